#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <fstream>

#include "support/module_client.h"
#include "support/raw_rest_client.h"
#include "support/sanitized.h"

// One watcher stops reading while others go on: the service's memory stays
// bounded, the others miss nothing, and the slow one gets what the listener's
// policy says.
namespace {

using namespace plr::test;
using plr::rest::Operation;

constexpr std::size_t kValueBytes = 1024;
constexpr std::uint32_t kQueuedBytes = 4U << 20;
constexpr int kWindow = 1024;  // how far the setter may be ahead of the good watchers

// How many values are set.
constexpr int kCount = kSanitized ? 30'000 : 200'000;

// The memory that this process has resident, in bytes.
std::size_t residentBytes() {
    std::ifstream file("/proc/self/statm");
    std::size_t total = 0;
    std::size_t resident = 0;
    file >> total >> resident;
    return resident * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
}

// A value that carries its number.
vox::object numbered(int number) {
    std::string text = std::to_string(number);
    text.resize(kValueBytes, '.');
    return vox::string(std::string_view(text));
}

// Sees that the numbers arrive in order, none missing.
class GoodWatcher : ModuleClient {
  public:
    GoodWatcher(const RestServerRig& rig, const char* name) : ModuleClient(name) {
        on([&] {
            module.connect(rig.connect());
            module.observeProperty("/kept/x", [this](const vox::object& value) {
                if (!value)
                    return ready.signal();
                wrong += std::atoi(std::string(value.text()).c_str()) != seen;
                if (++seen % kWindow == 0 || seen == kCount)
                    reached.signal();
            });
        });
        EXPECT_TRUE(ready.wait());
    }
    ~GoodWatcher() {
        on([this] { module.disconnect(); });
    }

    Event ready;
    Event reached;  // once each kWindow values, and at the last
    std::atomic<int> wrong{0};
    std::atomic<int> seen{0};
};

// Remembers the server's end of whoever pushes.
struct Capture : plr::rest::RestResource {
    vox::connection connection;
    bool handleRestMessage_PUSH(plr::rest::RestResourceContext& context,
                                const plr::rest::PathView&) override {
        connection = context.getRawAuthorConnection();
        return true;
    }
};

class StalledWatcher : public testing::Test {
  protected:
    void run(vox_overflow_policy_t policy) {
        vox_limits_t limits = vox_limits_default();
        limits.max_queued_bytes = kQueuedBytes;
        limits.overflow = policy;
        rig_ = std::make_unique<RestServerRig>(limits);
        rig_->add("/kept", std::make_shared<plr::rest::PropertyRestResource>(true));
        rig_->add("/capture", capture_);
        rig_->start();
        slow_ = rig_->registeredClient("slow");
        slow_->send(Operation::kPush, "/capture");
        slow_->send(Operation::kPush, "/kept/x");
        EXPECT_EQ(slow_->takeMessages().size(), 1U);
        slow_->connection().suspend();
        setAll();
    }

    void setAll() {
        GoodWatcher first(*rig_, "first");
        GoodWatcher second(*rig_, "second");
        const auto setter = rig_->client("setter");
        const std::size_t before = residentBytes();
        for (int i = 0; i < kCount; ++i) {
            ASSERT_EQ(setter->send(Operation::kSet, "/kept/x", numbered(i)), 0);
            if ((i + 1) % kWindow != 0 && i + 1 != kCount)
                continue;
            ASSERT_TRUE(first.reached.wait());
            ASSERT_TRUE(second.reached.wait());
            EXPECT_LE(serverEnd().statistics().queued_bytes, kQueuedBytes);
        }
        EXPECT_EQ(first.wrong + second.wrong, 0);
        EXPECT_EQ(first.seen, kCount);
        EXPECT_EQ(second.seen, kCount);
        // The queue, what the kernel holds besides, and as much again.
        EXPECT_TRUE(kSanitized || residentBytes() <= before + 4 * std::size_t{kQueuedBytes});
    }

    [[nodiscard]] vox::connection serverEnd() const {
        return rig_->queue().sync([this] { return capture_->connection; });
    }

    std::unique_ptr<RestServerRig> rig_;
    const std::shared_ptr<Capture> capture_ = std::make_shared<Capture>();
    std::unique_ptr<RawRestClient> slow_;
};

TEST_F(StalledWatcher, IsDisconnectedByDefault) {
    EXPECT_EQ(vox_limits_default().overflow, VOX_OVERFLOW_DISCONNECT);
    run(VOX_OVERFLOW_DISCONNECT);
    // The service has forgotten it, and the good ones that have left since.
    for (int gone = 0; gone < 3; ++gone)
        EXPECT_TRUE(rig_->waitForDrop());
    EXPECT_EQ(rig_->client("late")->textAt("/kept/x/_/watchers"), "[]");
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
    EXPECT_EQ(delivered + statistics.messages_dropped, static_cast<std::size_t>(kCount));
    EXPECT_EQ(slow_->connection().statistics().peer_dropped, statistics.messages_dropped);
    // It is a watcher like others again.
    const auto late = rig_->client("late");
    late->send(Operation::kSet, "/kept/x", vox::string("after"));
    EXPECT_EQ(late->get("/kept/x").text(), "after");
    EXPECT_EQ(slow_->takeMessages(), (Texts{"notify slow /kept/x \"after\""}));
}

}  // namespace
