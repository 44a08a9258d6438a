#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "plr/ipc.h"

namespace {

TEST(Object, IsNeverEmpty) {
    vox::object moved = vox::int64(1);
    const vox::object taken = std::move(moved);
    const std::pair<const char*, vox::object> cases[] = {
        {"default", vox::object()},
        {"adopted null", vox::object::adopt(nullptr)},
        {"moved from", moved},
        {"dict of a number", vox::dict(vox::int64(1))},
        {"array of a dictionary", vox::array(vox::dict::create())},
        {"connection of a string", vox::connection(vox::string("x"))},
        {"endpoint of a string", vox::endpoint(vox::string("x"))},
        {"entry of no dictionary", vox::dict()["k"]},
        {"past the end", vox::array::create()[0]},
    };
    for (const auto& [name, value] : cases) {
        EXPECT_NE(value.get(), nullptr) << name;
        EXPECT_EQ(value.type(), VOX_TYPE_NULL) << name;
        EXPECT_FALSE(value) << name;
    }
    EXPECT_EQ(taken, vox::int64(1));
}

TEST(ObjectProxy, ReadsByTypeAndStoresEveryKind) {
    const vox::dict values = vox::dict::create();
    vox::object moved = vox::string("text");
    values["object"] = std::move(moved);
    EXPECT_EQ(moved.type(), VOX_TYPE_NULL);  // NOLINT(bugprone-use-after-move): so it says
    values["array"] = vox::array::create();
    values["copy"] = values["object"];
    values["missing"] = values["no such key"];

    EXPECT_EQ(vox::object(values["copy"]).text(), "text");
    EXPECT_TRUE(vox::array(values["array"]));
    EXPECT_FALSE(vox::dict(values["array"]));
    const vox::dict converted = values["array"];
    EXPECT_FALSE(converted);
    EXPECT_TRUE(values.contains("missing"));
    EXPECT_EQ(values.count(), 4U);
}

TEST(ObjectProxy, AssigningNullKeepsTheKey) {
    const vox::dict values = vox::dict::create();
    values["k"] = vox::int64(1);
    values["k"] = nullptr;
    values["new"] = nullptr;
    EXPECT_EQ(values.to_string(), "{\n\t\"k\": null,\n\t\"new\": null\n}");
    const vox::dict none;
    none["k"] = vox::int64(1);
    EXPECT_EQ(none.count(), 0U);
    EXPECT_EQ(none.type(), VOX_TYPE_NULL);
}

TEST(Values, StringsComeFromFormatsAndFromTextAsItIs) {
    EXPECT_EQ(vox::string("%d%%", 5).text(), "5%");
    EXPECT_EQ(vox::string(std::string("%d%%")).text(), "%d%%");
    EXPECT_EQ(vox::string(std::string_view("a\0b", 3)).text(), std::string_view("a\0b", 3));
    EXPECT_EQ(vox::int64(1).text(), "");
}

TEST(Connection, TheNullObjectSendsNothing) {
    const vox::connection none;
    EXPECT_EQ(none.send_message(vox::dict::create()), ENOTCONN);
    none.set_event_handler([](const vox::object&) { FAIL(); });
    none.set_target_queue(dispatch::queue::global());
    none.resume();
    none.cancel();
    none.send_barrier(dispatch::block<void()>([] { FAIL(); }));
    const auto queue = dispatch::queue::create("replies");
    int replies = 0;  // touched on the queue only
    none.send_message_with_reply(vox::dict::create(), queue,
                                 dispatch::block<void(vox::object)>([&](const vox::object& reply) {
                                     ++replies;
                                     EXPECT_EQ(reply.type(), VOX_TYPE_ERROR);
                                 }));
    EXPECT_EQ(queue.sync([&] { return replies; }), 1);
    EXPECT_FALSE(vox::endpoint().connect());
    EXPECT_EQ(none.statistics().messages_sent, 0U);
}

}  // namespace
