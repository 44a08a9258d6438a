// Idle exit, between real processes: this program is also the service that
// leaves, when it is called with arguments.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "support/service_process.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;

constexpr const char* kName = "net.example.idle";
constexpr std::uint32_t kIdleMs = 2;

// ---- The service -------------------------------------------------------------------

// What a message asks for, by its number; others are requests for it.
enum Asked : std::int64_t {
    kBeginTransaction = -1,
    kEndTransaction = -2,
    kKeepRequest = -3,  // unanswered until the release
    kAskBack = -4,      // to be answered by the client
    kSuspendMe = -5,    // until the release
    kRelease = -6,
    kAnswerLater = -7,
};

// How many messages and requests the services of a test have handled.
class HandledCount {
  public:
    HandledCount() {
        const char* directory = std::getenv("VOX_RUNTIME_DIR");  // NOLINT(concurrency-mt-unsafe)
        const std::string file = std::string(directory) + "/handled";
        const int fd = ::open(file.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
        EXPECT_EQ(::ftruncate(fd, 4096), 0);
        page_ = ::mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        ::close(fd);
    }
    ~HandledCount() { ::munmap(page_, 4096); }
    HandledCount(const HandledCount&) = delete;
    HandledCount& operator=(const HandledCount&) = delete;
    std::atomic<std::uint64_t>* operator->() const {
        return static_cast<std::atomic<std::uint64_t>*>(page_);
    }

  private:
    void* page_;
};

// Everything runs on one queue.
class Service {
  public:
    void serve() {
        const Ref listener(vox_connection_create_listener(kName, nullptr));
        const dispatch::block<void(vox_object_t)> taker(
            [this](vox_object_t client) { take(client); });
        vox_connection_set_event_handler(listener, &taker);
        vox_connection_set_target_queue(listener, &queue_);
        vox_connection_resume(listener);
        const dispatch::block<void()> leave([] { ::_exit(0); });
        vox_set_idle_exit(kIdleMs, &queue_, &leave);
        serviceIsReady();
    }

  private:
    void take(vox_object_t client) {
        if (vox_get_type(client) != VOX_TYPE_CONNECTION)
            ::_exit(1);  // the listener failed
        const dispatch::block<void(vox_object_t)> handler(
            [this, own = Ref::retain(client)](vox_object_t event) {
                if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                    handle(own, event);
            });
        vox_connection_set_event_handler(client, &handler);
        vox_connection_set_target_queue(client, &queue_);
        vox_connection_resume(client);
    }
    void handle(vox_connection_t from, vox_object_t message) {
        handled_->fetch_add(1);
        switch (numberIn(message)) {
            case kBeginTransaction:
                return vox_transaction_begin();
            case kEndTransaction:
                return vox_transaction_end();
            case kKeepRequest:
                kept_ = Ref::retain(message);
                return;
            case kAskBack: {
                const dispatch::block<void(vox_object_t)> ignore([](vox_object_t) {});
                return vox_connection_send_message_with_reply(from, plr::test::message(0), &queue_,
                                                              &ignore);
            }
            case kSuspendMe:
                suspended_ = Ref::retain(from);
                return vox_connection_suspend(from);
            case kRelease:
                return release();
            case kAnswerLater:
                return queue_.after(
                    dispatch::time::after(std::chrono::microseconds(500)),
                    dispatch::block<void()>([kept = Ref::retain(message)] { answer(kept); }));
            default:
                answer(message);
        }
    }
    void release() {
        answer(std::exchange(kept_, {}));
        if (vox_object_t(suspended_))
            vox_connection_resume(std::exchange(suspended_, {}));
    }
    static void answer(vox_object_t request) {
        const Ref reply(vox_dictionary_create_reply(request));
        vox_dictionary_set_value(reply, "n", number(numberIn(request)));
        if (vox_object_t(reply))
            vox_connection_send_message(vox_dictionary_get_remote_connection(request), reply);
    }

    const dispatch::queue queue_ = dispatch::queue::create("service");
    const HandledCount handled_;
    Ref kept_;
    Ref suspended_;
};

// The service with a socket that a service manager holds.
void usePassedSocket() {
    const std::string self = std::to_string(::getpid());
    ::setenv("LISTEN_PID", self.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    ::setenv("LISTEN_FDS", "1", 1);           // NOLINT(concurrency-mt-unsafe)
    ::setenv("LISTEN_FDNAMES", kName, 1);     // NOLINT(concurrency-mt-unsafe)
}

// ---- What keeps a process ------------------------------------------------------------

struct Holder {
    const char* name;
    Asked asked;
    bool request;  // else a message
};

class IdleExitHolder : public ::testing::TestWithParam<Holder> {};

// Two services that nothing keeps come and go first: time enough to leave.
TEST_P(IdleExitHolder, KeepsTheProcessUntilItIsReleased) {
    const RuntimeDirectory held;
    const HandledCount handled;
    ServiceProcess service({"held"});
    Inbox replies;
    {
        Client client(vox_connection_create(kName));
        Client other(vox_connection_create(kName));
        if (GetParam().request)
            client.request(message(GetParam().asked), replies);
        else
            client.send(message(GetParam().asked));
        if (GetParam().asked == kSuspendMe)
            client.send(message(1));
        ASSERT_TRUE(eventually([&] { return handled->load() == 1; }));
        other.send(message(kEndTransaction));
        for (int i = 0; i < 2; ++i) {
            const RuntimeDirectory free;
            EXPECT_EQ(ServiceProcess().wait(), 0);
        }
        RuntimeDirectory::use(held.path());
        ASSERT_TRUE(other.works()) << "it has left";
        other.send(message(GetParam().asked == kBeginTransaction ? kEndTransaction : kRelease));
        if (GetParam().asked == kAskBack) {
            ASSERT_TRUE(client.inbox.wait(1));
            EXPECT_EQ(client.answer(client.inbox[0]), 0);
        }
        EXPECT_EQ(client.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    }
    EXPECT_EQ(service.wait(), 0);
    EXPECT_EQ(replies.numbers(), GetParam().request ? Numbers{kKeepRequest} : Numbers{});
}

INSTANTIATE_TEST_SUITE_P(Each, IdleExitHolder,
                         ::testing::Values(Holder{"Transaction", kBeginTransaction, false},
                                           Holder{"UnansweredRequest", kKeepRequest, true},
                                           Holder{"RequestOfItsOwn", kAskBack, false},
                                           Holder{"SuspendedConnectionWithSomethingToRead",
                                                  kSuspendMe, false}),
                         [](const auto& row) { return row.param.name; });

}  // namespace

int main(int count, char** arguments) {
    if (count == 2) {
        const std::string role = arguments[1];
        if (role == "held")
            vox_transaction_begin();
        if (role == "passed")
            usePassedSocket();
        Service().serve();
    }
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
