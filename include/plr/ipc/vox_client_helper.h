#pragma once

#include <cstddef>
#include <memory>
#include <utility>

#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"

// A VoxClientHelper keeps a connection to a server and delivers its events to a
// target object.
//
// Owner:   it is part of the target, so that it lives as long as the target.
//          The target is held weakly; events after its end are ignored.
// Queue:   handlers run on the queue given; members are called there.
//
// What a target T offers:
//   void handleMessage(vox::dict)
//   void handleServerError(vox::object)
namespace plr {

class PLR_EXPORT VoxClientHelper {
  public:
    VoxClientHelper() noexcept;
    // Drops the connection as setServer(nullptr) does.
    ~VoxClientHelper();
    VoxClientHelper(const VoxClientHelper&) = delete;
    VoxClientHelper& operator=(const VoxClientHelper&) = delete;

    // Replaces the connection and starts the new one. The old one is cancelled
    // once everything sent on it was handed to the kernel.
    template <class T>
    void setServer(vox::connection server, const dispatch::queue& queue, std::weak_ptr<T> target);
    void setServer(std::nullptr_t) { setServer_internal(nullptr); }

    // The null object when there is none.
    [[nodiscard]] const vox::connection& getServer() const noexcept { return server_; }

    // Holds `group` entered until everything sent before was handed to the
    // kernel; nothing happens without a connection.
    void flush(const dispatch::group& group) const;

  private:
    void setServer_internal(vox::connection server);

    vox::connection server_;
};

template <class T>
void VoxClientHelper::setServer(vox::connection server, const dispatch::queue& queue,
                                std::weak_ptr<T> target) {
    setServer_internal(std::move(server));
    if (!server_)
        return;
    // `this` is touched only while the target, which it is part of, is alive.
    server_.set_event_handler(
        [this, target = std::move(target), installedOn = server_](vox::object event) {
            const std::shared_ptr<T> alive = target.lock();
            if (!alive)
                return;
            if (event.type() == VOX_TYPE_DICTIONARY)
                alive->handleMessage(vox::dict(std::move(event)));
            else if (event.type() == VOX_TYPE_ERROR && server_.get() == installedOn.get())
                // Errors of a connection that was replaced concern nobody.
                alive->handleServerError(event);
        });
    server_.set_target_queue(queue);
    server_.resume();
}

}  // namespace plr
