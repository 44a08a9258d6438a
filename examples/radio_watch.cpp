// radio_watch: prints every new value of properties and events.
//
//   radio_watch PATH...     for instance /radio/signal /events/ring
//
// When the service goes away it waits for the next one. Values go to standard
// output. It logs into the service's log, in the domain radio.watch.PID; what it
// logs while there is no service waits for the next one.

#include <unistd.h>

#include <chrono>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "examples/end_signals.h"
#include "examples/logging.h"
#include "examples/radio_settings.h"
#include "examples/show.h"
#include "plr/concurrency.h"
#include "plr/log/vox_logger.h"
#include "plr/rest.h"

namespace {

using plr::LogLevel;

// Owns its queue; see plr/concurrency/shared_synchronizable.h.
class Watcher : public plr::SharedSynchronizable<Watcher> {
  public:
    static std::shared_ptr<Watcher> create(std::vector<std::string> paths) {
        auto watcher = make_shared_ptr(new Watcher);
        watcher->execute_wrapped([self = watcher.get(), paths = std::move(paths)] {
            self->ownQueue_.assertCurrent();
            self->start_sync(paths);
        });
        return watcher;
    }
    void flushLog() const {
        static_cast<void>(logger_->flush().wait(dispatch::time::after(std::chrono::seconds(1))));
    }

  private:
    Watcher() : SharedSynchronizable("radio_watch") {}

    void start_sync(const std::vector<std::string>& paths) PLR_ON(ownQueue_)
    {
        logger_->setInheritedLogLevel(LogLevel::Info);  // until the service tells
        for (const std::string& path : paths)
            rest_.observeProperty(
                path, plr::whileAlive(weak_from_this(), [path](Watcher& self, const auto& value) {
                    radio::say(path + " = " + radio::oneLine(value));
                    radio::log(*self.logger_, LogLevel::Debug, path, " = ", radio::oneLine(value));
                }));
        rest_.setConnectionHandler(
            plr::whileAlive(weak_from_this(), [](Watcher& self, bool isReached) {
                self.ownQueue_.assertCurrent();
                self.handleConnection_sync(isReached);
            }));
        rest_.connectToService(service_);
    }

    void handleConnection_sync(bool isReached) PLR_ON(ownQueue_)
    {
        if (!isReached)
            return radio::log(*logger_, LogLevel::Warn, service_, " is gone");
        radio::log(*logger_, LogLevel::Notice, "connected to ", service_);
        // Each service has a log of its own.
        rest_.getPropertyOnce("/log_server",
                              plr::whileAlive(weak_from_this(), [](Watcher& self, const auto& log) {
                                  if (log)
                                      self.logger_->reconnect(vox::endpoint(log));
                              }));
    }

    const std::string service_ = radio::serviceName();
    const std::string pid_ = std::to_string(::getpid());
    const std::shared_ptr<plr::VoxLogger> logger_ = plr::VoxLogger::create(
        ownQueue_.queue(), "radio_watch", "radio.watch." + pid_, vox::connection());
    plr::RestModule rest_ PLR_CONFINED_TO(ownQueue_)
    = plr::RestModule(ownQueue_.queue(), "radio_watch." + pid_);
};

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) {
        std::cerr << "usage: radio_watch PATH...\n";
        return 2;
    }
    const radio::EndSignals end;
    const auto watcher = Watcher::create({argv + 1, argv + argc});
    const int status = end.wait();
    watcher->flushLog();
    return status;
}
