#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <numeric>
#include <vector>

#include "support/vox_test.h"

namespace plr::test {

// 0, 1, … count - 1
inline std::vector<std::int64_t> upTo(std::int64_t count) {
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

}  // namespace plr::test
