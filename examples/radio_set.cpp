// radio_set: sets one property.
//
//   radio_set PATH VALUE    VALUE: true, false, null, an integer, else a string,
//                           in quotes where it is to be one: '"1234"'

#include <string>

#include "examples/radio_settings.h"
#include "examples/show.h"
#include "plr/rest.h"

namespace {

// Whether the service has handled it.
bool set(const std::string& path, const vox::object& value) {
    const auto queue = dispatch::queue::create("radio_set");
    const plr::RestModule rest(queue, "radio_set");
    const dispatch::group open;
    bool handled = false;
    queue.sync([&] {
        rest.connect(vox::connection::create(radio::serviceName().c_str()));
        rest.setProperty(path, value);
        // A SET has no reply. But messages are handled in order, so an answer to
        // a later one says that the SET was.
        rest.getPropertyOnce("/", [&, session = dispatch::group_session(open)](
                                      const vox::object& names) { handled = bool(names); });
    });
    static_cast<void>(open.wait());
    return handled;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) {
        std::cerr << "usage: radio_set PATH VALUE\n";
        return 2;
    }
    if (!set(argv[1], radio::valueOf(argv[2]))) {
        std::cerr << "radio_set: " << radio::serviceName() << " is not there\n";
        return 1;
    }
}
