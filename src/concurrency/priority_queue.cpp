#include "plr/concurrency/priority_queue.h"

#include <new>
#include <string_view>
#include <utility>

#include "plr/base/assert.h"

namespace plr::concurrency {
namespace {

// Null when there is no memory for the queue or its label.
dispatch::queue createOrNull(const std::string& name, std::string_view suffix,
                             const dispatch::queue& target) noexcept {
    try {
        return dispatch::queue::create(std::string(name).append(suffix), target);
    } catch (const std::bad_alloc&) {
        return {};
    }
}

// One suspension of a queue, which it keeps alive.
class Suspension {
  public:
    explicit Suspension(const dispatch::queue& queue) noexcept : queue_(queue) { queue_.suspend(); }
    Suspension(Suspension&&) noexcept = default;
    Suspension& operator=(Suspension&&) = delete;
    ~Suspension() {
        if (queue_)
            queue_.resume();
    }

  private:
    dispatch::queue queue_;  // null once moved from
};

// A highest block on its way. When it has run, it is released first, then the
// normal queue goes on.
struct HighestWork {
    Suspension normalQueue;
    dispatch::block<void()> block;

    void operator()() const { block(); }
};

}  // namespace

PriorityQueue::PriorityQueue(const std::string& name)
    // A target is fixed when its queue is created, so the work queue is made
    // first; what the caller sees of failures is as if it were made last.
    : work_(createOrNull(name, ".work", {})) {
    normal_ = createOrNull(name, ".normal", work_);
    PLR_ASSERT(normal_, "fNormalQueue");
    highest_ = createOrNull(name, ".highest", work_);
    PLR_ASSERT(highest_, "fHighestQueue");
    if (!work_)
        throw std::bad_alloc();
}

void PriorityQueue::addBlock(dispatch::block<void()> block, Priority priority) const {
    if (priority == Priority::Highest)
        addHighestPriorityBlock(std::move(block));
    else
        normal_.async(std::move(block));
}

void PriorityQueue::addHighestPriorityBlock(dispatch::block<void()> block) const {
    highest_.async(HighestWork{Suspension(normal_), std::move(block)});
}

void PriorityQueue::addBlock(const dispatch::group& group, dispatch::block<void()> block,
                             Priority priority) const {
    if (priority == Priority::Highest)
        addHighestPriorityBlock(group, std::move(block));
    else
        group.async(normal_, std::move(block));
}

void PriorityQueue::addHighestPriorityBlock(const dispatch::group& group,
                                            dispatch::block<void()> block) const {
    group.async(highest_, HighestWork{Suspension(normal_), std::move(block)});
}

void PriorityQueue::addBlockSync(const dispatch::block<void()>& block, Priority priority) const {
    if (priority == Priority::Highest)
        addHighestPriorityBlockSync(block);
    else
        normal_.sync(block);
}

void PriorityQueue::addHighestPriorityBlockSync(const dispatch::block<void()>& block) const {
    const Suspension normalQueue(normal_);
    highest_.sync(block);
}

void PriorityQueue::notifyOn(const dispatch::group& group, dispatch::block<void()> block,
                             Priority priority) const {
    if (priority != Priority::Highest) {
        group.notify(normal_, std::move(block));
        return;
    }
    // Handed on, not copied: the work queue is to release the block.
    group.notify(dispatch::queue::global(dispatch::priority::high),
                 dispatch::block<void()>([queue = *this, block = std::move(block)]() mutable {
                     queue.addHighestPriorityBlock(std::move(block));
                 }));
}

void PriorityQueue::suspend() {
    work_.suspend();
}
void PriorityQueue::resume() {
    work_.resume();
}

void PriorityQueue::assertSynchronized() const {
    work_.assert_current();
}

}  // namespace plr::concurrency
