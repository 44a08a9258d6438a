// radio_watch: prints every new value of properties and events.
//
//   radio_watch PATH...     for instance /radio/signal /events/ring
//
// When the service goes away it tries again, at growing intervals; what it
// observes comes back with the connection.

#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "examples/end_signals.h"
#include "examples/show.h"
#include "plr/concurrency.h"
#include "plr/rest.h"

namespace {

using namespace std::chrono_literals;

constexpr const char* kService = "net.example.radio";
constexpr std::chrono::milliseconds kFirstDelay = 50ms, kLongestDelay = 5s;

// Owns its queue; see plr/concurrency/shared_synchronizable.h.
class Watcher : public plr::SharedSynchronizable<Watcher> {
  public:
    static std::shared_ptr<Watcher> create(std::vector<std::string> paths) {
        auto watcher = make_shared_ptr(new Watcher);
        watcher->execute_wrapped([self = watcher.get(), paths = std::move(paths)] {
            self->ownQueue_.assertCurrent();
            self->observe_sync(paths);
            self->connect_sync();
        });
        return watcher;
    }

  private:
    Watcher()
        : SharedSynchronizable("radio_watch"),
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
        if (!std::exchange(connected_, true))
            radio::say(std::string("connected to ") + kService);
        delay_ = kFirstDelay;
    }

    void lost_sync() PLR_ON(ownQueue_)
    {
        if (std::exchange(connected_, false))
            radio::say(std::string(kService) + " is gone");
        ownQueue_.queue().after(
            dispatch::time::after(delay_),
            dispatch::block<void()>(plr::whileAlive(weak_from_this(), [](Watcher& self) {
                self.ownQueue_.assertCurrent();
                self.connect_sync();
            })));
        delay_ = std::min(2 * delay_, kLongestDelay);
    }

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
    const auto watcher = Watcher::create({argv + 1, argv + argc});
    return end.wait();
}
