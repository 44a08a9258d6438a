#pragma once

#include <utility>

// SharedRef<T, Retain, Release> owns one reference of a counted platform
// object, or is null. T is what the reference points to; the functors count.
//
// Owner:   copies retain, destruction releases. A failure inside a release
//          ends the process.
// Threads: as a plain pointer; the counts are the platform's.
namespace plr {

// Marks a reference that its maker has just created: it carries one count,
// which is to be adopted and not retained again.
template <class T>
class _Created {
  public:
    explicit _Created(T* reference) noexcept : reference_(reference) {}
    [[nodiscard]] T* get() const noexcept { return reference_; }

  private:
    T* reference_;
};

template <class T, class Retain, class Release, class U = T>
class SharedRef {
  public:
    SharedRef() noexcept = default;
    // Retains `reference`; null is allowed.
    explicit SharedRef(T* reference) : reference_(retained(reference)) {}
    // Adopts it.
    explicit SharedRef(_Created<U> created) noexcept : reference_(created.get()) {}

    SharedRef(const SharedRef& other) : SharedRef(other.reference_) {}
    SharedRef(SharedRef&& other) noexcept : reference_(std::exchange(other.reference_, nullptr)) {}
    SharedRef& operator=(const SharedRef& other) {
        if (this == &other)
            return *this;
        // The new one first: releasing the old one may be what destroys it.
        T* old = std::exchange(reference_, retained(other.reference_));
        released(old);
        return *this;
    }
    SharedRef& operator=(SharedRef&& other) noexcept {
        if (this != &other)
            released(std::exchange(reference_, std::exchange(other.reference_, nullptr)));
        return *this;
    }
    ~SharedRef() { released(reference_); }

    // A loan; null allowed.
    [[nodiscard]] T* get() const noexcept { return reference_; }
    explicit operator bool() const noexcept { return reference_ != nullptr; }
    // Gives the reference to the caller, who releases it; null afterwards.
    [[nodiscard]] T* detach() noexcept { return std::exchange(reference_, nullptr); }

  private:
    static T* retained(T* reference) {
        if (reference)
            Retain()(reference);
        return reference;
    }
    static void released(T* reference) noexcept {
        if (reference)
            Release()(reference);
    }

    T* reference_ = nullptr;
};

}  // namespace plr
