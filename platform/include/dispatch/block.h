#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "plr/base/assert.h"
#include "plr/base/export.h"

// A block is a copyable, nullable closure whose copies share one heap object.
//
// Owner:   whoever holds a copy; the callable is destroyed with the last one,
//          on the thread that drops it.
// Threads: copies may be taken, called and dropped on any threads at once; the
//          callable sees concurrent calls only if its callers make them.
// Cost:    one allocation when made from a callable, recycled memory for small
//          ones; one atomic count a copy.
//
// Construction from a callable is explicit, so that overloads taking
// std::function and overloads taking a block never collide on a lambda.
// An exception that leaves the callable ends the process.
namespace dispatch {

namespace detail {

// Recycled memory of kSmallBlock bytes, aligned to 16. Throws std::bad_alloc.
inline constexpr std::size_t kSmallBlock = 64;
[[nodiscard]] PLR_EXPORT void* allocate_small();
PLR_EXPORT void recycle_small(void* unused) noexcept;

struct from_store {
    static void* operator new(std::size_t) { return allocate_small(); }
    static void operator delete(void* memory) noexcept { recycle_small(memory); }
};
struct from_heap {};

}  // namespace detail

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
    static constexpr bool kSmall =
        alignof(Callable) <= 16 &&
        (sizeof(body) + 15) / 16 * 16 + sizeof(Callable) <= detail::kSmallBlock;

    template <class Callable>
    struct holder : body,
                    std::conditional_t<kSmall<Callable>, detail::from_store, detail::from_heap> {
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
        if (!shared)
            return;
        // The only holder has no rival: nothing to write.
        if (shared->references.load(std::memory_order_acquire) == 1 ||
            shared->references.fetch_sub(1, std::memory_order_acq_rel) == 1)
            shared->destroy(shared);
    }

    body* body_ = nullptr;
};

}  // namespace dispatch
