// What both ends of a connection can rely on.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <memory>
#include <numeric>
#include <thread>
#include <vector>

#include "support/vox_test.h"

namespace {

using plr::test::descriptionOf;
using plr::test::Event;
using plr::test::Inbox;
using plr::test::message;
using plr::test::numberIn;
using plr::test::Ref;
using plr::test::request;
using plr::test::resumeWith;

std::vector<std::int64_t> upTo(std::int64_t count) {
    std::vector<std::int64_t> numbers(static_cast<std::size_t>(count));
    std::iota(numbers.begin(), numbers.end(), 0);
    return numbers;
}

// Both ends of a connection in this process. The right one echoes requests.
class Pair : public ::testing::Test {
  protected:
    explicit Pair(const vox_limits_t* limits = nullptr) {
        vox_connection_t ends[2];
        vox_connection_create_pair(&ends[0], &ends[1], limits);
        left = Ref(ends[0]);
        right = Ref(ends[1]);
    }
    ~Pair() override {
        vox_connection_cancel(left);
        vox_connection_cancel(right);
        // Cancelling what was never resumed ends it too; nothing is waited for.
        if (leftResumed) {
            EXPECT_TRUE(leftInbox.waitForError());
        }
        if (rightResumed) {
            EXPECT_TRUE(rightInbox.waitForError());
        }
    }
    void resumeLeft() {
        leftResumed = true;
        resumeWith(left, leftInbox, leftQueue);
    }
    void resumeRight() {
        rightResumed = true;
        resumeWith(right, rightInbox, rightQueue);
    }
    void resumeBoth() {
        resumeLeft();
        resumeRight();
    }
    // The right end answers every request with its number.
    void resumeEcho() {
        rightResumed = true;
        const dispatch::block<void(vox_object_t)> echo([this](vox_object_t event) {
            if (const Ref reply(vox_dictionary_create_reply(event)); vox_object_t(reply)) {
                vox_dictionary_set_value(reply, "n", vox_dictionary_get_value(event, "n"));
                EXPECT_EQ(vox_connection_send_message(right, reply), 0);
            } else {
                rightInbox.add(event);
            }
        });
        vox_connection_set_event_handler(right, &echo);
        vox_connection_set_target_queue(right, &rightQueue);
        vox_connection_resume(right);
    }

    Ref left;
    Ref right;
    dispatch::queue leftQueue = dispatch::queue::create("left");
    dispatch::queue rightQueue = dispatch::queue::create("right");
    Inbox leftInbox;
    Inbox rightInbox;
    bool leftResumed = false;
    bool rightResumed = false;
};
using VoxConnection = Pair;

TEST_F(VoxConnection, MessagesArriveInTheOrderSentFromBeforeTheResumeOn) {
    for (std::int64_t n = 0; n < 100; ++n)
        ASSERT_EQ(vox_connection_send_message(left, message(n)), 0);
    resumeBoth();
    for (std::int64_t n = 100; n < 20000; ++n)
        ASSERT_EQ(vox_connection_send_message(left, message(n, n % 1000 == 0 ? 100000 : 0)), 0);
    ASSERT_TRUE(rightInbox.wait(20000));
    EXPECT_EQ(rightInbox.numbers(), upTo(20000));
}

TEST_F(VoxConnection, EachThreadsMessagesKeepTheirOrder) {
    resumeBoth();
    constexpr std::int64_t kThreads = 4;
    constexpr std::int64_t kEach = 2000;
    std::vector<std::thread> senders;
    for (std::int64_t thread = 0; thread < kThreads; ++thread) {
        senders.emplace_back([this, thread] {
            for (std::int64_t n = 0; n < kEach; ++n)
                EXPECT_EQ(vox_connection_send_message(left, message(thread * kEach + n)), 0);
        });
    }
    for (std::thread& sender : senders)
        sender.join();
    ASSERT_TRUE(rightInbox.wait(kThreads * kEach));
    std::vector<std::int64_t> next(kThreads, 0);
    for (const std::int64_t number : rightInbox.numbers()) {
        std::int64_t& expected = next[static_cast<std::size_t>(number / kEach)];
        EXPECT_EQ(number % kEach, expected++);
    }
}

TEST_F(VoxConnection, AMessageMayBeChangedOnceItWasSent) {
    resumeBoth();
    const Ref changing = message(1);
    EXPECT_EQ(vox_connection_send_message(left, changing), 0);
    vox_dictionary_set_value(changing, "n", Ref(vox_int64_create(2)));
    EXPECT_EQ(vox_connection_send_message(left, changing), 0);
    ASSERT_TRUE(rightInbox.wait(2));
    EXPECT_EQ(rightInbox.numbers(), (std::vector<std::int64_t>{1, 2}));
}

TEST_F(VoxConnection, RequestsGetTheirOwnReplies) {
    resumeLeft();
    resumeEcho();
    const auto other = dispatch::queue::create("other");
    std::vector<Inbox> replies(500);
    for (std::size_t n = 0; n < replies.size(); ++n)
        request(left, message(static_cast<std::int64_t>(n)), n % 2 == 0 ? leftQueue : other,
                replies[n]);
    for (std::size_t n = 0; n < replies.size(); ++n) {
        ASSERT_TRUE(replies[n].wait(1));
        EXPECT_EQ(numberIn(replies[n].all().front()), static_cast<std::int64_t>(n));
    }
}

TEST_F(VoxConnection, RepliesOnTheTargetQueueKeepTheirPlaceAmongMessages) {
    resumeLeft();
    rightResumed = true;
    const dispatch::block<void(vox_object_t)> answer([this](vox_object_t event) {
        const Ref reply(vox_dictionary_create_reply(event));
        if (!vox_object_t(reply))
            return rightInbox.add(event);
        EXPECT_EQ(vox_connection_send_message(right, message(0)), 0);
        vox_dictionary_set_value(reply, "n", Ref(vox_int64_create(1)));
        EXPECT_EQ(vox_connection_send_message(right, reply), 0);
        EXPECT_EQ(vox_connection_send_message(right, message(2)), 0);
    });
    vox_connection_set_event_handler(right, &answer);
    vox_connection_resume(right);
    for (std::size_t round = 1; round <= 50; ++round) {
        request(left, message(7), leftQueue, leftInbox);
        ASSERT_TRUE(leftInbox.wait(3 * round));
    }
    const std::vector<std::int64_t> numbers = leftInbox.numbers();
    for (std::size_t i = 0; i < numbers.size(); ++i)
        ASSERT_EQ(numbers[i], static_cast<std::int64_t>(i % 3)) << i;
}

TEST_F(VoxConnection, ARequestIsAnsweredOnceFromAnyThread) {
    resumeBoth();
    Inbox replies;
    request(left, message(5), leftQueue, replies);
    EXPECT_EQ(vox_connection_send_message(left, message(6)), 0);
    ASSERT_TRUE(rightInbox.wait(2));
    const Ref asked = rightInbox.all()[0];
    const Ref told = rightInbox.all()[1];
    EXPECT_EQ(vox_dictionary_create_reply(told), nullptr) << "not a request";
    EXPECT_EQ(vox_dictionary_get_remote_connection(told), right);
    EXPECT_EQ(vox_dictionary_get_remote_connection(message(1)), nullptr);

    const Ref reply(vox_dictionary_create_reply(asked));
    ASSERT_NE(vox_object_t(reply), nullptr);
    EXPECT_EQ(vox_dictionary_create_reply(asked), nullptr) << "has got one";
    EXPECT_EQ(vox_dictionary_get_remote_connection(reply), right);
    EXPECT_EQ(vox_connection_send_message(left, reply), EINVAL) << "not the request's connection";
    vox_dictionary_set_value(reply, "bad", Ref(vox_string_create("\xFF")));
    EXPECT_EQ(vox_connection_send_message(right, reply), EILSEQ);
    vox_dictionary_set_value(reply, "bad", nullptr);
    std::thread([&] { EXPECT_EQ(vox_connection_send_message(right, reply), 0); }).join();
    EXPECT_EQ(vox_connection_send_message(right, reply), EALREADY);
    ASSERT_TRUE(replies.wait(1));
    EXPECT_EQ(vox_get_type(replies.all().front()), VOX_TYPE_DICTIONARY);
    EXPECT_EQ(vox_dictionary_create_reply(replies.all().front()), nullptr);
    // What was received may be passed on like any dictionary.
    EXPECT_EQ(vox_connection_send_message(right, asked), 0);
    ASSERT_TRUE(leftInbox.wait(1));
    EXPECT_EQ(numberIn(leftInbox.all().front()), 5);
}

TEST_F(VoxConnection, DescriptorsTravelInMessages) {
    resumeBoth();
    int ends[2];
    ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
    for (std::int64_t n = 0; n < 100; ++n) {
        const Ref carrier = message(n);
        for (const char* key : {"a", "b"})
            vox_dictionary_set_value(carrier, key, Ref(vox_fd_create(ends[1])));
        ASSERT_EQ(vox_connection_send_message(left, carrier), 0);
        ASSERT_EQ(vox_connection_send_message(left, message(n)), 0);
    }
    ::close(ends[1]);
    ASSERT_TRUE(rightInbox.wait(200));
    const int received = vox_fd_dup(vox_dictionary_get_value(rightInbox.all()[198], "b"));
    ASSERT_GE(received, 0);
    EXPECT_EQ(::write(received, "x", 1), 1);
    ::close(received);
    rightInbox.clear();
    char read[2];
    EXPECT_EQ(::read(ends[0], read, 2), 1);
    EXPECT_EQ(::read(ends[0], read, 2), 0) << "a duplicate of the writing end is still open";
    ::close(ends[0]);
}

TEST_F(VoxConnection, TellsWhoThePeerIs) {
    EXPECT_EQ(vox_connection_get_pid(left), ::getpid());
    EXPECT_EQ(vox_connection_get_uid(left), ::getuid());
    EXPECT_EQ(vox_connection_get_gid(left), ::getgid());
    EXPECT_STREQ(vox_connection_get_name(left), "");
    const Ref unconnected(vox_connection_create("net.example.nobody"));
    EXPECT_EQ(vox_connection_get_pid(unconnected), -1);
    EXPECT_STREQ(vox_connection_get_name(unconnected), "net.example.nobody");
}

TEST_F(VoxConnection, CountsWhatWentThrough) {
    resumeLeft();
    resumeEcho();
    for (std::int64_t n = 0; n < 10; ++n)
        EXPECT_EQ(vox_connection_send_message(left, message(n)), 0);
    Inbox replies;
    request(left, message(10), leftQueue, replies);
    ASSERT_TRUE(replies.wait(1));
    vox_statistics_t counts;
    vox_connection_get_statistics(left, &counts);
    EXPECT_EQ(counts.messages_sent, 11u);
    EXPECT_EQ(counts.messages_received, 1u);
    EXPECT_EQ(counts.messages_dropped, 0u);
    EXPECT_EQ(counts.queued_messages, 0u);
    EXPECT_EQ(counts.queued_bytes, 0u);
}

// ---- Suspending -----------------------------------------------------------------------

TEST_F(VoxConnection, WhileSuspendedNothingIsDelivered) {
    leftResumed = rightResumed = true;
    resumeWith(left, leftInbox);
    Event suspended;
    const dispatch::block<void(vox_object_t)> once([&](vox_object_t event) {
        rightInbox.add(event);
        if (vox_get_type(event) == VOX_TYPE_DICTIONARY && numberIn(event) % 10 == 0) {
            vox_connection_suspend(right);
            suspended.signal();
        }
    });
    for (std::int64_t n = 0; n < 35; ++n)
        EXPECT_EQ(vox_connection_send_message(left, message(n)), 0);
    vox_connection_set_event_handler(right, &once);
    vox_connection_set_target_queue(right, &rightQueue);
    vox_connection_resume(right);
    for (std::int64_t n = 0; n <= 30; n += 10) {
        ASSERT_TRUE(suspended.wait());
        plr::test::drain(rightQueue);
        EXPECT_EQ(rightInbox.numbers(), upTo(n + 1));
        vox_connection_resume(right);
    }
    ASSERT_TRUE(rightInbox.wait(35));
    EXPECT_EQ(rightInbox.numbers(), upTo(35));
}

TEST_F(VoxConnection, TheEndOfThePeerIsToldAfterTheResume) {
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

// ---- Ending ---------------------------------------------------------------------------

TEST_F(VoxConnection, CancellingTellsEveryOutstandingRequestOnceAndThenTheHandler) {
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

TEST_F(VoxConnection, NothingIsDeliveredAfterAHandlerCancelled) {
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

TEST(VoxConnectionEnd, DroppingTheLastReferenceCancels) {
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

TEST(VoxConnectionEnd, AHandlerThatHoldsItsConnectionIsReleasedAfterTheError) {
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

TEST(VoxConnectionEnd, LeavesNoDescriptorHoweverItEnds) {
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

TEST_F(VoxConnection, ABarrierRunsOnTheQueueBehindWhatWasSent) {
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

// ---- What cannot be sent --------------------------------------------------------------

class VoxLimits : public Pair {
  protected:
    static const vox_limits_t* limits() {
        static const vox_limits_t small = [] {
            vox_limits_t made = vox_limits_default();
            made.max_message_bytes = 1000;
            made.max_depth = 3;
            made.max_descriptors = 1;
            return made;
        }();
        return &small;
    }
    VoxLimits() : Pair(limits()) {}
};

TEST_F(VoxLimits, WhatThePeerWouldRefuseIsRefusedHere) {
    const Ref deep = message(1);
    const Ref deeper(vox_array_create());
    const Ref deepest(vox_array_create());
    vox_array_append_value(deepest, Ref(vox_array_create()));
    vox_array_append_value(deeper, deepest);
    vox_dictionary_set_value(deep, "deep", deeper);
    const Ref carrier = message(1);
    vox_dictionary_set_value(carrier, "a", Ref(vox_fd_create(0)));
    vox_dictionary_set_value(carrier, "b", Ref(vox_fd_create(0)));
    const Ref broken = message(1);
    vox_dictionary_set_value(broken, "text", Ref(vox_string_create("\xC3")));
    const Ref foreign = message(1);
    vox_dictionary_set_value(foreign, "connection", left);

    struct Row {
        const char* name;
        Ref message;
        int error;
    };
    const Row rows[] = {
        {"long", message(1, 1000), EMSGSIZE},
        {"deep", deep, EMSGSIZE},
        {"descriptors", carrier, EMSGSIZE},
        {"text", broken, EILSEQ},
        {"a connection", foreign, EINVAL},
        {"no dictionary", Ref(vox_int64_create(1)), EINVAL},
        {"null", Ref(vox_null_create()), EINVAL},
        {"fits", message(0, 900), 0},
    };
    for (const bool connected : {false, true}) {
        if (connected) {
            resumeBoth();
            ASSERT_TRUE(rightInbox.wait(1));
        }
        for (const Row& row : rows)
            EXPECT_EQ(vox_connection_send_message(left, row.message), row.error) << row.name;
        Inbox refused;
        request(left, rows[0].message, leftQueue, refused);
        EXPECT_EQ(vox_error_get_code(refused.waitForError()), VOX_ERROR_MESSAGE_REFUSED);
    }
    ASSERT_TRUE(rightInbox.wait(2));
    EXPECT_EQ(rightInbox.numbers(), (std::vector<std::int64_t>{0, 0}));
}

TEST(VoxConnectionStart, WhatWasSentBeforeThePeersLimitsWereKnownIsHeldAgainstThem) {
    const plr::test::Reports reports;
    auto [connection, peer] = plr::test::connectionWithRawPeer();
    Inbox inbox;
    Inbox refused;
    const auto queue = dispatch::queue::create("early");
    const Ref deep = message(3);
    const Ref inner(vox_array_create());
    vox_array_append_value(inner, Ref(vox_array_create()));
    vox_dictionary_set_value(deep, "deep", inner);
    EXPECT_EQ(vox_connection_send_message(connection, message(1)), 0);
    EXPECT_EQ(vox_connection_send_message(connection, message(2, 1000)), 0);
    EXPECT_EQ(vox_connection_send_message(connection, deep), 0);
    request(connection, message(4, 1000), queue, refused);
    EXPECT_EQ(vox_connection_send_message(connection, message(5)), 0);
    Event passed;
    const dispatch::block<void()> barrier([&] { passed.signal(); });
    vox_connection_send_barrier(connection, &barrier);
    resumeWith(connection, inbox);

    EXPECT_EQ(peer.readFrame().first.type, vox_link::frame_type::hello);
    vox_wire::encoded hello;
    vox_link::build_hello({.bytes = 100, .depth = 2, .descriptors = 0}, hello);
    peer.send(hello.bytes.view());
    for (const std::int64_t expected : {1, 5}) {
        const auto [header, body] = peer.readFrame();
        const char* why = nullptr;
        EXPECT_EQ(numberIn(Ref(vox_wire::decode(body, {}, {}, why))), expected);
    }
    EXPECT_TRUE(passed.wait());
    EXPECT_EQ(vox_error_get_code(refused.waitForError()), VOX_ERROR_MESSAGE_REFUSED);
    EXPECT_EQ(reports.count("over its limits"), 3u);
    vox_statistics_t counts;
    vox_connection_get_statistics(connection, &counts);
    EXPECT_EQ(counts.messages_dropped, 3u);
    vox_connection_cancel(connection);
    EXPECT_TRUE(inbox.waitForError());
}

TEST(VoxTransaction, CountsWhatIsUnderWay) {
    EXPECT_EQ(vox_transaction_count(), 0u);
    vox_transaction_begin();
    vox_transaction_begin();
    EXPECT_EQ(vox_transaction_count(), 2u);
    vox_transaction_end();
    vox_transaction_end();
    EXPECT_EQ(vox_transaction_count(), 0u);
    EXPECT_DEATH(vox_transaction_end(), "vox_transaction_end");
}

}  // namespace
