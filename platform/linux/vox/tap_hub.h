#pragma once

#include <sys/socket.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "dispatch/dispatch.h"
#include "platform/linux/vox/byte_buffer.h"
#include "platform/linux/vox/frame.h"
#include "platform/linux/vox/lock.h"
#include "vox/value.h"

// What the taps of one listener see (vox/tap.h).
//
// Owner:   the listener and its clients share the hub. A tap is a client of the
//          listener that asked to be one.
// Threads: clients publish on any thread: a copy under a short lock. A serial queue of
//          low priority makes entries of that and sends them.
// Order:   as published.
// Loss:    what is published has a number. What finds the list full, or no room
//          at a tap, is left out; the numbers that are missing tell a tap how many.
// Memory:  the list, and as much again while it is being sent, as long as there are taps.
namespace vox_link {

class peer_connection;
class tapped_client;

enum class tap_kind : std::uint8_t {
    start,
    message,
    request,
    reply,
    cancel,
    refused,
    dropped,
    open,
    close,
};
enum class tap_way : std::uint8_t { none, in, out };

// One thing that passed; its body lies elsewhere.
struct tap_entry {
    tap_kind kind = tap_kind::start;
    tap_way way = tap_way::none;
    std::uint16_t descriptors = 0;
    std::uint32_t length = 0;   // of the body
    std::uint64_t request = 0;  // its id; 0 for none
    std::uint64_t client = 0;
    pid_t pid = -1;
    uid_t uid = static_cast<uid_t>(-1);
    std::int64_t time = 0;    // ns since 1970
    std::uint64_t index = 0;  // among all that was published
    std::size_t at = 0;       // of the body among those in the list …
    std::size_t kept = 0;     // … and the bytes that are there: all or none
};

class tap_hub : public std::enable_shared_from_this<tap_hub> {
  public:
    // Hot path: all that a message costs without taps; bench/vox_cases.h.
    [[nodiscard]] bool has_taps() const noexcept {
        return count_.load(std::memory_order_relaxed) != 0;
    }
    void set_allowed(bool allowed) noexcept { allowed_.store(allowed); }
    [[nodiscard]] bool is_allowed() const noexcept { return allowed_.load(); }

    // `tap` gets what is published from now on, until it is removed. False when
    // there are too many.
    [[nodiscard]] bool add(peer_connection* tap);
    void remove(peer_connection* tap);
    // On the taps' queue. Not before the first tap.
    void async(dispatch::block<void()> work);

    // `about` is known as open from then on.
    void publish(tapped_client& about, tap_entry entry, std::span<const std::uint8_t> body);

  private:
    struct tap;
    struct list {
        std::vector<tap_entry> entries;
        vox_wire::byte_buffer bodies;
        void clear() noexcept;
    };
    using taps = std::vector<std::shared_ptr<tap>>;

    void append(tap_entry entry, std::span<const std::uint8_t> body) PLR_REQUIRES(lock_);
    void drain();
    static void send(const taps& to, const list& what);

    std::atomic<std::uint32_t> count_{0};  // of taps_; changes under lock_
    std::atomic<bool> allowed_{true};
    mutex lock_;
    dispatch::queue queue_ PLR_GUARDED_BY(lock_);  // fixed from the first tap on
    taps taps_ PLR_GUARDED_BY(lock_);
    list list_ PLR_GUARDED_BY(lock_);
    std::uint64_t published_ PLR_GUARDED_BY(lock_) = 0;
    bool draining_ PLR_GUARDED_BY(lock_) = false;  // is scheduled
    list sending_;                                 // on the queue
};

// A client as taps know it. Without a hub there is nobody to know it.
class tapped_client {
  public:
    // Before anything else, once.
    void bind(std::shared_ptr<tap_hub> hub, const ucred& peer);

    [[nodiscard]] tap_hub* hub() const noexcept { return hub_.get(); }
    // Hot path.
    [[nodiscard]] bool is_watched() const noexcept { return hub_ && hub_->has_taps(); }
    // Hot path: it is there and is no tap.
    void opened() {
        if (!open_.load(std::memory_order_relaxed)) [[unlikely]]
            show_open();
    }
    // A frame that passed; `as_dropped` instead of being sent.
    void show(tap_way way, const frame_header& header, std::span<const std::uint8_t> body,
              bool as_dropped = false);
    // Its end, unless nobody heard of its beginning. `reason`: an error, or null.
    void closed(vox_object_t reason);

  private:
    friend class tap_hub;
    void show_open();
    [[nodiscard]] tap_entry entry(tap_kind kind) const noexcept;

    std::shared_ptr<tap_hub> hub_;
    std::uint64_t number_ = 0;
    pid_t pid_ = -1;
    uid_t uid_ = static_cast<uid_t>(-1);
    std::atomic<bool> open_{false};  // with taps, changes under the hub's lock
};

}  // namespace vox_link
