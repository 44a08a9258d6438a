// How connections end, and barriers.
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <memory>

#include "support/vox_pair.h"
#include "support/vox_raw_peer.h"

namespace {

using plr::test::Event;
using plr::test::Inbox;
using plr::test::message;
using plr::test::numberIn;
using plr::test::Ref;
using plr::test::request;
using plr::test::resumeWith;
using plr::test::upTo;
using VoxConnectionEnd = plr::test::Pair;

TEST_F(VoxConnectionEnd, TheEndOfThePeerIsToldAfterTheResume) {
    resumeBoth();
    Inbox replies;
    EXPECT_EQ(vox_connection_send_message(left, message(0)), 0);
    ASSERT_TRUE(rightInbox.wait(1));
    vox_connection_suspend(right);
    EXPECT_EQ(vox_connection_send_message(left, message(1)), 0);
    vox_connection_cancel(left);
    ASSERT_TRUE(leftInbox.waitForError());
    plr::test::drain(rightQueue);
    EXPECT_EQ(rightInbox.numbers().size(), 1u);
    vox_connection_resume(right);
    const Ref error = rightInbox.waitForError();
    EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(rightInbox.numbers(), upTo(2)) << "what was sent before comes before";
}

TEST_F(VoxConnectionEnd, CancellingTellsEveryOutstandingRequestOnceAndThenTheHandler) {
    resumeBoth();
    const auto other = dispatch::queue::create("other");
    Inbox elsewhere;
    for (std::int64_t n = 0; n < 100; ++n) {
        request(left, message(n), leftQueue, leftInbox);
        request(left, message(n), other, elsewhere);
    }
    ASSERT_TRUE(rightInbox.wait(200));
    vox_connection_cancel(left);
    vox_connection_cancel(left);
    ASSERT_TRUE(leftInbox.wait(101));
    ASSERT_TRUE(elsewhere.wait(100));
    plr::test::drain(leftQueue);
    plr::test::drain(other);
    EXPECT_EQ(leftInbox.all().size(), 101u);
    EXPECT_EQ(elsewhere.all().size(), 100u);
    for (const Ref& event : leftInbox.all())
        EXPECT_EQ(vox_error_get_code(event), VOX_ERROR_CONNECTION_INVALID);
    const Ref interrupted = rightInbox.waitForError();
    EXPECT_EQ(vox_error_get_code(interrupted), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(vox_connection_send_message(left, message(1)), EPIPE);
    request(left, message(1), other, elsewhere);
    ASSERT_TRUE(elsewhere.wait(101)) << "a request after the end fails, too";
}

TEST_F(VoxConnectionEnd, NothingIsDeliveredAfterAHandlerCancelled) {
    leftResumed = rightResumed = true;
    resumeWith(left, leftInbox);
    const dispatch::block<void(vox_object_t)> third([this](vox_object_t event) {
        rightInbox.add(event);
        if (numberIn(event) == 3)
            vox_connection_cancel(right);
    });
    for (std::int64_t n = 1; n <= 50; ++n)
        EXPECT_EQ(vox_connection_send_message(left, message(n)), 0);
    vox_connection_set_event_handler(right, &third);
    vox_connection_resume(right);
    const Ref error = rightInbox.waitForError();
    EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(rightInbox.numbers(), (std::vector<std::int64_t>{1, 2, 3}));
}

TEST(VoxConnectionRelease, DroppingTheLastReferenceCancels) {
    vox_connection_t ends[2];
    vox_connection_create_pair(&ends[0], &ends[1], nullptr);
    Inbox leftInbox;
    Inbox rightInbox;
    resumeWith(ends[0], leftInbox);
    resumeWith(ends[1], rightInbox);
    Inbox replies;
    request(ends[0], message(1), dispatch::queue::create("replies"), replies);
    ASSERT_TRUE(rightInbox.wait(1));
    vox_release(ends[0]);
    EXPECT_EQ(vox_error_get_code(replies.waitForError()), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(vox_error_get_code(leftInbox.waitForError()), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(vox_error_get_code(rightInbox.waitForError()), VOX_ERROR_CONNECTION_INTERRUPTED);
    vox_release(ends[1]);
}

TEST(VoxConnectionRelease, AHandlerThatHoldsItsConnectionIsReleasedAfterTheError) {
    vox_connection_t ends[2];
    vox_connection_create_pair(&ends[0], &ends[1], nullptr);
    auto held = std::make_shared<int>(0);
    const std::weak_ptr<int> watched = held;
    Event errors;
    const auto queue = dispatch::queue::create("holder");
    for (const vox_connection_t end : ends) {
        const dispatch::block<void(vox_object_t)> handler(
            [&errors, held, own = Ref::retain(end)](vox_object_t) { errors.signal(); });
        vox_connection_set_event_handler(end, &handler);
        vox_connection_set_target_queue(end, &queue);
        vox_connection_resume(end);
    }
    held.reset();
    vox_release(ends[1]);  // alive through its handler
    vox_connection_cancel(ends[0]);
    vox_release(ends[0]);
    ASSERT_TRUE(errors.wait());
    ASSERT_TRUE(errors.wait());
    plr::test::drain(queue);
    EXPECT_TRUE(watched.expired());
}

TEST(VoxConnectionRelease, LeavesNoDescriptorHoweverItEnds) {
    const auto queue = dispatch::queue::create("ends");
    const auto one_round = [&queue](bool left, bool right, bool cancels) {
        vox_connection_t ends[2];
        vox_connection_create_pair(&ends[0], &ends[1], nullptr);
        Inbox inboxes[2];
        EXPECT_EQ(vox_connection_send_message(ends[0], message(1)), 0);
        if (left)
            resumeWith(ends[0], inboxes[0], queue);
        if (right)
            resumeWith(ends[1], inboxes[1], queue);
        if (cancels)
            vox_connection_cancel(ends[0]);
        vox_release(ends[0]);
        if (left) {
            EXPECT_TRUE(inboxes[0].waitForError());
        }
        if (right) {
            EXPECT_TRUE(inboxes[1].waitForError());
        }
        inboxes[1].clear();
        vox_release(ends[1]);
        plr::test::drain(queue);
    };
    one_round(true, true, true);  // the queues open what they need
    const std::size_t before = plr::test::openDescriptors();
    for (const bool left : {false, true}) {
        for (const bool right : {false, true}) {
            for (const bool cancels : {false, true})
                one_round(left, right, cancels);
        }
    }
    EXPECT_TRUE(plr::test::eventually([&] { return plr::test::openDescriptors() == before; }));
}

// ---- Barriers -------------------------------------------------------------------------

TEST_F(VoxConnectionEnd, ABarrierRunsOnTheQueueBehindWhatWasSent) {
    Event passed;
    const dispatch::block<void()> barrier([&] {
        leftQueue.assert_current();
        passed.signal();
    });
    EXPECT_EQ(vox_connection_send_message(left, message(1)), 0);
    vox_connection_set_target_queue(left, &leftQueue);
    vox_connection_send_barrier(left, &barrier);  // waits for the resume
    resumeBoth();
    EXPECT_TRUE(passed.wait());
    vox_connection_send_barrier(left, &barrier);  // nothing waits
    EXPECT_TRUE(passed.wait());
    vox_connection_cancel(left);
    EXPECT_TRUE(leftInbox.waitForError());
    vox_connection_send_barrier(left, &barrier);  // nothing will ever be sent
    EXPECT_TRUE(passed.wait());
}

TEST(VoxBarrier, WaitsForThePeerToReadAndNoLongerThanTheConnection) {
    for (const bool reads : {true, false}) {
        auto [connection, peer] = plr::test::connectionWithRawPeer();
        Inbox inbox;
        resumeWith(connection, inbox);
        peer.send(plr::test::RawPeer::hello());
        std::atomic<bool> early{true};
        Event passed;
        const dispatch::block<void()> barrier([&] {
            EXPECT_FALSE(early.load());
            passed.signal();
        });
        // More than the kernel holds for a peer that does not read.
        for (std::int64_t n = 0; n < 8; ++n)
            EXPECT_EQ(vox_connection_send_message(connection, message(n, 1u << 20)), 0);
        vox_connection_send_barrier(connection, &barrier);
        early = false;
        if (reads)
            peer.read(8u << 20);
        else
            vox_connection_cancel(connection);
        EXPECT_TRUE(passed.wait());
        vox_connection_cancel(connection);
        EXPECT_TRUE(inbox.waitForError());
    }
}

}  // namespace
