// What passes a service, as its taps see it.
#include <fcntl.h>
#include <sys/stat.h>

#include "support/child.h"
#include "support/vox_raw_peer.h"
#include "support/vox_service.h"
#include "vox/tap.h"

namespace {

using namespace plr::test;
using vox_link::frame_type;

constexpr const char* kName = "net.example.tapped";

std::string stringAt(vox_object_t entry, const char* key) {
    const char* found = vox_string_get_string_ptr(vox_dictionary_get_value(entry, key));
    return found ? found : "";
}
std::uint64_t countAt(vox_object_t entry, const char* key) {
    return vox_uint64_get_value(vox_dictionary_get_value(entry, key));
}
// "in request 1 {"n": 5}": direction, kind, id and value, as far as they are there.
std::string summary(vox_object_t entry) {
    std::string made = stringAt(entry, "d");
    made += (made.empty() ? "" : " ") + stringAt(entry, "k");
    if (vox_dictionary_get_value(entry, "i"))
        made += " " + std::to_string(countAt(entry, "i"));
    const vox_object_t value = vox_dictionary_get_value(entry, "v");
    return value ? made + " " + description(value) : made;
}
std::vector<std::string> summaries(const Inbox& inbox) {
    std::vector<std::string> made;
    for (const Ref& event : inbox.all())
        made.push_back(summary(event));
    return made;
}

class VoxTap : public ::testing::Test {
  protected:
    // A tap that has its first event.
    void expectStart(Client& tap) {
        ASSERT_TRUE(tap.inbox.wait(1));
        ASSERT_EQ(summary(tap.inbox[0]), "start");
    }

    RuntimeDirectory directory;
    const std::string path = directory.path() + "/" + kName;
    const Bytes wish = frame({.type = frame_type::tap}, Bytes{0xf6});
    Reports reports;
    EchoService service{vox_connection_create_listener(kName, nullptr)};
};

TEST_F(VoxTap, SeesWhatPassesInOrder) {
    Client early(vox_connection_create(kName));
    ASSERT_TRUE(early.works());
    Client tap(vox_connection_create_tap(kName));
    expectStart(tap);
    Client second(vox_connection_create_tap(kName));
    expectStart(second);
    EXPECT_EQ(tap.send(message(1)), EINVAL);
    Inbox refused;
    tap.request(message(1), refused);
    EXPECT_EQ(refused.errorCode(), VOX_ERROR_MESSAGE_REFUSED);

    RawPeer client(connectTo(path));
    ASSERT_TRUE(client.send(hello()));
    ASSERT_TRUE(client.send(plainMessage(1)));
    ASSERT_TRUE(client.send(frame({.type = frame_type::request, .id = 7}, message(2))));
    ASSERT_TRUE(client.send(frame({.type = frame_type::cancel, .id = 7}, Bytes{0xf6})));
    ASSERT_TRUE(client.send(frame({.type = frame_type::dropped}, number(3))));
    const int null = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
    ASSERT_TRUE(client.send(frame({.type = frame_type::message, .descriptors = 1},
                                  fromHex("a1 61 64 da 76 6f 78 66 00")),
                            {null}));
    ::close(null);
    ASSERT_TRUE(client.send(plainMessage(4, 64u << 10)));
    for (const frame_type expected : {frame_type::hello, frame_type::reply})
        ASSERT_EQ(client.readFrame().first.type, expected);
    End& accepted = service.client(3);
    ASSERT_TRUE(accepted.inbox.wait(3));
    EXPECT_EQ(accepted.send(message(5)), 0);
    EXPECT_EQ(accepted.send(message(6, 20u << 20)), EMSGSIZE);
    EXPECT_EQ(service.client(1).send(message(6)), ENOBUFS) << "a tap gets no messages";
    client.close();
    EXPECT_EQ(accepted.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_TRUE(early.works());

    const std::vector<std::string> expected = {
        "start",
        "open",
        R"(in message {"n": 1})",
        R"(in request 7 {"n": 2})",
        R"(out reply 7 {"n": 2})",
        "in cancel 7 null",
        "in dropped 3",
        R"(in message {"d": null})",
        "in message",
        R"(out message {"n": 5})",
        R"(close <error 1: "the peer closed the connection">)",
        R"(in request 2 {"n": 42})",
        R"(out reply 2 {"n": 42})",
    };
    for (Client* watcher : {&tap, &second}) {
        ASSERT_TRUE(watcher->inbox.wait(expected.size()));
        EXPECT_EQ(summaries(watcher->inbox), expected);
        const Ref first = watcher->inbox.all()[2];
        EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(first, "p")), ::getpid());
        EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(first, "u")), ::getuid());
        EXPECT_EQ(countAt(first, "n"), encoding(message(1)).size());
        EXPECT_EQ(countAt(first, "c"), countAt(watcher->inbox[9], "c"));
        EXPECT_NE(countAt(first, "c"), countAt(watcher->inbox[11], "c"));
        EXPECT_EQ(countAt(watcher->inbox[7], "f"), 1u);
        EXPECT_GT(countAt(watcher->inbox[8], "n"), 64u << 10);
    }
}

// Everybody else gets everything, little waits for the tap, and what it sees and
// what it is told that it missed make up all that passed.
TEST_F(VoxTap, ThatDoesNotReadStopsNobodyAndLearnsHowMuchItMissed) {
    constexpr std::int64_t kMessages = 10000;
    const RawPeer tap(connectTo(path));
    ASSERT_TRUE(tap.send(join({hello(), wish})));
    for (const frame_type expected : {frame_type::hello, frame_type::tap})
        ASSERT_EQ(tap.readFrame().first.type, expected);
    Client client(vox_connection_create(kName));
    for (std::int64_t n = 0; n < kMessages; ++n)
        ASSERT_EQ(client.send(message(n, 1000)), 0);
    ASSERT_TRUE(service.client(1).inbox.wait(kMessages));
    EXPECT_EQ(service.client(1).inbox.numbers(), upTo(kMessages));
    EXPECT_LE(service.client(0).counts().queued_bytes, 1100u << 10);

    std::int64_t seen = 0;
    std::int64_t missed = 0;
    while (seen + missed < kMessages + 1) {  // and the opening
        const auto [header, body] = tap.readFrame();
        if (header.type == frame_type::dropped) {
            missed += vox_int64_get_value(body);
            continue;
        }
        ASSERT_EQ(header.type, frame_type::tap);
        if (const vox_object_t bytes = vox_dictionary_get_value(body, "b")) {
            const auto* begin = static_cast<const std::uint8_t*>(vox_data_get_bytes_ptr(bytes));
            ASSERT_EQ(numberIn(decode({begin, vox_data_get_length(bytes)}).first),
                      seen + missed - 1);
        }
        ++seen;
    }
    EXPECT_EQ(seen + missed, kMessages + 1);
    EXPECT_GT(missed, kMessages / 2) << "more waited for it than a megabyte";
    ASSERT_EQ(client.send(message(kMessages)), 0);
    EXPECT_EQ(tap.readFrame().first.type, frame_type::tap);
}

// Against a service that is spoken by hand.
TEST(VoxTapsEnd, BearsAnythingThatAServiceSays) {
    const RuntimeDirectory directory;
    const int listening = listeningSocket(directory.path() + "/" + kName);
    Client tap(vox_connection_create_tap(kName));
    const RawPeer other(::accept(listening, nullptr, nullptr));
    ::close(listening);
    const Ref bad(vox_data_create("\xff", 1));
    other.send(join({hello(), plainMessage(1), frame({.type = frame_type::dropped}, number(5)),
                     frame({.type = frame_type::tap}, dictionary({{"b", bad}})),
                     frame({.type = frame_type::tap}, dictionary({{"b", number(1)}})),
                     frame({.type = frame_type::tap}, number(1))}));
    EXPECT_EQ(tap.inbox.errorCode(), VOX_ERROR_CONNECTION_INVALID);
    ASSERT_EQ(tap.inbox.all().size(), 4u);
    const char* const expected[] = {R"({"k": "missed", "l": 5u})", R"({"b": <1 bytes ff>})",
                                    R"({"b": 1})"};
    for (std::size_t i = 0; i < std::size(expected); ++i)
        EXPECT_EQ(description(tap.inbox[i]), expected[i]);
}

// A connection that a process of another user made.
int connectAs(uid_t user, const std::string& path) {
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const UnixAddress address(path);
    EXPECT_TRUE(holdsInChild(
        [&] { return ::setuid(user) == 0 && ::connect(fd, address, address.size) == 0; }));
    return fd;
}

TEST(VoxTapsOfOthers, AreRefusedThoughTheyMayBeClients) {
    if (::geteuid() != 0)
        GTEST_SKIP() << "needs root, to be another user";
    const RuntimeDirectory directory;
    ASSERT_EQ(::chmod(directory.path().c_str(), 0711), 0);
    const Ref listener(vox_connection_create_listener(kName, nullptr));
    const vox_policy_t everybody = {
        .users = nullptr, .user_count = 0, .groups = nullptr, .group_count = 0, .everybody = 1};
    vox_listener_set_policy(listener, &everybody);
    EchoService service(vox_retain(listener));
    EXPECT_TRUE(Client(vox_connection_create(kName)).works());
    const RawPeer other(connectAs(65534, directory.path() + "/" + kName));
    other.send(join({hello(), frame({.type = frame_type::tap}, Bytes{0xf6})}));
    EXPECT_EQ(other.readFrame().first.type, frame_type::hello);
    const auto [header, body] = other.readFrame();
    EXPECT_EQ(header.type, frame_type::tap);
    EXPECT_EQ(vox_get_type(body), VOX_TYPE_ERROR);
    EXPECT_TRUE(other.read().empty()) << "it is open";
    service.client(1).inbox.expectError(VOX_ERROR_CONNECTION_INVALID, "it asked to be a tap");
}

TEST_F(VoxTap, IsRefusedByAServiceThatTakesNone) {
    vox_listener_set_taps(service.listener(), 0);
    Client tap(vox_connection_create_tap(kName));
    const std::string why = "this service takes no taps";
    tap.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, '"' + why + '"');
    service.client(0).inbox.expectError(VOX_ERROR_CONNECTION_INVALID,
                                        "\"it asked to be a tap: " + why + '"');
    Client client(vox_connection_create(kName));
    EXPECT_TRUE(client.works());
}

TEST_F(VoxTap, BreaksTheProtocolWhenItSendsMessages) {
    const Bytes streams[] = {
        join({hello(), wish, plainMessage(1)}),
        join({hello(), wish, wish}),
        join({hello(), plainMessage(1), wish}),
        join({hello(), frame({.type = frame_type::tap}, message(1))}),
    };
    for (const Bytes& stream : streams) {
        const RawPeer peer(connectTo(path));
        ASSERT_TRUE(peer.send(stream));
        EXPECT_EQ(peer.read(hello().size()), hello());
    }
    for (std::size_t i = 0; i < std::size(streams); ++i)
        EXPECT_EQ(service.client(i).inbox.errorCode(), VOX_ERROR_CONNECTION_INVALID) << i;
}

}  // namespace
