// Peers that do not read.
#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <optional>

#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using vox_link::frame_type;

vox_limits_t smallQueue(vox_overflow_policy_t policy) {
    vox_limits_t limits = vox_limits_default();
    limits.max_queued_messages = 100;
    limits.overflow = policy;
    return limits;
}

// A peer with little room in the queue for it, which has said hello.
class VoxSlowPeer : public ::testing::Test {
  protected:
    void start(vox_overflow_policy_t policy, const End::Handler& first = {},
               std::uint32_t mostBytes = 64u << 10) {
        limits = smallQueue(policy);
        limits.max_queued_bytes = mostBytes;
        pair.emplace(&limits);
        pair->start(first);
    }
    // What it does not get beyond the limits.
    [[nodiscard]] bool isWithin(std::uint32_t times) const {
        const vox_statistics_t counts = pair->end.counts();
        return counts.queued_bytes <= times * limits.max_queued_bytes &&
               counts.queued_messages <= times * limits.max_queued_messages;
    }
    // Has the kernel take no more: until the peer reads nobody is about to write.
    void block() {
        pair->peer.send(plainMessage(1));
        ASSERT_TRUE(pair->end.inbox.wait(1)) << "both have said hello";
        ASSERT_EQ(pair->end.send(message(accepted++, 4u << 20)), 0);
    }
    // Sends messages of so many bytes until one is not taken; that error.
    int fill(std::size_t bytes) {
        for (;;) {
            const int error = pair->end.send(message(accepted, bytes));
            EXPECT_TRUE(isWithin(1));
            if (error != 0)
                return error;
            ++accepted;
        }
    }
    void expectDisconnected() {
        pair->end.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, "does not read");
    }

    vox_limits_t limits = {};
    std::optional<RawPair> pair;
    std::int64_t accepted = 0;
};

TEST_F(VoxSlowPeer, IsDisconnectedWhenThatIsThePolicy) {
    start(VOX_OVERFLOW_DISCONNECT);
    EXPECT_EQ(fill(1000), EPIPE);  // there are too many bytes
    expectDisconnected();
}

TEST_F(VoxSlowPeer, GetsOneMessageOfAnySizeWhenNothingWaits) {
    start(VOX_OVERFLOW_DROP);
    End& end = pair->end;
    const RawPeer& peer = pair->peer;
    EXPECT_EQ(end.send(message(1, 4u << 20)), 0);
    EXPECT_EQ(peer.readFrame().first.type, frame_type::hello);
    EXPECT_EQ(end.send(message(2)), ENOBUFS) << "that one waits";
    EXPECT_EQ(peer.readFrame().first.length >> 20, 4u);
    EXPECT_EQ(peer.readFrame().first.type, frame_type::dropped);
    // The peer may have read it before the writer came back from the kernel.
    EXPECT_TRUE(eventually([&] { return end.send(message(3, 4u << 20)) == 0; }));
}

TEST_F(VoxSlowPeer, LearnsHowManyMessagesWereDroppedWhenThatIsThePolicy) {
    start(VOX_OVERFLOW_DROP, {}, 8u << 20);
    block();
    EXPECT_EQ(fill(0), ENOBUFS);  // there are too many messages
    for (int more = 0; more < 10; ++more)
        EXPECT_EQ(pair->end.send(message(1, 1000)), ENOBUFS);
    Inbox refused;
    pair->end.request(message(1, 1000), refused);
    EXPECT_EQ(refused.errorCode(), VOX_ERROR_MESSAGE_REFUSED);
    EXPECT_EQ(pair->end.counts().messages_dropped, 12u);

    EXPECT_EQ(pair->peer.readFrame().first.type, frame_type::hello);
    std::int64_t received = 0;
    std::int64_t told = 0;
    while (received < accepted || told < 12) {
        const auto [header, body] = pair->peer.readFrame();
        if (header.type == frame_type::dropped)
            told += vox_int64_get_value(body);
        else
            ASSERT_EQ(numberIn(body), received++);
    }
    EXPECT_EQ(received, accepted);
    EXPECT_EQ(told, 12);
    // Now that there is room again, messages pass.
    EXPECT_TRUE(eventually([&] { return pair->end.send(message(2)) == 0; }));
    frame_type next{};
    while ((next = pair->peer.readFrame().first.type) == frame_type::dropped) {
    }
    EXPECT_EQ(next, frame_type::message);
}

TEST_F(VoxSlowPeer, GetsEveryReplyUnlessTwiceTheLimitWaits) {
    std::atomic<bool> within{true};
    start(VOX_OVERFLOW_DROP, [&](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_ERROR)
            return false;
        static_cast<void>(pair->end.answer(event, 1000));
        within = within && isWithin(2) && pair->end.counts().messages_dropped == 0;
        return true;
    });
    bool open = true;
    for (std::uint64_t id = 1; open && id < 100000; ++id)
        open = pair->peer.send(frame({.type = frame_type::request, .id = id}, message(1)));
    expectDisconnected();
    EXPECT_TRUE(within);
}

TEST_F(VoxSlowPeer, CannotMakeAnswersToPingsPileUp) {
    start(VOX_OVERFLOW_DROP);
    const Bytes ping = frame({.type = frame_type::ping, .flags = 1, .id = 1}, Bytes{0xf6});
    Bytes many;
    for (int i = 0; i < 1000; ++i)
        many.insert(many.end(), ping.begin(), ping.end());
    while (pair->peer.send(many))
        ASSERT_LE(pair->end.counts().queued_bytes, 2 * limits.max_queued_bytes);
    expectDisconnected();
}

}  // namespace
