// A service with more clients than it has descriptors for, and with very many.

#include <deque>
#include <fstream>

#include "support/pressed_service.h"
#include "support/sanitized.h"
#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using std::chrono::steady_clock;
using vox_link::frame_type;

// Processor time that process `pid` has used, in seconds.
double processorTime(pid_t pid) {
    std::ifstream file("/proc/" + std::to_string(pid) + "/stat");
    std::string skipped;
    std::getline(file, skipped, ')');
    for (int field = 3; field < 14; ++field)
        file >> skipped;
    double user = 0;
    double system = 0;
    file >> user >> system;
    return (user + system) / static_cast<double>(::sysconf(_SC_CLK_TCK));
}
double secondsSince(steady_clock::time_point start) {
    return std::chrono::duration<double>(steady_clock::now() - start).count();
}

class VoxExhaustion : public ::testing::Test {
  protected:
    int connectRaw() const { return connectTo(directory.path() + "/" + kPressedName); }

    const RuntimeDirectory directory;
};

TEST_F(VoxExhaustion, OutOfDescriptorsAServiceServesAndRestsAndRecovers) {
    const ServiceProcess service({"service", "64"});
    Prober old;
    ASSERT_TRUE(old.works());
    EXPECT_EQ(vox_connection_get_pid(old), service.pid());
    std::deque<RawPeer> clients;
    while (clients.size() < 300)
        clients.emplace_back(connectRaw());
    EXPECT_EQ(clients.back().read(), Bytes{}) << "refused, and all before it are dealt with";

    // While it lasts, a request and one client more each 10 ms.
    const double before = processorTime(service.pid());
    const auto start = steady_clock::now();
    while (secondsSince(start) < 3) {
        ASSERT_TRUE(old.works());
        EXPECT_EQ(RawPeer(connectRaw()).read(), Bytes{}) << "refused, not left waiting";
        ::usleep(10'000);
    }
    const double share = (processorTime(service.pid()) - before) / secondsSince(start);
    EXPECT_LT(share, kSanitized ? 0.5 : 0.05);

    const auto release = steady_clock::now();
    clients.clear();
    EXPECT_TRUE(eventually([] { return Prober().works(); }));
    // Not asked before: UndefinedBehaviorSanitizer needs descriptors to look at objects.
    EXPECT_GE(old.ask("without descriptors"), 200);
    std::printf("out of descriptors: %.1f %% of a processor; a new client after %.0f ms\n",
                share * 100, secondsSince(release) * 1000);
}

// Says hello and sends a ping; returns when its answer came.
bool answersPing(const RawPeer& client, std::uint64_t id, bool first) {
    const Bytes ping = frame({.type = frame_type::ping, .flags = 1, .id = id}, Bytes{0xf6});
    client.send(first ? join({hello(), ping}) : ping);
    if (first && client.readFrame().first.type != frame_type::hello)
        return false;
    const vox_link::frame_header answer = client.readFrame().first;
    return answer.type == frame_type::ping && answer.id == id;
}

TEST_F(VoxExhaustion, ManyClientsLeaveNothingBehind) {
    constexpr std::size_t kHeld = 1000;
    constexpr std::size_t kPassing = kSanitized ? 10'000 : 100'000;
    if (limitDescriptors(kHeld + 200) < kHeld + 200)
        GTEST_SKIP() << "this user may not have " << kHeld << " descriptors";
    const ServiceProcess service({"service", std::to_string(kHeld + 200)});
    Prober prober;
    const auto holdAndPing = [&] {
        std::deque<RawPeer> held;
        while (held.size() < kHeld)
            held.emplace_back(connectRaw());
        for (std::uint64_t round = 1; round <= 3; ++round)
            for (const RawPeer& client : held)
                ASSERT_TRUE(answersPing(client, round, round == 1));
        EXPECT_EQ(prober.ask("clients"), std::int64_t{kHeld} + 1);
    };
    const auto isAlone = [&] { return prober.ask("clients") == 1; };
    holdAndPing();
    ASSERT_TRUE(eventually(isAlone));
    const std::int64_t descriptors = prober.ask("descriptors");
    const std::int64_t memory = prober.ask("memory");

    // They leave at once, after a hello, or in the middle of a frame.
    const Bytes farewells[] = {{}, hello(), join({hello(), plainMessage(1, 5000)}), hello()};
    for (std::size_t n = 0; n < kPassing; ++n) {
        const RawPeer client(connectRaw());
        const Bytes& farewell = farewells[n % 4];
        client.send(std::span(farewell).first(farewell.size() - (n % 8 > 3 ? n % 4 : 0)));
    }
    // Who comes last is accepted last.
    ASSERT_TRUE(eventually([] { return Prober().works(); }));
    ASSERT_TRUE(eventually(isAlone));
    holdAndPing();
    ASSERT_TRUE(eventually(isAlone));
    EXPECT_EQ(prober.ask("descriptors"), descriptors);
    const std::int64_t grown = prober.ask("memory") - memory;
    if (!kSanitized) {
        // Threads keep some freed blocks; a leak of one a client were more.
        EXPECT_LT(grown, 8 * std::int64_t{kPassing});
    }
    std::printf("%zu clients: %lld bytes more are in use\n", kPassing,
                static_cast<long long>(grown));
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 3 && std::string(arguments[1]) == "service") {
        ::mallopt(M_ARENA_MAX, 1);  // so that all memory in use is counted
        limitDescriptors(std::stoul(arguments[2]));
        const PressedService served(vox_limits_default(), false);
        serviceIsReady();
    }
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
