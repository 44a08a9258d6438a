#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <deque>
#include <vector>

#include "dispatch/dispatch.h"
#include "support/descriptors.h"
#include "support/sanitized.h"
#include "support/waiting.h"

namespace {

using dispatch::queue;
using namespace plr::test;

unsigned workers() {
    unsigned count = 0;
    EXPECT_EQ(std::sscanf(dispatch::dump().c_str(), "dispatch: %u workers", &count), 1);
    return count;
}

TEST(Load, TenThousandQueuesKeepTheirOrder) {
    const int each = kSanitized ? 10 : 1'000;
    struct Line {
        queue on = queue::create("one of many");
        int next = 0;
        int faults = 0;
    };
    std::deque<Line> lines(10'000);
    for (int i = 0; i < each; ++i)
        for (Line& line : lines)
            line.on.async([&line, i] { line.faults += line.next++ != i; });
    for (Line& line : lines) {
        drain(line.on);
        ASSERT_EQ(line.next, each);
        ASSERT_EQ(line.faults, 0);
    }
}

// More than there may be workers: other queues go on meanwhile, one that was never
// seen before included as soon as one of the blocked ones ends.
TEST(Load, WorkThatBlocksHoldsUpNoOtherQueue) {
    constexpr unsigned kBlocks = 1'000;
    const Ends pipe;
    const auto other = queue::create("other");
    drain(other);
    Event served;
    other.async([&] { served.signal(); });
    ASSERT_TRUE(served.wait());
    std::atomic<unsigned> ended{0};
    std::vector<queue> blocked;
    for (unsigned i = 0; i < kBlocks; ++i)
        blocked.emplace_back(queue::create("blocked")).async([&] {
            char one;
            EXPECT_EQ(::read(pipe.out(), &one, 1), 1);
            ++ended;
        });
    do {
        other.async([&] { served.signal(); });
        ASSERT_TRUE(served.wait());
    } while (workers() < dispatch::kMaximumWorkers);
    for (int i = 0; i < 100; ++i) {
        other.async([&] { served.signal(); });
        ASSERT_TRUE(served.wait());
    }
    EXPECT_EQ(ended, 0u);
    pipe.put(std::string(kBlocks, 'x'));
    EXPECT_TRUE(eventually([&] { return ended == kBlocks; }));
    EXPECT_TRUE(eventually([] { return workers() < 16; }));
}

}  // namespace
