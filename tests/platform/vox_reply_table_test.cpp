#include "platform/linux/vox/reply_table.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <map>
#include <random>
#include <vector>

namespace {

using vox_link::reply_table;
using vox_link::waiting_reply;

waiting_reply entry(std::uint64_t id) {
    waiting_reply made;
    made.id = id;
    return made;
}

TEST(ReplyTable, FindsEveryOutstandingRequestWhateverTheOrderOfReplies) {
    reply_table table;
    std::map<std::uint64_t, bool> outstanding;
    std::mt19937 random(1);
    std::uint64_t last = 0;
    for (int step = 0; step < 50000; ++step) {
        if (outstanding.size() < 300 && random() % 2 == 0) {
            table.insert(entry(++last));
            outstanding[last] = true;
        } else if (!outstanding.empty()) {
            auto chosen = outstanding.lower_bound(random() % (last + 1));
            if (chosen == outstanding.end())
                chosen = outstanding.begin();
            ASSERT_EQ(table.take(chosen->first).id, chosen->first) << "step " << step;
            ASSERT_EQ(table.take(chosen->first).id, 0u) << "taken twice, step " << step;
            outstanding.erase(chosen);
        }
        ASSERT_EQ(table.size(), outstanding.size());
    }
    std::vector<std::uint64_t> left;
    for (const waiting_reply& reply : table.take_all())
        left.push_back(reply.id);
    std::vector<std::uint64_t> expected;
    for (const auto& [id, present] : outstanding)
        expected.push_back(id);
    EXPECT_EQ(left, expected);
}

TEST(ReplyTable, UnknownIdsAreNotFound) {
    reply_table table;
    EXPECT_EQ(table.take(0).id, 0u);
    EXPECT_EQ(table.take(7).id, 0u);
    table.insert(entry(1));
    EXPECT_EQ(table.take(9).id, 0u);
    EXPECT_EQ(table.take(0).id, 0u);
    EXPECT_EQ(table.take(1).id, 1u);
}

}  // namespace
