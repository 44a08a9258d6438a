// A service that is killed and restarted, also under load, and clients that connect
// to it again. This program is also the service, when it is called with the
// argument "service".
#include <sys/mman.h>
#include <sys/prctl.h>

#include <condition_variable>

#include "plr/rest.h"
#include "plr/test/fake_rest.h"
#include "support/module_client.h"
#include "support/runtime.h"
#include "support/sanitized.h"
#include "support/scripted_resource.h"
#include "support/service_process.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::rest;
using namespace plr::test;
using namespace std::chrono_literals;

constexpr const char* kName = "net.example.rest";
constexpr const char* kAssertion = "/assertions/busy";
constexpr ReconnectPolicy kQuick{1ms, 4ms};
constexpr std::size_t kProperties = 5;
constexpr std::size_t kClients = 6;
constexpr int kRestarts = kSanitized ? 15 : 50;

// ---- The service ------------------------------------------------------------------------

// What outlives the service, in memory that it shares with the test.
using Values = std::array<std::atomic<std::int64_t>, kProperties>;

Values& valuesIn(int memory) {
    void* const mapped =
        ::mmap(nullptr, sizeof(Values), PROT_READ | PROT_WRITE, MAP_SHARED, memory, 0);
    return *static_cast<Values*>(mapped);
}

// Properties "0", "1", …, which start as they were left: a value is stored before
// anybody is told.
class StoredProperties : public PropertyRestResource {
  public:
    explicit StoredProperties(Values& values) : PropertyRestResource(true), values_(values) {
        for (std::size_t i = 0; i < kProperties; ++i) {
            FakeRestContext context(Operation::kSet, vox::int64(values_[i]));
            PropertyRestResource::handleRestMessage_SET(context, PathView(std::to_string(i)));
        }
    }
    bool handleRestMessage_SET(RestResourceContext& context, const PathView& path) override {
        const auto index = static_cast<std::size_t>(path.current()[0] - '0');
        values_.at(index) = vox::dyn_cast_or_default(context.getRestValue(), 0LL);
        return PropertyRestResource::handleRestMessage_SET(context, path);
    }

  private:
    Values& values_;
};

// Logs what is pushed. GET answers the log, or never where the path says so.
std::shared_ptr<plr::rest::RestResource> log() {
    const vox::array pushed = vox::array::create();
    std::vector<std::shared_ptr<vox::object>> unanswered;
    return std::make_shared<ScriptedResource>(
        [pushed, unanswered](auto& context, const PathView& path) mutable {
            if (path.current() != "silent")
                return context.sendReplyWithValue(pushed);
            unanswered.push_back(context.takeAutoReplyValue());
            return true;
        },
        [pushed](auto&&, const PathView& path) {
            pushed.append(vox::string(path.full()));
            return true;
        });
}

// Serves until SIGTERM, and then ends as services do.
int serviceMain() {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    sigset_t end;
    sigemptyset(&end);
    sigaddset(&end, SIGTERM);
    ::pthread_sigmask(SIG_BLOCK, &end, nullptr);
    const auto queue = dispatch::queue::create("service");
    auto server = RestServerExample::create(queue, kName);
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/kept", std::make_shared<StoredProperties>(valuesIn(3)));
    server->registerResource("/assertions", std::make_shared<plr::rest::AssertionRestResource>());
    server->registerResource("/log", log());
    server->connect(vox::listener::create(kName));
    std::puts("ready");
    std::fflush(stdout);
    int signal = 0;
    ::sigwait(&end, &signal);
    server.reset();
    drain(queue);
    return 0;
}

// ---- Its clients ------------------------------------------------------------------------

std::string pathOf(std::size_t property) {
    return "/kept/" + std::to_string(property);
}

// What the clients have been told, for the test to wait for.
struct Board {
    struct Told {
        std::array<std::int64_t, kProperties> values{};
        bool isGranted = false;
        int grants = 0;
    };
    std::mutex lock;
    std::condition_variable changed;
    std::array<Told, kClients> clients;
    std::int64_t written = 0;  // by the setter, to every property
    int stale = 0;             // values older than one told before

    template <class Change>
    void change(Change&& change) {
        const std::lock_guard guard(lock);
        change();
        changed.notify_all();
    }
    template <class Condition>
    [[nodiscard]] bool wait(Condition condition) {
        std::unique_lock guard(lock);
        return changed.wait_for(guard, kBound, condition);
    }
};

// Watches every property and holds the assertion.
class Watcher : ModuleClient {
  public:
    Watcher(Board& board, std::size_t index) : ModuleClient("watcher") {
        Board::Told& told = board.clients.at(index);
        queue.sync([&, this] {
            for (std::size_t i = 0; i < kProperties; ++i)
                module.watch<std::int64_t>(
                    pathOf(i), [&board, &last = told.values[i]](std::optional<std::int64_t> value) {
                        board.change([&] {
                            board.stale += value && *value >= last ? 0 : 1;
                            last = value.value_or(-1);
                        });
                    });
            handle_ = {module, kAssertion, [&board, &told](bool granted) {
                           board.change([&] {
                               told.isGranted = granted;
                               told.grants += granted ? 1 : 0;
                           });
                       }};
            module.connectToService(kName, kQuick);
        });
    }

  private:
    AssertionHandle handle_;
};

// Sets all properties to 1, 2, 3, … for ever, each when the one before has been
// heard.
class Setter : ModuleClient {
  public:
    explicit Setter(Board& board) : ModuleClient("setter"), board_(board) {
        queue.sync([this] {
            module.setConnectionHandler([this](bool isReached) {
                if (isReached)
                    setNext();
            });
            module.connectToService(kName, kQuick);
        });
    }
    // The last number, which is on its way then.
    std::int64_t stop() {
        return queue.sync([this] {
            isStopped_ = true;
            return number_;
        });
    }

  private:
    void setNext() {
        if (isStopped_)
            return;
        ++number_;
        for (std::size_t i = 0; i < kProperties; ++i)
            module.setProperty(pathOf(i), vox::int64(number_));
        board_.change([this] { board_.written = number_; });
        module.sendRequest("", {}, kBound, [this](const Result<vox::object>& heard) {
            if (heard)
                setNext();
        });
    }

    Board& board_;
    std::int64_t number_ = 0;
    bool isStopped_ = false;
};

// Grants the assertion whenever it is wanted.
class Granter : ModuleClient {
  public:
    Granter() : ModuleClient("granter") {
        queue.sync([this] {
            provider_.emplace(module, kAssertion, [this](const AssertionAcquireState& wanted) {
                if (wanted.state == AssertionState::kPending)
                    provider_->grant();
            });
            module.connectToService(kName, kQuick);
        });
    }
    ~Granter() {
        queue.sync([this] { provider_.reset(); });
    }

  private:
    std::optional<AssertionProvider> provider_;
};

class RestartedService : public testing::Test {
  protected:
    RestartedService() { EXPECT_EQ(::ftruncate(memory_, sizeof(Values)), 0); }
    ~RestartedService() override { ::close(memory_); }
    void start() { service_.emplace(std::vector<std::string>{"service"}, memory_); }

    const RuntimeDirectory directory_;
    const int memory_ = ::memfd_create("values", MFD_CLOEXEC);
    std::optional<ServiceProcess> service_;
};

TEST_F(RestartedService, AnswersEachRequestOnceAndGetsItsRegistrationsBack) {
    Event gone;
    const ModuleClient client;
    const auto connect = [&] {
        client.on([&] { client.module.connect(vox::connection::create(kName)); });
    };
    const auto pushed = [&] {
        Event answered;
        vox::object answer;
        client.on([&] {
            client.module.getPropertyOnce("/log", [&](const vox::object& value) {
                answer = value;
                answered.signal();
            });
        });
        EXPECT_TRUE(answered.wait());
        return answer;
    };
    start();
    client.on([&] {
        const auto ignore = [](auto&&...) {};
        client.module.setServerErrorHandler([&gone](const vox::object&) { gone.signal(); });
        client.module.observeProperty("/log/b", RestModule::Handler(ignore));
        client.module.observeProperty("/log/a", RestModule::Handler(ignore));
        client.module.registerAsRequestSink("/log/2", RestModule::RequestHandler(ignore));
        client.module.registerAsRequestSink("/log/1", RestModule::RequestHandler(ignore));
    });
    const vox::object inOrder =
        vox::array(vox::array_creator()("/log/1")("/log/2")("/log/a")("/log/b"));
    connect();
    EXPECT_EQ(pushed(), inOrder);

    std::vector<int> answers(100);  // touched on the client's queue only
    client.on([&] {
        for (int& count : answers)
            client.module.getPropertyOnce("/log/silent", [&count](const vox::object& value) {
                EXPECT_EQ(value, vox::object());
                ++count;
            });
    });
    EXPECT_EQ(pushed(), inOrder) << "the requests have arrived";
    service_->kill();
    ASSERT_TRUE(gone.wait());
    client.on([&] {
        EXPECT_FALSE(client.module.isConnected());
        EXPECT_EQ(answers, std::vector<int>(100, 1));
    });
    connect();  // to nobody
    ASSERT_TRUE(gone.wait());

    start();
    connect();
    EXPECT_EQ(pushed(), inOrder);
}

TEST_F(RestartedService, GivesEveryClientEveryValueAndNoneThatIsStale) {
    Board board;
    Granter granter;
    Setter setter(board);
    std::vector<std::unique_ptr<Watcher>> watchers;
    for (std::size_t i = 0; i < kClients; ++i)
        watchers.push_back(std::make_unique<Watcher>(board, i));

    start();
    for (int restart = 0; restart < kRestarts; ++restart) {
        std::array<Board::Told, kClients> before;
        board.change([&] { before = board.clients; });
        if (restart % 2 == 0) {
            service_->kill();
        } else {
            ::kill(service_->pid(), SIGTERM);
            EXPECT_EQ(service_->wait(), 0);
        }
        start();
        // What is written from now on, on new connections, and granted there. Now and
        // then the service goes while most are on their way to it.
        std::int64_t old = 0;
        board.change([&] { old = board.written; });
        const std::size_t awaited = restart % 4 == 2 ? 1 : kClients;
        ASSERT_TRUE(board.wait([&] {
            bool arrived = true;
            for (std::size_t i = 0; i < awaited; ++i) {
                const Board::Told& told = board.clients.at(i);
                arrived = arrived && told.isGranted && told.grants > before.at(i).grants &&
                          std::ranges::min(told.values) > old;
            }
            return arrived;
        })) << "restart "
            << restart;
    }

    const std::int64_t last = setter.stop();
    EXPECT_TRUE(board.wait([&] {
        return std::ranges::all_of(board.clients, [&](const Board::Told& told) {
            return std::ranges::count(told.values, last) == kProperties;
        });
    }));
    for (const auto& value : valuesIn(memory_))
        EXPECT_EQ(value, last);
    EXPECT_EQ(board.stale, 0);
    for (const Board::Told& told : board.clients)
        EXPECT_TRUE(told.isGranted);
    EXPECT_GT(last, kRestarts);
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        return serviceMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
