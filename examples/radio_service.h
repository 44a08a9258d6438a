#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "plr/concurrency.h"
#include "plr/ipc.h"
#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// A RadioService has the tree of resources (radio_tree.h) and serves it to clients.
// It acts on what they set itself:
//
//   /settings/status_seconds    a period for status lines in the log
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own has everything: clients' messages, the tree, the timer.
// Logs:    in the domain radio.rest.
class RadioService : public plr::SharedLoggable<RadioService> {
  public:
    [[nodiscard]] static std::shared_ptr<RadioService> create(
        const std::shared_ptr<plr::LogServer>& logServer,
        std::shared_ptr<plr::TimerService> timers);

    // Returns whether clients can come; `onFailure` is called on the queue when they
    // cannot, or can no more. Any thread but the queue.
    bool serve(const vox::connection& listener, std::function<void()> onFailure);
    // Sets a property as a client would. Any thread.
    void publish(const std::string& path, const vox::object& value);

  private:
    class Settings;

    RadioService(const std::shared_ptr<plr::LogServer>& logServer,
                 std::shared_ptr<plr::TimerService> timers);
    void init_sync() PLR_ON(ownQueue_);
    void publish_sync(const std::string& path, const vox::object& value) PLR_ON(ownQueue_);
    void set_sync(const std::string& path, const vox::object& value) PLR_ON(ownQueue_);
    void applySetting_sync(const std::string& name, const vox::object& value) PLR_ON(ownQueue_);
    void setStatusPeriod_sync(std::int64_t seconds) PLR_ON(ownQueue_);

    const std::shared_ptr<plr::rest::RestServerExample> server_;  // on the same queue
    const std::shared_ptr<plr::TimerService> timers_;
    bool failed_ PLR_CONFINED_TO(ownQueue_)
    = false;  // the listener
    std::unique_ptr<plr::Timer> statusTimer_ PLR_CONFINED_TO(ownQueue_);
    std::uint64_t published_ PLR_CONFINED_TO(ownQueue_)
    = 0;  // reports
};

}  // namespace radio
