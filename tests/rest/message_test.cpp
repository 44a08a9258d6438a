#include "plr/rest/message.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "plr/ipc/read.h"
#include "plr/ipc/values.h"
#include "plr/rest/auto_reply.h"
#include "plr/rest/value_coding.h"

namespace {

using plr::rest::asObject;
using plr::rest::asOperation;
using plr::rest::asString;
using plr::rest::Operation;

TEST(Operation, IsReadFromItsExactStringOnly) {
    const struct {
        vox::object value;
        int expected;
    } rows[] = {
        {vox::string("set"), 1},
        {vox::string("get"), 2},
        {vox::string("push"), 3},
        {vox::string("pop"), 4},
        {vox::string("notify"), 5},
        {vox::string("ping"), 6},
        {vox::string("GET"), 0},
        {vox::string("get "), 0},
        {vox::string(std::string_view()), 0},
        {vox::string("?"), 0},
        {vox::int64(1), 0},
        {nullptr, 0},
        {vox::dict::create(), 0},
        {vox::string(std::string_view("set\0", 4)), 0},
    };
    for (const auto& row : rows)
        EXPECT_EQ(static_cast<int>(asOperation(row.value)), row.expected) << row.value.to_string();
}

TEST(Operation, IsWrittenByItsNumber) {
    const char* const names[] = {"?", "set", "get", "push", "pop", "notify", "ping", "?"};
    for (int i = 0; i < 8; ++i)
        EXPECT_STREQ(asString(static_cast<Operation>(i)), names[i]);
    EXPECT_STREQ(asString(static_cast<Operation>(-1)), "?");
    EXPECT_EQ(asObject(Operation::kPing).text(), "ping");
    EXPECT_EQ(asObject(Operation::kNone), vox::object());
}

std::vector<std::string> keysOf(const vox::dict& message) {
    std::vector<std::string> keys;
    const char* key = nullptr;
    for (std::size_t i = 0; vox_dictionary_get_entry(message.get(), i, &key); ++i)
        keys.emplace_back(key);
    return keys;
}

TEST(RestMessage, AlwaysHasFourKeysInOrder) {
    const std::vector<std::string> keys{"o", "a", "r", "v"};
    const vox::dict empty = plr::rest::createRestMessage(nullptr, nullptr, nullptr, nullptr);
    EXPECT_EQ(keysOf(empty), keys);
    for (const std::string& key : keys)
        EXPECT_EQ(vox::object(empty[key.c_str()]), vox::object()) << key;
    const vox::dict notify =
        plr::rest::createNotify(vox::string("me"), vox::string("/a"), vox::int64(1));
    EXPECT_EQ(keysOf(notify), keys);
    EXPECT_EQ(notify.to_string(),
              "{\n\t\"o\": \"notify\",\n\t\"a\": \"me\",\n\t\"r\": \"/a\",\n\t\"v\": 1\n}");
    EXPECT_EQ(plr::rest::createPingMessage().to_string(), "{\n\t\"o\": \"ping\"\n}");
}

TEST(RestReply, NeedsARequestThatWasReceived) {
    for (const vox::dict& request : {vox::dict(), vox::dict::create()}) {
        EXPECT_FALSE(plr::rest::createReply(request));
        EXPECT_FALSE(plr::rest::createReplyWithValue(request, vox::int64(1)));
        EXPECT_EQ(plr::rest::createAutoReplyValue(request), nullptr);
    }
}

TEST(RestReply, CarriesAValueOrAnErrorsDescription) {
    const struct {
        const char* name;
        vox::object value;
        const char* key;
        vox::object stored;
    } rows[] = {
        {"value", vox::int64(1), "v", vox::int64(1)},
        {"null", nullptr, "v", nullptr},
        {"error", vox::error(7, "too late"), "e", vox::string("too late")},
        {"silent error", vox::error(7, nullptr), "e", nullptr},
    };
    for (const auto& row : rows) {
        const vox::dict reply = vox::dict::create();
        plr::rest::updateReplyValue(reply, row.value);
        EXPECT_EQ(keysOf(reply), std::vector<std::string>{row.key}) << row.name;
        EXPECT_EQ(vox::object(reply[row.key]), row.stored) << row.name;
    }
    const vox::dict failed = vox::dict::create();
    plr::rest::updateReplyValue(failed, vox::error(7, "too late"));
    EXPECT_EQ(plr::rest::getReplyValue(failed), vox::object());
    EXPECT_EQ(plr::rest::getReplyValue(nullptr), vox::object());
}

TEST(AutoReply, CallsItsActionOnceWithTheValue) {
    std::vector<vox::object> calls;
    const auto make = [&calls] {
        return plr::rest::createAutoReplyWithAction(
            [&calls](const vox::object& value) { calls.push_back(value); });
    };
    auto first = make();
    const std::weak_ptr<vox::object> watched = first;
    auto copy = first;
    *first = vox::int64(1);
    first.reset();
    EXPECT_TRUE(calls.empty());
    copy.reset();
    EXPECT_TRUE(watched.expired());
    make().reset();
    EXPECT_EQ(calls, (std::vector<vox::object>{vox::int64(1), nullptr}));
    plr::rest::createAutoReplyWithAction({}).reset();
}

TEST(AutoReply, InnerOnesFillTheOuterOnesDictionary) {
    vox::object answer;
    auto outer = plr::rest::createAutoReplyWithAction(
        [&answer](const vox::object& value) { answer = value; });
    *outer = vox::dict::create();
    auto first = plr::rest::createAutoReplyValueInsideOuterReply(outer, "first");
    auto second = plr::rest::createAutoReplyValueInsideOuterReply(outer, "second");
    *first = vox::int64(1);
    outer.reset();
    first.reset();
    EXPECT_EQ(answer, vox::object());
    second.reset();
    EXPECT_EQ(answer.to_string(), "{\n\t\"first\": 1,\n\t\"second\": null\n}");
}

TEST(AutoReply, InnerOnesStoreNothingWithoutADictionaryButLetTheOuterGo) {
    int calls = 0;
    auto outer = plr::rest::createAutoReplyWithAction([&calls](const vox::object& value) {
        ++calls;
        EXPECT_EQ(value, vox::int64(5));
    });
    *outer = vox::int64(5);
    auto inner = plr::rest::createAutoReplyValueInsideOuterReply(outer, "k");
    outer.reset();
    *inner = vox::int64(1);
    inner.reset();
    EXPECT_EQ(calls, 1);
    plr::rest::createAutoReplyValueInsideOuterReply(nullptr, "k").reset();
}

TEST(EnumString, IsANumberAndAName) {
    using plr::rest::detail::write_enum_string_value;
    EXPECT_EQ(write_enum_string_value(2LL, "kGranted").text(), "2:kGranted");
    EXPECT_EQ(write_enum_string_value(-2LL, std::string("kLost")).text(), "-2:kLost");
    EXPECT_EQ(write_enum_string_value(~0ULL, "kAll").text(), "18446744073709551615:kAll");
    EXPECT_EQ(write_enum_string_value(0ULL, std::string()).text(), "0:");
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
        {vox::string(std::string_view()), 99},
        {vox::string("99999999999999999999999:x"), 99},
        {vox::int64(7), 99},
        {nullptr, 99},
    };
    for (const auto& row : rows) {
        TypeParam out = 99;
        plr::rest::detail::read_enum_string_value(out, row.value);
        EXPECT_EQ(out, row.expected) << row.value.to_string();
    }
}

TEST(EnumString, IsReadByTheFamilyOfItsType) {
    const vox::object big = vox::string("4294967297:x");  // 2^32 + 1
    short narrow = 9;
    plr::rest::detail::read_enum_string_value(narrow, big);
    EXPECT_EQ(narrow, 9);  // out of the range of int
    unsigned int wide = 9;
    plr::rest::detail::read_enum_string_value(wide, big);
    EXPECT_EQ(wide, 1U);  // in the range of unsigned long, then cut
}

TEST(RawBinary, IsCutOrFilledWithZeros) {
    const std::vector<std::uint8_t> ten{1, 2, 3, 4, 5, 6, 7, 8, 9, 10};
    const struct {
        const char* name;
        vox::object value;
        std::array<std::uint8_t, 9> expected;  // the last byte is behind the buffer
    } rows[] = {
        {"3 bytes", vox::data(std::span(ten).first(3)), {1, 2, 3, 0, 0, 0, 0, 0, 77}},
        {"10 bytes", vox::data(ten), {1, 2, 3, 4, 5, 6, 7, 8, 77}},
        {"no bytes", vox::data({}), {0, 0, 0, 0, 0, 0, 0, 0, 77}},
        {"no data", vox::string("12345678"), {0, 0, 0, 0, 0, 0, 0, 0, 77}},
    };
    for (const auto& row : rows) {
        std::array<std::uint8_t, 9> buffer{};
        buffer.fill(77);
        plr::rest::detail::read_raw_binary_value(buffer.data(), 8, row.value);
        EXPECT_EQ(buffer, row.expected) << row.name;
    }
    plr::rest::detail::read_raw_binary_value(nullptr, 0, vox::data(ten));
}

}  // namespace
