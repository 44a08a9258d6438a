// How requests end: by reply, time limit, cancellation, refusal or the end of the
// connection, and never twice.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <random>
#include <thread>

#include "support/vox_pair.h"
#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using vox_link::frame_type;

constexpr std::uint32_t kSoon = 5;  // ms
constexpr std::uint32_t kLong = 3'600'000;

dispatch::block<void(vox_object_t)> into(Inbox& replies) {
    return dispatch::block<void(vox_object_t)>(
        [&replies](vox_object_t reply) { replies.add(reply); });
}
std::uint64_t request(End& from, Inbox& replies, std::uint32_t timeout, std::int64_t n = 1) {
    const auto handler = into(replies);
    return vox_connection_send_request(from, message(n), timeout, &from.queue, &handler);
}
int onCancel(vox_object_t message, Event& happened) {
    const dispatch::block<void()> handler([&happened] { happened.signal(); });
    return vox_dictionary_set_cancel_handler(message, &handler);
}

class VoxRequest : public Pair {
  protected:
    VoxRequest() {
        resumeBoth();
        // What is given up before the other's hello never leaves.
        static_cast<void>(right.send(message(0)));
        EXPECT_TRUE(left.inbox.wait(1));
        left.inbox.clear();
    }
    // A request of the left end as it arrived on the right.
    Ref arrived(std::uint32_t timeout) {
        id = request(left, replies, timeout);
        EXPECT_TRUE(right.inbox.wait(1));
        const Ref found = right.inbox.all().at(0);
        right.inbox.clear();
        return found;
    }
    Inbox replies;
    std::uint64_t id = 0;
};

TEST_F(VoxRequest, ThatIsOverInTimeTellsTheServiceWhichSendsNoReply) {
    const Ref late = arrived(kSoon);
    Event cancelled;
    EXPECT_EQ(onCancel(late, cancelled), 0);
    EXPECT_EQ(replies.errorCode(), VOX_ERROR_REQUEST_TIMED_OUT);
    EXPECT_EQ(left.counts().pending_replies, 0u);
    EXPECT_EQ(vox_connection_cancel_request(left, id), ESRCH);
    EXPECT_TRUE(cancelled.wait());
    EXPECT_EQ(vox_dictionary_is_cancelled(late), 1);
    EXPECT_EQ(right.counts().open_requests, 1u) << "the service still has it";
    const Ref reply(vox_dictionary_create_reply(late));
    EXPECT_EQ(vox_dictionary_is_cancelled(reply), 1);
    EXPECT_EQ(right.send(reply), ECANCELED);
}

TEST_F(VoxRequest, ThatIsCancelledTellsTheHandlerThatWasSetLast) {
    const Ref request = arrived(0);
    Event first;
    Event second;
    EXPECT_EQ(onCancel(request, first), 0);
    const Ref reply(vox_dictionary_create_reply(request));
    EXPECT_EQ(onCancel(reply, second), 0);
    EXPECT_EQ(vox_dictionary_is_cancelled(reply), 0);
    EXPECT_EQ(vox_connection_cancel_request(left, id), 0);
    EXPECT_EQ(vox_connection_cancel_request(left, id), ESRCH);
    EXPECT_EQ(replies.errorCode(), VOX_ERROR_REQUEST_CANCELLED);
    EXPECT_TRUE(second.wait());
    Event late;
    EXPECT_EQ(onCancel(request, late), 0);
    EXPECT_TRUE(late.wait()) << "it runs at once";
    drain(right.queue);
    EXPECT_EQ(replies.all().size(), 1u);
}

// How the service lets go of a request, and what is left of it.
TEST_F(VoxRequest, IsOpenUntilTheServiceLetsGoOfIt) {
    const auto made = [](Ref& request) {
        Ref reply(vox_dictionary_create_reply(request));
        request = Ref();
        return reply;
    };
    struct Row {
        const char* name;
        std::function<void(Ref&)> let_go;
        bool answered;
    };
    for (const Row& row :
         {Row{"answered", [&](Ref& request) { EXPECT_EQ(right.answer(request), 0); }, true},
          Row{"released", [](Ref& request) { request = Ref(); }, false},
          Row{"its reply released", [&](Ref& request) { made(request); }, false},
          Row{"its reply sent later",
              [&](Ref& request) { EXPECT_EQ(right.send(made(request)), 0); }, true}}) {
        SCOPED_TRACE(row.name);
        replies.clear();
        Ref held = arrived(0);
        Event never;
        EXPECT_EQ(onCancel(held, never), 0);
        EXPECT_EQ(right.counts().open_requests, 1u);
        row.let_go(held);
        drain(right.queue);  // which delivered it
        EXPECT_EQ(right.counts().open_requests, 0u);
        if (vox_object_t(held)) {
            EXPECT_EQ(vox_dictionary_is_cancelled(held), 0);
            EXPECT_EQ(onCancel(held, never), EINVAL);
        }
        EXPECT_TRUE(!row.answered || replies.wait(1));
        EXPECT_EQ(vox_connection_cancel_request(left, id), row.answered ? ESRCH : 0);
        EXPECT_TRUE(replies.wait(1));
    }
    EXPECT_EQ(vox_dictionary_is_cancelled(message(1)), 0);
}

TEST_F(VoxRequest, OfAnAskerThatDiesIsCancelled) {
    const Ref held = arrived(kLong);
    Event cancelled;
    EXPECT_EQ(onCancel(held, cancelled), 0);
    vox_connection_cancel(left);
    EXPECT_TRUE(cancelled.wait());
    EXPECT_EQ(right.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(vox_dictionary_is_cancelled(held), 1);
    EXPECT_EQ(right.counts().open_requests, 0u);
    const Ref reply(vox_dictionary_create_reply(held));
    EXPECT_EQ(right.send(reply), EPIPE);
    EXPECT_EQ(vox_dictionary_is_cancelled(reply), 1);
    EXPECT_EQ(replies.errorCode(), VOX_ERROR_CONNECTION_INVALID);
}

using VoxRequestRace = Pair;

TEST_F(VoxRequestRace, CallsEachHandlerOnceAndLeavesNothing) {
    constexpr std::int64_t kRequests = 4000;
    left.resume();
    right.resume([this](vox_object_t event) {
        return vox_get_type(event) != VOX_TYPE_ERROR && numberIn(event) % 2 == 0 &&
               right.answer(event) != EINVAL;
    });
    std::vector<std::atomic<int>> calls(kRequests);
    std::array<std::atomic<int>, 6> ways{};  // by the code of the error; 0 for a reply
    Event ended;
    const auto ask = [&](std::int64_t n, std::uint32_t timeout) {
        const dispatch::block<void(vox_object_t)> handler([&, n](vox_object_t reply) {
            ++calls[static_cast<std::size_t>(n)];
            ++ways.at(static_cast<std::size_t>(vox_error_get_code(reply)));
            ended.signal();
        });
        return vox_connection_send_request(left, message(n), timeout, &left.queue, &handler);
    };
    Threads(2, [&](unsigned first) {
        std::mt19937 random(first);
        for (std::int64_t n = first; n < kRequests; n += 2) {
            // Those that are not answered have a time limit.
            const auto timeout =
                static_cast<std::uint32_t>(n % 2 == 0 ? random() % 3 : 1 + random() % 3);
            const std::uint64_t number = ask(n, timeout);
            if (random() % 3 == 0)
                static_cast<void>(vox_connection_cancel_request(left, number - random() % 3));
        }
    });
    for (std::int64_t n = 0; n < kRequests; ++n)
        ASSERT_TRUE(ended.wait());
    drain(left.queue);
    EXPECT_TRUE(
        std::all_of(calls.begin(), calls.end(), [](const auto& count) { return count == 1; }));
    for (const auto way : {0, int{VOX_ERROR_REQUEST_TIMED_OUT}, int{VOX_ERROR_REQUEST_CANCELLED}})
        EXPECT_GT(ways.at(static_cast<std::size_t>(way)), 0) << way;
    EXPECT_EQ(left.counts().pending_replies, 0u);
    EXPECT_TRUE(eventually([&] {
        right.inbox.clear();  // more may come
        return right.counts().open_requests == 0;
    }));
}

TEST(VoxRequests, ByTheHundredThousandHaveOneTimerAndEndTogether) {
    constexpr std::uint32_t kRequests = 100'000;
    vox_limits_t limits = vox_limits_default();
    limits.max_pending_replies = limits.max_open_requests = kRequests;
    Inbox replies;
    RawPair pair(&limits);
    pair.start();
    std::thread reader([&] { static_cast<void>(pair.peer.read()); });
    for (std::uint32_t n = 0; n < kRequests; ++n)
        ASSERT_NE(request(pair.end, replies, 100 + n % 2), 0u);
    EXPECT_TRUE(replies.wait(kRequests));
    EXPECT_EQ(pair.end.counts().pending_replies, 0u);
    for (const Ref& reply : replies.all())
        ASSERT_EQ(vox_error_get_code(reply), VOX_ERROR_REQUEST_TIMED_OUT);
    vox_connection_cancel(pair.end);
    reader.join();
}

TEST(VoxRequests, GivenUpBeforeTheHelloAreNotSent) {
    Inbox replies;
    RawPair pair;
    pair.end.resume();
    EXPECT_NE(request(pair.end, replies, kSoon, 1), 0u);
    const std::uint64_t cancelled = request(pair.end, replies, 0, 2);
    EXPECT_EQ(vox_connection_cancel_request(pair.end, cancelled), 0);
    ASSERT_TRUE(replies.wait(2));
    EXPECT_NE(request(pair.end, replies, kLong, 3), 0u);
    pair.peer.send(hello());
    EXPECT_EQ(pair.peer.readFrame().first.type, frame_type::hello);
    const auto [header, body] = pair.peer.readFrame();
    EXPECT_EQ(header.type, frame_type::request);
    EXPECT_EQ(numberIn(body), 3);
}

TEST(VoxRequests, ThatAreOpenCannotBeMadeAgain) {
    for (const bool cancelled : {false, true}) {
        RawPair pair;
        pair.start();
        pair.peer.send(frame({.type = frame_type::cancel, .id = 7}, Bytes{0xf6}));  // nothing
        pair.peer.send(frame({.type = frame_type::request, .id = 7}, message(1)));
        if (cancelled)
            pair.peer.send(frame({.type = frame_type::cancel, .id = 7}, Bytes{0xf6}));
        pair.peer.send(frame({.type = frame_type::request, .id = 7}, message(2)));
        pair.end.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, "request 7 is open");
        EXPECT_EQ(pair.end.inbox.numbers(), Numbers{1});
    }
}

}  // namespace
