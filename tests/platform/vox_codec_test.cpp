#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <limits>

#include "tests/platform/vox_values.h"

namespace {

using namespace vox_test;
using vox_wire::codec_limits;

int encode_error(vox_object_t value, const codec_limits& limits = {}) {
    vox_wire::encoded out;
    return vox_wire::encode(value, limits, out);
}

// Heads change their length at these numbers.
TEST(VoxCodec, IntegersOfAllLengthsComeBackAsTheType) {
    for (int shift = 0; shift < 64; shift++) {
        for (const std::uint64_t base : {std::uint64_t{1}, std::uint64_t{24}}) {
            for (const std::uint64_t offset :
                 {~std::uint64_t{0}, std::uint64_t{0}, std::uint64_t{1}}) {
                const std::uint64_t bits = (base << shift) + offset;
                for (const std::uint64_t pattern : {bits, ~bits}) {
                    const owned unsigned_one = own(vox_uint64_create(pattern));
                    const owned signed_one = number(static_cast<std::int64_t>(pattern));
                    const owned date = own(vox_date_create(static_cast<std::int64_t>(pattern)));
                    const owned real = own(vox_double_create(std::bit_cast<double>(pattern)));
                    const owned all =
                        array({unsigned_one.get(), signed_one.get(), date.get(), real.get()});
                    ASSERT_TRUE(vox_equal(decoded(encoding(all.get())).get(), all.get()))
                        << description(all.get());
                }
            }
        }
    }
}

TEST(VoxCodec, LengthsOfAllHeadsComeBack) {
    for (const std::size_t length :
         {0u, 1u, 7u, 8u, 15u, 16u, 17u, 23u, 24u, 255u, 256u, 65535u, 65536u}) {
        const owned string = text(std::string(length, 's'));
        const owned data = own(vox_data_create(std::string(length, '\xff').data(), length));
        owned list = own(vox_array_create());
        owned map = own(vox_dictionary_create());
        for (std::size_t i = 0; i < length; i++) {
            vox_array_append_value(list.get(), vox_null_create());
            vox_dictionary_set_value(map.get(), std::to_string(i).c_str(), vox_null_create());
        }
        const owned long_key = dictionary({{std::string(length, 'k').c_str(), string.get()}});
        for (vox_object_t value :
             {string.get(), data.get(), list.get(), map.get(), long_key.get()}) {
            const owned again = decoded(encoding(value));
            EXPECT_TRUE(vox_equal(again.get(), value)) << length << description(again.get());
        }
    }
}

TEST(VoxCodec, KeepsTheOrderOfEntries) {
    owned map = own(vox_dictionary_create());
    for (int i = 0; i < 100; i++)
        vox_dictionary_set_value(map.get(), std::to_string(i * 7919 % 100).c_str(),
                                 number(i).get());
    const owned again = decoded(encoding(map.get()));
    ASSERT_EQ(vox_dictionary_get_count(again.get()), 100u);
    for (std::size_t i = 0; i < 100; i++) {
        const char* key = nullptr;
        vox_object_t value = vox_dictionary_get_entry(again.get(), i, &key);
        EXPECT_EQ(vox_int64_get_value(value), static_cast<std::int64_t>(i));
        EXPECT_EQ(key, std::to_string(i * 7919 % 100));
    }
}

TEST(VoxCodec, AppendsToWhatIsThere) {
    vox_wire::encoded out;
    ASSERT_EQ(vox_wire::encode(text("a").get(), {}, out), 0);
    ASSERT_EQ(vox_wire::encode(text("b").get(), {}, out), 0);
    EXPECT_EQ(to_hex(out.bytes.view()), "61616162");
}

TEST(VoxCodec, DecodedContainersMayBeChanged) {
    const owned outer = decoded(
        encoding(dictionary({{"list", array({}).get()}, {"map", dictionary({}).get()}}).get()));
    vox_object_t list = vox_dictionary_get_value(outer.get(), "list");
    vox_object_t map = vox_dictionary_get_value(outer.get(), "map");
    for (int i = 0; i < 50; i++) {
        vox_array_append_value(list, number(i).get());
        vox_dictionary_set_value(map, std::to_string(i).c_str(), number(i).get());
        vox_dictionary_set_value(outer.get(), std::to_string(i).c_str(), number(i).get());
    }
    EXPECT_TRUE(vox_equal(decoded(encoding(outer.get())).get(), outer.get()));
}

// ---- What cannot be sent ---------------------------------------------------------

struct unsendable {
    const char* what;
    owned value;
    int error;
    codec_limits limits;
};

TEST(VoxCodec, WhatCannotBeSentLeavesTheOutputAsItWas) {
    const long before = open_descriptors();
    const owned fd = own(vox_fd_create(STDIN_FILENO));
    const owned bad = text("\xff");
    owned laughs = array({number(1).get()});
    for (int i = 0; i < 60; i++)
        laughs = array({laughs.get(), laughs.get(), laughs.get()});
    unsendable cases[] = {
        {"text", array({fd.get(), bad.get()}), EILSEQ, {}},
        {"key", array({fd.get(), dictionary({{"\xff", bad.get()}}).get()}), EILSEQ, {}},
        {"error description", own(vox_error_create(1, "\xff")), EILSEQ, {}},
        {"depth 65", nested(65), EMSGSIZE, {}},
        {"depth over the limit", nested(4), EMSGSIZE, {.depth = 3}},
        {"a long text", text(std::string(100, 'x')), EMSGSIZE, {.bytes = 101}},
        {"a long key", dictionary({{"kkkkkkkk", bad.get()}}), EMSGSIZE, {.bytes = 5}},
        {"long in sum",
         array({number(1 << 30).get(), number(1 << 30).get()}),
         EMSGSIZE,
         {.bytes = 10}},
        {"one value 3^60 times", std::move(laughs), EMSGSIZE, {}},
        {"descriptors over the limit", array({fd.get(), fd.get()}), EMSGSIZE, {.descriptors = 1}},
    };
    for (const unsendable& one : cases) {
        vox_wire::encoded out;
        ASSERT_EQ(vox_wire::encode(array({fd.get(), text("before").get()}).get(), {}, out), 0);
        const std::string bytes_before = to_hex(out.bytes.view());
        EXPECT_EQ(vox_wire::encode(one.value.get(), one.limits, out), one.error) << one.what;
        EXPECT_EQ(to_hex(out.bytes.view()), bytes_before) << one.what;
        ASSERT_EQ(out.descriptors.size(), 1u) << one.what;
        close(out.descriptors[0]);
    }
    EXPECT_EQ(open_descriptors(), before + 1);
}

TEST(VoxCodec, LimitsAreInclusive) {
    EXPECT_EQ(encode_error(nested(64).get()), 0);
    EXPECT_NE(decoded(encoding(nested(64).get())), nullptr);
    EXPECT_EQ(encode_error(text(std::string(100, 'x')).get(), {.bytes = 102}), 0);
    const bytes body = encoding(text(std::string(100, 'x')).get());
    EXPECT_EQ(refusal(body, {.bytes = 102}), "");
    EXPECT_NE(refusal(body, {.bytes = 101}), "");
    EXPECT_EQ(refusal(encoding(nested(3).get()), {.depth = 3}), "");
    EXPECT_NE(refusal(encoding(nested(3).get()), {.depth = 2}), "");
    EXPECT_EQ(encode_error(nested(65).get(), {.depth = 1000}), EMSGSIZE) << "64 is the most";
}

// ---- Descriptors ------------------------------------------------------------------

std::pair<dev_t, ino_t> file_of(int descriptor) {
    struct stat found {};
    EXPECT_EQ(fstat(descriptor, &found), 0);
    return {found.st_dev, found.st_ino};
}

TEST(VoxCodec, DescriptorsComeBackInTheirPlaces) {
    const long before = open_descriptors();
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const auto read_file = file_of(ends[0]);
    const owned sent = dictionary({{"zero", own(vox_fd_create(STDIN_FILENO)).get()},
                                   {"pipe", own(vox_fd_create(ends[0])).get()}});
    close(ends[0]);
    close(ends[1]);
    vox_wire::encoded out;
    ASSERT_EQ(vox_wire::encode(sent.get(), {}, out), 0);
    const char* why = nullptr;
    owned received = own(vox_wire::decode(out.bytes.view(), out.descriptors, {}, why));
    ASSERT_NE(received, nullptr) << why;
    const int copy = vox_fd_dup(vox_dictionary_get_value(received.get(), "pipe"));
    EXPECT_EQ(file_of(copy), read_file);
    close(copy);
    received.reset();
    EXPECT_EQ(open_descriptors(), before + 2) << "those of the value that was sent";
}

TEST(VoxCodec, OutOfDescriptorsIsAnErrorAndLeaksNone) {
    const owned fd = own(vox_fd_create(STDIN_FILENO));
    const owned value = array({fd.get(), fd.get(), fd.get()});
    std::vector<int> fillers;
    for (int filler; (filler = dup(STDIN_FILENO)) >= 0;)
        fillers.push_back(filler);
    close(fillers.back());
    fillers.pop_back();
    const int error = encode_error(value.get());
    const int again = dup(STDIN_FILENO);
    for (const int filler : fillers)
        close(filler);
    close(again);
    EXPECT_EQ(error, EMFILE);
    EXPECT_GE(again, 0) << "the one descriptor that was free is free again";
}

// ---- Size -------------------------------------------------------------------------

TEST(VoxCodec, AMillionKeysAreNoTrouble) {
    const owned map = own(vox_dictionary_create());
    for (int i = 0; i < 1'000'000; i++)
        vox_dictionary_set_value(map.get(), std::to_string(i).c_str(), vox_null_create());
    const owned again = decoded(encoding(map.get()));
    EXPECT_TRUE(vox_equal(again.get(), map.get()));
}

}  // namespace
