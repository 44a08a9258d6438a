#pragma once

#include <atomic>
#include <cstdint>

// What stands in the pool's place for one queue without target: the queue is
// announced here when somebody is to run it, and the serving thread takes it.
//
// Owner:   that queue.
// Threads: announce() on any, by the queue's owner; stop() and the descriptor on any;
//          the rest on the serving thread.
namespace dispatch::detail {

class queue_core;
struct waiter;

class pump_core {
  public:
    // Throws std::system_error.
    pump_core();
    ~pump_core();
    pump_core(const pump_core&) = delete;
    pump_core& operator=(const pump_core&) = delete;

    // Takes over the ownership of the queue, and tells the serving thread. False once
    // closed: the pool shall have it.
    [[nodiscard]] bool announce() noexcept;

    // In the child of a fork: any of its threads may serve, and nothing is announced.
    void forked() noexcept;

    [[nodiscard]] int descriptor() const noexcept { return descriptor_; }
    bool process(queue_core& served) noexcept;
    void run(queue_core& served) noexcept;
    void stop() noexcept;
    void close(queue_core& served) noexcept;

    // Waits until work on the served queue, or on one that targets it, has granted
    // `done`. Any thread; the serving one serves meanwhile.
    void await(queue_core& served, waiter& done) noexcept;

  private:
    // Ownership of the queue: idle and closed, it is not here; ready, it is.
    enum class state : std::uint8_t { idle, ready, closed };

    void claim(const queue_core& served) noexcept;
    [[nodiscard]] bool is_server() const noexcept;
    [[nodiscard]] bool has(state wanted) const noexcept {
        return state_.load(std::memory_order_acquire) == wanted;
    }
    void wake() const noexcept;
    void wait() const noexcept;

    const int descriptor_;  // eventfd(2)
    std::atomic<state> state_{state::idle};
    std::atomic<bool> stopped_{false};
    std::atomic<const void*> server_{nullptr};  // an address that only that thread has
};

}  // namespace dispatch::detail
