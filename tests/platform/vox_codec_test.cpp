#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <unistd.h>

#include <cerrno>

#include "support/vox_values.h"

// What the codec refuses, both ways, and what that leaves behind.
namespace {

using namespace plr::test;
using vox_wire::codec_limits;

int encodeError(vox_object_t value, const codec_limits& limits) {
    vox_wire::encoded out;
    return vox_wire::encode(value, limits, out);
}

// ---- What cannot be sent ---------------------------------------------------------

TEST(VoxCodec, WhatCannotBeSentLeavesTheOutputAsItWas) {
    const Ref fd(vox_fd_create(STDIN_FILENO));
    const std::size_t before = openDescriptors();
    const Ref bad = text("\xff");
    const Ref large = number(1 << 30);
    Ref laughs = array({large});
    for (int i = 0; i < 60; i++)
        laughs = array({laughs, laughs, laughs});
    const struct {
        const char* what;
        Ref value;
        int error;
        codec_limits limits;
    } rows[] = {
        {"text", array({fd, bad}), EILSEQ, {}},
        {"key", array({fd, dictionary({{"\xff", bad}})}), EILSEQ, {}},
        {"error description", Ref(vox_error_create(1, "\xff")), EILSEQ, {}},
        {"depth 65", nested(65), EMSGSIZE, {}},
        {"depth 65 whatever the limit", nested(65), EMSGSIZE, {.depth = 1000}},
        {"depth over the limit", nested(4), EMSGSIZE, {.depth = 3}},
        {"a long text", text(std::string(100, 'x')), EMSGSIZE, {.bytes = 101}},
        {"a long key", dictionary({{"kkkkkkkk", bad}}), EMSGSIZE, {.bytes = 5}},
        {"long in sum", array({large, large}), EMSGSIZE, {.bytes = 10}},
        {"one value 3^60 times", laughs, EMSGSIZE, {}},
        {"descriptors over the limit", array({fd, fd}), EMSGSIZE, {.descriptors = 1}},
    };
    for (const auto& row : rows) {
        vox_wire::encoded out;
        ASSERT_EQ(vox_wire::encode(array({fd, text("before")}), {}, out), 0);
        const Bytes first(out.bytes.view().begin(), out.bytes.view().end());
        EXPECT_EQ(vox_wire::encode(row.value, row.limits, out), row.error) << row.what;
        EXPECT_EQ(Bytes(out.bytes.view().begin(), out.bytes.view().end()), first) << row.what;
        ASSERT_EQ(out.descriptors.size(), 1u) << row.what;
        close(out.descriptors[0]);
    }
    EXPECT_EQ(openDescriptors(), before);
}

TEST(VoxCodec, LimitsAreInclusive) {
    const Ref hundred = text(std::string(100, 'x'));
    const struct {
        Ref value;
        codec_limits enough;
        codec_limits few;
    } rows[] = {
        {nested(64), {}, {.depth = 63}},
        {nested(3), {.depth = 3}, {.depth = 2}},
        {hundred, {.bytes = 102}, {.bytes = 101}},
    };
    for (const auto& row : rows) {
        EXPECT_EQ(encodeError(row.value, row.enough), 0);
        EXPECT_EQ(encodeError(row.value, row.few), EMSGSIZE);
        EXPECT_EQ(decode(encoding(row.value), row.enough).second, "");
        EXPECT_NE(decode(encoding(row.value), row.few).second, "");
    }
}

// ---- What is refused when it comes ------------------------------------------------

const char* const kShort = "the body is shorter than its values declare";
const char* const kOverlong = "a number is not in its shortest form";
const char* const kSimple = "a simple value or a float of another width than 64 bits";
const char* const kSigned = "an integer does not fit into 64 bits with a sign";
const char* const kUnnamed = "a descriptor is named that did not come";
const char* const kDeep = "values are nested deeper than this end accepts";

struct Refused {
    const char* what;
    std::string hex;
    const char* why;
    std::size_t descriptors = 0;
};

std::string times(int count, std::string_view hex) {
    std::string all;
    for (int i = 0; i < count; ++i)
        all += hex;
    return all;
}

// Beside the blocks of docs/wire-protocol.md.
std::vector<Refused> refused() {
    const std::string longKey = "72" + times(18, "66") + "01";
    return {
        {"nothing", "", "the body is empty", 3},
        {"a byte after an array", "8000", "bytes follow the value"},
        {"overlong in 2 bytes", "1900ff", kOverlong},
        {"overlong in 4 bytes", "1a0000ffff", kOverlong},
        {"overlong in 8 bytes", "1b00000000ffffffff", kOverlong},
        {"overlong negative", "3817", kOverlong},
        {"overlong text length", "780161", kOverlong},
        {"overlong tag", "d90025500000000000000000000000000000000", kOverlong},
        {"int64 too small", "3b8000000000000000", kSigned},
        {"date too large", "da766f78741b8000000000000000", kSigned},
        {"head 28", "1c", "a head is malformed"},
        {"indefinite dictionary", "bfff", "a length is indefinite"},
        {"break", "ff", kSimple},
        {"half float", "f93c00", kSimple},
        {"simple 0", "e0", kSimple},
        {"text of 2^32-1", "7affffffff", kShort},
        {"text of 2^64-1", "7bffffffffffffffff61", kShort},
        {"data of 2^63", "5b8000000000000000", kShort},
        {"array of 2^63", "9b8000000000000000", kShort},
        {"dictionary of 2^63", "bb8000000000000000", kShort},
        {"dictionary with room for keys only", "a2616b6161", kShort},
        {"inner array promises its parent's bytes", "83820000", kShort},
        {"64 arrays that each promise all that is left",
         times(63, "9a00018000") + times(100'000, "00"), kShort},
        {"long key twice", "a2" + longKey + longKey, "a dictionary names a key twice"},
        {"empty key twice", "a260016002", "a dictionary names a key twice"},
        {"NUL inside a key", "a16361006201", "a dictionary key contains NUL"},
        {"key not UTF-8", "a161ff01", "text is not UTF-8"},
        {"tag without content", "d825", "the body ends inside the value"},
        {"negative uint64", "da766f787520", "a uint64 is not an unsigned integer"},
        {"date of text", "da766f78746161", "a date is not an integer"},
        {"UUID of text", "d8256161", "a UUID is not a byte string"},
        {"UUID of 15 bytes", "d8254f" + times(15, "00"), "a UUID has not 16 bytes"},
        {"UUID of 17 bytes", "d82551" + times(17, "00"), "a UUID has not 16 bytes"},
        {"error of a number", "da766f786503", "an error is not an array"},
        {"error of nothing", "da766f786580", "an error has not one or two parts"},
        {"error of three", "da766f78658303616100", "an error has not one or two parts"},
        {"error without code", "da766f7865816161", "an error's code is not an integer"},
        {"described by a number", "da766f7865820303", "an error's description is not a string"},
        {"described in bad UTF-8", "da766f7865820361ff", "text is not UTF-8"},
        {"65 arrays", times(65, "81") + "f6", kDeep},
        {"65 dictionaries", times(65, "a160") + "f6", kDeep},
        {"1,000,000 arrays", times(1'000'000, "81"), kDeep},
        {"1,000,000 tags", times(1'000'000, "c0"), "a tag is unknown"},
        {"endpoint that did not come", "da766f787000", kUnnamed},
        {"descriptor 2^64-1", "da766f78661bffffffffffffffff", kUnnamed, 1},
        {"descriptor past the end", "da766f786601", kUnnamed, 1},
        {"descriptor of text", "da766f78666161", "a descriptor's index is not a number", 1},
        {"unnamed descriptor", "f6", "a descriptor came that no value names", 1},
        {"last one unnamed", "81da766f786600", "a descriptor came that no value names", 2},
        {"named as two kinds", "83da766f786600da766f787000da766f786601",
         "a descriptor is named twice", 2},
        {"out of order", "82da766f786601da766f786600", "descriptors are not named in order", 2},
        {"trailing byte", "da766f78660000", "bytes follow the value", 1},
        {"bad text behind", "82da766f78660061ff", "text is not UTF-8", 1},
        {"as values of a key named twice", "a2616bda766f786600616bda766f786601",
         "a dictionary names a key twice", 2},
        {"more than accepted", "f6", "more descriptors than this end accepts", 65},
    };
}

TEST(VoxCodec, SaysWhyItRefusesAndClosesEveryDescriptor) {
    const std::size_t before = openDescriptors();
    for (const Refused& row : refused()) {
        std::vector<int> descriptors;
        while (descriptors.size() < row.descriptors)
            descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
        EXPECT_EQ(decode(fromHex(row.hex), {}, descriptors).second, row.why) << row.what;
        EXPECT_EQ(openDescriptors(), before) << row.what;
    }
}

TEST(VoxCodec, RefusesTextThatIsNotUtf8) {
    const char* const bad[] = {
        "80",       "bf",       "c080",     "c1bf",     "c2",     "c241",     "e08080",
        "e09fbf",   "eda080",   "edbfbf",   "e282",     "e28228", "e2a1e2",   "f0808080",
        "f08fbfbf", "f4908080", "f5808080", "f8888080", "ff",     "f09f9841", "c3a9c3",
    };
    const char* const good[] = {"00",     "7f",     "c280",     "dfbf",     "e0a080",
                                "ed9fbf", "ee8080", "f0908080", "f48fbfbf", "e282acc3a9f09f9880"};
    // Behind and before ASCII of lengths around the steps that ASCII is read in.
    for (const std::size_t before : {0u, 1u, 7u, 8u, 31u, 32u, 33u, 100u}) {
        for (const std::size_t behind : {0u, 1u, 7u, 8u, 40u}) {
            const auto isUtf8 = [&](const char* hex) {
                Bytes text = fromHex(hex);
                text.insert(text.begin(), before, 'x');
                text.insert(text.end(), behind, 'y');
                return vox_wire::is_utf8(text);
            };
            for (const char* hex : bad)
                EXPECT_FALSE(isUtf8(hex)) << hex << " after " << before;
            for (const char* hex : good)
                EXPECT_TRUE(isUtf8(hex)) << hex << " after " << before;
        }
    }
}

// Each of these makes as much memory of its bytes as the format allows. An
// allocator that replaces malloc (sanitizers) counts nothing here.
TEST(VoxCodec, MemoryIsAtMostAHundredTimesTheBytes) {
    const auto allocated = [] { return mallinfo2().uordblks + mallinfo2().hblkhd; };
    constexpr std::size_t size = 100'000;
    const auto array_of = [](std::uint8_t item) {
        Bytes body = {0x9a, 0, 1, 0x86, 0x9b};  // 99,995
        body.insert(body.end(), size - body.size(), item);
        return body;
    };
    for (const std::uint8_t item : Bytes{0x00, 0x60, 0x40, 0x80, 0xa0}) {
        const Bytes body = array_of(item);
        const std::size_t before = allocated();
        const Ref value = decode(body).first;
        ASSERT_TRUE(value);
        EXPECT_LT(allocated() - before, 100 * size) << std::hex << unsigned{item};
    }
    // More elements than memory shall be spent on, although the bytes would do.
    EXPECT_EQ(decode(array_of(0xa0), {.bytes = size}).second, "more values than this end accepts");
    EXPECT_EQ(encodeError(decode(array_of(0)).first, {.bytes = size}), EMSGSIZE);
}

}  // namespace
