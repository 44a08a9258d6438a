#include "plr/ob/auto_pool.h"

#include <utility>

#include "ob/ob.h"

namespace plr::ob {

AutoPool::AutoPool() : pool_(ob_autorelease_pool_push()) {}

AutoPool::AutoPool(AutoPool&& other) noexcept : pool_(std::exchange(other.pool_, nullptr)) {}

AutoPool& AutoPool::operator=(AutoPool&& other) noexcept {
    if (this == &other)
        return *this;
    end();
    pool_ = std::exchange(other.pool_, nullptr);
    if (pool_ && !ob_autorelease_pool_is_open(pool_))
        pool_ = ob_autorelease_pool_push();
    return *this;
}

AutoPool::~AutoPool() {
    end();
}

void AutoPool::swap(AutoPool& other) noexcept {
    std::swap(pool_, other.pool_);
}

void AutoPool::end() noexcept {
    if (pool_)
        ob_autorelease_pool_pop(pool_);
}

}  // namespace plr::ob
