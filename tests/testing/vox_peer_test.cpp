#include "plr/test/vox_peer.h"

#include <gtest/gtest.h>

#include <atomic>

#include "plr/ipc/read.h"
#include "plr/ipc/values.h"
#include "plr/test/waiting.h"

namespace {

using plr::test::Event;
using plr::test::VoxPeer;

vox::dict message(std::int64_t n) {
    const vox::dict made = vox::dict::create();
    made["n"] = vox::int64(n);
    return made;
}
std::int64_t numberIn(const vox::object& message) {
    return vox::dyn_cast_or_default(vox::dict(message)["n"], std::int64_t{-1});
}

TEST(VoxPeer, SpeaksListensAndAnswers) {
    VoxPeer peer;
    Event arrived;
    const vox::connection tested = peer.tested();
    tested.set_event_handler([&](const vox::object& event) {
        if (numberIn(event) == 1)
            arrived.signal();
    });
    tested.resume();
    EXPECT_EQ(peer.send(message(1)), 0);
    EXPECT_TRUE(arrived.wait());
    EXPECT_EQ(tested.send_message(message(2)), 0);
    peer.answerWith([](const vox::dict& request, vox::dict& reply) {
        reply["n"] = vox::int64(numberIn(request) + 1);
        return true;
    });
    Event answered;
    std::atomic<std::int64_t> answer = 0;
    tested.send_message_with_reply(
        message(3), dispatch::queue::global(),
        dispatch::block<void(vox::object)>([&](const vox::object& reply) {
            answer = numberIn(reply);
            answered.signal();
        }));
    EXPECT_TRUE(answered.wait());
    EXPECT_EQ(answer, 4);
    EXPECT_TRUE(peer.waitForMessages(2));
    const auto messages = peer.takeMessages();
    ASSERT_EQ(messages.size(), 2u);
    EXPECT_EQ(numberIn(messages[0]), 2);
    EXPECT_EQ(numberIn(messages[1]), 3);
    tested.cancel();
    EXPECT_TRUE(peer.waitForEnd());
}

TEST(VoxPeer, HangsAndDies) {
    VoxPeer peer;
    Event died;
    peer.tested().set_event_handler([&](const vox::object& event) {
        if (event.type() == VOX_TYPE_ERROR)
            died.signal();
    });
    peer.tested().resume();
    peer.pauseReading();
    EXPECT_EQ(peer.tested().send_message(message(1)), 0);
    EXPECT_TRUE(peer.takeMessages().empty());
    peer.resumeReading();
    EXPECT_TRUE(peer.waitForMessages(1));
    peer.pauseReading();
    peer.hangUp();
    EXPECT_TRUE(died.wait());
}

}  // namespace
