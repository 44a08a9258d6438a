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

using namespace plr::test;

constexpr const char* kName = "net.example.process";

// What the service does with such a request: the reply, and then the end; or it
// carries the "endpoint" of the hidden listener.
constexpr std::int64_t kExitAfter = -1;
constexpr std::int64_t kGiveEndpoint = -2;

// Answers say what "pid" their asker has.
void answer(vox_connection_t to, vox_connection_t hidden, vox_object_t event) {
    const Ref reply(vox_dictionary_create_reply(event));
    if (!vox_object_t(reply))
        return;
    vox_dictionary_set_value(reply, "n", number(numberIn(event)));
    vox_dictionary_set_value(reply, "pid", number(vox_connection_get_pid(to)));
    if (numberIn(event) == kGiveEndpoint)
        vox_dictionary_set_value(reply, "endpoint", Ref(vox_endpoint_create(hidden)));
    static_cast<void>(vox_connection_send_message(to, reply));
    if (numberIn(event) == kExitAfter) {
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
    serve(hidden, hidden);
    serve(vox_connection_create_listener(kName, nullptr), hidden);
    serviceIsReady();
}

class VoxProcess : public ::testing::Test {
  protected:
    // The "pid" in a reply.
    static std::int64_t pidIn(vox_object_t reply) {
        return vox_int64_get_value(vox_dictionary_get_value(reply, "pid"));
    }

    const RuntimeDirectory directory;
    ServiceProcess service;
    Inbox replies;
    Client client{vox_connection_create(kName)};
};

TEST_F(VoxProcess, ProcessesKnowEachOtherAndPassEndpointsOn) {
    client.request(message(kGiveEndpoint), replies);
    ASSERT_TRUE(replies.wait(1));
    EXPECT_EQ(vox_connection_get_pid(client), service.pid());
    EXPECT_EQ(pidIn(replies[0]), ::getpid());
    Client direct(
        vox_connection_create_from_endpoint(vox_dictionary_get_value(replies[0], "endpoint")));
    direct.request(message(2), replies);
    ASSERT_TRUE(replies.wait(2));
    EXPECT_EQ(pidIn(replies[1]), ::getpid());
}

TEST_F(VoxProcess, WhatWasSentBeforeTheEndArrives) {
    for (std::int64_t n = 0; n < 200; ++n)
        client.request(message(n, static_cast<std::size_t>(n) * 150), replies);
    client.request(message(kExitAfter), replies);
    ASSERT_TRUE(replies.wait(201));
    Numbers expected = upTo(200);
    expected.push_back(kExitAfter);
    EXPECT_EQ(replies.numbers(), expected);
    EXPECT_TRUE(client.inbox.waitForError());
    service.wait();
}

TEST_F(VoxProcess, InterruptedSystemCallsAreRepeated) {
    struct sigaction handler = {};
    handler.sa_handler = [](int) {};
    struct sigaction before = {};
    ASSERT_EQ(::sigaction(SIGALRM, &handler, &before), 0);  // without SA_RESTART
    const itimerval often = {{0, 100}, {0, 100}};
    ASSERT_EQ(::setitimer(ITIMER_REAL, &often, nullptr), 0);
    for (std::int64_t n = 0; n < 2000; ++n)
        client.request(message(n, n % 50 == 0 ? 100000 : 10), replies);
    EXPECT_TRUE(replies.wait(2000));
    EXPECT_EQ(replies.numbers(), upTo(2000));
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
