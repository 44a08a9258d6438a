#include "plr/concurrency/shared_ref.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "plr/concurrency/qf_shared_ref.h"

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

TEST_F(SharedRefTest, ChecksTheTypeOfCreatedValues) {
    qf_retain(string_);
    const Text fits{_Created<const void>(string_)};
    EXPECT_EQ(fits.get(), string_);
    EXPECT_EQ(count(), 2);

    const QfNumberRef number = qf_number_create_int64(5);
    qf_retain(number);  // the created reference
    const Text doesNot{_Created<const void>(number)};
    EXPECT_EQ(doesNot.get(), nullptr);
    EXPECT_EQ(qf_get_retain_count(number), 1);

    const QfSharedRef<const void> untyped{_Created<const void>(number)};
    EXPECT_EQ(untyped.get(), number);
    EXPECT_FALSE(Text{_Created<const void>(nullptr)});
}

TEST(Qf, ValuesKeepTheirContentAndType) {
    const Text text{_Created<plr::qf::String>(qf_string_create_with_length("a\0b", 3))};
    EXPECT_EQ(std::string(qf_string_get_string_ptr(text.get()), qf_string_get_length(text.get())),
              std::string("a\0b", 3));
    const QfSharedRef<plr::qf::Number> number{
        _Created<plr::qf::Number>(qf_number_create_int64(-5))};
    EXPECT_EQ(qf_number_get_int64(number.get()), -5);
    EXPECT_EQ(qf_get_type_id(text.get()), qf_string_get_type_id());
    EXPECT_EQ(qf_get_type_id(number.get()), qf_number_get_type_id());
    EXPECT_NE(qf_string_get_type_id(), qf_number_get_type_id());
}

}  // namespace
