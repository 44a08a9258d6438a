#include <gtest/gtest.h>

#include <cstdlib>
#include <memory>
#include <new>

#include "plr/concurrency/shared_synchronizable.h"
#include "support/waiting.h"

// This program's allocations fail on demand, once.
namespace {
thread_local bool failNext = false;
}  // namespace

void* operator new(std::size_t size) {
    if (std::exchange(failNext, false))
        throw std::bad_alloc();
    if (void* memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace {

class Thing : public plr::SharedSynchronizable<Thing> {
  public:
    explicit Thing(plr::test::Event& end) : SharedSynchronizable("thing"), end_(end) {}
    ~Thing() {
        EXPECT_TRUE(ownQueue_.queue().is_current());
        end_.signal();
    }

  private:
    plr::test::Event& end_;
};

TEST(SharedSynchronizable, IsDestroyedOnItsQueueWhenItCannotBeOwned) {
    plr::test::Event end;
    auto* thing = new Thing(end);
    const auto own = [thing] { return Thing::make_shared_ptr(thing); };
    failNext = true;
    EXPECT_THROW(static_cast<void>(own()), std::bad_alloc);
    EXPECT_TRUE(end.wait());
}

}  // namespace
