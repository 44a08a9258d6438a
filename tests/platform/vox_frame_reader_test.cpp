#include "platform/linux/vox/frame_reader.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "support/vox_raw_peer.h"

namespace {

using plr::test::RawPeer;
using vox_link::frame;
using vox_link::frame_header;
using vox_link::frame_reader;
using vox_link::frame_type;
using Bytes = std::vector<std::uint8_t>;

Bytes frameOf(const frame_header& header, std::size_t body) {
    Bytes made(vox_link::kHeaderBytes + body, 0x61);
    vox_link::write_header(header, made.data());
    return made;
}

Bytes messageOf(std::size_t body, std::uint16_t descriptors = 0) {
    return frameOf({.type = frame_type::message,
                    .descriptors = descriptors,
                    .length = static_cast<std::uint32_t>(body)},
                   body);
}

int anyDescriptor() {
    return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

// Feeds a reader as a socket would, in pieces of at most `step` bytes.
struct Feed {
    explicit Feed(vox_link::frame_limits limits = {}) : reader(limits) {}

    // Returns the error, or "" when all was taken.
    std::string give(const Bytes& bytes, std::size_t step, std::vector<int> descriptors = {}) {
        std::size_t at = 0;
        while (at < bytes.size()) {
            const std::span<std::uint8_t> space = reader.space(scratch);
            EXPECT_FALSE(space.empty());
            const std::size_t count = std::min({step, space.size(), bytes.size() - at});
            std::copy_n(bytes.begin() + static_cast<std::ptrdiff_t>(at), count, space.begin());
            reader.arrived(count, at == 0 ? descriptors : std::vector<int>());
            at += count;
            if (!takeAll())
                return reader.error();
            reader.keep();
            std::fill(scratch.begin(), scratch.end(), std::uint8_t{0xEE});
        }
        return {};
    }
    bool takeAll() {
        frame arrived;
        for (;;) {
            switch (reader.next(arrived)) {
                case frame_reader::outcome::more:
                    return true;
                case frame_reader::outcome::error:
                    return false;
                case frame_reader::outcome::frame:
                    bodies.push_back(arrived.body.size());
                    intact = intact && std::all_of(arrived.body.begin(), arrived.body.end(),
                                                   [](std::uint8_t byte) { return byte == 0x61; });
                    counts.push_back(arrived.descriptors.size());
                    for (const int descriptor : arrived.descriptors)
                        ::close(descriptor);
            }
        }
    }

    frame_reader reader;
    Bytes scratch = Bytes(16384);
    std::vector<std::size_t> bodies;
    std::vector<std::size_t> counts;  // descriptors of each frame
    bool intact = true;
};

TEST(FrameReader, FramesAreTheSameHoweverTheBytesAreCut) {
    const std::vector<std::size_t> sizes = {1, 5000, 3, 20000, 100, 70000, 1};
    Bytes stream;
    for (const std::size_t size : sizes) {
        const Bytes one = messageOf(size);
        stream.insert(stream.end(), one.begin(), one.end());
    }
    const std::vector<std::size_t> steps = {1, 2, 7, 23, 24, 25, 100, 4097, 16383, 16384, 1000000};
    for (const std::size_t step : steps) {
        Feed feed;
        EXPECT_EQ(feed.give(stream, step), "") << "step " << step;
        EXPECT_EQ(feed.bodies, sizes) << "step " << step;
        EXPECT_TRUE(feed.intact) << "step " << step;
        EXPECT_FALSE(feed.reader.in_frame());
        EXPECT_EQ(feed.reader.held(), 0u) << "memory left, step " << step;
    }
}

TEST(FrameReader, RefusesHeadersThatBreakTheGrammar) {
    const vox_link::frame_limits limits{.body_bytes = 1000, .descriptors = 3};
    const auto plain = [](std::size_t offset, std::uint8_t value) {
        Bytes bytes = messageOf(10);
        bytes[offset] = value;
        return bytes;
    };
    struct Row {
        const char* name;
        Bytes bytes;
        const char* why;
    };
    const auto text = [](std::string_view from) { return Bytes(from.begin(), from.end()); };
    const Row rows[] = {
        {"one wrong byte of the magic", {'V', 'O', 'Y'}, "does not begin with VOX1"},
        {"HTTP", text("GET / HTTP/1.1\r\n\r\n"), "does not begin with VOX1"},
        {"type 0", plain(4, 0), "unknown frame type 0"},
        {"type 8", plain(4, 8), "unknown frame type 8"},
        {"flags of a message", plain(5, 1), "unknown flags 1"},
        {"reserved field", plain(13, 1), "reserved field"},
        {"id of a message", plain(16, 1), "unexpected id"},
        {"request without id", frameOf({.type = frame_type::request, .length = 1}, 1),
         "needs the id"},
        {"reply without id", frameOf({.type = frame_type::reply, .length = 1}, 1), "needs the id"},
        {"empty body", frameOf({.type = frame_type::message}, 0), "without body"},
        {"long body", frameOf({.type = frame_type::message, .length = 1001}, 0),
         "frame of 1001 bytes is over the limit of 1000"},
        {"4 GiB", frameOf({.type = frame_type::message, .length = 0xFFFFFFFF}, 0),
         "frame of 4294967295 bytes is over the limit of 1000"},
        {"long hello", frameOf({.type = frame_type::hello, .length = 1025}, 0), "limit of 1024"},
        {"descriptors of a message", frameOf({.descriptors = 4, .length = 1}, 1),
         "4 descriptors is over the limit of 3"},
        {"descriptors of a ping",
         frameOf({.type = frame_type::ping, .descriptors = 1, .length = 1}, 1),
         "descriptors is over the limit of 0"},
        {"unknown flag of a ping", frameOf({.type = frame_type::ping, .flags = 2, .length = 1}, 1),
         "unknown flags 2"},
    };
    for (const Row& row : rows) {
        Feed feed(limits);
        const std::string why = feed.give(row.bytes, 7);
        EXPECT_NE(why.find(row.why), std::string::npos) << row.name << ": '" << why << "'";
        EXPECT_TRUE(feed.bodies.empty()) << row.name;
    }
}

TEST(FrameReader, GivesDescriptorsToTheFrameThatDeclaresThem) {
    const std::size_t before = plr::test::openDescriptors();
    const Bytes stream =
        RawPeer::join({messageOf(10), messageOf(10, 2), messageOf(10), messageOf(10, 1)});
    for (const std::size_t step : {std::size_t{1}, std::size_t{30}, stream.size()}) {
        Feed feed;
        // Those of both frames come with the first byte of the second, at the earliest.
        const Bytes first(stream.begin(), stream.begin() + 34);
        const Bytes rest(stream.begin() + 34, stream.end());
        EXPECT_EQ(feed.give(first, step), "");
        if (step == stream.size()) {
            EXPECT_EQ(feed.give(rest, step, {anyDescriptor(), anyDescriptor(), anyDescriptor()}),
                      "");
            EXPECT_EQ(feed.counts, (std::vector<std::size_t>{0, 2, 0, 1}));
        } else {
            const Bytes second(rest.begin(), rest.begin() + 34);
            EXPECT_EQ(feed.give(second, step, {anyDescriptor(), anyDescriptor()}), "");
            EXPECT_EQ(feed.counts, (std::vector<std::size_t>{0, 2})) << "step " << step;
        }
    }
    EXPECT_EQ(plr::test::openDescriptors(), before);
}

TEST(FrameReader, RefusesMoreOrFewerDescriptorsThanDeclaredAndClosesThem) {
    const std::size_t before = plr::test::openDescriptors();
    struct Row {
        const char* name;
        Bytes bytes;
        std::size_t descriptors;
        const char* why;
    };
    Bytes unfinished = messageOf(10, 1);
    unfinished.resize(30);
    const Row rows[] = {
        {"fewer", messageOf(10, 2), 1, "declares 2 descriptors but came with 1"},
        {"none", messageOf(10, 1), 0, "declares 1 descriptors but came with 0"},
        {"more", messageOf(10, 1), 2, "more descriptors arrived"},
        {"undeclared", messageOf(10), 1, "more descriptors arrived"},
        {"more, frame under way", unfinished, 2, "more descriptors arrived"},
        {"many, header under way", {'V', 'O'}, 65, "more descriptors arrived"},
    };
    for (const Row& row : rows) {
        Feed feed;
        std::vector<int> descriptors;
        for (std::size_t i = 0; i < row.descriptors; ++i)
            descriptors.push_back(anyDescriptor());
        const std::string why = feed.give(row.bytes, row.bytes.size(), descriptors);
        EXPECT_NE(why.find(row.why), std::string::npos) << row.name << ": '" << why << "'";
    }
    EXPECT_EQ(plr::test::openDescriptors(), before);
}

TEST(FrameReader, MemoryFollowsTheBytesThatArriveNotTheLengthDeclared) {
    Feed feed;
    Bytes start = frameOf({.type = frame_type::message, .length = 16u << 20}, 0);
    start.resize(start.size() + 4096, 0x61);
    EXPECT_EQ(feed.give(start, 100), "");
    EXPECT_LE(feed.reader.held(), 64u << 10);
    EXPECT_EQ(feed.give(Bytes(20000, 0x61), 1), "");
    EXPECT_LE(feed.reader.held(), 64u << 10);
    EXPECT_EQ(feed.give(Bytes(1u << 20, 0x61), 16384), "");
    EXPECT_LE(feed.reader.held(), 3u << 20);
    EXPECT_TRUE(feed.reader.in_frame());
}

TEST(FrameReader, IsBrokenForGoodAfterAnError) {
    Feed feed;
    EXPECT_NE(feed.give({'x'}, 1), "");
    frame arrived;
    EXPECT_EQ(feed.reader.next(arrived), frame_reader::outcome::error);
    EXPECT_TRUE(feed.reader.has_next());
}

}  // namespace
