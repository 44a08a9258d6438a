// Whom listeners let in: the rule, and what the kernel says of real clients.
#include <grp.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>

#include <filesystem>
#include <string>
#include <vector>

#include "platform/linux/vox/admission.h"
#include "platform/linux/vox/socket_io.h"
#include "platform/linux/vox/value_layout.h"
#include "support/child.h"
#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;
using Numbers32 = std::vector<gid_t>;

constexpr const char* kName = "net.example.policy";
constexpr uid_t kFriend = 12345;
constexpr uid_t kStranger = 12346;
constexpr gid_t kClub = 23456;
constexpr auto kUnknown = static_cast<uid_t>(-1);

struct Policy {
    std::vector<uid_t> users;
    Numbers32 groups;
    int everybody = 0;
    [[nodiscard]] vox_policy_t get() const {
        return {users.data(), users.size(), groups.data(), groups.size(), everybody};
    }
};
struct Identity {
    uid_t user;
    gid_t group = 1;
    Numbers32 groups = {};
};
// Enough that the kernel has to be asked twice.
Numbers32 manyGroupsAnd(gid_t last) {
    Numbers32 groups(40, 1000);
    groups.push_back(last);
    return groups;
}

TEST(VoxPolicy, AdmitsThisUserRootAndWhoeverIsNamed) {
    constexpr uid_t kSelf = 1000;
    const Policy named = {.users = {7, kUnknown, kFriend}, .groups = {kClub}};
    const Policy nobody = {};
    const Policy everybody = {.users = {}, .groups = {}, .everybody = 1};
    const struct {
        const char* name;
        const Policy& policy;
        Identity client;
        bool admitted;
    } rows[] = {
        {"own user", nobody, {kSelf}, true},
        {"root", nobody, {0}, true},
        {"another user", nobody, {kFriend}, false},
        {"unknown user", nobody, {kUnknown, kUnknown}, false},
        {"named user", named, {kFriend}, true},
        {"user who is not named", named, {kStranger}, false},
        {"primary group", named, {kStranger, kClub}, true},
        {"supplementary group", named, {kStranger, 1, {2, kClub}}, true},
        {"other groups", named, {kStranger, 2, {7, kFriend}}, false},
        {"unknown user, who cannot be named", named, {kUnknown, kUnknown}, false},
        {"everybody", everybody, {kStranger}, true},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const vox_link::admission rule(row.policy.get());
        EXPECT_EQ(rule.admits(kSelf, row.client.user, row.client.group, row.client.groups),
                  row.admitted);
    }
    EXPECT_FALSE(vox_link::admission().lets_others_in());
}

// ---- Real clients ------------------------------------------------------------------------

enum Fate : int { kServed, kRefused, kNotConnected };

// Without the C library's signals to other threads: after fork(2) there are none.
void become(const Identity& who) {
    if (::syscall(SYS_setgroups, who.groups.size(), who.groups.data()) != 0 ||
        ::syscall(SYS_setresgid, who.group, who.group, who.group) != 0 ||
        ::syscall(SYS_setresuid, who.user, who.user, who.user) != 0)
        ::_exit(99);
}

// Those who are served get a hello first.
Fate fateOf(int fd) {
    char byte = 0;
    return fd < 0 ? kNotConnected : ::recv(fd, &byte, 1, 0) == 1 ? kServed : kRefused;
}

// Connects by `connect` in a process of its own with the rights of `who`.
template <class Connect>
int connectAs(const Identity& who, Connect connect) {
    return inChild([&] {
        become(who);
        return int{fateOf(connect())};
    });
}

bool sendOver(int endpoint, int fd) {
    std::uint8_t byte = 0;
    iovec piece = {&byte, 1};
    return vox_link::send_pieces(endpoint, {&piece, 1}, {&fd, 1}).error == 0;
}

int connectOver(int endpoint) {
    int ends[2];
    if (::socketpair(AF_UNIX, SOCK_STREAM, 0, ends) != 0 || !sendOver(endpoint, ends[1]))
        return -1;
    ::close(ends[1]);
    return ends[0];
}

int descriptorOf(vox_object_t endpoint) {
    return vox_values::as<vox_descriptor_object>(endpoint, VOX_TYPE_ENDPOINT)->descriptor;
}

// Serves with `policy`, and notes the groups of each client.
class Service {
  public:
    Service(vox_connection_t listener, const Policy* policy) : listener_(listener) {
        const vox_policy_t given = policy ? policy->get() : vox_policy_t{};
        vox_listener_set_policy(listener_, policy ? &given : nullptr);
        listener_.resume([this](vox_object_t event) { return take(event); });
    }
    [[nodiscard]] vox_listener_statistics_t counts() const {
        vox_listener_statistics_t counts;
        vox_listener_get_statistics(listener_, &counts);
        return counts;
    }
    [[nodiscard]] Numbers32 groupsSeen() const {
        Numbers32 seen;
        listener_.queue.sync([this, &seen] { seen = groups_; });
        return seen;
    }
    [[nodiscard]] End& listener() { return listener_; }

  private:
    bool take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return false;
        groups_.resize(vox_connection_get_groups(event, nullptr, 0));
        vox_connection_get_groups(event, groups_.data(), groups_.size());
        clients_.push_back(std::make_unique<Client>(vox_retain(event)));
        return true;
    }

    std::vector<std::unique_ptr<Client>> clients_;
    Numbers32 groups_;
    End listener_;
};

class VoxPolicyOfRealClients : public ::testing::Test {
  protected:
    void SetUp() override {
        if (::getuid() != 0)
            GTEST_SKIP() << "only root can be other users";
        std::filesystem::permissions(directory.path(), std::filesystem::perms(0755));
    }
    int byName(const Identity& who) {
        return connectAs(who, [this] { return connectTo(path); });
    }
    static int byEndpoint(const Identity& who, vox_object_t endpoint) {
        const int fd = descriptorOf(endpoint);
        return connectAs(who, [fd] { return connectOver(fd); });
    }

    RuntimeDirectory directory;
    const std::string path = directory.path() + "/" + kName;
    Reports reports;
};

TEST_F(VoxPolicyOfRealClients, DecidesByUserAndByEveryGroup) {
    const Policy policy = {.users = {kFriend}, .groups = {kClub}};
    const mode_t before = ::umask(077);
    Service service(vox_connection_create_listener(kName, nullptr), &policy);
    ::umask(before);
    EXPECT_EQ(byName({0}), kServed);
    EXPECT_EQ(byName({kFriend}), kServed);
    EXPECT_EQ(byName({kStranger, kClub}), kServed);
    EXPECT_EQ(service.groupsSeen(), Numbers32{});
    EXPECT_EQ(byName({kStranger, 1, {kClub}}), kServed);
    EXPECT_EQ(service.groupsSeen(), Numbers32{kClub});
    EXPECT_EQ(byName({kStranger, 1, manyGroupsAnd(kClub)}), kServed);
    EXPECT_EQ(service.groupsSeen(), manyGroupsAnd(kClub));
    EXPECT_EQ(byName({kStranger, kFriend, manyGroupsAnd(kFriend)}), kRefused);
    const Ref endpoint(vox_endpoint_create(service.listener()));
    EXPECT_EQ(byEndpoint({kStranger, 1, {kClub}}, endpoint), kServed);
    EXPECT_EQ(byEndpoint({kStranger}, endpoint), kRefused);
    EXPECT_EQ(service.counts().refused_by_policy, 2u);
    EXPECT_EQ(service.counts().clients_accepted, 6u);
    // A client sees that it is refused before the listener reports it.
    EXPECT_TRUE(eventually(
        [&] { return reports.count("(uid 12346): the policy does not let it in") == 2; }));
}

TEST_F(VoxPolicyOfRealClients, WithoutOneNamesAreForThisUserAndEndpointsForTheirHolders) {
    Service named(vox_connection_create_listener(kName, nullptr), nullptr);
    EXPECT_EQ(byName({kFriend}), kNotConnected) << "the socket is not open to others";
    EXPECT_EQ(byEndpoint({kFriend}, Ref(vox_endpoint_create(named.listener()))), kRefused);
    Service hidden(vox_connection_create_anonymous_listener(nullptr), nullptr);
    EXPECT_EQ(byEndpoint({kFriend}, Ref(vox_endpoint_create(hidden.listener()))), kServed);
}

TEST(VoxPolicy, NobodyPassesAnothersSocketOffAsItsOwn) {
    Service service(vox_connection_create_anonymous_listener(nullptr), nullptr);
    const Ref endpoint(vox_endpoint_create(service.listener()));
    Ends ends(SOCK_STREAM);
    EXPECT_TRUE(holdsInChild([&] { return sendOver(descriptorOf(endpoint), ends.in()); }));
    ends.closeIn();
    EXPECT_EQ(fateOf(ends.out()), kRefused);
    EXPECT_EQ(service.counts().clients_accepted, 0u);
}

}  // namespace
