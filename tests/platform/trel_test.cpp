#include "trel/trel.h"

#include <array>
#include <string>

#include "support/waiting.h"

namespace {

TEST(Trel, EqualPairsShareAHandleWhateverElseDiffers) {
    std::string subsystem = "test.pairs";
    std::string category = "radio";
    const trel_t handle = trel_create(subsystem.c_str(), category.c_str());
    subsystem = "other";  // the texts were copied
    category = "other";
    EXPECT_EQ(trel_create("test.pairs", "radio"), handle);
    EXPECT_STREQ(trel_get_subsystem(handle), "test.pairs");
    EXPECT_STREQ(trel_get_category(handle), "radio");
    EXPECT_NE(trel_create("test.pairs", "sms"), handle);
    EXPECT_NE(trel_create("radio", "test.pairs"), handle);
    EXPECT_EQ(trel_create(nullptr, nullptr), trel_create("", ""));
    EXPECT_EQ(trel_retain(nullptr), nullptr);
    EXPECT_STREQ(trel_get_category(nullptr), "");
}

TEST(Trel, LivesOnWhenReleasedMoreOftenThanRetained) {
    const trel_t handle = trel_create("test.count", "negative");
    EXPECT_EQ(trel_get_reference_count(handle), 1);
    EXPECT_EQ(trel_retain(handle), handle);
    for (int i = 0; i < 5; i++)
        trel_release(handle);
    EXPECT_EQ(trel_get_reference_count(handle), -3);
    EXPECT_STREQ(trel_get_category(handle), "negative");
    EXPECT_EQ(trel_create("test.count", "negative"), handle);
}

TEST(Trel, ThreadsAgreeOnOneHandle) {
    std::array<trel_t, 4> found{};
    plr::test::Threads(4, [&found](unsigned i) {
        for (int turn = 0; turn < 1000; turn++)
            found[i] = trel_create("test.threads", std::to_string(turn % 7).c_str());
    });
    for (const trel_t handle : found)
        EXPECT_EQ(handle, found[0]);
    EXPECT_EQ(trel_get_reference_count(found[0]), 4 * 143);  // turns 5, 12, … of each thread
}

}  // namespace
