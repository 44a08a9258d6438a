#pragma once

#include "plr/base/export.h"

namespace plr::ob {

// Owns an autorelease pool of the calling thread from construction to
// destruction: what is autoreleased in between is released then. Move-only.
//
// Threads: made, changed and destroyed on one thread.
// Order:   pools nest. The end of one ends those made after it, too, whoever
//          owns them; destroying such an owner later does nothing.
class PLR_EXPORT AutoPool {
  public:
    AutoPool();
    // `other` owns none afterwards.
    AutoPool(AutoPool&& other) noexcept;
    // Ends the pool held before. If that ends the one of `other` as well, which
    // is the younger then, a new one takes its place: `pool = AutoPool()`
    // releases what there is and goes on.
    AutoPool& operator=(AutoPool&& other) noexcept;
    ~AutoPool();

    void swap(AutoPool& other) noexcept;
    friend void swap(AutoPool& left, AutoPool& right) noexcept { left.swap(right); }

    // Whether it owns one.
    [[nodiscard]] explicit operator bool() const noexcept { return pool_ != nullptr; }

  private:
    void end() noexcept;

    void* pool_;  // owned; null for none
};

}  // namespace plr::ob
