#include "plr/concurrency/shared_ref.h"

#include <gtest/gtest.h>

#include "plr/concurrency/qf_shared_ref.h"
#include "support/qf_balance.h"

namespace {

using plr::_Created;
using plr::qf::QfSharedRef;
using Text = QfSharedRef<plr::qf::String>;

// A string with the one reference of this test.
class SharedRefTest : public testing::Test {
  protected:
    ~SharedRefTest() override { qf_release(string_); }
    [[nodiscard]] long count() const { return qf_get_retain_count(string_); }

    QfStringRef string_ = qf_string_create("text");
};

TEST_F(SharedRefTest, RetainsRawReferencesAndAdoptsCreatedOnes) {
    {
        const Text retained(string_);
        EXPECT_EQ(retained.get(), string_);
        EXPECT_EQ(count(), 2);
        qf_retain(string_);
        const Text adopted{_Created<plr::qf::String>(string_)};
        EXPECT_EQ(count(), 3);
    }
    EXPECT_EQ(count(), 1);
    EXPECT_EQ(Text().get(), nullptr);
    EXPECT_EQ(Text(static_cast<QfStringRef>(nullptr)).get(), nullptr);
}

TEST_F(SharedRefTest, CopiesRetainAndMovesDoNot) {
    Text first(string_);
    Text copy(first);
    EXPECT_EQ(count(), 3);
    const Text moved(std::move(copy));
    EXPECT_EQ(count(), 3);
    EXPECT_FALSE(copy);  // NOLINT(bugprone-use-after-move): null afterwards
    first = moved;       // the same reference on both sides
    EXPECT_EQ(count(), 3);
    const Text& same = first;
    first = same;
    EXPECT_EQ(count(), 3);
    Text& alias = first;
    first = std::move(alias);
    EXPECT_EQ(count(), 3);
    EXPECT_EQ(first.get(), string_);
    first = Text();
    EXPECT_EQ(count(), 2);
}

TEST_F(SharedRefTest, AdoptsAnyCreatedValueWhenUntyped) {
    const QfSharedRef<const void> untyped{_Created<const void>(qf_retain(string_))};
    EXPECT_EQ(untyped.get(), string_);
    EXPECT_EQ(count(), 2);
}

TEST_F(SharedRefTest, DetachesWithoutReleasing) {
    Text text(string_);
    EXPECT_EQ(text.detach(), string_);
    EXPECT_FALSE(text);
    EXPECT_EQ(count(), 2);
    qf_release(string_);
}

}  // namespace
