#include <gtest/gtest.h>
#include <pthread.h>
#include <stdlib.h>
#include <time.h>

#include "plr/ipc.h"

namespace {

vox::dict dictOf(const char* key, const vox::object& value) {
    const vox::dict made = vox::dict::create();
    made[key] = value;
    return made;
}

vox::object nested() {
    const vox::array list = vox::array_creator()("x");
    list.append(dictOf("b", vox::boolean(true)));
    list.append(vox::array::create());
    const vox::dict root = dictOf("a", list);
    root["e"] = vox::dict::create();
    return root;
}

TEST(ToString, RendersEveryType) {
    const std::uint8_t bytes[] = {0x01, 0xA2, 0xFF};
    const std::uint8_t uuid[16] = {0x00, 0x11, 0x22, 0x33, 0x44, 0x55, 0x66, 0x77,
                                   0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF};
    const struct {
        const char* name;
        vox::object value;
        const char* expected;
    } rows[] = {
        {"empty dictionary", vox::dict::create(), "{}"},
        {"empty array", vox::array::create(), "[]"},
        {"nested", nested(),
         "{\n\t\"a\": [\n\t\t0: \"x\",\n\t\t1: {\n\t\t\t\"b\": true\n\t\t},\n\t\t2: []\n\t],\n"
         "\t\"e\": {}\n}"},
        {"string", vox::string("a \"quote\""), "\"a \"quote\"\""},
        {"int64", vox::int64(-7), "-7"},
        {"uint64", vox::uint64(5), "5u"},
        {"double", vox::real(0.5), "0.500000"},
        {"false", vox::boolean(false), "false"},
        {"null", vox::object(), "null"},
        {"no data", vox::data({}), "[0 bytes]"},
        {"data", vox::data(bytes), "[3 bytes] 01 a2 ff"},
        {"uuid", vox::uuid(uuid), "00112233-4455-6677-8899-aabbccddeeff"},
        {"error", vox::error(1, "out of range"), "VOX_ERROR(out of range)"},
        {"silent error", vox::error(1, nullptr), "VOX_ERROR()"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(row.value.to_string(), row.expected) << row.name;
    EXPECT_EQ(vox::string(std::string_view("a\0b", 3)).to_string(), std::string("\"a\0b\"", 5));
    EXPECT_FALSE(vox::object::adopt(vox_fd_create(0)).to_string().empty());
}

// Sets TZ for one test.
class DateToString : public testing::Test {
  protected:
    static void useZone(const char* zone) {
        ::setenv("TZ", zone, 1);
        ::tzset();
    }
    static std::string render(long long nanoseconds) {
        return vox::date(std::chrono::nanoseconds(nanoseconds)).to_string();
    }
    ~DateToString() override {
        ::unsetenv("TZ");
        ::tzset();
    }
};

TEST_F(DateToString, IsLocalTimeInWholeSeconds) {
    useZone("UTC0");
    EXPECT_EQ(render(0), "1970-01-01 00:00:00 UTC");
    EXPECT_EQ(render(1'700'000'000'999'999'999), "2023-11-14 22:13:20 UTC");
    EXPECT_EQ(render(-1), "1970-01-01 00:00:00 UTC");  // towards zero
    useZone("ABC-2");
    EXPECT_EQ(render(0), "1970-01-01 02:00:00 ABC");
    useZone("<LONGZONENAME>0");
    EXPECT_EQ(render(0), "1970-01-01 00:00:00 LONGZONEN");  // 29 characters at most
}

// Users may build values deeper than any that a message can carry. On a stack
// far too small for a call per level:
TEST(ToString, NeedsNoStackForDepth) {
    constexpr std::size_t kDepth = 3000;
    struct Call {
        vox::object value = vox::array::create();
        std::size_t length = 0;
    } call;
    for (std::size_t i = 1; i < kDepth; ++i) {
        const vox::array outer = vox::array::create();
        outer.append(call.value);
        call.value = outer;
    }
    const auto describe = [](void* context) -> void* {
        auto* described = static_cast<Call*>(context);
        described->length = described->value.to_string().size();
        return nullptr;
    };
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    ASSERT_EQ(pthread_attr_setstacksize(&attributes, 128U * 1024), 0);
    pthread_t thread{};
    ASSERT_EQ(pthread_create(&thread, &attributes, describe, &call), 0);
    pthread_join(thread, nullptr);
    pthread_attr_destroy(&attributes);
    // Twice the tabs of every level, and "[", "\n", "0: ", "\n", "]" around it.
    EXPECT_EQ(call.length, kDepth * (kDepth - 1) - (kDepth - 1) + 7U * (kDepth - 1) + 2);
}

}  // namespace
