#include "platform/linux/dispatch/latency.h"

#include <algorithm>
#include <cmath>
#include <new>

#include "platform/linux/dispatch/io_watch.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch {
namespace detail {
namespace {

struct stamp {
    latencies* into;
    item* work;
    std::int64_t submitted;  // monotonic nanoseconds
};
static_assert(sizeof(stamp) <= kInlineClosure);

const stamp& stamp_of(const item* work) noexcept {
    return *std::launder(
        reinterpret_cast<const stamp*>(static_cast<const closure_item*>(work)->storage));
}

// Counts the wait; returns the begin.
std::int64_t begin(const stamp& of) noexcept {
    const std::int64_t begun = time::now().nanoseconds();
    of.into->wait.add(begun - of.submitted);
    return begun;
}

void run_stamped(item* self) noexcept {
    const stamp& mine = stamp_of(self);
    const std::int64_t begun = begin(mine);
    mine.work->run(mine.work);
    recycle_item(static_cast<closure_item*>(mine.work));
    mine.into->run.add(time::now().nanoseconds() - begun);
}

void run_stamped_embedded(item* self) noexcept {
    const stamp& mine = stamp_of(self);
    const std::int64_t begun = begin(mine);
    auto* work = static_cast<embedded_item*>(mine.work);
    work->function(work);
    mine.into->run.add(time::now().nanoseconds() - begun);
}

item* wrap(latencies& into, item* work, void (*run)(item*) noexcept) noexcept {
    try {
        closure_item* made = allocate_item();
        ::new (static_cast<void*>(made->storage)) stamp{&into, work, time::now().nanoseconds()};
        made->run = run;
        return made;
    } catch (const std::bad_alloc&) {
        return work;
    }
}

}  // namespace

void counted_durations::add(std::int64_t nanoseconds) noexcept {
    const auto duration = static_cast<std::uint64_t>(std::max<std::int64_t>(nanoseconds, 0));
    counts_[histogram::bucket(duration)].fetch_add(1, std::memory_order_relaxed);
    std::int64_t longest = longest_.load(std::memory_order_relaxed);
    while (longest < nanoseconds &&
           !longest_.compare_exchange_weak(longest, nanoseconds, std::memory_order_relaxed)) {
    }
}

item* stamped(latencies& into, closure_item* work) noexcept {
    return wrap(into, work, &run_stamped);
}
item* stamped(latencies& into, embedded_item* work) noexcept {
    return wrap(into, work, &run_stamped_embedded);
}

std::int64_t submission_of(const item* work) noexcept {
    const bool is_stamped = work->run == &run_stamped || work->run == &run_stamped_embedded;
    return is_stamped ? stamp_of(work).submitted : 0;
}

void measured_sync::run(void* opaque) noexcept {
    const auto& self = *static_cast<measured_sync*>(opaque);
    const std::int64_t begun = time::now().nanoseconds();
    self.into.wait.add(begun - self.called);
    self.function(self.context);
    self.into.run.add(time::now().nanoseconds() - begun);
}

}  // namespace detail

class statistics_reader {
  public:
    static void read(detail::counted_durations& from, histogram& into, bool take) noexcept {
        for (std::size_t i = 0; i < histogram::kBuckets; ++i)
            into.count_ += into.counts_[i] = from.read(i, take);
        into.longest_ = from.read_longest(take);
    }
};

queue_statistics detail::read(latencies* from, bool take) noexcept {
    queue_statistics result;
    if (from) {
        statistics_reader::read(from->wait, result.wait, take);
        statistics_reader::read(from->run, result.run, take);
    }
    return result;
}

std::chrono::nanoseconds histogram::percentile(double percent) const noexcept {
    const double share = std::clamp(percent, 0.0, 100.0) / 100.0;
    const auto wanted = static_cast<std::uint64_t>(std::ceil(share * static_cast<double>(count_)));
    std::uint64_t seen = 0;
    for (std::size_t i = 0; i < kBuckets; ++i) {
        seen += counts_[i];
        if (seen > 0 && seen >= wanted) {
            const auto longest = static_cast<std::int64_t>(limit(i));
            return std::chrono::nanoseconds(i + 1 == kBuckets ? longest_
                                                              : std::min(longest, longest_));
        }
    }
    return std::chrono::nanoseconds(0);
}

void enable_statistics(const queue& of, bool on) {
    of.get()->enable_statistics(on);
}
queue_statistics statistics(const queue& of) {
    return detail::read(of.get()->statistics(), false);
}
queue_statistics take_statistics(const queue& of) {
    return detail::read(of.get()->statistics(), true);
}

}  // namespace dispatch
