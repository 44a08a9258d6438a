// Peers that do not read, or stop in the middle of a frame.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <string>

#include "support/vox_raw_peer.h"

namespace {

using plr::test::descriptionOf;
using plr::test::Inbox;
using plr::test::message;
using plr::test::RawPeer;
using plr::test::Ref;
using vox_link::frame_type;
using Bytes = RawPeer::Bytes;

TEST(VoxSlowPeer, AFrameMustBeWholeInTime) {
    vox_limits_t limits = vox_limits_default();
    limits.incomplete_frame_ms = 20;
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    const Bytes whole = RawPeer::frame(frame_type::message, 0, message(1));
    peer.send(RawPeer::join({RawPeer::hello(), whole}));
    ASSERT_TRUE(inbox.wait(1));
    peer.send(std::span(whole).first(whole.size() - 1));
    const Ref error = inbox.waitForError();
    EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_NE(descriptionOf(error).find("not whole after 20 ms"), std::string::npos);
}

vox_limits_t smallQueue(vox_overflow_policy_t policy) {
    vox_limits_t limits = vox_limits_default();
    limits.max_queued_bytes = 64u << 10;
    limits.max_queued_messages = 100;
    limits.overflow = policy;
    return limits;
}

TEST(VoxSlowPeer, IsDisconnectedWhenThatIsThePolicy) {
    const plr::test::Reports reports;
    const vox_limits_t limits = smallQueue(VOX_OVERFLOW_DISCONNECT);
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    Inbox refused;
    plr::test::resumeWith(connection, inbox);
    peer.send(RawPeer::hello());
    int error = 0;
    vox_statistics_t counts;
    while (error == 0) {
        error = vox_connection_send_message(connection, message(1, 1000));
        vox_connection_get_statistics(connection, &counts);
        ASSERT_LE(counts.queued_bytes, limits.max_queued_bytes);
    }
    EXPECT_EQ(error, EPIPE);
    const Ref event = inbox.waitForError();
    EXPECT_EQ(vox_error_get_code(event), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_NE(descriptionOf(event).find("does not read"), std::string::npos);
    EXPECT_LE(reports.count("does not read"), 1u);
}

TEST(VoxSlowPeer, OneMessageOfAnySizeIsTakenWhenNothingWaits) {
    const vox_limits_t limits = smallQueue(VOX_OVERFLOW_DROP);
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    peer.send(RawPeer::hello());
    EXPECT_EQ(vox_connection_send_message(connection, message(1, 4u << 20)), 0);
    EXPECT_EQ(peer.readFrame().first.type, frame_type::hello);
    EXPECT_EQ(vox_connection_send_message(connection, message(2)), ENOBUFS) << "that one waits";
    EXPECT_EQ(peer.readFrame().first.length >> 20, 4u);
    EXPECT_EQ(peer.readFrame().first.type, frame_type::dropped);
    // The peer may have read it before the writer came back from the kernel.
    EXPECT_TRUE(plr::test::eventually([&sender = connection] {
        return vox_connection_send_message(sender, message(3, 4u << 20)) == 0;
    }));
    vox_connection_cancel(connection);
    EXPECT_TRUE(inbox.waitForError());
}

TEST(VoxSlowPeer, LearnsHowManyMessagesWereDroppedWhenThatIsThePolicy) {
    const vox_limits_t limits = smallQueue(VOX_OVERFLOW_DROP);
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    peer.send(RawPeer::hello());
    std::int64_t accepted = 0;
    std::int64_t dropped = 0;
    constexpr std::int64_t kSent = 3000;
    vox_statistics_t counts;
    for (std::int64_t n = 0; n < kSent; ++n) {
        const int error = vox_connection_send_message(connection, message(n, 1000));
        ASSERT_TRUE(error == 0 || error == ENOBUFS);
        ++(error == 0 ? accepted : dropped);
        vox_connection_get_statistics(connection, &counts);
        ASSERT_LE(counts.queued_bytes, limits.max_queued_bytes);
        ASSERT_LE(counts.queued_messages, limits.max_queued_messages);
    }
    EXPECT_GT(dropped, 0);
    EXPECT_EQ(counts.messages_dropped, static_cast<std::uint64_t>(dropped));

    Inbox refused;
    plr::test::request(connection, message(1, 1000), dispatch::queue::global(), refused);
    EXPECT_EQ(vox_error_get_code(refused.waitForError()), VOX_ERROR_MESSAGE_REFUSED);
    ++dropped;

    EXPECT_EQ(peer.readFrame().first.type, frame_type::hello);
    std::int64_t received = 0;
    std::int64_t told = 0;
    std::int64_t last = -1;
    while (received < accepted || told < dropped) {
        const auto [header, body] = peer.readFrame();
        const char* why = nullptr;
        const Ref value(vox_wire::decode(body, {}, {}, why));
        if (header.type == frame_type::dropped) {
            told += vox_int64_get_value(value);
            continue;
        }
        ASSERT_EQ(header.type, frame_type::message);
        EXPECT_GT(plr::test::numberIn(value), last);
        last = plr::test::numberIn(value);
        ++received;
    }
    EXPECT_EQ(received, accepted);
    EXPECT_EQ(told, dropped);
    // Now that there is room again, messages pass.
    EXPECT_TRUE(plr::test::eventually([&sender = connection] {
        return vox_connection_send_message(sender, message(kSent)) == 0;
    }));
    while (peer.readFrame().first.type == frame_type::dropped) {
    }
    vox_connection_cancel(connection);
    EXPECT_TRUE(inbox.waitForError());
}

TEST(VoxSlowPeer, GetsEveryReplyUnlessTwiceTheLimitWaits) {
    const vox_limits_t limits = smallQueue(VOX_OVERFLOW_DROP);
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    std::atomic<std::uint64_t> most{0};
    const dispatch::block<void(vox_object_t)> answer(
        [&, own = vox_connection_t(connection)](vox_object_t event) {
            const Ref reply(vox_dictionary_create_reply(event));
            if (!vox_object_t(reply))
                return inbox.add(event);
            vox_dictionary_set_value(reply, "data",
                                     Ref(vox_data_create(std::string(1000, 'x').data(), 1000)));
            static_cast<void>(vox_connection_send_message(own, reply));
            vox_statistics_t counts;
            vox_connection_get_statistics(own, &counts);
            most = std::max(most.load(), counts.queued_bytes);
            EXPECT_EQ(counts.messages_dropped, 0u);
        });
    vox_connection_set_event_handler(connection, &answer);
    vox_connection_resume(connection);
    bool open = peer.send(RawPeer::hello());
    for (std::uint64_t id = 1; open && id < 100000; ++id)
        open = peer.send(RawPeer::frame(frame_type::request, id, message(1)));
    EXPECT_NE(descriptionOf(inbox.waitForError()).find("does not read"), std::string::npos);
    EXPECT_LE(most.load(), 2 * limits.max_queued_bytes);
}

TEST(VoxSlowPeer, CannotMakeAnswersToPingsPileUp) {
    const vox_limits_t limits = smallQueue(VOX_OVERFLOW_DROP);
    auto [connection, peer] = plr::test::connectionWithRawPeer(&limits);
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    const Bytes ping = RawPeer::frame(frame_type::ping, 1, Ref(vox_null_create()), 0, 1);
    Bytes many;
    for (int i = 0; i < 1000; ++i)
        many.insert(many.end(), ping.begin(), ping.end());
    bool open = peer.send(RawPeer::hello());
    vox_statistics_t counts;
    while (open) {
        open = peer.send(many);
        vox_connection_get_statistics(connection, &counts);
        ASSERT_LE(counts.queued_bytes, 2 * limits.max_queued_bytes);
    }
    EXPECT_NE(descriptionOf(inbox.waitForError()).find("does not read"), std::string::npos);
}

TEST(VoxSlowPeer, ToldCountsAreSeenByTheReceiver) {
    auto [connection, peer] = plr::test::connectionWithRawPeer();
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    peer.send(RawPeer::join({RawPeer::hello(),
                             RawPeer::frame(frame_type::dropped, 0, Ref(vox_int64_create(5))),
                             RawPeer::frame(frame_type::dropped, 0, Ref(vox_int64_create(2))),
                             RawPeer::frame(frame_type::message, 0, message(1))}));
    ASSERT_TRUE(inbox.wait(1));
    vox_statistics_t counts;
    vox_connection_get_statistics(connection, &counts);
    EXPECT_EQ(counts.peer_dropped, 7u);
    vox_connection_cancel(connection);
    EXPECT_TRUE(inbox.waitForError());
}

}  // namespace
