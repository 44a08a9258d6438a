// Vox between real processes: this program is also the service, when it is
// called with arguments.
#include <gtest/gtest.h>
#include <sys/time.h>

#include <csignal>
#include <memory>
#include <string>
#include <vector>

#include "support/service_process.h"
#include "support/vox_service.h"

namespace {

using plr::test::Event;
using plr::test::Inbox;
using plr::test::message;
using plr::test::Ref;
using plr::test::ServiceProcess;
using plr::test::TestClient;

constexpr const char* kName = "net.example.process";

// What the service does with a request: its "n".
enum Wish : std::int64_t {
    kNeverAnswer = -1,
    kEndpoint = -2,   // "endpoint" of an anonymous listener in the reply
    kExitAfter = -3,  // the reply, and then the end of the process
};

void answer(vox_connection_t to, vox_connection_t hidden, vox_object_t event) {
    const std::int64_t wish = plr::test::numberIn(event);
    if (wish == kNeverAnswer)
        return;
    const Ref reply(vox_dictionary_create_reply(event));
    if (!vox_object_t(reply))
        return;
    vox_dictionary_set_value(reply, "n", Ref(vox_int64_create(wish)));
    vox_dictionary_set_value(reply, "pid", Ref(vox_int64_create(vox_connection_get_pid(to))));
    if (wish == kEndpoint)
        vox_dictionary_set_value(reply, "endpoint", Ref(vox_endpoint_create(hidden)));
    static_cast<void>(vox_connection_send_message(to, reply));
    if (wish == kExitAfter) {
        const dispatch::block<void()> leave([] { ::_exit(0); });
        vox_connection_send_barrier(to, &leave);
    }
}

void serve(vox_connection_t listener, vox_connection_t hidden) {
    const dispatch::block<void(vox_object_t)> taker([hidden](vox_object_t client) {
        if (vox_get_type(client) != VOX_TYPE_CONNECTION)
            return;
        const dispatch::block<void(vox_object_t)> handler(
            [hidden, own = Ref::retain(client)](vox_object_t event) {
                answer(own, hidden, event);
            });
        vox_connection_set_event_handler(client, &handler);
        vox_connection_resume(client);
    });
    vox_connection_set_event_handler(listener, &taker);
    vox_connection_resume(listener);
}

// The service process: says "ready" and runs until it is killed.
[[noreturn]] void serviceMain() {
    const vox_connection_t hidden = vox_connection_create_anonymous_listener(nullptr);
    serve(hidden, nullptr);
    serve(vox_connection_create_listener(kName, nullptr), hidden);
    plr::test::serviceIsReady();
}

class VoxProcess : public ::testing::Test {
  protected:
    plr::test::RuntimeDirectory directory;
    dispatch::queue queue = dispatch::queue::create("test");
};

TEST_F(VoxProcess, ProcessesKnowEachOtherAndExchangeMessages) {
    const ServiceProcess service;
    TestClient client(vox_connection_create(kName));
    EXPECT_TRUE(client.works());
    EXPECT_EQ(vox_connection_get_pid(client.connection()), service.pid());
    Inbox replies;
    for (std::int64_t n = 0; n < 1000; ++n)
        plr::test::request(client.connection(), message(n, static_cast<std::size_t>(n * 30)), queue,
                           replies);
    ASSERT_TRUE(replies.wait(1000));
    const std::vector<std::int64_t> numbers = replies.numbers();
    ASSERT_EQ(numbers.size(), 1000u);
    for (std::size_t i = 0; i < numbers.size(); ++i)
        ASSERT_EQ(numbers[i], static_cast<std::int64_t>(i));
    EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(replies.all()[0], "pid")), ::getpid());
}

TEST_F(VoxProcess, AKilledServiceTellsEveryRequestOnceAndMayComeBack) {
    ServiceProcess service;
    TestClient client(vox_connection_create(kName));
    ASSERT_TRUE(client.works());
    std::vector<Inbox> replies(100);
    for (Inbox& reply : replies)
        plr::test::request(client.connection(), message(kNeverAnswer), queue, reply);
    ASSERT_TRUE(client.works());  // they have all arrived
    service.kill();
    for (Inbox& reply : replies)
        EXPECT_EQ(vox_error_get_code(reply.waitForError()), VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(vox_error_get_code(client.inbox().waitForError()), VOX_ERROR_CONNECTION_INTERRUPTED);
    plr::test::drain(queue);
    for (const Inbox& reply : replies)
        EXPECT_EQ(reply.all().size(), 1u);
    EXPECT_EQ(client.inbox().all().size(), 1u);

    const ServiceProcess again;
    TestClient back(vox_connection_create(kName));
    EXPECT_TRUE(back.works());
}

TEST_F(VoxProcess, WhatWasSentBeforeTheEndArrives) {
    ServiceProcess service;
    TestClient client(vox_connection_create(kName));
    Inbox replies;
    for (std::int64_t n = 0; n < 200; ++n)
        plr::test::request(client.connection(), message(n, 1000), queue, replies);
    plr::test::request(client.connection(), message(kExitAfter), queue, replies);
    ASSERT_TRUE(replies.wait(201));
    EXPECT_EQ(replies.numbers().size(), 201u);
    EXPECT_TRUE(client.inbox().waitForError());
    service.wait();
}

TEST_F(VoxProcess, AnEndpointConnectsAThirdPartyDirectly) {
    const ServiceProcess service;
    TestClient client(vox_connection_create(kName));
    Inbox replies;
    plr::test::request(client.connection(), message(kEndpoint), queue, replies);
    ASSERT_TRUE(replies.wait(1));
    const Ref reply = replies.all().front();
    const vox_object_t endpoint = vox_dictionary_get_value(reply, "endpoint");
    ASSERT_EQ(vox_get_type(endpoint), VOX_TYPE_ENDPOINT);
    TestClient direct(vox_connection_create_from_endpoint(endpoint));
    EXPECT_TRUE(direct.works());
    Inbox known;
    plr::test::request(direct.connection(), message(1), queue, known);
    ASSERT_TRUE(known.wait(1));
    EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(known.all()[0], "pid")), ::getpid());
}

TEST_F(VoxProcess, InterruptedSystemCallsAreRepeated) {
    const ServiceProcess service;
    struct sigaction handler = {};
    handler.sa_handler = [](int) {};
    struct sigaction before = {};
    ASSERT_EQ(::sigaction(SIGALRM, &handler, &before), 0);  // without SA_RESTART
    const itimerval often = {{0, 100}, {0, 100}};
    ASSERT_EQ(::setitimer(ITIMER_REAL, &often, nullptr), 0);
    {
        TestClient client(vox_connection_create(kName));
        Inbox replies;
        for (std::int64_t n = 0; n < 2000; ++n)
            plr::test::request(client.connection(), message(n, n % 50 == 0 ? 100000 : 10), queue,
                               replies);
        EXPECT_TRUE(replies.wait(2000));
        EXPECT_EQ(replies.numbers().size(), 2000u);
    }
    const itimerval never = {};
    ::setitimer(ITIMER_REAL, &never, nullptr);
    ::sigaction(SIGALRM, &before, nullptr);
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        serviceMain();
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
