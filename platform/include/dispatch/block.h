#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "plr/base/assert.h"

// A block is a copyable, nullable closure whose copies share one heap object.
//
// Owner:   whoever holds a copy; the callable is destroyed with the last one,
//          on the thread that drops it.
// Threads: copies may be taken, called and dropped on any threads at once; the
//          callable sees concurrent calls only if its callers make them.
// Cost:    one allocation when made from a callable, one atomic count a copy.
//
// Construction from a callable is explicit, so that overloads taking
// std::function and overloads taking a block never collide on a lambda.
// An exception that leaves the callable ends the process.
namespace dispatch {

template <class Signature>
class block;

template <class Result, class... Arguments>
class block<Result(Arguments...)> {
  public:
    // The shared object; get() and from_raw() lend it as a plain pointer.
    struct body {
        std::atomic<std::uint32_t> references{1};
        Result (*call)(body*, Arguments...) noexcept = nullptr;
        void (*destroy)(body*) noexcept = nullptr;
    };

    block() noexcept = default;
    block(std::nullptr_t) noexcept {}

    template <class Callable>
    requires(!std::is_same_v<std::remove_cvref_t<Callable>, block> &&
             !std::is_same_v<std::remove_cvref_t<Callable>, std::nullptr_t> &&
             std::is_invocable_r_v<Result, std::decay_t<Callable>&,
                                   Arguments...>) explicit block(Callable&& callable)
        : body_(new holder<std::decay_t<Callable>>(std::forward<Callable>(callable))) {}

    block(const block& other) noexcept : body_(retain(other.body_)) {}
    block(block&& other) noexcept : body_(std::exchange(other.body_, nullptr)) {}
    block& operator=(block other) noexcept {
        std::swap(body_, other.body_);
        return *this;
    }
    ~block() { release(body_); }

    // False for a null block.
    explicit operator bool() const noexcept { return body_ != nullptr; }

    // Runs the callable. Calling a null block is a programming error.
    Result operator()(Arguments... arguments) const {
        PLR_ASSERT(body_, "a null block was called");
        return body_->call(body_, std::forward<Arguments>(arguments)...);
    }

    // A loan of the shared object, null for a null block; it lives as long as
    // some block holds it.
    [[nodiscard]] body* get() const noexcept { return body_; }
    // A new holder of a lent object.
    [[nodiscard]] static block from_raw(body* lent) noexcept {
        block result;
        result.body_ = retain(lent);
        return result;
    }

  private:
    template <class Callable>
    struct holder : body {
        template <class Source>
        explicit holder(Source&& source) : callable(std::forward<Source>(source)) {
            this->call = [](body* self, Arguments... arguments) noexcept -> Result {
                return static_cast<Result>(
                    static_cast<holder*>(self)->callable(std::forward<Arguments>(arguments)...));
            };
            this->destroy = [](body* self) noexcept { delete static_cast<holder*>(self); };
        }
        Callable callable;
    };

    static body* retain(body* shared) noexcept {
        if (shared)
            shared->references.fetch_add(1, std::memory_order_relaxed);
        return shared;
    }
    static void release(body* shared) noexcept {
        if (shared && shared->references.fetch_sub(1, std::memory_order_acq_rel) == 1)
            shared->destroy(shared);
    }

    body* body_ = nullptr;
};

}  // namespace dispatch
