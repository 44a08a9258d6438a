#include "plr/rest/message.h"

#include <gtest/gtest.h>

#include "plr/rest/auto_reply.h"
#include "plr/rest/value_coding.h"
#include "plr/test/fake_rest.h"

namespace {

using namespace plr::rest;
using plr::test::oneLine;

TEST(Operation, IsItsExactString) {
    const char* const names[] = {"set", "get", "push", "pop", "notify", "ping"};
    for (int i = 1; i <= 6; ++i) {
        const auto operation = static_cast<Operation>(i);
        EXPECT_EQ(asOperation(vox::string(std::string_view(names[i - 1]))), operation);
        EXPECT_STREQ(asString(operation), names[i - 1]);
        EXPECT_EQ(asObject(operation).text(), names[i - 1]);
    }
    for (const int none : {-1, 0, 7})
        EXPECT_STREQ(asString(static_cast<Operation>(none)), "?");
    EXPECT_EQ(asObject(Operation::kNone), vox::object());
    const vox::object odd[] = {
        vox::string("GET"), vox::string("get "),
        vox::string("?"),   vox::string(std::string_view("set\0", 4)),
        vox::int64(1),      nullptr,
    };
    for (const vox::object& value : odd)
        EXPECT_EQ(asOperation(value), Operation::kNone) << value.to_string();
}

TEST(RestMessage, AlwaysHasFourKeysInOrder) {
    EXPECT_EQ(oneLine(createRestMessage(nullptr, nullptr, nullptr, nullptr)),
              R"({"o": null,"a": null,"r": null,"v": null})");
    EXPECT_EQ(oneLine(createNotify(vox::string("me"), vox::string("/a"), vox::int64(1))),
              R"({"o": "notify","a": "me","r": "/a","v": 1})");
}

TEST(RestReply, NeedsARequestThatWasReceived) {
    for (const vox::dict& request : {vox::dict(), vox::dict::create()}) {
        EXPECT_FALSE(createReply(request));
        EXPECT_FALSE(createReplyWithValue(request, vox::int64(1)));
        EXPECT_EQ(createAutoReplyValue(request), nullptr);
    }
}

TEST(RestReply, CarriesAValueOrAnErrorsDescription) {
    const struct {
        vox::object value;
        const char* reply;
    } rows[] = {
        {vox::int64(1), R"({"v": 1})"},
        {nullptr, R"({"v": null})"},
        {vox::error(7, "too late"), R"({"e": "too late"})"},
        {vox::error(7, nullptr), R"({"e": null})"},
    };
    for (const auto& row : rows) {
        const vox::dict reply = vox::dict::create();
        updateReplyValue(reply, row.value);
        EXPECT_EQ(oneLine(reply), row.reply);
        EXPECT_EQ(getReplyValue(reply), row.reply[2] == 'v' ? row.value : vox::object());
    }
    EXPECT_EQ(getReplyValue(nullptr), vox::object());
}

TEST(AutoReply, CallsItsActionOnceWithTheValue) {
    std::vector<vox::object> calls;
    const auto make = [&calls] {
        return createAutoReplyWithAction(
            [&calls](const vox::object& value) { calls.push_back(value); });
    };
    auto first = make();
    auto copy = first;
    *first = vox::int64(1);
    first.reset();
    EXPECT_TRUE(calls.empty());
    copy.reset();
    make().reset();
    EXPECT_EQ(calls, (std::vector<vox::object>{vox::int64(1), nullptr}));
    createAutoReplyWithAction({}).reset();
}

TEST(AutoReply, InnerOnesFillTheOuterOnesDictionary) {
    // What is no dictionary is left as it is.
    for (const vox::object& initial : {vox::object(vox::dict::create()), vox::int64(5)}) {
        std::string answers;
        auto outer = createAutoReplyWithAction(
            [&answers](const vox::object& value) { answers += oneLine(value); });
        *outer = initial;
        auto first = createAutoReplyValueInsideOuterReply(outer, "first");
        auto second = createAutoReplyValueInsideOuterReply(outer, "second");
        *first = vox::int64(1);
        outer.reset();
        first.reset();
        EXPECT_EQ(answers, "");
        second.reset();
        EXPECT_EQ(answers, vox::dict(initial) ? R"({"first": 1,"second": null})" : "5");
    }
    createAutoReplyValueInsideOuterReply(nullptr, "k").reset();
}

// ---- Values in messages -------------------------------------------------------------

TEST(EnumString, IsANumberAndAName) {
    EXPECT_EQ(detail::write_enum_string_value(-2LL, std::string("kLost")).text(), "-2:kLost");
    EXPECT_EQ(detail::write_enum_string_value(~0ULL, std::string("kAll")).text(),
              "18446744073709551615:kAll");
}

template <class T>
class ReadEnumString : public testing::Test {};
using Readable = testing::Types<signed char, unsigned char, short, unsigned short, int,
                                unsigned int, long, unsigned long, long long, unsigned long long>;
TYPED_TEST_SUITE(ReadEnumString, Readable);

TYPED_TEST(ReadEnumString, TakesTheLeadingNumberOrLeavesTheTarget) {
    const struct {
        vox::object value;
        TypeParam expected;
    } rows[] = {
        {vox::string("7:kIdle"), 7},
        {vox::string(" +7"), 7},
        {vox::string("-1:kNone"), static_cast<TypeParam>(-1)},
        {vox::string("300:x"), static_cast<TypeParam>(300)},  // 44 in eight bits
        {vox::string("kIdle"), 99},
        {vox::string("99999999999999999999999:x"), 99},
        {vox::int64(7), 99},
    };
    for (const auto& row : rows) {
        TypeParam out = 99;
        detail::read_enum_string_value(out, row.value);
        EXPECT_EQ(out, row.expected) << row.value.to_string();
    }
}

TEST(EnumString, IsReadByTheFamilyOfItsType) {
    const vox::object big = vox::string("4294967297:x");  // 2^32 + 1
    short narrow = 9;
    detail::read_enum_string_value(narrow, big);
    EXPECT_EQ(narrow, 9);  // out of the range of int
    unsigned int wide = 9;
    detail::read_enum_string_value(wide, big);
    EXPECT_EQ(wide, 1U);  // in the range of unsigned long, then cut
}

TEST(RawBinary, IsCutOrFilledWithZeros) {
    const std::vector<std::uint8_t> ten{1, 2, 3, 4, 5, 6, 7, 8, 9, 10};
    const struct {
        vox::object value;
        std::array<std::uint8_t, 9> expected;  // the last byte is behind the buffer
    } rows[] = {
        {vox::data(std::span(ten).first(3)), {1, 2, 3, 0, 0, 0, 0, 0, 77}},
        {vox::data(ten), {1, 2, 3, 4, 5, 6, 7, 8, 77}},
        {vox::string("12345678"), {0, 0, 0, 0, 0, 0, 0, 0, 77}},
    };
    for (const auto& row : rows) {
        std::array<std::uint8_t, 9> buffer{};
        buffer.fill(77);
        detail::read_raw_binary_value(buffer.data(), 8, row.value);
        EXPECT_EQ(buffer, row.expected) << row.value.to_string();
    }
    detail::read_raw_binary_value(nullptr, 0, vox::data(ten));
}

}  // namespace
