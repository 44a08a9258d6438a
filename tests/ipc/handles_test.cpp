#include <unistd.h>

#include "plr/ipc.h"
#include "support/waiting.h"

namespace {

using namespace std::chrono_literals;
using plr::test::Event;

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
    EXPECT_EQ(none.peer().pid, -1);
    EXPECT_FALSE(
        none.send_request({}, 1ms, queue, dispatch::block<void(vox::object)>([](auto&&) {})));
    EXPECT_FALSE(vox::request().cancel());
    vox::listener().set_policy({});
    EXPECT_EQ(vox::listener().listener_statistics().clients, 0U);
}

TEST(Connection, GivesRequestsUpInTimeAndOnDemand) {
    const auto [asker, answerer] = vox::connection::create_pair();
    Event asked;
    Event given;
    answerer.set_event_handler([&asked, &given](const vox::object& event) {
        if (const vox::dict request(event); request) {
            EXPECT_FALSE(vox::is_cancelled(request));
            // Kept by its own handler, which goes when it is given up.
            EXPECT_TRUE(vox::set_cancel_handler(request, dispatch::block<void()>([request, &given] {
                                                    EXPECT_TRUE(vox::is_cancelled(request));
                                                    given.signal();
                                                })));
            asked.signal();
        }
    });
    asker.resume();
    answerer.resume();
    EXPECT_EQ(asker.peer().pid, ::getpid());
    EXPECT_EQ(answerer.peer().uid, ::getuid());
    const auto queue = dispatch::queue::create("replies");
    Event over;
    std::int64_t code = 0;  // touched on the queue only
    const dispatch::block<void(vox::object)> handler([&](const vox::object& reply) {
        code = vox_error_get_code(reply.get());
        over.signal();
    });
    const vox::request patient = asker.send_request(vox::dict::create(), 24h, queue, handler);
    EXPECT_TRUE(asked.wait());
    EXPECT_TRUE(patient.cancel());
    EXPECT_TRUE(over.wait() && given.wait());
    EXPECT_EQ(queue.sync([&] { return code; }), VOX_ERROR_REQUEST_CANCELLED);
    EXPECT_FALSE(patient.cancel());
    // Not the first: it might be given up before the other's hello, and never leave.
    EXPECT_TRUE(asker.send_request(vox::dict::create(), 1ms, queue, handler));
    EXPECT_TRUE(over.wait() && asked.wait() && given.wait());
    EXPECT_EQ(queue.sync([&] { return code; }), VOX_ERROR_REQUEST_TIMED_OUT);
    asker.cancel();
}

}  // namespace
