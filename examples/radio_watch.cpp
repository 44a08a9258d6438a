// radio_watch: prints every new value of properties and events.
//
//   radio_watch PATH...     for instance /radio/signal /events/ring
//
// When the service goes away it tries again, at growing intervals; what it
// observes comes back with the connection. Values go to standard output, what
// happens to the connection is logged to standard error.

#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "examples/end_signals.h"
#include "examples/logging.h"
#include "examples/show.h"
#include "plr/concurrency.h"
#include "plr/rest.h"

namespace {

using namespace std::chrono_literals;
using plr::LogLevel;

constexpr const char* kService = "net.example.radio";
constexpr std::chrono::milliseconds kFirstDelay = 50ms, kLongestDelay = 5s;

// Owns its queue and its logger; see plr/log/shared_loggable.h.
class Watcher : public plr::SharedLoggable<Watcher> {
  public:
    static std::shared_ptr<Watcher> create(const std::shared_ptr<plr::LogServer>& logServer,
                                           std::vector<std::string> paths) {
        auto watcher = make_shared_ptr(new Watcher(logServer));
        watcher->execute_wrapped([self = watcher.get(), paths = std::move(paths)] {
            self->ownQueue_.assertCurrent();
            self->observe_sync(paths);
            self->connect_sync();
        });
        return watcher;
    }

  private:
    explicit Watcher(const std::shared_ptr<plr::LogServer>& logServer)
        : SharedLoggable("radio_watch", "radio.watch", logServer),
          timers_(plr::DispatchTimerService::create(logServer)),
          rest_(ownQueue_.queue(), "radio_watch." + std::to_string(::getpid())) {}

    void observe_sync(const std::vector<std::string>& paths) PLR_ON(ownQueue_)
    {
        for (const std::string& path : paths)
            rest_.observeProperty(
                path, plr::whileAlive(weak_from_this(), [path](Watcher& self, const auto& value) {
                    self.ownQueue_.assertCurrent();
                    self.connected_sync();
                    radio::say(path + " = " + radio::oneLine(value));
                }));
        rest_.setServerErrorHandler(plr::whileAlive(weak_from_this(), [](Watcher& self, auto&&) {
            self.ownQueue_.assertCurrent();
            self.lost_sync();
        }));
    }

    void connect_sync() PLR_ON(ownQueue_)
    {
        rest_.connect(vox::connection::create(kService));
        // Null without a service; else the first sign of it, when only events are
        // observed.
        rest_.getPropertyOnce(
            "/", plr::whileAlive(weak_from_this(), [](Watcher& self, const vox::object& names) {
                self.ownQueue_.assertCurrent();
                if (names)
                    self.connected_sync();
            }));
    }

    void connected_sync() PLR_ON(ownQueue_)
    {
        delay_ = kFirstDelay;
        if (std::exchange(connected_, true))
            return;
        radio::log(logger(), LogLevel::Notice, "connected to ", kService);
        logger().getLogServer()->debugFlush();  // values come behind it
    }

    void lost_sync() PLR_ON(ownQueue_)
    {
        if (std::exchange(connected_, false))
            radio::log(logger(), LogLevel::Warn, kService, " is gone");
        timers_->runAfter(delay_, ownQueue_.queue(),
                          plr::whileAlive(weak_from_this(), [](Watcher& self) {
                              self.ownQueue_.assertCurrent();
                              self.connect_sync();
                          }));
        delay_ = std::min(2 * delay_, kLongestDelay);
    }

    const std::shared_ptr<plr::TimerService> timers_;
    plr::RestModule rest_ PLR_CONFINED_TO(ownQueue_);
    bool connected_ PLR_CONFINED_TO(ownQueue_)
    = false;
    std::chrono::milliseconds delay_ PLR_CONFINED_TO(ownQueue_)
    = kFirstDelay;  // of the next try
};

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) {
        std::cerr << "usage: radio_watch PATH...\n";
        return 2;
    }
    const radio::EndSignals end;
    const auto logServer = radio::startLog("radio_watch", {"console"});
    const plr::ScopedLogFlusher flusher(logServer);
    const auto watcher = Watcher::create(logServer, {argv + 1, argv + argc});
    return end.wait();
}
