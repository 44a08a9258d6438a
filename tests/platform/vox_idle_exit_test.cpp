// Idle exit, between real processes: this program is also the service that
// leaves, when it is called with arguments.
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/mman.h>

#include <atomic>
#include <random>
#include <thread>

#include "support/sanitized.h"
#include "support/service_process.h"
#include "support/unix_socket.h"
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
    kAskBack = -4,      // to be answered by the client, after the release
    kSuspendMe = -5,    // until the release
    kRelease = -6,
    kAnswerLater = -7,
    kAskBackHere = -8,  // to be answered by the client now, and handled after the release
    kAnswerNow = 1,
};

// What the services of a test have handled so far, in a file that they share.
struct Handled {
    std::atomic<std::uint64_t> messages;
    std::atomic<std::uint64_t> requests;

    static Handled& shared() {
        const char* directory = std::getenv("VOX_RUNTIME_DIR");  // NOLINT(concurrency-mt-unsafe)
        const std::string file = std::string(directory) + "/handled";
        const int fd = ::open(file.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
        EXPECT_EQ(::ftruncate(fd, sizeof(Handled)), 0);
        void* page = ::mmap(nullptr, sizeof(Handled), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        ::close(fd);
        return *static_cast<Handled*>(page);  // stays mapped
    }
};

// Everything runs on one queue.
class Service {
  public:
    void serve() {
        held_.suspend();
        const Ref listener(vox_connection_create_listener(kName, nullptr));
        resumeOn(queue_, listener, [this](vox_object_t client) { take(client); });
        const dispatch::block<void()> leave([] { ::_exit(0); });
        vox_set_idle_exit(kIdleMs, &queue_, &leave);
        serviceIsReady();
    }

  private:
    void take(vox_object_t client) {
        if (vox_get_type(client) != VOX_TYPE_CONNECTION)
            ::_exit(1);  // the listener failed
        resumeOn(queue_, client, [this, own = Ref::retain(client)](vox_object_t event) {
            if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                handle(own, event);
        });
    }
    void handle(vox_connection_t from, vox_object_t message) {
        ++(numberIn(message) == 0 ? handled_.messages : handled_.requests);
        switch (numberIn(message)) {
            case kBeginTransaction:
                return vox_transaction_begin();
            case kEndTransaction:
                return vox_transaction_end();
            case kKeepRequest:
                kept_ = Ref::retain(message);
                return;
            case kAskBack:
                return askBack(from, queue_);
            case kAskBackHere:
                return askBack(from, held_);
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
    static void askBack(vox_connection_t client, const dispatch::queue& queue) {
        const dispatch::block<void(vox_object_t)> ignore([](vox_object_t) {});
        vox_connection_send_message_with_reply(client, plr::test::message(0), &queue, &ignore);
    }
    void release() {
        held_.resume();
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
    const dispatch::queue held_ = dispatch::queue::create("held");  // until the release
    Handled& handled_ = Handled::shared();
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
    bool request = false;  // else a message
};

class IdleExitHolder : public ::testing::TestWithParam<Holder> {
  protected:
    static void answerBack(End& client) {
        ASSERT_TRUE(client.inbox.wait(1));
        EXPECT_EQ(client.answer(client.inbox[0]), 0);
    }
};

// Two services that nothing keeps come and go first: time enough to leave.
TEST_P(IdleExitHolder, KeepsTheProcessUntilItIsReleased) {
    const RuntimeDirectory held;
    const Handled& handled = Handled::shared();
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
        ASSERT_TRUE(eventually([&] { return handled.requests == 1; }));
        if (GetParam().asked == kAskBackHere)
            answerBack(client);
        other.send(message(kEndTransaction));
        for (int i = 0; i < 2; ++i) {
            const RuntimeDirectory free;
            EXPECT_EQ(ServiceProcess().wait(), 0);
        }
        RuntimeDirectory::use(held.path());
        ASSERT_TRUE(other.works()) << "it has left";
        other.send(message(GetParam().asked == kBeginTransaction ? kEndTransaction : kRelease));
        if (GetParam().asked == kAskBack)
            answerBack(client);
        EXPECT_EQ(client.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
    }
    EXPECT_EQ(service.wait(), 0);
    EXPECT_EQ(replies.numbers(), GetParam().request ? Numbers{kKeepRequest} : Numbers{});
}

INSTANTIATE_TEST_SUITE_P(Each, IdleExitHolder,
                         ::testing::Values(Holder{"Transaction", kBeginTransaction},
                                           Holder{"UnansweredRequest", kKeepRequest, true},
                                           Holder{"RequestOfItsOwn", kAskBack},
                                           Holder{"ReplyThatIsNotHandledYet", kAskBackHere},
                                           Holder{"SuspendedConnectionWithSomethingToRead",
                                                  kSuspendMe, false}),
                         [](const auto& row) { return row.param.name; });

// ---- Between requests ------------------------------------------------------------------

constexpr unsigned kExits = kSanitized ? 60 : 200;

// A service manager: holds the service's socket, and starts a service whenever a
// client waits in it.
class Manager {
  public:
    explicit Manager(const std::string& directory)
        : socket_(listeningSocket(directory + "/" + kName, SOCK_NONBLOCK)),
          thread_([this] { run(); }) {}
    ~Manager() {
        ::eventfd_write(end_, 1);
        thread_.join();
        ::close(socket_);
        ::close(end_);
    }
    // Services that have come and gone.
    [[nodiscard]] unsigned exits() const { return exits_; }

  private:
    void run() {
        for (;;) {
            pollfd waiting[] = {{socket_, POLLIN, 0}, {end_, POLLIN, 0}};
            ::poll(waiting, 2, -1);
            if (waiting[1].revents != 0)
                return;
            EXPECT_EQ(ServiceProcess({"passed"}, socket_).wait(), 0);
            ++exits_;
        }
    }

    const int socket_;
    const int end_ = ::eventfd(0, EFD_CLOEXEC);
    std::atomic<unsigned> exits_{0};
    std::thread thread_;
};

// What all clients saw, each added when it is known.
struct Tally {
    std::atomic<std::uint64_t> answered{0};
    std::atomic<std::uint64_t> handed{0};  // messages and requests that the kernel took
};

// A message and some requests at once. Returns whether all were answered.
bool ask(End& service, std::minstd_rand& random, Tally& tally) {
    const std::size_t count = 1 + random() % 5;
    Inbox replies;
    service.send(message(0));
    for (std::size_t i = 0; i < count; ++i) {
        service.request(message(random() % 2 == 0 ? kAnswerNow : kAnswerLater), replies);
        ::usleep(static_cast<useconds_t>(random() % 500));
    }
    EXPECT_TRUE(replies.wait(count));
    EXPECT_EQ(replies.all().size(), count);
    tally.answered += replies.numbers().size();
    return replies.numbers().size() == count;
}

// Asks at random times until enough services have gone, over one connection after
// another.
void useService(const Manager& manager, unsigned seed, Tally& tally) {
    std::minstd_rand random(seed);
    while (manager.exits() < kExits) {
        Client service(vox_connection_create(kName));
        bool alive = true;
        while (alive && manager.exits() < kExits) {
            ::usleep(static_cast<useconds_t>(random() % (3000 * kIdleMs)));
            alive = ask(service, random, tally);
        }
        if (!alive) {
            EXPECT_EQ(service.inbox.errorCode(), VOX_ERROR_CONNECTION_INTERRUPTED);
        }
        tally.handed += service.counts().messages_sent;
    }
}

// Clients use a service that leaves whenever it may. Whatever the kernel took for
// it was handled by it, every request that it handled was answered, and the others
// are known to have failed.
TEST(IdleExit, NeverLosesARequest) {
    const RuntimeDirectory directory;
    const Handled& handled = Handled::shared();
    Tally tally;
    {
        const Manager manager(directory.path());
        Threads(3, [&](unsigned i) { useService(manager, i + 1, tally); });
    }
    EXPECT_EQ(handled.messages + handled.requests, tally.handed);
    EXPECT_EQ(handled.requests, tally.answered);
    EXPECT_GT(tally.answered, kExits);
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && *arguments[1] != '-') {
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
