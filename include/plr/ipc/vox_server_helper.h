#pragma once

#include <memory>
#include <utility>

#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"

// A VoxServerHelper keeps a listener and delivers its events, and those of the
// clients that were accepted, to a target object.
//
// Owner:   it is part of the target, so that it lives as long as the target.
//          The target is held weakly; events after its end are ignored.
// Queue:   handlers run on the queue given; members are called there.
//
// What a target T offers:
//   bool handleNewClient(vox::connection)           false refuses the client
//   void handleListenerError(vox::object)
//   void handleClientMessage(vox::connection, vox::dict, const Handler&)
//   void handleClientError(vox::connection, vox::object)
namespace plr {

class PLR_EXPORT VoxServerHelper {
  public:
    explicit VoxServerHelper(vox::connection listener = {}) noexcept;
    // Cancels the listener.
    ~VoxServerHelper();
    VoxServerHelper(const VoxServerHelper&) = delete;
    VoxServerHelper& operator=(const VoxServerHelper&) = delete;

    // Cancels the current listener at once and keeps the new one; it is not
    // started.
    void setListener(vox::connection listener);
    [[nodiscard]] vox::connection getListener() const { return listener_; }

    // Starts the listener; nothing happens without one.
    template <class T>
    void startListener(const dispatch::queue& queue, std::weak_ptr<T> target);

    // Starts a client that handleNewClient() was given. `handler` is handed
    // back with each message.
    template <class T, class Handler>
    void acceptClient(vox::connection client, const dispatch::queue& queue, std::weak_ptr<T> target,
                      Handler handler) const;

    // Holds `group` entered until everything sent on the listener before was
    // handed over; nothing happens without a listener.
    void flush(const dispatch::group& group) const;

  private:
    vox::connection listener_;
};

namespace detail {
// Sends a barrier on `connection` that holds `group` entered until it has run;
// nothing happens on the null object.
PLR_EXPORT void flush(const vox::connection& connection, const dispatch::group& group);
}  // namespace detail

template <class T>
void VoxServerHelper::startListener(const dispatch::queue& queue, std::weak_ptr<T> target) {
    if (!listener_)
        return;
    // `this` is touched only while the target, which it is part of, is alive.
    listener_.set_event_handler(
        [this, target = std::move(target), installedOn = listener_](const vox::object& event) {
            const std::shared_ptr<T> alive = target.lock();
            if (!alive)
                return;
            if (const vox::connection client(event); client) {
                if (!alive->handleNewClient(client))
                    client.cancel();
            } else if (event.type() == VOX_TYPE_ERROR && listener_.get() == installedOn.get()) {
                // Errors of a listener that was replaced concern nobody.
                alive->handleListenerError(event);
            }
        });
    listener_.set_target_queue(queue);
    listener_.resume();
}

template <class T, class Handler>
void VoxServerHelper::acceptClient(vox::connection client, const dispatch::queue& queue,
                                   std::weak_ptr<T> target, Handler handler) const {
    client.set_event_handler(
        [target = std::move(target), client, handler = std::move(handler)](vox::object event) {
            const std::shared_ptr<T> alive = target.lock();
            if (!alive)
                return;
            if (event.type() == VOX_TYPE_DICTIONARY)
                alive->handleClientMessage(client, vox::dict(std::move(event)), handler);
            else if (event.type() == VOX_TYPE_ERROR)
                alive->handleClientError(client, event);
        });
    client.set_target_queue(queue);
    client.resume();
}

}  // namespace plr
