#include "platform/linux/vox/frame_reader.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using vox_link::frame_reader;
using Sizes = std::vector<std::size_t>;

Bytes body(std::size_t size) {
    return Bytes(size, 0x61);
}

// Feeds a reader as a socket would, in pieces of at most `step` bytes.
struct Feed {
    // Returns the error, or "" when all was taken.
    std::string give(const Bytes& bytes, std::size_t step) {
        for (std::size_t at = 0; at < bytes.size();) {
            const std::span<std::uint8_t> space = reader.space(scratch);
            const std::size_t count = std::min({step, space.size(), bytes.size() - at});
            std::copy_n(bytes.begin() + static_cast<std::ptrdiff_t>(at), count, space.begin());
            reader.arrived(count, {});
            at += count;
            if (!takeAll())
                return reader.error();
            reader.keep();
            std::fill(scratch.begin(), scratch.end(), std::uint8_t{0xEE});
        }
        return {};
    }
    bool takeAll() {
        vox_link::frame arrived;
        for (;;) {
            const frame_reader::outcome outcome = reader.next(arrived);
            if (outcome != frame_reader::outcome::frame)
                return outcome == frame_reader::outcome::more;
            EXPECT_TRUE(std::ranges::equal(arrived.body, body(arrived.body.size())));
            sizes.push_back(arrived.body.size());
        }
    }

    frame_reader reader{vox_link::frame_limits{}};
    Bytes scratch = Bytes(16384);
    Sizes sizes;  // of the bodies that came
};

TEST(FrameReader, FramesAreTheSameHoweverTheBytesAreCut) {
    const Sizes sizes = {1, 5000, 3, 20000, 100, 70000, 1};
    Bytes stream;
    for (const std::size_t size : sizes)
        stream = join({stream, frame({}, body(size))});
    for (const std::size_t step :
         Sizes{1, 2, 7, 23, 24, 25, 100, 4097, 16383, 16384, stream.size()}) {
        Feed feed;
        EXPECT_EQ(feed.give(stream, step), "") << "step " << step;
        EXPECT_EQ(feed.sizes, sizes) << "step " << step;
        EXPECT_FALSE(feed.reader.in_frame());
        EXPECT_EQ(feed.reader.held(), 0u) << "memory left, step " << step;
    }
}

TEST(FrameReader, MemoryFollowsTheBytesThatArriveNotTheLengthDeclared) {
    Feed feed;
    EXPECT_EQ(feed.give(join({header({.length = 16u << 20}), body(4096)}), 100), "");
    EXPECT_LE(feed.reader.held(), 64u << 10);
    EXPECT_EQ(feed.give(body(20000), 1), "");
    EXPECT_LE(feed.reader.held(), 64u << 10);
    EXPECT_EQ(feed.give(body(1u << 20), 16384), "");
    EXPECT_LE(feed.reader.held(), 3u << 20);
    EXPECT_TRUE(feed.reader.in_frame());
}

TEST(FrameReader, IsBrokenForGoodAfterAnError) {
    Feed feed;
    EXPECT_NE(feed.give({'x'}, 1), "");
    EXPECT_FALSE(feed.takeAll());
    EXPECT_TRUE(feed.reader.has_next());
}

}  // namespace
