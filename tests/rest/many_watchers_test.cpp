// Watchers by the thousand: gone at once, and each told of thousands of properties;
// and one that stops reading while others go on. This program also holds those that
// go, when it is called with "watchers".
#include <sys/prctl.h>
#include <sys/resource.h>

#include <fstream>

#include "support/raw_rest_client.h"
#include "support/runtime.h"
#include "support/sanitized.h"
#include "support/scripted_resource.h"
#include "support/service_process.h"

namespace {

using namespace plr::rest;
using namespace plr::test;
using enum Operation;

constexpr const char* kName = "net.example.rest";
constexpr int kLeaving = 1'000;  // watchers
constexpr int kGroups = 10;      // properties that some of them watch besides
constexpr int kProperties = kSanitized ? 500 : 5'000;
constexpr int kWatchers = kSanitized ? 20 : 50;
constexpr int kRounds = 2;
constexpr std::uint32_t kQueuedBytes = 4U << 20;
constexpr int kWindow = 1024;  // how far the setter may be ahead of the good watchers
constexpr int kWindows = kSanitized ? 30 : 200;
constexpr std::size_t kValueBytes = 1024;

// Both ends of all connections may be in this process.
void allowOpenFiles() {
    rlimit limit{};
    ::getrlimit(RLIMIT_NOFILE, &limit);
    limit.rlim_cur = limit.rlim_max;
    ::setrlimit(RLIMIT_NOFILE, &limit);
}

// All watch x, and each a property of its group.
[[noreturn]] void watchersMain() {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    std::vector<std::unique_ptr<RawRestClient>> watchers;
    for (int i = 0; i < kLeaving; ++i) {
        const std::string number = std::to_string(i);
        const auto& watcher = watchers.emplace_back(
            std::make_unique<RawRestClient>(vox::connection::create(kName), "w" + number));
        watcher->registerName();
        watcher->send(kPush, "/kept/x");
        watcher->send(kPush, "/kept/group" + std::to_string(i % kGroups));
    }
    for (const auto& watcher : watchers)
        if (watcher->takeMessages().size() != 2)
            std::abort();
    serviceIsReady();
}

TEST(ManyWatchers, ThatGoAtOnceLeaveNothingBehindAndNobodyWaitsForIt) {
    const RuntimeDirectory directory;
    const RestServerRig rig(vox::listener::create(kName));
    rig.add("/kept", std::make_shared<PropertyRestResource>(true));
    rig.start();
    const auto me = rig.registeredClient("me");
    me->send(kSet, "/kept/x", vox::int64(0));
    me->send(kPush, "/kept/_/watched");
    static_cast<void>(me->takeMessages());  // all that is handled before others come
    for (int time = 1; time <= 2; ++time) {
        ServiceProcess leaving({"watchers"});
        EXPECT_EQ(vox::array(me->get("/kept/x/_/watchers")).count(), std::size_t{kLeaving});
        EXPECT_EQ(vox::array(me->get("/kept/_/watched")).count(), std::size_t{kGroups} + 1);
        static_cast<void>(me->takeMessages());

        leaving.kill();
        const auto next = rig.registeredClient("next");
        next->send(kPush, "/kept/x");
        next->send(kSet, "/kept/x", vox::int64(time));
        EXPECT_EQ(next->takeMessages(), (Texts{"notify next /kept/x " + std::to_string(time - 1),
                                               "notify next /kept/x " + std::to_string(time)}));
        EXPECT_TRUE(eventually([&] {
            const Texts news = me->takeMessages();
            return !news.empty() && news.back() == R"(notify me /kept/_/watched [0: "x"])";
        })) << "who watches what is watched is told that most is not";
        EXPECT_EQ(me->textAt("/kept/_/watched"), R"([0: "x"])");
        EXPECT_EQ(me->textAt("/kept/x/_/watchers"), R"([0: "next"])");
        EXPECT_EQ(me->textAt("/connections"), R"([0: "me",1: "next"])");
    }
}

// Watches properties "0", "1", …, and sees that the values of each come in order, none
// missing: null, and the numbers from 0 on.
class GoodWatcher {
  public:
    explicit GoodWatcher(const RestServerRig& rig, int properties)
        : connection_(rig.connect()), next_(static_cast<std::size_t>(properties), -1) {
        connection_.set_event_handler([this](const vox::object& event) { take(event); });
        connection_.set_target_queue(queue_);
        connection_.resume();
        push("/connections");
        for (int i = 0; i < properties; ++i)
            push("/kept/" + std::to_string(i));
        EXPECT_TRUE(wait(properties));
    }
    ~GoodWatcher() {
        connection_.cancel();
        EXPECT_TRUE(ended_.wait());
    }
    GoodWatcher(const GoodWatcher&) = delete;
    GoodWatcher& operator=(const GoodWatcher&) = delete;

    // Whether `count` more values came in time.
    [[nodiscard]] bool wait(int count) {
        while (count > 0 && taken_.wait())
            --count;
        return count == 0;
    }
    // Values that came too early, too late or twice.
    [[nodiscard]] int wrong() const {
        return queue_.sync([this] { return wrong_; });
    }

  private:
    void push(const std::string& path) const {
        connection_.send_message(
            createRestMessage(asObject(kPush), vox::string("good"), vox::string(path), {}));
    }
    void take(const vox::object& event) {
        const vox::dict message(event);
        if (!message)
            return ended_.signal();
        const std::string property(message.text("r").substr(sizeof "/kept"));
        const vox::object value(message["v"]);
        const int number = value ? std::atoi(std::string(value.text()).c_str()) : -1;
        wrong_ += number == next_.at(std::stoul(property))++ ? 0 : 1;
        taken_.signal();
    }

    const vox::connection connection_;
    const dispatch::queue queue_ = dispatch::queue::create("good");
    std::vector<int> next_;  // touched on the queue only, as …
    int wrong_ = 0;
    Event taken_, ended_;
};

// A value that carries its number.
vox::object numbered(int number, std::size_t bytes) {
    std::string text = std::to_string(number);
    text.resize(bytes, '.');
    return vox::string(std::string_view(text));
}

TEST(ManyWatchers, SeeEverySetOfEveryPropertyInOrder) {
    vox_limits_t limits = vox_limits_default();
    limits.max_queued_messages_per_uid = kProperties * kWatchers * 2;
    const RestServerRig rig(limits);
    rig.add("/kept", std::make_shared<PropertyRestResource>(true));
    rig.start();
    std::vector<std::unique_ptr<GoodWatcher>> watchers;
    for (int i = 0; i < kWatchers; ++i)
        watchers.push_back(std::make_unique<GoodWatcher>(rig, kProperties));
    const auto setter = rig.client("setter");
    for (int round = 0; round < kRounds; ++round) {
        for (int i = 0; i < kProperties; ++i)
            setter->send(kSet, "/kept/" + std::to_string(i), numbered(round, 1));
        for (const auto& watcher : watchers)
            ASSERT_TRUE(watcher->wait(kProperties));
    }
    for (const auto& watcher : watchers)
        EXPECT_EQ(watcher->wrong(), 0);
}

// ---- One that stops reading --------------------------------------------------------

// The memory that this process has resident, in bytes.
std::size_t residentBytes() {
    std::ifstream file("/proc/self/statm");
    std::size_t total = 0;
    std::size_t resident = 0;
    file >> total >> resident;
    return resident * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
}

class StalledWatcher : public testing::Test {
  protected:
    void run(vox_overflow_policy_t policy) {
        vox_limits_t limits = vox_limits_default();
        limits.max_queued_bytes = kQueuedBytes;
        limits.overflow = policy;
        rig_ = std::make_unique<RestServerRig>(limits);
        rig_->add("/kept", std::make_shared<PropertyRestResource>(true));
        rig_->add("/capture",
                  std::make_shared<ScriptedResource>(nullptr, [this](auto& context, auto&&) {
                      serverEnd_ = context.getRawAuthorConnection();
                      return true;
                  }));
        rig_->start();
        slow_ = rig_->registeredClient("slow");
        slow_->send(kPush, "/capture");
        slow_->send(kPush, "/kept/0");
        EXPECT_EQ(slow_->takeMessages().size(), 1U);
        slow_->connection().suspend();
        setAll();
    }

    void setAll() {
        GoodWatcher first(*rig_, 1);
        GoodWatcher second(*rig_, 1);
        const auto setter = rig_->client("setter");
        const std::size_t before = residentBytes();
        for (int i = 0; i < kWindows * kWindow; ++i) {
            ASSERT_EQ(setter->send(kSet, "/kept/0", numbered(i, kValueBytes)), 0);
            if ((i + 1) % kWindow != 0)
                continue;
            ASSERT_TRUE(first.wait(kWindow) && second.wait(kWindow));
            EXPECT_LE(serverEnd().statistics().queued_bytes, kQueuedBytes);
        }
        EXPECT_EQ(first.wrong() + second.wrong(), 0);
        // The queue, what the kernel holds besides, and as much again.
        EXPECT_TRUE(kSanitized || residentBytes() <= before + 4 * std::size_t{kQueuedBytes});
    }

    [[nodiscard]] vox::connection serverEnd() const {
        return rig_->queue().sync([this] { return serverEnd_; });
    }

    std::unique_ptr<RestServerRig> rig_;
    vox::connection serverEnd_;  // of the slow one; touched on the server's queue only
    std::unique_ptr<RawRestClient> slow_;
};

TEST_F(StalledWatcher, IsDisconnectedByDefault) {
    EXPECT_EQ(vox_limits_default().overflow, VOX_OVERFLOW_DISCONNECT);
    run(VOX_OVERFLOW_DISCONNECT);
    // The service has forgotten it, and the good ones that have left since.
    for (int gone = 0; gone < 3; ++gone)
        EXPECT_TRUE(rig_->waitForDrop());
    EXPECT_EQ(rig_->client("late")->textAt("/kept/0/_/watchers"), "[]");
    slow_->connection().resume();
    EXPECT_TRUE(slow_->waitForEnd());
}

TEST_F(StalledWatcher, MissesWhatIsCountedUnderTheDropPolicy) {
    run(VOX_OVERFLOW_DROP);
    const vox::connection serverEnd = this->serverEnd();
    EXPECT_GT(serverEnd.statistics().messages_dropped, 0U);
    slow_->connection().resume();
    // What waited for it has left; then there is room for one more.
    Event drained;
    serverEnd.send_barrier(dispatch::block<void()>([&drained] { drained.signal(); }));
    ASSERT_TRUE(drained.wait());
    const std::size_t delivered = slow_->takeMessages().size();
    const vox_statistics_t statistics = serverEnd.statistics();
    EXPECT_EQ(delivered + statistics.messages_dropped, std::size_t{kWindows * kWindow});
    EXPECT_EQ(slow_->connection().statistics().peer_dropped, statistics.messages_dropped);
    // It is a watcher like others again.
    const auto late = rig_->client("late");
    late->send(kSet, "/kept/0", vox::string("after"));
    EXPECT_EQ(late->get("/kept/0").text(), "after");
    EXPECT_EQ(slow_->takeMessages(), (Texts{"notify slow /kept/0 \"after\""}));
}

}  // namespace

int main(int count, char** arguments) {
    allowOpenFiles();
    if (count == 2 && std::string(arguments[1]) == "watchers")
        watchersMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
