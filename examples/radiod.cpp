// radiod: a radio service. It reads what a modem says, line by line, and
// publishes it as properties and events under the name net.example.radio.
//
//   radiod --modem PATH     a terminal, a FIFO or a file with a recorded session
//
//   /connections            who is connected
//   /radio/...              the last value of everything that the modem reported
//   /events/...             calls and messages as they come; not kept
//   /settings/...           what clients ask for
//
// radio_reports.h says which result code becomes which path and value.

#include <exception>
#include <memory>
#include <optional>

#include "examples/end_signals.h"
#include "examples/modem.h"
#include "examples/radio_reports.h"
#include "examples/show.h"
#include "plr/rest.h"

namespace {

using plr::rest::Operation;
using plr::rest::PropertyRestResource;
using plr::rest::RestServerExample;

constexpr const char* kService = "net.example.radio";

// Properties that clients set and the service acts on.
class Settings : public PropertyRestResource {
  public:
    Settings() : PropertyRestResource(true) {}

    bool handleRestMessage_SET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override {
        radio::say(std::string(path.current()) + " is set to " +
                   radio::oneLine(context.getRestValue()));
        return PropertyRestResource::handleRestMessage_SET(context, path);
    }
};

std::shared_ptr<RestServerExample> makeServer(const dispatch::queue& queue) {
    const auto server = RestServerExample::create(queue, kService);
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<PropertyRestResource>(true));
    server->registerResource("/events", std::make_shared<PropertyRestResource>(false));
    server->registerResource("/settings", std::make_shared<Settings>());
    return server;
}

// Sets a property of the service's own tree as a client would.
void publish(RestServerExample& server, const std::string& path, const vox::object& value) {
    radio::say(path + " = " + radio::oneLine(value));
    server.handleRestMessage(
        nullptr, plr::rest::createRestMessage(asObject(Operation::kSet), vox::string("radiod"),
                                              vox::string(path), value));
}

void handleLine(RestServerExample& server, const radio::ModemLine& said) {
    const auto line = said.cut ? std::nullopt : radio::parseAtLine(said.text);
    const auto reading = line ? radio::readLine(*line) : radio::Reading{{}, {}, "unreadable"};
    if (reading.complaint)
        radio::say("line " + std::to_string(said.number) + " is " + reading.complaint +
                   ", skipped: " + said.text);
    if (!reading.path.empty())
        publish(server, reading.path, reading.value);
}

// One queue has everything: the modem's lines, the clients' messages, the tree.
int serve(const char* modemPath) {
    radio::EndSignals end;
    const auto queue = dispatch::queue::create("radiod");
    const auto server = makeServer(queue);
    std::optional<radio::Modem> modem;
    modem.emplace(
        modemPath, queue, [&](const radio::ModemLine& said) { handleLine(*server, said); },
        [](int) { radio::say("the modem has ended"); });
    server->setListenerErrorHandler([&end](const vox::object& error) {
        radio::say("radiod: " + radio::oneLine(error));
        end.raise(1);
    });
    server->connect(vox::connection::create_listener(kService));
    modem->start();
    radio::say(std::string("serving ") + kService);
    const int status = end.wait();
    queue.sync([&] { modem.reset(); });
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3 || std::string_view(argv[1]) != "--modem") {
        std::cerr << "usage: radiod --modem PATH\n";
        return 2;
    }
    try {
        return serve(argv[2]);
    } catch (const std::exception& error) {
        std::cerr << "radiod: " << error.what() << '\n';
        return 1;
    }
}
