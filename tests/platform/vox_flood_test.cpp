// One user takes all that a service gives, and more; another's requests are
// answered meanwhile. Prints how soon.
//
// Needs root, for processes and threads of other users.
#include <grp.h>
#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <deque>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "platform/linux/vox/socket_io.h"
#include "support/pressed_service.h"
#include "support/vox_raw_peer.h"

namespace {

using namespace plr::test;
using std::chrono::steady_clock;
using vox_link::frame_type;

constexpr uid_t kGreedy = 65534;
constexpr uid_t kModest = 65533;
constexpr std::chrono::seconds kWindow{3};

vox_limits_t limits() {
    vox_limits_t made = vox_limits_default();
    made.max_queued_bytes = 1u << 20;
    made.max_open_requests = 1024;
    made.max_held_descriptors = 64;
    made.incomplete_frame_ms = 1000;
    made.max_connections = 512;
    made.max_connections_per_uid = 256;
    made.max_queued_bytes_per_uid = 8u << 20;
    made.max_open_requests_per_uid = 4096;
    made.max_held_descriptors_per_uid = 256;
    made.max_partial_bytes_per_uid = 8u << 20;
    return made;
}

// ---- The user who wants too much --------------------------------------------------------

Bytes request(std::uint64_t id, std::int64_t wish) {
    return frame({.type = frame_type::request, .id = id}, message(wish));
}
Bytes requestGivenUp(std::uint64_t id) {
    return join({request(id, kHold), frame({.type = frame_type::cancel, .id = id}, Bytes{0xf6})});
}
Bytes ping(std::uint64_t id) {
    return frame({.type = frame_type::ping, .flags = 1, .id = id}, Bytes{0xf6});
}
Bytes partOfFrame(std::uint64_t) {
    Bytes part = header({.length = 1u << 20});
    part.resize(100'000);
    return part;
}
constexpr int kFiles = 32;
Bytes filesToKeep(std::uint64_t) {
    const Ref list(vox_array_create());
    for (int i = 0; i < kFiles; ++i)
        vox_array_append_value(list, Ref(vox_fd_create(STDIN_FILENO)));
    vox_wire::encoded made;
    EXPECT_EQ(vox_wire::encode(dictionary({{"files", list}}), {}, made), 0);
    const Bytes body(made.bytes.view().begin(), made.bytes.view().end());
    for (const int file : made.descriptors)
        ::close(file);
    return frame({.type = frame_type::message, .descriptors = kFiles}, body);
}

// What each of some connections does.
struct Attack {
    Bytes (*what)(std::uint64_t id);  // null: says hello and leaves
    unsigned atOnce;                  // of these in one write
    unsigned connections;
    bool again;  // and again, else once
    bool reads;  // what comes back
};
const Attack kAttacks[] = {
    {[](std::uint64_t id) { return request(id, 1); }, 200, 100, true, true},
    {[](std::uint64_t id) { return request(id, kBig); }, 10, 20, true, false},
    {[](std::uint64_t id) { return request(id, kHold); }, 100, 20, true, true},
    {requestGivenUp, 100, 20, true, true},
    {ping, 200, 20, true, true},
    {partOfFrame, 1, 100, false, false},
    {filesToKeep, 1, 10, true, false},
    {nullptr, 0, 20, false, false},
};

// One connection, made again whenever the service ends it.
class Attacker {
  public:
    Attacker(const Attack& attack, const std::string& path) : attack_(attack), path_(path) {}

    // Returns whether there was anything to do.
    bool step() {
        moved_ = false;
        if (fd_ < 0) {
            fd_ = connectTo(path_);
            waiting_ = hello();
            begun_ = false;
        } else if (!write() || !read() || (!attack_.what && waiting_.empty())) {
            ::close(std::exchange(fd_, -1));
        }
        return moved_;
    }

  private:
    bool write() {
        const bool fresh = waiting_.empty() && attack_.what && (attack_.again || !begun_);
        if (fresh)
            prepare();
        if (waiting_.empty())
            return true;
        static const std::vector<int> files(kFiles, STDIN_FILENO);
        const bool withFiles = fresh && attack_.what == filesToKeep;
        iovec piece = {waiting_.data(), waiting_.size()};
        const vox_link::io_result sent = vox_link::send_pieces(
            fd_, {&piece, 1}, withFiles ? std::span<const int>(files) : std::span<const int>());
        waiting_.erase(waiting_.begin(),
                       waiting_.begin() + static_cast<std::ptrdiff_t>(sent.bytes));
        moved_ = sent.bytes > 0;
        if (withFiles && sent.bytes == 0)
            waiting_.clear();
        return sent.error == 0 || sent.error == EAGAIN || sent.error == ETOOMANYREFS;
    }
    void prepare() {
        begun_ = true;
        for (unsigned i = 0; i < attack_.atOnce; ++i) {
            const Bytes more = attack_.what(++id_);
            waiting_.insert(waiting_.end(), more.begin(), more.end());
        }
    }
    // Also tells when the service has closed.
    [[nodiscard]] bool read() {
        static std::array<std::uint8_t, 1u << 16> memory;
        const ssize_t got = ::recv(fd_, memory.data(), memory.size(),
                                   MSG_DONTWAIT | (attack_.reads ? 0 : MSG_PEEK));
        moved_ = moved_ || (got > 0 && attack_.reads);
        return got > 0 || (got < 0 && errno == EAGAIN);
    }

    const Attack& attack_;
    const std::string path_;
    int fd_ = -1;
    Bytes waiting_;
    bool begun_ = false;
    bool moved_ = false;
    std::uint64_t id_ = 0;
};

// A process of the greedy user, which makes every other of the attacks. It waits
// when it can do nothing: the processors are the kernel's to share.
[[noreturn]] void attack(const std::string& path, std::size_t first) {
    if (::setgroups(0, nullptr) != 0 || ::setresgid(kGreedy, kGreedy, kGreedy) != 0 ||
        ::setresuid(kGreedy, kGreedy, kGreedy) != 0)
        ::_exit(1);
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    std::deque<Attacker> attackers;
    for (std::size_t i = first; i < std::size(kAttacks); i += 2)
        for (unsigned n = 0; n < kAttacks[i].connections; ++n)
            attackers.emplace_back(kAttacks[i], path);
    std::puts("ready");
    std::fflush(stdout);
    for (;;) {
        bool moved = false;
        for (Attacker& each : attackers)
            moved = each.step() || moved;
        if (!moved)
            ::usleep(1000);
    }
}

// ---- The user who wants little ----------------------------------------------------------

struct Times {
    std::vector<double> ms;  // each request's, sorted
    [[nodiscard]] double percentile(std::size_t percent) const {
        return ms.empty() ? 0 : ms[std::min(ms.size() - 1, ms.size() * percent / 100)];
    }
    void print(const char* when) const {
        std::printf("%s: %zu requests, ms: 50 %% %.2f, 99 %% %.2f, most %.2f\n", when, ms.size(),
                    percentile(50), percentile(99), percentile(100));
    }
};

// A request each millisecond for `length`, by a thread of the modest user. Every one
// is answered.
Times askFor(steady_clock::duration length, const std::string& path) {
    Times times;
    std::thread([&] {
        // The C library would change the whole process.
        ASSERT_EQ(::syscall(SYS_setresuid, kModest, kModest, kModest), 0);
        const int fd = connectTo(path);
        const timeval bound = {kBound.count(), 0};
        ASSERT_EQ(::setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &bound, sizeof bound), 0);
        const RawPeer client(fd);
        client.send(hello());
        ASSERT_EQ(client.readFrame().first.type, frame_type::hello);
        const auto end = steady_clock::now() + length;
        for (std::uint64_t id = 1; steady_clock::now() < end; ++id) {
            const auto start = steady_clock::now();
            client.send(request(id, 1));
            const vox_link::frame_header answer = client.readFrame().first;
            const std::chrono::duration<double, std::milli> taken = steady_clock::now() - start;
            ASSERT_EQ(answer.type, frame_type::reply);
            ASSERT_EQ(answer.id, id);
            times.ms.push_back(taken.count());
            ::usleep(1000);
        }
    }).join();
    std::sort(times.ms.begin(), times.ms.end());
    return times;
}

TEST(VoxFlood, OneUserCannotKeepAnotherFromBeingServed) {
    if (::getuid() != 0)
        GTEST_SKIP() << "only root can be two users";
    const RuntimeDirectory directory;
    std::filesystem::permissions(directory.path(), std::filesystem::perms(0755));
    const std::string path = directory.path() + "/" + kPressedName;
    const ServiceProcess service;
    Prober prober;
    const std::int64_t descriptors = prober.ask("descriptors");
    askFor(kWindow / 3, path).print("alone");
    {
        const ServiceProcess first({"attack", path, "0"});
        const ServiceProcess second({"attack", path, "1"});
        askFor(kWindow, path).print("beside a greedy user");
    }
    for (const char* limit : {"refused", "ended", "requests refused"}) {
        const std::int64_t times = prober.ask(limit);
        EXPECT_GT(times, 0) << limit;
        std::printf("%s: %lld\n", limit, static_cast<long long>(times));
    }
    // Nothing is left of it.
    EXPECT_TRUE(eventually([&] { return prober.ask("clients") == 1; }));
    EXPECT_EQ(prober.ask("of user", kGreedy), 0);
    EXPECT_EQ(prober.ask("descriptors"), descriptors);
}

}  // namespace

int main(int count, char** arguments) {
    const std::vector<std::string> words(arguments, arguments + count);
    if (count == 4 && words[1] == "attack")
        attack(words[2], std::stoul(words[3]));
    if (count == 2 && words[1] == "service") {
        limitDescriptors(2000);
        const PressedService served(limits(), true);
        serviceIsReady();
    }
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
