// What both ends of a connection can rely on while it lasts.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <thread>
#include <vector>

#include "support/vox_pair.h"

namespace {

using plr::test::Event;
using plr::test::Inbox;
using plr::test::message;
using plr::test::numberIn;
using plr::test::Ref;
using plr::test::request;
using plr::test::resumeWith;
using plr::test::upTo;
using VoxConnection = plr::test::Pair;

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

TEST_F(VoxConnection, WhatAHandlerSentLeavesWhileItBlocks) {
    Event answered;
    const dispatch::block<void(vox_object_t)> blocks([&](vox_object_t event) {
        rightInbox.add(event);
        if (vox_get_type(event) == VOX_TYPE_DICTIONARY && numberIn(event) == 0) {
            EXPECT_EQ(vox_connection_send_message(right, message(1)), 0);
            EXPECT_TRUE(answered.wait()) << "kept for the end of the turn";
        }
    });
    const dispatch::block<void(vox_object_t)> answers([&](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
            answered.signal();
        else
            leftInbox.add(event);
    });
    // More messages wait behind the one whose handler blocks.
    for (std::int64_t n = 0; n < 10; ++n)
        EXPECT_EQ(vox_connection_send_message(left, message(n)), 0);
    leftResumed = rightResumed = true;
    vox_connection_set_event_handler(left, &answers);
    vox_connection_resume(left);
    vox_connection_set_event_handler(right, &blocks);
    vox_connection_resume(right);
    ASSERT_TRUE(rightInbox.wait(10));
    EXPECT_EQ(rightInbox.numbers(), upTo(10));
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

}  // namespace
