// Peers that break the protocol or die: each loses its own connection, with a
// reason, and nobody else is harmed.
#include <fcntl.h>
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using plr::test::descriptionOf;
using plr::test::EchoService;
using plr::test::message;
using plr::test::RawPeer;
using plr::test::Ref;
using plr::test::TestClient;
using vox_link::frame_type;
using Bytes = RawPeer::Bytes;

constexpr const char* kName = "net.example.hostile";

class VoxHostilePeer : public ::testing::Test {
  protected:
    void SetUp() override { serve(nullptr); }
    void TearDown() override {
        good.reset();
        service.reset();
    }
    void serve(const vox_limits_t* limits) {
        service.emplace(vox_connection_create_listener(kName, limits));
        good.emplace(vox_connection_create(kName));
        ASSERT_TRUE(good->works());
    }
    // A raw client, and the service's side of it. Their numbers count from 1,
    // behind the good client.
    RawPeer connect() { return RawPeer(plr::test::connectTo(directory.path() + "/" + kName)); }

    plr::test::RuntimeDirectory directory;
    plr::test::Reports reports;
    std::optional<EchoService> service;
    std::optional<TestClient> good;
};

Bytes header(const vox_link::frame_header& fields) {
    Bytes made(vox_link::kHeaderBytes);
    vox_link::write_header(fields, made.data());
    return made;
}

Bytes withBody(frame_type type, std::uint64_t id, Bytes body) {
    return RawPeer::join(
        {header({.type = type, .length = static_cast<std::uint32_t>(body.size()), .id = id}),
         body});
}

Bytes changed(Bytes bytes, std::size_t offset, std::uint8_t value) {
    bytes[offset] = value;
    return bytes;
}

Ref helloOf(std::int64_t lowest, std::int64_t highest) {
    Ref made(vox_dictionary_create());
    vox_dictionary_set_value(made, "min", Ref(vox_int64_create(lowest)));
    vox_dictionary_set_value(made, "max", Ref(vox_int64_create(highest)));
    vox_dictionary_set_value(made, "bytes", Ref(vox_int64_create(1000)));
    vox_dictionary_set_value(made, "depth", Ref(vox_int64_create(10)));
    vox_dictionary_set_value(made, "fds", Ref(vox_int64_create(0)));
    return made;
}

struct Attack {
    const char* name;
    Bytes bytes;
    std::size_t descriptors;
    const char* why;
};

std::vector<Attack> attacks() {
    const Bytes hello = RawPeer::hello();
    const Bytes plain = RawPeer::frame(frame_type::message, 0, message(1));
    const Ref null(vox_null_create());
    const auto after = [&hello](Bytes bytes) { return RawPeer::join({hello, std::move(bytes)}); };
    const auto text = [](std::string_view from) { return Bytes(from.begin(), from.end()); };
    Bytes garbage;
    for (unsigned i = 0; i < 4096; ++i)
        garbage.push_back(static_cast<std::uint8_t>(i * 2654435761u >> 13));
    return {
        {"garbage", garbage, 0, "does not begin with VOX1"},
        {"HTTP", text("GET / HTTP/1.1\r\nHost: localhost\r\n\r\n"), 0, "does not begin with VOX1"},
        {"garbage behind a message", after(RawPeer::join({plain, garbage})), 0, "VOX1"},
        {"4 GiB", after(header({.length = 0xFFFFFFFF})), 0,
         "frame of 4294967295 bytes is over the limit of 16777216"},
        {"1,000,000 nested arrays", after(withBody(frame_type::message, 0, Bytes(1000000, 0x81))),
         0, ""},
        {"no CBOR", after(withBody(frame_type::message, 0, text("{\"n\": 1}"))), 0, ""},
        {"no dictionary", after(withBody(frame_type::message, 0, {0x01})), 0, "no dictionary"},
        {"bytes behind the value", after(withBody(frame_type::message, 0, {0xa0, 0x00})), 0, ""},
        {"more descriptors than declared", after(plain), 2, "more descriptors"},
        {"fewer descriptors than declared",
         after(RawPeer::frame(frame_type::message, 0, message(1), 2)), 0, "declares 2 descriptors"},
        {"descriptors that nothing names", RawPeer::frame(frame_type::message, 0, message(1), 2), 2,
         ""},
        {"200 descriptors", after(plain), 200, "more descriptors"},
        {"second hello", after(hello), 0, "second hello"},
        {"message before hello", plain, 0, "not a hello"},
        {"request with descriptor before hello",
         RawPeer::frame(frame_type::request, 1, message(1), 1), 1, "not a hello"},
        {"ping before hello", RawPeer::frame(frame_type::ping, 0, null), 0, "not a hello"},
        {"version 99", RawPeer::frame(frame_type::hello, 0, helloOf(99, 100)), 0,
         "the peer speaks 99 to 100, this side 1 to 1"},
        {"version 0", RawPeer::frame(frame_type::hello, 0, helloOf(0, 0)), 0, "speaks 0 to 0"},
        {"hello that is null", RawPeer::frame(frame_type::hello, 0, null), 0, "hello"},
        {"hello without limits", RawPeer::frame(frame_type::hello, 0, message(1)), 0, "hello"},
        {"unknown type", after(changed(plain, 4, 99)), 0, "unknown frame type 99"},
        {"reserved field", after(changed(plain, 12, 1)), 0, "reserved field"},
        {"unknown flag", after(changed(plain, 5, 0x80)), 0, "unknown flags"},
        {"ping with a body", after(RawPeer::frame(frame_type::ping, 0, message(1))), 0, "ping"},
        {"cancel with a body", after(RawPeer::frame(frame_type::cancel, 1, message(1))), 0,
         "cancel"},
        {"dropped without number", after(RawPeer::frame(frame_type::dropped, 0, null)), 0,
         "dropped"},
    };
}

TEST_F(VoxHostilePeer, LosesItsConnectionWithAReasonAndNobodyElseDoes) {
    const std::size_t before = plr::test::openDescriptors();
    std::size_t number = 0;
    for (const Attack& attack : attacks()) {
        SCOPED_TRACE(attack.name);
        RawPeer peer = connect();
        const std::vector<int> descriptors(attack.descriptors, 0);
        peer.sendWith(attack.bytes, descriptors);
        EchoService::Client* client = service->client(++number);
        ASSERT_NE(client, nullptr);
        const Ref error = client->inbox.waitForError();
        EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
        EXPECT_NE(descriptionOf(error).find(attack.why), std::string::npos) << descriptionOf(error);
        EXPECT_FALSE(descriptionOf(error).empty());
        peer.read();  // ends, because the connection is closed
        peer.close();
        client->inbox.clear();
        client->inbox.add(error);
        EXPECT_EQ(plr::test::openDescriptors(), before);
        ASSERT_TRUE(good->works());
    }
    EXPECT_GT(number, 20u);
}

TEST_F(VoxHostilePeer, IsNamedInOneLineOfTheReport) {
    const std::string line = "vox: connection from pid " + std::to_string(::getpid()) + " (uid " +
                             std::to_string(::getuid()) + ") to '" + kName +
                             "' ended: frame of 4294967295 bytes is over the limit of 16777216";
    // Again, while other tests have used up the lines of this second.
    std::size_t number = 0;
    EXPECT_TRUE(plr::test::eventually([&] {
        RawPeer peer = connect();
        peer.send(RawPeer::join({RawPeer::hello(), header({.length = 0xFFFFFFFF})}));
        EXPECT_TRUE(service->client(++number)->inbox.waitForError());
        return reports.count(line) > 0;
    }));
    EXPECT_EQ(reports.count(line), 1u);
}

TEST_F(VoxHostilePeer, CannotFloodTheReport) {
    constexpr std::size_t kPeers = 100;
    for (std::size_t i = 1; i <= kPeers; ++i) {
        RawPeer peer = connect();
        peer.send(Bytes{'x'});
        EXPECT_TRUE(service->client(i)->inbox.waitForError());
    }
    EXPECT_LT(reports.count("vox: connection from"), kPeers);
}

TEST_F(VoxHostilePeer, ARefusedReplyIsNotTakenForOne) {
    RawPeer peer = connect();
    peer.send(RawPeer::join({RawPeer::hello(), RawPeer::frame(frame_type::reply, 77, message(1)),
                             RawPeer::frame(frame_type::cancel, 78, Ref(vox_null_create())),
                             RawPeer::frame(frame_type::ping, 5, Ref(vox_null_create()), 0, 1),
                             RawPeer::frame(frame_type::message, 0, message(2))}));
    EchoService::Client* client = service->client(1);
    ASSERT_TRUE(client->inbox.wait(1));
    EXPECT_EQ(client->inbox.numbers(), std::vector<std::int64_t>{2});
    EXPECT_EQ(peer.readFrame().first.type, frame_type::hello);
    const auto [answer, body] = peer.readFrame();
    EXPECT_EQ(answer.type, frame_type::ping);
    EXPECT_EQ(answer.id, 5u);
    EXPECT_EQ(answer.flags, 0);
}

// ---- Cut at every byte ----------------------------------------------------------------

TEST_F(VoxHostilePeer, AFrameCutAtAnyByteIsNeverDelivered) {
    const Bytes hello = RawPeer::hello();
    const Bytes first = RawPeer::frame(frame_type::message, 0, message(1));
    const Bytes stream =
        RawPeer::join({hello, first, RawPeer::frame(frame_type::request, 1, message(2, 50))});
    std::size_t number = 0;
    for (std::size_t cut = 0; cut < stream.size(); ++cut) {
        SCOPED_TRACE(cut);
        RawPeer peer = connect();
        peer.send(std::span(stream).first(cut));
        peer.close();
        EchoService::Client* client = service->client(++number);
        ASSERT_NE(client, nullptr);
        const Ref error = client->inbox.waitForError();
        EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INTERRUPTED);
        const std::size_t whole = cut >= hello.size() + first.size() ? 1 : 0;
        EXPECT_EQ(client->inbox.numbers().size(), whole);
        const bool boundary = cut == 0 || cut == hello.size() || cut == hello.size() + first.size();
        EXPECT_EQ(descriptionOf(error).find("middle of a frame") == std::string::npos, boundary);
    }
}

TEST_F(VoxHostilePeer, BytesOneByOneAreMessagesLikeOthers) {
    const std::size_t before = plr::test::openDescriptors();
    RawPeer peer = connect();
    Ref carrier = message(7);
    vox_dictionary_set_value(carrier, "fd", Ref(vox_fd_create(0)));
    const Bytes stream = RawPeer::frame(frame_type::message, 0, carrier, 1);
    carrier = Ref();
    peer.send(RawPeer::hello());
    for (std::size_t i = 0; i < stream.size(); ++i) {
        const std::vector<int> descriptors(i == 0 ? 1 : 0, 0);
        ASSERT_TRUE(peer.send(std::span(stream).subspan(i, 1), descriptors));
    }
    EchoService::Client* client = service->client(1);
    ASSERT_TRUE(client->inbox.wait(1));
    EXPECT_EQ(client->inbox.numbers(), std::vector<std::int64_t>{7});
    client->inbox.clear();
    peer.close();
    EXPECT_TRUE(client->inbox.waitForError());
    EXPECT_EQ(plr::test::openDescriptors(), before);
}

}  // namespace
