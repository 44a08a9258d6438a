// A service that is restarted again and again under load, and clients that connect
// to it by themselves. This program is also the service, when it is called with the
// argument "service".
#include <sys/mman.h>
#include <sys/prctl.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <condition_variable>
#include <optional>

#include "plr/rest.h"
#include "plr/test/fake_rest.h"
#include "support/module_client.h"
#include "support/runtime.h"
#include "support/sanitized.h"
#include "support/service_process.h"
#include "support/waiting.h"

namespace {

using namespace plr::test;
using namespace std::chrono_literals;
using plr::rest::AssertionHandle;
using plr::rest::AssertionProvider;
using plr::rest::AssertionState;
using plr::rest::Operation;

constexpr const char* kName = "net.example.rest";
constexpr const char* kAssertion = "/assertions/busy";
constexpr plr::ReconnectPolicy kQuick{1ms, 4ms};
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
class StoredProperties : public plr::rest::PropertyRestResource {
  public:
    explicit StoredProperties(Values& values) : PropertyRestResource(true), values_(values) {
        for (std::size_t i = 0; i < kProperties; ++i) {
            FakeRestContext context(Operation::kSet, vox::int64(values_[i]));
            PropertyRestResource::handleRestMessage_SET(context,
                                                        plr::rest::PathView(std::to_string(i)));
        }
    }
    bool handleRestMessage_SET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override {
        const auto index = static_cast<std::size_t>(path.current()[0] - '0');
        values_.at(index) = vox::dyn_cast_or_default(context.getRestValue(), 0LL);
        return PropertyRestResource::handleRestMessage_SET(context, path);
    }

  private:
    Values& values_;
};

// Serves until SIGTERM, and then ends as services do.
int serviceMain() {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    sigset_t end;
    sigemptyset(&end);
    sigaddset(&end, SIGTERM);
    ::pthread_sigmask(SIG_BLOCK, &end, nullptr);
    const auto queue = dispatch::queue::create("service");
    auto server = plr::rest::RestServerExample::create(queue, kName);
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/kept", std::make_shared<StoredProperties>(valuesIn(3)));
    server->registerResource("/assertions", std::make_shared<plr::rest::AssertionRestResource>());
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
        module.sendRequest("", {}, kBound, [this](const plr::Result<vox::object>& heard) {
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
            provider_.emplace(module, kAssertion,
                              [this](const plr::rest::AssertionAcquireState& wanted) {
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

TEST(RestartedService, GivesEveryClientEveryValueAndNoneThatIsStale) {
    const RuntimeDirectory directory;
    const int memory = ::memfd_create("values", MFD_CLOEXEC);
    ASSERT_EQ(::ftruncate(memory, sizeof(Values)), 0);
    Board board;
    std::optional<ServiceProcess> service;
    Granter granter;
    Setter setter(board);
    std::vector<std::unique_ptr<Watcher>> watchers;
    for (std::size_t i = 0; i < kClients; ++i)
        watchers.push_back(std::make_unique<Watcher>(board, i));

    service.emplace(std::vector<std::string>{"service"}, memory);
    for (int restart = 0; restart < kRestarts; ++restart) {
        std::array<Board::Told, kClients> before;
        board.change([&] { before = board.clients; });
        if (restart % 2 == 0) {
            service->kill();
        } else {
            ::kill(service->pid(), SIGTERM);
            EXPECT_EQ(service->wait(), 0);
        }
        service.emplace(std::vector<std::string>{"service"}, memory);
        // What is written from now on, on new connections, and granted there. Now and
        // then the service goes while most are on their way to it.
        std::int64_t old = 0;
        board.change([&] { old = board.written; });
        const std::size_t awaited = restart % 4 == 2 ? 1 : kClients;
        ASSERT_TRUE(board.wait([&] {
            for (std::size_t i = 0; i < awaited; ++i) {
                const Board::Told& told = board.clients.at(i);
                if (!told.isGranted || told.grants <= before.at(i).grants)
                    return false;
                for (const std::int64_t value : told.values)
                    if (value <= old)
                        return false;
            }
            return true;
        })) << "restart "
            << restart;
    }

    const std::int64_t last = setter.stop();
    EXPECT_TRUE(board.wait([&] {
        return std::all_of(board.clients.begin(), board.clients.end(), [&](const auto& told) {
            return std::all_of(told.values.begin(), told.values.end(),
                               [&](std::int64_t value) { return value == last; });
        });
    }));
    for (const auto& value : valuesIn(memory))
        EXPECT_EQ(value, last);
    EXPECT_EQ(board.stale, 0);
    for (const Board::Told& told : board.clients)
        EXPECT_TRUE(told.isGranted);
    EXPECT_GT(last, kRestarts);
    ::close(memory);
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        return serviceMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
