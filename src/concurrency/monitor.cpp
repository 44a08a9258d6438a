#include "plr/concurrency/monitor.h"

#include <utility>

#include "plr/base/assert.h"

namespace plr::concurrency {
namespace {

const Monitor& checked(const Monitor* parent) noexcept {
    PLR_ASSERT(parent, "a monitor's parent is null");
    return *parent;
}

}  // namespace

Monitor::Monitor(const std::string& name) : queue_(name) {}
Monitor::Monitor(Monitor* parent, const std::string&)
    : queue_(checked(parent).queue_), group_(parent->group_) {}
Monitor::~Monitor() = default;

void Monitor::executeBlock(dispatch::block<void()> block, Priority priority) const {
    executeBlock(group_, std::move(block), priority);
}
void Monitor::executeBlock(dispatch::block<void()> block, Priority priority) {
    std::as_const(*this).executeBlock(std::move(block), priority);
}

void Monitor::executeBlock(const dispatch::group& group, dispatch::block<void()> block,
                           Priority priority) const {
    queue_.addBlock(group, std::move(block), priority);
}
void Monitor::executeBlock(const dispatch::group& group, dispatch::block<void()> block,
                           Priority priority) {
    std::as_const(*this).executeBlock(group, std::move(block), priority);
}

void Monitor::executeBlockAndWait(dispatch::block<void()> block, Priority priority,
                                  dispatch::time timeout) const {
    if (timeout.is_forever()) {
        queue_.addBlockSync(block, priority);
        return;
    }
    const dispatch::group done;  // the waiting block holds it, too
    queue_.addBlock(done, std::move(block), priority);
    static_cast<void>(done.wait(timeout));
}
void Monitor::executeBlockAndWait(dispatch::block<void()> block, Priority priority,
                                  dispatch::time timeout) {
    std::as_const(*this).executeBlockAndWait(std::move(block), priority, timeout);
}

long Monitor::waitForCompletion(dispatch::time timeout) const {
    return group_.wait(timeout);
}
long Monitor::waitForCompletion(dispatch::time timeout) {
    return std::as_const(*this).waitForCompletion(timeout);
}

void Monitor::notifyOnCompletion(const dispatch::group& group, dispatch::block<void()> block,
                                 Priority priority) const {
    queue_.notifyOn(group, std::move(block), priority);
}
void Monitor::notifyOnCompletion(const dispatch::group& group, dispatch::block<void()> block,
                                 Priority priority) {
    std::as_const(*this).notifyOnCompletion(group, std::move(block), priority);
}

void Monitor::suspend() {
    queue_.suspend();
}
void Monitor::resume() {
    queue_.resume();
}

void Monitor::suspendAndExecute(const dispatch::block<void()>& block) {
    suspend();
    block();
    resume();
}

}  // namespace plr::concurrency
