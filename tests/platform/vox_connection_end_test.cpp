// How connections end, and barriers.
#include <gtest/gtest.h>

#include <atomic>

#include "support/vox_pair.h"
#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using VoxConnectionEnd = Pair;

TEST_F(VoxConnectionEnd, TheEndOfThePeerIsToldAfterTheResume) {
    resumeBoth();
    EXPECT_EQ(left.send(message(0)), 0);
    ASSERT_TRUE(right.inbox.wait(1));
    vox_connection_suspend(right);
    EXPECT_EQ(left.send(message(1)), 0);
    vox_connection_cancel(left);
    ASSERT_TRUE(left.inbox.waitForError());
    drain(right.queue);
    EXPECT_EQ(right.inbox.all().size(), 1u);
    vox_connection_resume(right);
    EXPECT_EQ(right.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(right.inbox.numbers(), upTo(2)) << "what was sent before comes before";
}

TEST_F(VoxConnectionEnd, CancellingTellsEveryOutstandingRequestOnceAndThenTheHandler) {
    resumeBoth();
    const auto other = dispatch::queue::create("other");
    Inbox elsewhere;
    Numbers order;  // touched on the other queue only
    for (std::int64_t n = 0; n < 100; ++n) {
        left.request(message(n), left.inbox);
        const dispatch::block<void(vox_object_t)> told([&, n](vox_object_t error) {
            order.push_back(n);
            elsewhere.add(error);
        });
        vox_connection_send_message_with_reply(left, message(n), &other, &told);
    }
    ASSERT_TRUE(right.inbox.wait(200));
    vox_connection_cancel(left);
    vox_connection_cancel(left);
    ASSERT_TRUE(left.inbox.wait(101));
    ASSERT_TRUE(elsewhere.wait(100));
    drain(left.queue);
    drain(other);
    EXPECT_EQ(left.inbox.all().size(), 101u);
    EXPECT_EQ(order, upTo(100));
    for (const Ref& event : left.inbox.all())
        EXPECT_EQ(vox_error_get_code(event), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(right.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(left.send(message(1)), EPIPE);
    left.request(message(1), elsewhere, other);
    EXPECT_TRUE(elsewhere.wait(101)) << "a request after the end fails, too";
}

TEST_F(VoxConnectionEnd, NothingIsDeliveredAfterAHandlerCancelled) {
    left.resume();
    for (std::int64_t n = 0; n < 50; ++n)
        EXPECT_EQ(left.send(message(n)), 0);
    right.resume([this](vox_object_t event) {
        if (numberIn(event) == 3)
            vox_connection_cancel(right);
        return false;
    });
    EXPECT_EQ(right.inbox.errorCode(), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(right.inbox.numbers(), upTo(4));
}

// Resumes; the handler holds `held` until the end, which is signalled.
void resumeHolding(vox_connection_t connection, Event& ended, const Ref& held = Ref()) {
    const dispatch::block<void(vox_object_t)> handler([&ended, held](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_ERROR)
            ended.signal();
    });
    vox_connection_set_event_handler(connection, &handler);
    vox_connection_resume(connection);
}

// One connection: which ends are resumed, and whether the left one is cancelled
// while its handler holds it, or ends because nothing holds it.
void connectAndEnd(bool left, bool right, bool cancels) {
    vox_connection_t ends[2];
    vox_connection_create_pair(&ends[0], &ends[1], nullptr);
    EXPECT_EQ(vox_connection_send_message(ends[0], message(1)), 0);
    Event leftEnded;
    Event rightEnded;
    if (left)
        resumeHolding(ends[0], leftEnded, cancels ? Ref::retain(ends[0]) : Ref());
    if (right)
        resumeHolding(ends[1], rightEnded, Ref::retain(ends[1]));
    if (cancels)
        vox_connection_cancel(ends[0]);
    vox_release(ends[0]);
    EXPECT_TRUE(!left || leftEnded.wait());
    EXPECT_TRUE(!right || rightEnded.wait());
    vox_release(ends[1]);
}

TEST(VoxConnectionRelease, EndsTheConnectionAndLeavesNoDescriptor) {
    connectAndEnd(true, true, true);  // the queues open what they need
    const std::size_t before = openDescriptors();
    for (int round = 0; round < 10; ++round)
        for (const bool left : {false, true})
            for (const bool right : {false, true})
                for (const bool cancels : {false, true})
                    connectAndEnd(left, right, cancels);
    EXPECT_TRUE(eventually([&] { return openDescriptors() <= before; }));
}

// ---- Barriers -------------------------------------------------------------------------

TEST_F(VoxConnectionEnd, ABarrierRunsOnTheQueueBehindWhatWasSent) {
    Event passed;
    const dispatch::block<void()> barrier([&] {
        left.queue.assert_current();
        passed.signal();
    });
    EXPECT_EQ(left.send(message(1)), 0);
    vox_connection_set_target_queue(left, &left.queue);
    vox_connection_send_barrier(left, &barrier);  // waits for the resume
    resumeBoth();
    EXPECT_TRUE(passed.wait());
    vox_connection_send_barrier(left, &barrier);  // nothing waits
    EXPECT_TRUE(passed.wait());
    vox_connection_cancel(left);
    EXPECT_TRUE(left.inbox.waitForError());
    vox_connection_send_barrier(left, &barrier);  // nothing will ever be sent
    EXPECT_TRUE(passed.wait());
}

TEST(VoxBarrier, WaitsForThePeerToReadAndNoLongerThanTheConnection) {
    for (const bool reads : {true, false}) {
        RawPair pair;
        pair.start();
        std::atomic<bool> early{true};
        Event passed;
        const dispatch::block<void()> barrier([&] {
            EXPECT_FALSE(early.load());
            passed.signal();
        });
        // More than the kernel holds for a peer that does not read.
        for (std::int64_t n = 0; n < 8; ++n)
            EXPECT_EQ(pair.end.send(message(n, 1u << 20)), 0);
        vox_connection_send_barrier(pair.end, &barrier);
        early = false;
        if (reads)
            EXPECT_EQ(pair.peer.read(8u << 20).size(), 8u << 20);
        else
            vox_connection_cancel(pair.end);
        EXPECT_TRUE(passed.wait());
    }
}

}  // namespace
