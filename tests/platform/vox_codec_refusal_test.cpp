#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <unistd.h>

#include "tests/platform/vox_values.h"

namespace {

using namespace vox_test;

struct refused {
    const char* what;
    std::string hex;
    const char* why;
};

const char* const kShort = "the body is shorter than its values declare";
const char* const kEnds = "the body ends inside the value";
const char* const kOverlong = "a number is not in its shortest form";

TEST(VoxCodecRefusal, SaysWhy) {
    const refused cases[] = {
        {"nothing", "", "the body is empty"},
        {"a byte more", "0000", "bytes follow the value"},
        {"a byte after an array", "8000", "bytes follow the value"},
        {"overlong in 1 byte", "1817", kOverlong},
        {"overlong in 2 bytes", "1900ff", kOverlong},
        {"overlong in 4 bytes", "1a0000ffff", kOverlong},
        {"overlong in 8 bytes", "1b00000000ffffffff", kOverlong},
        {"overlong negative", "3817", kOverlong},
        {"overlong text length", "780161", kOverlong},
        {"overlong data length", "580161", kOverlong},
        {"overlong count", "980100", kOverlong},
        {"overlong tag", "d90025500000000000000000000000000000000", kOverlong},
        {"int64 too large", "1b8000000000000000",
         "an integer does not fit into 64 bits with a sign"},
        {"int64 too small", "3b8000000000000000",
         "an integer does not fit into 64 bits with a sign"},
        {"date too large", "da766f78741b8000000000000000",
         "an integer does not fit into 64 bits with a sign"},
        {"head 28", "1c", "a head is malformed"},
        {"head 30", "5e", "a head is malformed"},
        {"indefinite array", "9f00ff", "a length is indefinite"},
        {"indefinite dictionary", "bfff", "a length is indefinite"},
        {"indefinite text", "7f6161ff", "a length is indefinite"},
        {"break", "ff", "a simple value or a float of another width than 64 bits"},
        {"half float", "f93c00", "a simple value or a float of another width than 64 bits"},
        {"single float", "fa3fc00000", "a simple value or a float of another width than 64 bits"},
        {"undefined", "f7", "a simple value or a float of another width than 64 bits"},
        {"simple 0", "e0", "a simple value or a float of another width than 64 bits"},
        {"simple 255", "f8ff", "a simple value or a float of another width than 64 bits"},
        {"half a double", "fb3ff80000", kShort},
        {"9a0fffffff", "9a0fffffff", kShort},
        {"text of 2^31", "7a80000000", kShort},
        {"text of 2^32-1", "7affffffff", kShort},
        {"text of 2^63", "7b8000000000000000", kShort},
        {"text of 2^64-1", "7bffffffffffffffff61", kShort},
        {"data of 2^31", "5a80000000", kShort},
        {"data of 2^63", "5b8000000000000000", kShort},
        {"array of 2^31", "9a80000000", kShort},
        {"array of 2^63", "9b8000000000000000", kShort},
        {"dictionary of 2^31", "ba80000000", kShort},
        {"dictionary of 2^32-1", "baffffffff", kShort},
        {"dictionary of 2^63", "bb8000000000000000", kShort},
        {"dictionary with room for keys only", "a2616b6161", kShort},
        {"inner array promises its parent's bytes", "83820000", kShort},
        {"key twice", "a2616b01616b02", "a dictionary names a key twice"},
        {"long key twice",
         "a2"
         "72" +
             std::string(36, '6') +
             "01"
             "72" +
             std::string(36, '6') + "02",
         "a dictionary names a key twice"},
        {"empty key twice", "a260016002", "a dictionary names a key twice"},
        {"NUL key", "a1610001", "a dictionary key contains NUL"},
        {"NUL inside a key",
         "a163610062"
         "01",
         "a dictionary key contains NUL"},
        {"number as key", "a10102", "a dictionary key is not a string"},
        {"data as key", "a1416b02", "a dictionary key is not a string"},
        {"key not UTF-8", "a161ff01", "text is not UTF-8"},
        {"text not UTF-8", "61ff", "text is not UTF-8"},
        {"unknown tag", "c000", "a tag is unknown"},
        {"tag without content", "d825", kEnds},
        {"uint64 in uint64", "da766f7875da766f787500", "a uint64 is not an unsigned integer"},
        {"negative uint64", "da766f787520", "a uint64 is not an unsigned integer"},
        {"date of text", "da766f78746161", "a date is not an integer"},
        {"UUID of text",
         "d82561"
         "61",
         "a UUID is not a byte string"},
        {"UUID of 15 bytes", "d8254f" + std::string(30, '0'), "a UUID has not 16 bytes"},
        {"UUID of 17 bytes", "d82551" + std::string(34, '0'), "a UUID has not 16 bytes"},
        {"UUID cut", "d82550" + std::string(30, '0'), kShort},
        {"error of a number", "da766f786503", "an error is not an array"},
        {"error of nothing", "da766f786580", "an error has not one or two parts"},
        {"error of three", "da766f78658303616100", "an error has not one or two parts"},
        {"error without code", "da766f7865816161", "an error's code is not an integer"},
        {"error described by a number", "da766f7865820303",
         "an error's description is not a string"},
        {"error described in bad UTF-8", "da766f7865820361ff", "text is not UTF-8"},
        {"descriptor that did not come", "da766f786600", "a descriptor is named that did not come"},
        {"endpoint that did not come", "da766f787000", "a descriptor is named that did not come"},
        {"descriptor 2^64-1", "da766f78661bffffffffffffffff",
         "a descriptor is named that did not come"},
        {"descriptor of text", "da766f78666161", "a descriptor's index is not a number"},
    };
    for (const refused& one : cases)
        EXPECT_EQ(refusal(from_hex(one.hex)), one.why) << one.what;
}

TEST(VoxCodecRefusal, OfDepth) {
    const char* const too_deep = "values are nested deeper than this end accepts";
    for (const std::uint8_t opening : bytes{0x81, 0xa1}) {
        bytes deep;
        for (int i = 0; i < 65; i++) {
            deep.push_back(opening);
            if (opening == 0xa1)
                deep.push_back(0x60);
        }
        deep.push_back(0xf6);
        EXPECT_EQ(refusal(deep), too_deep);
    }
    EXPECT_EQ(refusal(bytes(1'000'000, 0x81)), too_deep);
    EXPECT_EQ(refusal(bytes(1'000'000, 0xc0)), "a tag is unknown");
}

// A sample with every type in it.
bytes sample() {
    const std::uint8_t uuid[16] = {1, 2, 3};
    const owned inner = dictionary({{"o", text("set").get()},
                                    {"a key of more than 15 bytes", number(-100000).get()},
                                    {"u", own(vox_uint64_create(1ull << 40)).get()},
                                    {"d", own(vox_double_create(1.5)).get()},
                                    {"t", own(vox_date_create(1ll << 60)).get()},
                                    {"b", own(vox_data_create("\0\1", 2)).get()},
                                    {"i", own(vox_uuid_create(uuid)).get()},
                                    {"e", own(vox_error_create(1000, "why")).get()},
                                    {"n", vox_null_create()}});
    return encoding(array({inner.get(), vox_bool_create(1), text("é").get()}).get());
}

TEST(VoxCodecRefusal, OfEveryTruncation) {
    const bytes whole = sample();
    ASSERT_NE(decoded(whole), nullptr);
    for (std::size_t length = 0; length < whole.size(); length++)
        // A copy, so that a sanitizer sees a read past the end.
        EXPECT_NE(
            refusal(bytes(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length))), "")
            << length;
}

TEST(VoxCodecRefusal, OfTextThatIsNotUtf8) {
    const char* const bad[] = {
        "80",       "bf",       "c080",     "c1bf",     "c2",     "c241",     "e08080",
        "e09fbf",   "eda080",   "edbfbf",   "e282",     "e28228", "e2a1e2",   "f0808080",
        "f08fbfbf", "f4908080", "f5808080", "f8888080", "ff",     "fe",       "f09f98",
        "f09f9841", "c3a9c3",   "f0",       "e2",       "ef",     "c280c1bf",
    };
    const char* const good[] = {"",       "00",       "7f",       "c280",
                                "dfbf",   "e0a080",   "ed9fbf",   "ee8080",
                                "efbfbf", "f0908080", "f48fbfbf", "e282acc3a9f09f9880"};
    // Behind and before ASCII of lengths around the steps that ASCII is read in.
    for (const std::size_t before : {0u, 1u, 7u, 8u, 31u, 32u, 33u, 100u}) {
        for (const std::size_t behind : {0u, 1u, 7u, 8u, 40u}) {
            const auto framed = [&](const char* hex) {
                bytes text(before, 'x');
                for (const std::uint8_t byte : from_hex(hex))
                    text.push_back(byte);
                text.insert(text.end(), behind, 'y');
                return text;
            };
            for (const char* hex : bad)
                EXPECT_FALSE(vox_wire::is_utf8(framed(hex))) << hex << " after " << before;
            for (const char* hex : good)
                EXPECT_TRUE(vox_wire::is_utf8(framed(hex))) << hex << " after " << before;
        }
    }
}

// ---- Descriptors --------------------------------------------------------------------

struct descriptor_case {
    const char* what;
    std::size_t count;
    const char* hex;
    const char* why;  // null: accepted
};

TEST(VoxCodecRefusal, ClosesEveryDescriptor) {
    const descriptor_case cases[] = {
        {"one named", 1, "da766f786600", nullptr},
        {"two kinds", 2, "82da766f786600da766f787001", nullptr},
        {"unnamed", 1, "f6", "a descriptor came that no value names"},
        {"last unnamed", 2, "81da766f786600", "a descriptor came that no value names"},
        {"named twice", 1, "82da766f786600da766f786600", "a descriptor is named twice"},
        {"twice as two kinds", 2, "83da766f786600da766f787000da766f786601",
         "a descriptor is named twice"},
        {"out of order", 2, "82da766f786601da766f786600", "descriptors are not named in order"},
        {"past the end", 1, "da766f786601", "a descriptor is named that did not come"},
        {"trailing byte", 1, "da766f78660000", "bytes follow the value"},
        {"bad text behind", 1, "82da766f78660061ff", "text is not UTF-8"},
        {"as value of a key named twice", 2, "a2616bda766f786600616bda766f786601",
         "a dictionary names a key twice"},
        {"more than accepted", 65, "f6", "more descriptors than this end accepts"},
        {"empty body", 3, "", "the body is empty"},
    };
    const long before = open_descriptors();
    for (const descriptor_case& one : cases) {
        std::vector<int> descriptors;
        for (std::size_t i = 0; i < one.count; i++)
            descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
        const char* why = nullptr;
        owned value = own(vox_wire::decode(from_hex(one.hex), descriptors, {}, why));
        EXPECT_STREQ(why, one.why) << one.what;
        EXPECT_EQ(value == nullptr, one.why != nullptr) << one.what;
        value.reset();
        EXPECT_EQ(open_descriptors(), before) << one.what;
    }
}

// ---- Memory -------------------------------------------------------------------------

std::size_t allocated() {
    return mallinfo2().uordblks + mallinfo2().hblkhd;
}

// Each of these makes as much memory of its bytes as the format allows. An
// allocator that replaces malloc (sanitizers) counts nothing here.
TEST(VoxCodecRefusal, MemoryIsAtMostAHundredTimesTheBytes) {
    constexpr std::size_t size = 100'000;
    const auto array_of = [](std::uint8_t item) {
        bytes body = {0x9a, 0, 1, 0x86, 0x9b};  // 99,995
        body.insert(body.end(), size - body.size(), item);
        return body;
    };
    for (const std::uint8_t item : bytes{0x00, 0x60, 0x40, 0x80, 0xa0}) {
        const bytes body = array_of(item);
        const std::size_t before = allocated();
        const owned value = decoded(body);
        ASSERT_NE(value, nullptr);
        EXPECT_LT(allocated() - before, 100 * size) << std::hex << unsigned{item};
    }
    // More elements than memory shall be spent on, although the bytes would do.
    vox_wire::codec_limits few;
    few.bytes = size;
    const char* why = nullptr;
    EXPECT_EQ(vox_wire::decode(array_of(0xa0), {}, few, why), nullptr);
    EXPECT_STREQ(why, "more values than this end accepts");
    vox_wire::encoded out;
    EXPECT_EQ(vox_wire::encode(decoded(array_of(0)).get(), few, out), EMSGSIZE);
    // 64 arrays that each promise to be as long as what is left.
    bytes liars;
    for (int i = 0; i < 63; i++)
        for (const std::uint8_t byte : bytes{0x9a, 0, 1, 0x80, 0})
            liars.push_back(byte);
    liars.insert(liars.end(), size, 0);
    EXPECT_EQ(refusal(liars), kShort);
}

}  // namespace
