// What both ends of a connection can rely on while it lasts.

#include <random>
#include <thread>

#include "support/vox_pair.h"
#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using VoxConnection = Pair;

TEST_F(VoxConnection, MessagesArriveInTheOrderSentFromBeforeTheResumeOn) {
    for (std::int64_t n = 0; n < 100; ++n)
        ASSERT_EQ(left.send(message(n)), 0);
    resumeBoth();
    const Ref changing = message(0);  // encoded before the call returns
    for (std::int64_t n = 100; n < 20000; ++n) {
        vox_dictionary_set_value(changing, "n", number(n));
        ASSERT_EQ(left.send(n % 1000 == 0 ? message(n, 100000) : changing), 0);
    }
    ASSERT_TRUE(right.inbox.wait(20000));
    EXPECT_EQ(right.inbox.numbers(), upTo(20000));
}

TEST_F(VoxConnection, EachThreadsMessagesKeepTheirOrder) {
    resumeBoth();
    constexpr std::int64_t kEach = 2000;
    Threads(4, [this](unsigned thread) {
        for (std::int64_t n = 0; n < kEach; ++n)
            EXPECT_EQ(left.send(message(thread * kEach + n)), 0);
    });
    ASSERT_TRUE(right.inbox.wait(4 * kEach));
    Numbers next = {0, kEach, 2 * kEach, 3 * kEach};
    for (const std::int64_t n : right.inbox.numbers())
        EXPECT_EQ(n, next[static_cast<std::size_t>(n / kEach)]++);
}

TEST_F(VoxConnection, RequestsGetTheirOwnRepliesInAnyOrder) {
    constexpr std::size_t kRequests = 500;
    resumeBoth();
    const auto other = dispatch::queue::create("other");
    std::vector<Inbox> replies(kRequests);
    for (std::size_t n = 0; n < kRequests; ++n)
        left.request(message(static_cast<std::int64_t>(n)), replies[n],
                     n % 2 == 0 ? left.queue : other);
    ASSERT_TRUE(right.inbox.wait(kRequests));
    std::vector<Ref> requests = right.inbox.all();
    std::shuffle(requests.begin(), requests.end(), std::mt19937(1));
    for (const Ref& request : requests)
        EXPECT_EQ(right.answer(request), 0);
    for (std::size_t n = 0; n < kRequests; ++n) {
        ASSERT_TRUE(replies[n].wait(1));
        EXPECT_EQ(replies[n].numbers(), Numbers{static_cast<std::int64_t>(n)});
    }
    const vox_statistics_t counts = left.counts();
    EXPECT_EQ(counts.messages_sent, kRequests);
    EXPECT_EQ(counts.messages_received, kRequests);
    EXPECT_EQ(counts.queued_messages + counts.queued_bytes + counts.messages_dropped, 0u);
}

TEST_F(VoxConnection, RepliesOnTheTargetQueueKeepTheirPlaceAmongMessages) {
    left.resume();
    right.resume([this](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_ERROR)
            return false;
        return right.send(message(0)) + right.answer(event) + right.send(message(2)) == 0;
    });
    for (std::size_t round = 1; round <= 50; ++round) {
        left.request(message(1), left.inbox);
        ASSERT_TRUE(left.inbox.wait(3 * round));
    }
    const Numbers numbers = left.inbox.numbers();
    for (std::size_t i = 0; i < numbers.size(); ++i)
        ASSERT_EQ(numbers[i], static_cast<std::int64_t>(i % 3)) << i;
}

TEST_F(VoxConnection, ARequestIsAnsweredOnceFromAnyThread) {
    resumeBoth();
    Inbox replies;
    left.request(message(5), replies);
    EXPECT_EQ(left.send(message(6)), 0);
    ASSERT_TRUE(right.inbox.wait(2));
    const Ref asked = right.inbox.all()[0];
    const Ref told = right.inbox.all()[1];
    EXPECT_EQ(vox_dictionary_create_reply(told), nullptr) << "not a request";
    EXPECT_EQ(vox_dictionary_get_remote_connection(told), right);
    EXPECT_EQ(vox_dictionary_get_remote_connection(message(1)), nullptr);

    const Ref reply(vox_dictionary_create_reply(asked));
    EXPECT_EQ(vox_dictionary_create_reply(asked), nullptr) << "has got one";
    EXPECT_EQ(vox_dictionary_get_remote_connection(reply), right);
    EXPECT_EQ(left.send(reply), EINVAL) << "not the request's connection";
    vox_dictionary_set_value(reply, "bad", text("\xFF"));
    EXPECT_EQ(right.send(reply), EILSEQ);
    vox_dictionary_set_value(reply, "bad", nullptr);
    std::thread([&] { EXPECT_EQ(right.send(reply), 0); }).join();
    EXPECT_EQ(right.send(reply), EALREADY);
    ASSERT_TRUE(replies.wait(1));
    EXPECT_EQ(vox_dictionary_create_reply(replies[0]), nullptr);
    // What was received may be passed on like any dictionary.
    EXPECT_EQ(right.send(asked), 0);
    ASSERT_TRUE(left.inbox.wait(1));
    EXPECT_EQ(left.inbox.numbers(), Numbers{5});
}

TEST_F(VoxConnection, TellsWhoThePeerIs) {
    EXPECT_EQ(vox_connection_get_pid(left), ::getpid());
    EXPECT_EQ(vox_connection_get_uid(left), ::getuid());
    EXPECT_EQ(vox_connection_get_gid(left), ::getgid());
    EXPECT_STREQ(vox_connection_get_name(left), "");
    EXPECT_EQ(vox_connection_get_pid(Ref(vox_connection_create("net.example.nobody"))), -1);
}

TEST_F(VoxConnection, WhatAHandlerSentLeavesWhileItBlocks) {
    Event answered;
    right.resume([&](vox_object_t event) {
        if (numberIn(event) == 1) {
            EXPECT_EQ(right.send(message(1)), 0);
            EXPECT_TRUE(answered.wait()) << "kept for the end of the turn";
        }
        return false;
    });
    // More messages wait behind the one whose handler blocks.
    for (std::int64_t n = 1; n <= 10; ++n)
        EXPECT_EQ(left.send(message(n)), 0);
    left.resume([&](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
            answered.signal();
        return false;
    });
    EXPECT_TRUE(right.inbox.wait(10));
}

TEST_F(VoxConnection, WhileSuspendedNothingIsDelivered) {
    left.resume();
    Event suspended;
    for (std::int64_t n = 0; n < 35; ++n)
        EXPECT_EQ(left.send(message(n)), 0);
    right.resume([&](vox_object_t event) {
        right.inbox.add(event);
        if (vox_get_type(event) == VOX_TYPE_DICTIONARY && numberIn(event) % 10 == 0) {
            vox_connection_suspend(right);
            suspended.signal();
        }
        return true;
    });
    for (std::int64_t n = 0; n <= 30; n += 10) {
        ASSERT_TRUE(suspended.wait());
        drain(right.queue);
        EXPECT_EQ(right.inbox.numbers(), upTo(n + 1));
        vox_connection_resume(right);
    }
    ASSERT_TRUE(right.inbox.wait(35));
    EXPECT_EQ(right.inbox.numbers(), upTo(35));
}

// ---- What cannot be sent ------------------------------------------------------------

vox_limits_t smallLimits() {
    vox_limits_t made = vox_limits_default();
    made.max_message_bytes = 1000;
    made.max_depth = 3;
    made.max_descriptors = 1;
    return made;
}

class VoxLimits : public Pair {
  protected:
    VoxLimits() : Pair(&limits_) {}
    static inline const vox_limits_t limits_ = smallLimits();
};

TEST_F(VoxLimits, WhatThePeerWouldRefuseIsRefusedHere) {
    const Ref fd(vox_fd_create(0));
    const struct {
        const char* name;
        Ref message;
        int error;
    } rows[] = {
        {"long", message(1, 1000), EMSGSIZE},
        {"deep", dictionary({{"deep", nested(3)}}), EMSGSIZE},
        {"descriptors", dictionary({{"a", fd}, {"b", fd}}), EMSGSIZE},
        {"text", dictionary({{"text", text("\xC3")}}), EILSEQ},
        {"a connection", dictionary({{"connection", left}}), EINVAL},
        {"no dictionary", number(1), EINVAL},
        {"fits", message(0, 900), 0},
    };
    for (const bool connected : {false, true}) {
        if (connected) {
            resumeBoth();
            ASSERT_TRUE(right.inbox.wait(1));
        }
        for (const auto& row : rows)
            EXPECT_EQ(left.send(row.message), row.error) << row.name;
        Inbox refused;
        left.request(rows[0].message, refused);
        EXPECT_EQ(refused.errorCode(), VOX_ERROR_MESSAGE_REFUSED);
    }
    ASSERT_TRUE(right.inbox.wait(2));
    EXPECT_EQ(right.inbox.numbers(), (Numbers{0, 0}));
}

TEST(VoxConnectionStart, WhatWasSentBeforeThePeersLimitsWereKnownIsHeldAgainstThem) {
    const Reports reports;
    RawPair pair;
    Inbox refused;
    for (const Ref& early :
         {message(1), message(2, 1000), dictionary({{"deep", nested(2)}}), message(5)})
        EXPECT_EQ(pair.end.send(early), 0);
    pair.end.request(message(4, 1000), refused);
    Event passed;
    const dispatch::block<void()> barrier([&] { passed.signal(); });
    vox_connection_send_barrier(pair.end, &barrier);
    pair.end.resume();

    EXPECT_EQ(pair.peer.readFrame().first.type, vox_link::frame_type::hello);
    pair.peer.send(hello({.bytes = 100, .depth = 2, .descriptors = 0}));
    for (const std::int64_t expected : {1, 5})
        EXPECT_EQ(numberIn(pair.peer.readFrame().second), expected);
    EXPECT_TRUE(passed.wait());
    EXPECT_EQ(refused.errorCode(), VOX_ERROR_MESSAGE_REFUSED);
    EXPECT_EQ(reports.count("over its limits"), 3u);
    EXPECT_EQ(pair.end.counts().messages_dropped, 3u);
}

TEST(VoxTransaction, CountsWhatIsUnderWay) {
    vox_transaction_begin();
    vox_transaction_begin();
    EXPECT_EQ(vox_transaction_count(), 2u);
    vox_transaction_end();
    vox_transaction_end();
    EXPECT_EQ(vox_transaction_count(), 0u);
    EXPECT_DEATH(vox_transaction_end(), "vox_transaction_end");
}

}  // namespace
