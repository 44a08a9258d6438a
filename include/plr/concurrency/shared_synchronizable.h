#pragma once

#include <memory>
#include <string_view>
#include <type_traits>
#include <utility>

#include "dispatch/queue.h"
#include "plr/concurrency/queue_role.h"

// SharedSynchronizable<T> is the base of every object that owns a serial queue
// and touches its state from work of that queue only. T is the deriving class.
//
// Owner:   a std::shared_ptr made by make_shared_ptr(), in a static create() of
//          the deriving class; constructors are not for clients. The last
//          owner may go on any thread: the object is destroyed on its queue,
//          behind everything queued before.
// Queue:   made by the constructor, or given to it; never replaced.
// Order:   work of one thread runs in the order of its submission.
// Naming:  a member whose name ends in `_sync` is called on the queue only and
//          marked PLR_ON(ownQueue_); state is PLR_CONFINED_TO(ownQueue_).
//          Queued lambdas start with ownQueue_.assertCurrent().
// Cost:    execute_wrapped() is one queued node and one atomic count.
namespace plr {

template <class T>
class SharedSynchronizable : public std::enable_shared_from_this<T> {
  public:
    SharedSynchronizable(const SharedSynchronizable&) = delete;
    SharedSynchronizable& operator=(const SharedSynchronizable&) = delete;

    // Makes a freshly built object owned, T itself or a class derived from it
    // (then T needs a virtual destructor). Takes `object` over, also when it
    // throws std::bad_alloc: then the object is destroyed on its queue. Null
    // gives an owner of nothing.
    template <class Derived>
    [[nodiscard]] static std::shared_ptr<Derived> make_shared_ptr(Derived* object) {
        static_assert(std::is_same_v<Derived, T> || std::has_virtual_destructor_v<T>);
        return std::shared_ptr<Derived>(object, DestroyOnQueue());
    }

    // Throws std::bad_weak_ptr when the object is not, or no longer, owned.
    [[nodiscard]] std::weak_ptr<T> weak_from_this() { return this->shared_from_this(); }
    [[nodiscard]] std::weak_ptr<const T> weak_from_this() const { return this->shared_from_this(); }

    // Queues `work`, a callable without arguments or a block, and keeps the
    // object alive until it has run. Throws std::bad_weak_ptr, and queues
    // nothing, when the object is not (or no longer) owned. Any thread.
    template <class Callable>
    void execute_wrapped(Callable&& work) const {
        ownQueue_.queue().async(Wrapped<std::decay_t<Callable>>{this->shared_from_this(),
                                                                std::forward<Callable>(work)});
    }

    // Runs `work` on the queue while the caller, who holds the object, waits,
    // and returns its result (move-only ones too). Never from the object's own
    // queue: that stops the process.
    template <class Callable>
    auto execute_wrapped_sync(Callable&& work) const -> std::invoke_result_t<Callable&> {
        return ownQueue_.queue().sync(std::forward<Callable>(work));
    }

  protected:
    // A new serial queue of that label; or the given one, which is retained.
    explicit SharedSynchronizable(std::string_view label)
        : ownQueue_(dispatch::queue::create(label)) {}
    explicit SharedSynchronizable(dispatch::queue queue) noexcept : ownQueue_(std::move(queue)) {}
    ~SharedSynchronizable() = default;

    // For public members that may be called on the queue and elsewhere: in
    // place on the queue, like execute_wrapped_sync() elsewhere.
    template <class Callable>
    auto perform(Callable&& work) const -> std::invoke_result_t<Callable&> {
        if (ownQueue_.queue().is_current())
            return work();
        return execute_wrapped_sync(std::forward<Callable>(work));
    }

    const QueueRole ownQueue_;

  private:
    // `work` goes before `self`, so that what it captured dies while the object
    // is still owned.
    template <class Callable>
    struct Wrapped {
        std::shared_ptr<const T> self;
        Callable work;
        void operator()() { work(); }
    };

    // Runs on whatever thread drops the last owner, perhaps in the middle of the
    // object's own work: so the destruction is queued, never done in place.
    struct DestroyOnQueue {
        void operator()(T* object) const {
            if (!object)
                return;
            const SharedSynchronizable& base = *object;
            base.ownQueue_.queue().barrier_async([object] { delete object; });
        }
    };
};

}  // namespace plr
