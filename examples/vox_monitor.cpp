// vox_monitor: prints what passes a service, while it happens.
//
//   vox_monitor NAME        for instance net.example.radio
//
// Only root and the service's own user may. A line for each message, request and
// reply, and for clients that come and go: when, the direction ("->" to the service),
// the client's connection and pid, what it is, the id of a request, the body's bytes
// and descriptors, and the value. Where this program was too slow, or the service too
// busy, a line says how much is missing.

#include "examples/end_signals.h"
#include "examples/show.h"
#include "plr/ipc.h"
#include "vox/tap.h"

namespace {

std::uint64_t countAt(const vox::dict& event, const char* key) {
    const vox::object number = event[key];
    return vox_uint64_get_value(number.get());
}

std::string direction(const vox::dict& event) {
    const std::string_view text = event.text("d");
    if (text.empty())
        return "--";
    return text == "in" ? "->" : "<-";
}

std::string client(const vox::dict& event) {
    return "#" + std::to_string(countAt(event, "c")) + " pid " + radio::oneLine(event["p"]);
}

// "request 7, 31 bytes, 1 descriptors"
std::string content(const vox::dict& event) {
    std::string text(event.text("k"));
    if (event.contains("i"))
        text += " " + std::to_string(countAt(event, "i"));
    if (event.contains("n"))
        text += ", " + std::to_string(countAt(event, "n")) + " bytes";
    if (countAt(event, "f") > 0)
        text += ", " + std::to_string(countAt(event, "f")) + " descriptors";
    return text;
}

std::string value(const vox::dict& event) {
    for (const char* key : {"v", "b"})
        if (event.contains(key))
            return ": " + radio::oneLine(event[key]);
    return {};
}

void show(const vox::dict& event) {
    if (event.text("k") == "missed")
        radio::say("... " + std::to_string(countAt(event, "l")) + " not seen");
    else if (event.text("k") == "start")
        radio::say(radio::oneLine(event["t"]) + " start");
    else
        radio::say(radio::oneLine(event["t"]) + " " + direction(event) + " " + client(event) + " " +
                   content(event) + value(event));
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::cerr << "usage: vox_monitor NAME\n";
        return 2;
    }
    radio::EndSignals end;
    const vox::connection tap = vox::object::adopt(vox_connection_create_tap(argv[1]));
    tap.set_event_handler([&end](const vox::object& event) {
        if (event.type() == VOX_TYPE_DICTIONARY)
            return show(vox::dict(event));
        std::cerr << "vox_monitor: " << radio::oneLine(event) << '\n';
        end.raise(1);
    });
    tap.resume();
    const int status = end.wait();
    tap.cancel();
    return status;
}
