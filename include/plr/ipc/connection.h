#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <type_traits>
#include <utility>
#include <vector>

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"
#include "vox/connection.h"

// vox::connection holds a Vox connection or the null object, on which every
// member does nothing. vox/connection.h says how connections behave.
namespace vox {

class request;

// Who is at the other end, as the kernel knew it when the connection was made.
struct credentials {
    pid_t pid = -1;  // -1: not connected
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
};

class PLR_EXPORT connection : public object {
  public:
    connection() noexcept = default;
    connection(std::nullptr_t) noexcept {}
    // Keeps `other` if it is a connection.
    connection(const object& other) noexcept : connection(object(other)) {}
    connection(object&& other) noexcept
        : object(other.type() == VOX_TYPE_CONNECTION ? std::move(other) : nullptr) {}

    // A client of the service `name`; a tap on it (vox/tap.h). Made suspended, and
    // tell what is wrong by their error event. plr/ipc/listener.h has listeners.
    [[nodiscard]] static connection create(const char* name) {
        return object::adopt(vox_connection_create(name));
    }
    [[nodiscard]] static connection create_tap(const char* name);
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
    // The same with a time limit: `handler` gets the reply or an error, after
    // `timeout` one of code VOX_ERROR_REQUEST_TIMED_OUT. Positive, up to 49 days.
    request send_request(const dict& message, std::chrono::milliseconds timeout,
                         const dispatch::queue& queue, dispatch::block<void(object)> handler) const;
    // `barrier` runs on the target queue once everything sent before was handed
    // to the kernel, or can never be.
    void send_barrier(const dispatch::block<void()>& barrier) const;

    [[nodiscard]] vox_statistics_t statistics() const;
    [[nodiscard]] credentials peer() const;
    // The peer's supplementary groups; empty when it is not connected.
    [[nodiscard]] std::vector<gid_t> peer_groups() const;

  private:
    void set_raw_event_handler(const dispatch::block<void(vox_object_t)>& handler) const;
};

// A request under way. Dropping it changes nothing: the reply handler runs once
// in any case.
class PLR_EXPORT request {
  public:
    request() noexcept = default;
    request(connection sent_on, std::uint64_t number) noexcept
        : connection_(std::move(sent_on)), number_(number) {}

    // Gives it up: the handler gets an error of code VOX_ERROR_REQUEST_CANCELLED, and
    // the peer is told. False when its handler has, or will get, something else.
    bool cancel() const;
    // False when nothing was sent; the handler gets the error.
    explicit operator bool() const noexcept { return number_ != 0; }

  private:
    connection connection_;
    std::uint64_t number_ = 0;
};

// Whether nobody waits any more for the reply to `message`: a request, or the
// reply made for it.
[[nodiscard]] PLR_EXPORT bool is_cancelled(const dict& message);
// Runs `handler` once when that happens, on the connection's queue, or never. False for
// what is no open request.
PLR_EXPORT bool set_cancel_handler(const dict& message, const dispatch::block<void()>& handler);

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
