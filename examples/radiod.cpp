// radiod: a radio service. It reads what a modem says, line by line, and
// publishes it as properties and events under the name net.example.radio.
//
//   radiod --modem PATH     a terminal, a FIFO or a file with a recorded session
//
//   /connections            who is connected
//   /radio/...              the last value of everything the modem reported
//   /events/...             calls and messages as they come; not kept
//   /settings/...           what clients ask for
//
// radio_reports.h says which result code becomes which path and value.

#include <signal.h>

#include <exception>
#include <memory>
#include <optional>

#include "examples/modem.h"
#include "examples/radio_reports.h"
#include "examples/show.h"
#include "plr/rest.h"

namespace {

using plr::rest::ConnectionRestResource;
using plr::rest::PropertyRestResource;
using plr::rest::RestServerExample;

constexpr const char* kService = "net.example.radio";

std::shared_ptr<RestServerExample> makeServer() {
    const auto server = RestServerExample::create(dispatch::queue::create("radiod"), kService);
    server->registerResource("/connections", std::make_shared<ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<PropertyRestResource>(true));
    server->registerResource("/events", std::make_shared<PropertyRestResource>(false));
    server->registerResource("/settings", std::make_shared<PropertyRestResource>(true));
    return server;
}

// Publishes what a modem says through a client of its own, so that the service
// sets its properties in the same way as everybody else. Made on any thread
// (throws when there is no such modem), started and destroyed on its queue.
class Publisher {
  public:
    Publisher(const std::string& modemPath, const dispatch::queue& queue)
        : rest_(queue, "radiod"),
          modem_(
              modemPath, queue, [this](const radio::ModemLine& line) { publish(line); },
              [](int) { radio::say("radiod: the modem is gone"); }) {}

    void start() {
        rest_.observeProperty("/settings/airplane_mode", [](const vox::object& wanted) {
            if (!vox::is_logically_false(wanted))
                radio::say("radiod: airplane mode is asked for");
        });
        rest_.connect(vox::connection::create(kService));
        modem_.start();
    }

  private:
    void publish(const radio::ModemLine& said) {
        const auto line = said.cut ? std::nullopt : radio::parseAtLine(said.text);
        const auto reading = line ? radio::readLine(*line) : radio::Reading{{}, {}, "unreadable"};
        if (reading.complaint)
            radio::say("radiod: line " + std::to_string(said.number) + " skipped, " +
                       reading.complaint + ": " + said.text);
        if (reading.path.empty())
            return;
        radio::say("radiod: " + reading.path + " = " + radio::oneLine(reading.value));
        rest_.setProperty(reading.path, reading.value);
    }

    plr::RestModule rest_;
    radio::Modem modem_;
};

// Signals that end the service arrive in waitForEnd() only.
void blockEndSignals(sigset_t& signals) {
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
}

void serve(const std::string& modemPath, const sigset_t& endSignals) {
    const auto queue = dispatch::queue::create("radiod.modem");
    std::optional<Publisher> publisher(std::in_place, modemPath, queue);
    const auto server = makeServer();
    server->connect(vox::connection::create_listener(kService));
    queue.sync([&] { publisher->start(); });
    radio::say(std::string("radiod: serving ") + kService);
    int signal = 0;
    sigwait(&endSignals, &signal);
    queue.sync([&] { publisher.reset(); });
    radio::say("radiod: ended");
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3 || std::string_view(argv[1]) != "--modem") {
        std::cerr << "usage: radiod --modem PATH\n";
        return 2;
    }
    sigset_t endSignals;
    blockEndSignals(endSignals);
    try {
        serve(argv[2], endSignals);
    } catch (const std::exception& error) {
        std::cerr << "radiod: " << error.what() << '\n';
        return 1;
    }
}
