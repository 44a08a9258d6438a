// Every limit, of one connection and of one user: what is within it passes, what
// goes over it has the documented end and is counted, and afterwards nobody is
// charged for anything.
#include <gtest/gtest.h>
#include <unistd.h>

#include <deque>
#include <optional>

#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;
using vox_link::frame_type;

constexpr const char* kName = "net.example.limits";
constexpr std::uint32_t kAllowed = 4;  // units of whatever is limited
constexpr std::uint32_t kPart = 1000;  // bytes, the unit of partial frames

// A service that answers nothing, and clients that are spoken by hand.
class Stage {
  public:
    explicit Stage(const vox_limits_t& limits)
        : service(vox_connection_create_listener(kName, &limits), false) {}

    std::size_t connect(bool greets = true) {
        peers.emplace_back(connectTo(directory.path() + "/" + kName));
        if (greets)
            peers.back().send(hello());
        return peers.size() - 1;
    }
    End& served(std::size_t client) { return service.client(client); }
    [[nodiscard]] vox_user_statistics_t user() {
        vox_user_statistics_t now;
        vox_listener_get_user_statistics(service.listener(), ::getuid(), &now);
        return now;
    }
    // All that is charged to the user, in sum.
    [[nodiscard]] std::uint64_t charges() {
        const vox_user_statistics_t now = user();
        return now.connections + now.queued_bytes + now.queued_messages + now.pending_replies +
               now.open_requests + now.held_descriptors + now.partial_bytes;
    }

    Inbox replies;
    RuntimeDirectory directory;
    Reports reports;
    EchoService service;
    std::deque<RawPeer> peers;
    std::uint64_t next = 1;  // id of a request
};

// ---- One unit of each ----------------------------------------------------------------

void askPeer(Stage& stage, std::size_t client) {
    stage.served(client).request(message(1), stage.replies);
}
void askService(Stage& stage, std::size_t client) {
    stage.peers[client].send(frame({.type = frame_type::request, .id = stage.next++}, message(1)));
}
void sendDescriptor(Stage& stage, std::size_t client) {
    const Ref carrier = dictionary({{"fd", Ref(vox_fd_create(STDIN_FILENO))}});
    stage.peers[client].send(frame({.descriptors = 1}, carrier), {STDIN_FILENO});
}
void beginFrame(Stage& stage, std::size_t client) {
    Bytes part(kPart, 0);
    if (stage.served(client).counts().partial_bytes == 0) {
        part = header({.length = 1u << 20});
        part.resize(kPart);
    }
    stage.peers[client].send(part);
}
// The first one fills the socket, and waits.
void queueMessage(Stage& stage, std::size_t client, const Ref& small) {
    End& end = stage.served(client);
    const bool first = end.counts().queued_messages == 0;
    static_cast<void>(end.send(first ? message(1, 4u << 20) : small));
}
void queueMessage(Stage& stage, std::size_t client) {
    queueMessage(stage, client, message(2));
}
void queueDescriptor(Stage& stage, std::size_t client) {
    if (stage.served(client).counts().queued_messages == 0)
        queueMessage(stage, client);
    queueMessage(stage, client, dictionary({{"fd", Ref(vox_fd_create(STDIN_FILENO))}}));
}

// ---- What one too many leads to -----------------------------------------------------

void endsTheConnection(Stage& stage, std::size_t client, const std::string& limit) {
    stage.served(client).inbox.expectError(VOX_ERROR_CONNECTION_INVALID, limit);
    EXPECT_TRUE(eventually([&] { return stage.service.counts().ended_for_limits == 1; }));
}
void failsTheRequest(Stage& stage, std::size_t client, const std::string& limit) {
    stage.replies.expectError(VOX_ERROR_MESSAGE_REFUSED, limit);
    EXPECT_EQ(stage.served(client).counts().replies_refused, 1u);
}
void refusesTheRequest(Stage& stage, std::size_t client, const std::string& limit) {
    EXPECT_EQ(stage.peers[client].readFrame().first.type, frame_type::hello);
    const auto [header, body] = stage.peers[client].readFrame();
    EXPECT_EQ(header.type, frame_type::refused);
    EXPECT_EQ(header.id, kAllowed + 1);
    EXPECT_EQ(vox_error_get_code(body), VOX_ERROR_MESSAGE_REFUSED);
    EXPECT_NE(description(body).find(limit), std::string::npos) << description(body);
    EXPECT_EQ(stage.service.counts().requests_refused, 1u);
    EXPECT_TRUE(stage.served(client).inbox.all().size() <= kAllowed)
        << "the service did not see it";
}

struct Row {
    const char* limit;                           // its name; that of a user ends with "_per_uid"
    std::uint32_t vox_limits_t::*of_connection;  // null: there is none
    std::uint32_t vox_limits_t::*of_user;
    std::uint64_t vox_statistics_t::*on_connection;
    std::uint64_t vox_user_statistics_t::*on_user;
    void (*add)(Stage&, std::size_t client);
    void (*then)(Stage&, std::size_t client, const std::string& limit);
    std::uint32_t unit = 1;
};

const Row kRows[] = {
    {"max_pending_replies", &vox_limits_t::max_pending_replies,
     &vox_limits_t::max_pending_replies_per_uid, &vox_statistics_t::pending_replies,
     &vox_user_statistics_t::pending_replies, askPeer, failsTheRequest},
    {"max_open_requests", &vox_limits_t::max_open_requests,
     &vox_limits_t::max_open_requests_per_uid, &vox_statistics_t::open_requests,
     &vox_user_statistics_t::open_requests, askService, refusesTheRequest},
    {"max_held_descriptors", &vox_limits_t::max_held_descriptors,
     &vox_limits_t::max_held_descriptors_per_uid, &vox_statistics_t::held_descriptors,
     &vox_user_statistics_t::held_descriptors, sendDescriptor, endsTheConnection},
    {"max_held_descriptors", &vox_limits_t::max_held_descriptors,
     &vox_limits_t::max_held_descriptors_per_uid, &vox_statistics_t::held_descriptors,
     &vox_user_statistics_t::held_descriptors, queueDescriptor, endsTheConnection},
    {"max_queued_messages", &vox_limits_t::max_queued_messages,
     &vox_limits_t::max_queued_messages_per_uid, &vox_statistics_t::queued_messages,
     &vox_user_statistics_t::queued_messages, queueMessage, endsTheConnection},
    {"max_partial_bytes", nullptr, &vox_limits_t::max_partial_bytes_per_uid,
     &vox_statistics_t::partial_bytes, &vox_user_statistics_t::partial_bytes, beginFrame,
     endsTheConnection, kPart},
};

// kAllowed units, by one client or by two in turns, and one too many.
void reach(const Row& row, bool per_user) {
    SCOPED_TRACE(std::string(row.limit) + (per_user ? "_per_uid" : ""));
    vox_limits_t limits = vox_limits_default();
    limits.*(per_user ? row.of_user : row.of_connection) = kAllowed * row.unit;
    std::optional<Stage> stage(limits);
    for (std::size_t client : {stage->connect(), stage->connect(), stage->connect()})
        stage->served(client);
    const auto client_of = [per_user](std::size_t i) { return per_user ? i % 2 : 0; };
    for (std::size_t i = 0; i < kAllowed; ++i) {
        row.add(*stage, client_of(i));
        EXPECT_TRUE(eventually([&] { return stage->user().*row.on_user == (i + 1) * row.unit; }))
            << i << ": " << stage->user().*row.on_user;
    }
    const auto own = stage->served(0).counts().*row.on_connection;
    EXPECT_EQ(own, kAllowed * row.unit / (per_user ? 2 : 1));
    row.add(*stage, client_of(kAllowed));
    row.then(*stage, client_of(kAllowed), std::string(row.limit) + (per_user ? "_per_uid" : " ("));
    // Nobody else pays: it still reads and writes.
    stage->peers[2].send(frame({.type = frame_type::ping, .flags = 1, .id = 1}, Bytes{0xf6}));
    EXPECT_EQ(stage->peers[2].readFrame().first.type, frame_type::hello);
    EXPECT_EQ(stage->peers[2].readFrame().first.type, frame_type::ping);
    // What came may be held longer than its connection lives.
    std::vector<Ref> held = stage->served(0).inbox.all();
    const std::size_t messages = stage->served(0).inbox.numbers().size();
    stage->peers.clear();
    for (std::size_t client = 0; client < 3; ++client) {
        EXPECT_NE(stage->served(client).inbox.errorCode(), 0);
        stage->served(client).inbox.clear();
    }
    if (row.add == &sendDescriptor) {
        EXPECT_EQ(stage->charges(), messages);
    }
    held.clear();
    EXPECT_EQ(stage->charges(), 0u);
}

TEST(VoxLimits, EndExactlyWhereTheyAreSet) {
    for (const Row& row : kRows) {
        if (row.of_connection)
            reach(row, false);
        reach(row, true);
    }
}

vox_limits_t queueOf(std::uint32_t vox_limits_t::*field, std::uint32_t bytes,
                     vox_overflow_policy_t overflow) {
    vox_limits_t limits = vox_limits_default();
    limits.*field = bytes;
    limits.overflow = overflow;
    return limits;
}

TEST(VoxLimits, OfQueuedBytesAreUsedUpAndNotExceeded) {
    constexpr std::uint32_t kBytes = 5u << 20;
    constexpr std::size_t kSize = 10'000;
    for (const auto field :
         {&vox_limits_t::max_queued_bytes, &vox_limits_t::max_queued_bytes_per_uid}) {
        const bool per_user = field == &vox_limits_t::max_queued_bytes_per_uid;
        Stage stage(queueOf(field, kBytes, VOX_OVERFLOW_DISCONNECT));
        stage.connect();
        stage.connect();
        queueMessage(stage, 0);
        std::uint64_t before = 0;
        for (std::size_t i = 1; stage.served(per_user ? i % 2 : 0).send(message(1, kSize)) == 0;
             ++i)
            before = per_user ? stage.user().queued_bytes : stage.served(0).counts().queued_bytes;
        EXPECT_LE(before, kBytes);
        EXPECT_GT(before + 2 * kSize, kBytes);
        EXPECT_TRUE(eventually([&] { return stage.service.counts().ended_for_limits == 1; }));
        stage.peers.clear();
        EXPECT_TRUE(eventually([&] { return stage.charges() == 0; }));
    }
}

TEST(VoxLimits, OfAUserDropMessagesForAllItsClientsWhenThatIsThePolicy) {
    Stage stage(queueOf(&vox_limits_t::max_queued_messages_per_uid, 2, VOX_OVERFLOW_DROP));
    for (const std::size_t client : {stage.connect(), stage.connect()})
        queueMessage(stage, client);
    EXPECT_EQ(stage.served(0).send(message(3)), ENOBUFS);
    EXPECT_EQ(stage.served(1).send(message(3)), ENOBUFS);
    EXPECT_EQ(stage.service.counts().messages_dropped, 2u);
    for (RawPeer& peer : stage.peers)
        for (const frame_type next : {frame_type::hello, frame_type::message, frame_type::dropped})
            EXPECT_EQ(peer.readFrame().first.type, next);
    EXPECT_TRUE(eventually([&] { return stage.charges() == 2; })) << "the connections alone";
    EXPECT_EQ(stage.served(0).send(message(4)), 0);
}

TEST(VoxLimits, CountWhatWaitsForAHelloAsWell) {
    Stage stage(vox_limits_default());
    stage.connect(false);
    for (const std::size_t bytes : {10u, 5000u, 10u})
        EXPECT_EQ(stage.served(0).send(message(1, bytes)), 0);
    EXPECT_EQ(stage.user().queued_messages, 3u);
    EXPECT_EQ(stage.user().queued_bytes, stage.served(0).counts().queued_bytes);
    stage.peers[0].send(hello({.bytes = 1000}));  // one of them is given up
    for (const frame_type next : {frame_type::hello, frame_type::message, frame_type::message})
        EXPECT_EQ(stage.peers[0].readFrame().first.type, next);
    EXPECT_TRUE(eventually([&] { return stage.charges() == 1; }));
    EXPECT_EQ(stage.service.counts().messages_dropped, 1u);
    EXPECT_EQ(stage.service.counts().messages_sent, 2u);
}

TEST(VoxLimits, OfConnectionsCloseANewOneBeforeAnyMessage) {
    for (const auto field :
         {&vox_limits_t::max_connections, &vox_limits_t::max_connections_per_uid}) {
        Stage stage(queueOf(field, 2, VOX_OVERFLOW_DISCONNECT));
        stage.served(stage.connect());
        stage.served(stage.connect());
        EXPECT_TRUE(stage.peers[stage.connect()].read().empty());
        EXPECT_EQ(stage.service.counts().refused_by_limit, 1u);
        EXPECT_EQ(stage.user().connections, 2u);
        stage.peers.pop_front();
        EXPECT_TRUE(eventually([&] { return stage.user().connections == 1; }));
        stage.connect();
        stage.served(2);
        EXPECT_EQ(stage.service.counts().clients_accepted, 3u);
    }
}

TEST(VoxLimits, OfTimeAreForPartsOfFramesAndForClientsThatDoNotSayHello) {
    vox_limits_t limits = vox_limits_default();
    limits.incomplete_frame_ms = 20;
    Stage stage(limits);
    std::size_t client = stage.connect(false);
    stage.connect(false);
    Bytes begun = hello();
    begun.resize(30);
    stage.peers[1].send(begun);
    const Bytes whole = plainMessage(1);
    stage.connect();
    stage.peers[2].send(whole);
    ASSERT_TRUE(stage.served(2).inbox.wait(1));
    stage.peers[2].send(std::span(whole).first(whole.size() - 1));
    for (const char* why :
         {"no hello after 20 ms", "no hello after 20 ms", "not whole after 20 ms"})
        stage.served(client++).inbox.expectError(VOX_ERROR_CONNECTION_INVALID, why);
    EXPECT_TRUE(eventually([&] { return stage.service.counts().ended_for_limits == 3; }));
    // A client waits for a slow service as long as it takes.
    RawPair slow(&limits);
    slow.end.resume();
    EXPECT_NE(stage.served(stage.connect(false)).inbox.errorCode(), 0);
    slow.peer.send(hello());
    slow.peer.send(plainMessage(1));
    EXPECT_TRUE(slow.end.inbox.wait(1));
    EXPECT_EQ(slow.end.inbox.numbers(), Numbers{1});
}

}  // namespace
