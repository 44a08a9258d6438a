#pragma once

#include <type_traits>
#include <utility>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"
#include "vox/connection.h"
#include "vox/listener.h"

// vox::connection holds a Vox connection or the null object, on which every
// member does nothing. vox/connection.h says how connections behave.
namespace vox {

class PLR_EXPORT connection : public object {
  public:
    connection() noexcept = default;
    connection(std::nullptr_t) noexcept {}
    // Keeps `other` if it is a connection.
    connection(const object& other) noexcept : connection(object(other)) {}
    connection(object&& other) noexcept
        : object(other.type() == VOX_TYPE_CONNECTION ? std::move(other) : nullptr) {}

    // A client of the service `name`, a listener of that name, a listener that
    // only endpoints reach. `limits` null for the defaults. All are made
    // suspended, and tell what is wrong by their error event.
    [[nodiscard]] static connection create(const char* name) {
        return object::adopt(vox_connection_create(name));
    }
    [[nodiscard]] static connection create_listener(const char* name,
                                                    const vox_limits_t* limits = nullptr) {
        return object::adopt(vox_connection_create_listener(name, limits));
    }
    [[nodiscard]] static connection create_anonymous_listener(
        const vox_limits_t* limits = nullptr) {
        return object::adopt(vox_connection_create_anonymous_listener(limits));
    }
    // Both ends of a new connection inside this process.
    [[nodiscard]] static std::pair<connection, connection> create_pair(
        const vox_limits_t* limits = nullptr);

    // Before the first resume() only. `handler` takes an object, or a const
    // reference to one.
    template <class Handler>
    void set_event_handler(Handler&& handler) const {
        const dispatch::block<void(vox_object_t)> adapted(
            [handler = std::decay_t<Handler>(std::forward<Handler>(handler))](
                vox_object_t event) mutable { handler(object::retain(event)); });
        set_raw_event_handler(adapted);
    }
    void set_target_queue(const dispatch::queue& queue) const;
    void resume() const;
    void suspend() const;
    void cancel() const;

    // 0 when the message was accepted for sending, else an error number;
    // ENOTCONN on the null object.
    int send_message(const dict& message) const;
    // `handler` runs once on `queue`, with the reply or an error object.
    void send_message_with_reply(const dict& message, const dispatch::queue& queue,
                                 dispatch::block<void(object)> handler) const;
    // `barrier` runs on the target queue once everything sent before was handed
    // to the kernel, or can never be.
    void send_barrier(const dispatch::block<void()>& barrier) const;

    [[nodiscard]] vox_statistics_t statistics() const;

  private:
    void set_raw_event_handler(const dispatch::block<void(vox_object_t)>& handler) const;
};

// vox::endpoint holds what lets its receiver connect to an anonymous listener,
// or the null object. It travels in messages.
class PLR_EXPORT endpoint : public object {
  public:
    endpoint() noexcept = default;
    // Keeps `other` if it is an endpoint.
    endpoint(const object& other) noexcept
        : object(other.type() == VOX_TYPE_ENDPOINT ? other : object()) {}
    [[nodiscard]] static endpoint create(const connection& listener);
    // A new connection, suspended; the null object when there is no endpoint.
    [[nodiscard]] connection connect() const;
};

}  // namespace vox
