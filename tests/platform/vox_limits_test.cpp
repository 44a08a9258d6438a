// What cannot be sent, and transactions.
#include <gtest/gtest.h>

#include <cerrno>

#include "support/vox_pair.h"
#include "support/vox_raw_peer.h"

namespace {

using plr::test::Event;
using plr::test::Inbox;
using plr::test::message;
using plr::test::numberIn;
using plr::test::Pair;
using plr::test::Ref;
using plr::test::request;
using plr::test::resumeWith;

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
