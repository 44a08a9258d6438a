// Watchers by the thousand: gone at once, and each told of thousands of properties.
// This program also holds those that go, when it is called with "watchers".
#include <sys/prctl.h>
#include <sys/resource.h>

#include <charconv>

#include "support/raw_rest_client.h"
#include "support/runtime.h"
#include "support/sanitized.h"
#include "support/service_process.h"

namespace {

using namespace plr::test;
using plr::rest::Operation;
using plr::rest::PropertyRestResource;

constexpr const char* kName = "net.example.rest";
constexpr int kLeaving = 1'000;  // watchers
constexpr int kGroups = 10;      // properties that some of them watch besides
constexpr int kProperties = kSanitized ? 500 : 5'000;
constexpr int kWatchers = kSanitized ? 20 : 50;
constexpr int kRounds = 2;

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
        watcher->send(Operation::kPush, "/kept/x");
        watcher->send(Operation::kPush, "/kept/group" + std::to_string(i % kGroups));
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
    me->send(Operation::kSet, "/kept/x", vox::int64(0));
    me->send(Operation::kPush, "/kept/_/watched");
    static_cast<void>(me->takeMessages());  // all that is handled before others come
    for (int time = 1; time <= 2; ++time) {
        ServiceProcess leaving({"watchers"});
        EXPECT_EQ(vox::array(me->get("/kept/x/_/watchers")).count(), std::size_t{kLeaving});
        EXPECT_EQ(vox::array(me->get("/kept/_/watched")).count(), std::size_t{kGroups} + 1);
        static_cast<void>(me->takeMessages());

        leaving.kill();
        const auto next = rig.registeredClient("next");
        next->send(Operation::kPush, "/kept/x");
        next->send(Operation::kSet, "/kept/x", vox::int64(time));
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

// Watches all properties, and sees that each one's values come in order, none
// missing: null, 1, 2, …
class Watcher {
  public:
    explicit Watcher(vox::connection connection) : client_(std::move(connection)) {
        client_.set_event_handler([this](const vox::object& event) { take(event); });
        client_.set_target_queue(queue_);
        client_.resume();
    }
    ~Watcher() {
        client_.cancel();
        EXPECT_TRUE(end_.wait());
    }

    void watchAll() const {
        send("/connections");
        for (int i = 0; i < kProperties; ++i)
            send("/kept/" + std::to_string(i));
    }
    // Whether each property had one more value.
    [[nodiscard]] bool waitForRound() { return round_.wait(); }
    // Values that came too early, too late or twice.
    [[nodiscard]] int wrong() const {
        return queue_.sync([this] { return wrong_; });
    }

  private:
    void send(const std::string& path) const {
        client_.send_message(plr::rest::createRestMessage(plr::rest::asObject(Operation::kPush),
                                                          vox::string("watcher"),
                                                          vox::string(std::string_view(path)), {}));
    }
    void take(const vox::object& event) {
        const vox::dict message(event);
        if (!message)
            return end_.signal();
        const std::string path(message.text("r"));
        std::size_t property = 0;
        std::from_chars(path.data() + sizeof "/kept", path.data() + path.size(), property);
        const vox::object value(message["v"]);
        const int number = value ? std::atoi(std::string(value.text()).c_str()) : 0;
        wrong_ += number == next_.at(property)++ ? 0 : 1;
        if (++taken_ % kProperties == 0)
            round_.signal();
    }

    const vox::connection client_;
    const dispatch::queue queue_ = dispatch::queue::create("watcher");
    std::vector<int> next_ = std::vector<int>(kProperties);  // touched on the queue only, as …
    int taken_ = 0;
    int wrong_ = 0;
    Event round_;
    Event end_;
};

TEST(ManyWatchers, SeeEverySetOfEveryPropertyInOrder) {
    vox_limits_t limits = vox_limits_default();
    limits.max_queued_messages_per_uid = kProperties * kWatchers * 2;
    const RestServerRig rig(vox::listener::create_anonymous(&limits));
    rig.add("/kept", std::make_shared<PropertyRestResource>(true));
    rig.start();
    std::vector<std::unique_ptr<Watcher>> watchers;
    for (int i = 0; i < kWatchers; ++i)
        watchers.emplace_back(std::make_unique<Watcher>(rig.connect()))->watchAll();
    const auto setter = rig.client("setter");
    for (int round = 0; round <= kRounds; ++round) {
        const std::string value = std::to_string(round);
        for (int i = 0; i < kProperties && round > 0; ++i)
            setter->send(Operation::kSet, "/kept/" + std::to_string(i),
                         vox::string(std::string_view(value)));
        for (const auto& watcher : watchers)
            ASSERT_TRUE(watcher->waitForRound());
    }
    for (const auto& watcher : watchers)
        EXPECT_EQ(watcher->wrong(), 0);
}

}  // namespace

int main(int count, char** arguments) {
    allowOpenFiles();
    if (count == 2 && std::string(arguments[1]) == "watchers")
        watchersMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
