#pragma once

#include <atomic>
#include <cstdint>
#include <utility>

// How an idle process leaves (vox/service.h).
//
// Every listener and peer connection is in one list of the process. While the
// process is opted in, a timer looks at them twice in the idle time: when nothing has passed
// for that time and nothing waits, the process begins to leave, in stages, each of
// which is over when every participant says so and no transaction is open:
//
//   listeners    take no more clients
//   clients      connections that a listener accepted stop receiving (SHUT_RD): what
//                the peer sends from then on fails at the peer. What came before is
//                delivered and answered, with the other connections at work.
//   everything   the other connections stop receiving
//
// Then `leave` runs. Nothing of this is on the way of messages: activity is read
// from counters that connections keep anyway.
//
// Locks:   the list's mutex is taken before a participant's, never while one is held.
namespace vox_link {

enum class leaving_stage : std::uint8_t { none, listeners, clients, everything };

// A listener or a connection in the eyes of idle exit. Its members are called with
// the list's mutex held, on any thread; they return at once.
class idle_participant {
  public:
    idle_participant(const idle_participant&) = delete;
    idle_participant& operator=(const idle_participant&) = delete;

    struct sight {
        std::uint64_t passed;  // messages so far; it only grows
        bool busy;             // something waits: to be read, delivered, answered or written
    };
    [[nodiscard]] virtual sight look() = 0;
    // Does what `stage` asks of it; called again and again. Returns whether nothing
    // of it has to be waited for.
    [[nodiscard]] virtual bool leave(leaving_stage stage) = 0;

  protected:
    idle_participant() = default;
    virtual ~idle_participant() = default;
    // From the end of the constructor of the class that implements the members, …
    void enlist();
    // … until it has ended.
    void discharge();

  private:
    friend class participant_list;
    idle_participant* before_ = nullptr;
    idle_participant* after_ = nullptr;
};

// A call that waits on a queue of the user's holds one: the process stays until it was
// made. Costs one load while the process is not opted in.
class queued_call {
  public:
    queued_call() noexcept : counted_(is_counting.load(std::memory_order_relaxed)) {
        if (counted_)
            count.fetch_add(1, std::memory_order_relaxed);
    }
    queued_call(queued_call&& other) noexcept : counted_(std::exchange(other.counted_, false)) {}
    queued_call(const queued_call&) = delete;
    queued_call& operator=(const queued_call&) = delete;
    ~queued_call() {
        if (counted_)
            count.fetch_sub(1, std::memory_order_release);
    }

    static inline std::atomic<bool> is_counting{false};  // while opted in
    static inline std::atomic<std::uint64_t> count{0};

  private:
    bool counted_;
};

}  // namespace vox_link
