// Peers that break the protocol or die: each loses its own connection, with a
// reason, and nobody else is harmed.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;
using vox_link::frame_header;
using vox_link::frame_type;

constexpr const char* kName = "net.example.hostile";

class VoxHostilePeer : public ::testing::Test {
  protected:
    VoxHostilePeer() { EXPECT_TRUE(good.works()); }
    // A raw client; served() is the service's side of it.
    int connect() {
        ++number;
        return connectTo(directory.path() + "/" + kName);
    }
    End& served() { return service.client(number); }

    RuntimeDirectory directory;
    Reports reports;
    EchoService service{vox_connection_create_listener(kName, nullptr)};
    Client good{vox_connection_create(kName)};
    std::size_t number = 0;  // of raw clients, the good one not counted
};

Bytes changed(Bytes bytes, std::size_t offset, std::uint8_t value) {
    bytes[offset] = value;
    return bytes;
}

Bytes bytesOf(std::string_view text) {
    return {text.begin(), text.end()};
}

// A hello of these versions.
Bytes helloOf(std::int64_t lowest, std::int64_t highest) {
    return frame({.type = frame_type::hello}, dictionary({{"min", number(lowest)},
                                                          {"max", number(highest)},
                                                          {"bytes", number(1000)},
                                                          {"depth", number(10)},
                                                          {"fds", number(0)},
                                                          {"later", number(1)}}));
}

struct Attack {
    const char* name;
    Bytes bytes;
    std::size_t descriptors;
    const char* why;
};

// What is no frame, or one that says something wrong of itself.
std::vector<Attack> brokenFrames() {
    const Bytes plain = plainMessage(1);
    const Bytes one = {0xf6};
    Bytes garbage;
    for (unsigned i = 0; i < 4096; ++i)
        garbage.push_back(static_cast<std::uint8_t>(i * 2654435761u >> 13));
    return {
        {"garbage", join({plain, garbage}), 0, "does not begin with VOX1"},
        {"one wrong byte of the magic", bytesOf("VOY"), 0, "does not begin with VOX1"},
        {"type 0", changed(plain, 4, 0), 0, "unknown frame type 0"},
        {"type 10", changed(plain, 4, 10), 0, "unknown frame type 10"},
        {"flags of a message", changed(plain, 5, 1), 0, "unknown flags 1"},
        {"flags of a ping", frame({.type = frame_type::ping, .flags = 2}, one), 0, "flags 2"},
        {"reserved field", changed(plain, 13, 1), 0, "reserved field"},
        {"id of a message", changed(plain, 16, 1), 0, "unexpected id"},
        {"request without id", frame({.type = frame_type::request}, one), 0, "needs the id"},
        {"reply without id", frame({.type = frame_type::reply}, one), 0, "needs the id"},
        {"empty body", header({}), 0, "without body"},
        {"long body", header({.length = (16u << 20) + 1}), 0, "16777217 bytes is over the limit"},
        {"4 GiB", header({.length = 0xFFFFFFFF}), 0,
         "frame of 4294967295 bytes is over the limit of 16777216"},
        {"long ping", header({.type = frame_type::ping, .length = 1025}), 0, "limit of 1024"},
        {"many descriptors", frame({.descriptors = 65}, one), 0, "65 descriptors is over"},
        {"descriptors of a ping", frame({.type = frame_type::ping, .descriptors = 1}, one), 0,
         "over the limit of 0"},
        {"fewer descriptors than declared", frame({.descriptors = 2}, one), 1,
         "declares 2 descriptors but came with 1"},
        {"none of those declared", frame({.descriptors = 1}, one), 0, "but came with 0"},
        {"more descriptors than declared", frame({.descriptors = 1}, one), 2, "descriptor"},
        {"undeclared descriptors", plain, 2, "more descriptors"},
        {"200 descriptors", plain, 200, "more descriptors"},
        {"many, header under way", bytesOf("VO"), 65, "more descriptors"},
        {"descriptors that nothing names", frame({.descriptors = 2}, message(1)), 2, "names"},
    };
}

// Whole frames that are wrong, or come at the wrong time.
std::vector<Attack> wrongFrames() {
    const Ref null(vox_null_create());
    return {
        {"1,000,000 nested arrays", frame({}, Bytes(1000000, 0x81)), 0, "nested deeper"},
        {"no CBOR", frame({}, bytesOf("{\"n\": 1}")), 0, "ends inside"},
        {"no dictionary", frame({}, Bytes{0x01}), 0, "no dictionary"},
        {"bytes behind the value", frame({}, Bytes{0xa0, 0x00}), 0, "follow the value"},
        {"second hello", hello(), 0, "second hello"},
        {"ping with a body", frame({.type = frame_type::ping}, message(1)), 0, "ping"},
        {"cancel with a body", frame({.type = frame_type::cancel, .id = 1}, message(1)), 0,
         "cancel"},
        {"refused without error", frame({.type = frame_type::refused, .id = 1}, null), 0,
         "refused"},
        {"dropped without number", frame({.type = frame_type::dropped}, null), 0, "dropped"},
    };
}

// In place of the hello.
std::vector<Attack> firstFrames() {
    const Ref null(vox_null_create());
    return {
        {"HTTP", bytesOf("GET / HTTP/1.1\r\nHost: localhost\r\n\r\n"), 0, "begin with VOX1"},
        {"message", plainMessage(1), 0, "not a hello"},
        {"request with descriptor",
         frame({.type = frame_type::request, .descriptors = 1, .id = 1}, message(1)), 1,
         "not a hello"},
        {"ping", frame({.type = frame_type::ping}, null), 0, "not a hello"},
        {"null", frame({.type = frame_type::hello}, null), 0, "hello"},
        {"no limits", frame({.type = frame_type::hello}, message(1)), 0, "hello"},
    };
}

TEST_F(VoxHostilePeer, OfAnotherVersionIsTakenWhenItSpeaksThisOneAsWell) {
    struct Row {
        const char* name;
        std::int64_t lowest, highest;
        const char* why;  // it is refused; null when it is not
    };
    for (const Row& row :
         {Row{"newer, and this one", 1, 7, nullptr}, Row{"older, and this one", 0, 1, nullptr},
          Row{"newer only", 2, 7, "the peer speaks 2 to 7, this side 1 to 1"},
          Row{"older only", 0, 0, "speaks 0 to 0, this side"},
          Row{"an empty range", 7, 1, "speaks 7 to 1"}}) {
        SCOPED_TRACE(row.name);
        RawPeer peer(connect());
        peer.send(helloOf(row.lowest, row.highest));
        peer.send(frame({.type = frame_type::request, .id = 1}, message(5)));
        EXPECT_EQ(peer.readFrame().first.type, frame_type::hello);
        const auto [header, body] = peer.readFrame();
        EXPECT_EQ(header.type, row.why ? frame_type{0} : frame_type::reply);
        if (row.why)
            served().inbox.expectError(VOX_ERROR_CONNECTION_INVALID, row.why);
        else
            EXPECT_EQ(numberIn(body), 5);
    }
}

TEST_F(VoxHostilePeer, LosesItsConnectionWithAReasonAndNobodyElseDoes) {
    const std::size_t before = openDescriptors();
    const auto suffer = [&](const Attack& attack, const Bytes& first) {
        SCOPED_TRACE(attack.name);
        RawPeer peer(connect());
        peer.send(first);
        peer.send(attack.bytes, std::vector<int>(attack.descriptors, 0));
        served().inbox.expectError(VOX_ERROR_CONNECTION_INVALID, attack.why);
        static_cast<void>(peer.read());  // ends, because the connection is closed
        peer.close();
        EXPECT_EQ(openDescriptors(), before);
        EXPECT_TRUE(good.works());
    };
    for (const Attack& each : firstFrames())
        suffer(each, {});
    for (const auto& attacks : {brokenFrames(), wrongFrames()})
        for (const Attack& each : attacks)
            suffer(each, hello());
}

TEST_F(VoxHostilePeer, IsNamedInTheReportWhichItCannotFlood) {
    const std::string line = "vox: connection from pid " + std::to_string(::getpid()) + " (uid " +
                             std::to_string(::getuid()) + ") to '" + kName +
                             "' ended: frame does not begin with VOX1";
    constexpr std::size_t kPeers = 100;
    for (std::size_t i = 0; i < kPeers; ++i) {
        const RawPeer peer(connect());
        peer.send(Bytes{'x'});
        EXPECT_TRUE(served().inbox.waitForError());
    }
    EXPECT_LT(reports.count("vox: connection from"), kPeers);
    // Also while others have used up the lines of this second.
    EXPECT_TRUE(eventually([&] {
        const RawPeer peer(connect());
        peer.send(Bytes{'x'});
        EXPECT_TRUE(served().inbox.waitForError());
        return reports.count(line) > 0;
    }));
}

TEST_F(VoxHostilePeer, WhatAnswersNothingIsIgnoredAndWhatItDroppedIsCounted) {
    const Ref null(vox_null_create());
    const RawPeer peer(connect());
    served().request(message(3), served().inbox);
    peer.send(
        join({hello(), frame({.type = frame_type::reply, .id = 77}, message(1)),
              frame({.type = frame_type::cancel, .id = 78}, null),
              frame({.type = frame_type::dropped}, plr::test::number(5)),
              frame({.type = frame_type::dropped}, plr::test::number(2)),
              frame({.type = frame_type::ping, .flags = 1, .id = 5}, null), plainMessage(2)}));
    ASSERT_TRUE(served().inbox.wait(1));
    EXPECT_EQ(served().inbox.numbers(), Numbers{2});
    EXPECT_EQ(served().counts().peer_dropped, 7u);
    for (const frame_type each : {frame_type::hello, frame_type::request})
        EXPECT_EQ(peer.readFrame().first.type, each);
    const frame_header answer = peer.readFrame().first;
    EXPECT_EQ(answer.type, frame_type::ping);
    EXPECT_EQ(answer.id, 5u);
    EXPECT_EQ(answer.flags, 0);
}

// ---- Cut at every byte ----------------------------------------------------------------

TEST_F(VoxHostilePeer, AFrameCutAtAnyByteIsNeverDelivered) {
    const std::size_t before = hello().size();
    const Bytes first = frame({.descriptors = 1}, fromHex("a2 616e 01 6166 da766f786600"));
    const Bytes stream =
        join({hello(), first, frame({.type = frame_type::request, .id = 1}, message(2, 50))});
    const std::size_t descriptors = openDescriptors();
    for (std::size_t cut = 0; cut < stream.size(); ++cut) {
        SCOPED_TRACE(cut);
        RawPeer peer(connect());
        const std::span sent = std::span(stream).first(cut);
        peer.send(sent.first(std::min(cut, before)));
        // Byte by byte, which is a message like others.
        for (std::size_t i = before; i < cut; ++i)
            peer.send(sent.subspan(i, 1), std::vector<int>(i == before ? 1 : 0, 0));
        peer.close();
        EXPECT_EQ(served().inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
        const std::size_t second = before + first.size();
        EXPECT_EQ(served().inbox.numbers(), Numbers(cut >= second ? 1 : 0, 1));
        const bool boundary = cut == 0 || cut == before || cut == second;
        EXPECT_EQ(served().inbox.errorText().find("middle of a frame") == std::string::npos,
                  boundary);
        served().inbox.clear();
    }
    EXPECT_TRUE(eventually([&] { return openDescriptors() == descriptors; }));
}

}  // namespace
