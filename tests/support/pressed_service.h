#pragma once

#include <malloc.h>
#include <sys/resource.h>

#include <algorithm>
#include <map>

#include "support/service_process.h"
#include "support/vox_test.h"

// A service in a process of its own for clients that want too much, and what it
// costs.
namespace plr::test {

inline constexpr const char* kPressedName = "net.example.pressed";

// What a request's "n" asks for; any other is answered with that number.
enum Wish : std::int64_t {
    kHold = -1,   // no answer, until the client is gone
    kBig = -2,    // an answer of 64 KiB
    kProbe = -3,  // what the service costs now
};

// Those open in this process, also when it cannot open one more.
inline std::size_t countDescriptors() {
    std::size_t open = 0;
    for (int fd = 0; fd < ::sysconf(_SC_OPEN_MAX); ++fd)
        open += ::fcntl(fd, F_GETFD) >= 0 ? 1 : 0;
    return open;
}

// Messages with descriptors are kept as long as their client.
class PressedService {
  public:
    PressedService(const vox_limits_t& limits, bool everybody)
        : listener_(vox_connection_create_listener(kPressedName, &limits)) {
        vox_policy_t policy = {};
        policy.everybody = everybody ? 1 : 0;
        vox_listener_set_policy(listener_, &policy);
        resumeOn(queue_, listener_, [this](vox_object_t event) { take(event); });
    }

  private:
    void take(vox_object_t client) {
        if (vox_get_type(client) != VOX_TYPE_CONNECTION)
            return;
        kept_[client] = {Ref::retain(client)};
        resumeOn(queue_, client, [this, client](vox_object_t event) {
            if (vox_get_type(event) == VOX_TYPE_ERROR)
                kept_.erase(client);
            else
                serve(client, event);
        });
    }
    void serve(vox_object_t client, vox_object_t event) {
        const Ref reply(numberIn(event) == kHold ? nullptr : vox_dictionary_create_reply(event));
        if (!vox_object_t(reply)) {
            kept_[client].push_back(Ref::retain(event));
            return;
        }
        vox_dictionary_set_value(reply, "n", number(numberIn(event)));
        if (numberIn(event) == kBig)
            vox_dictionary_set_value(reply, "data", vox_dictionary_get_value(bigData_, "data"));
        if (numberIn(event) == kProbe)
            tellCosts(event, reply);
        static_cast<void>(vox_connection_send_message(client, reply));
    }
    void tellCosts(vox_object_t event, vox_object_t reply) {
        vox_listener_statistics_t all;
        vox_listener_get_statistics(listener_, &all);
        vox_user_statistics_t user;
        const vox_object_t whose = vox_dictionary_get_value(event, "user");
        vox_listener_get_user_statistics(listener_, static_cast<uid_t>(vox_int64_get_value(whose)),
                                         &user);
        for (const auto& [key, value] : std::initializer_list<std::pair<const char*, std::size_t>>{
                 {"descriptors", countDescriptors()},
                 {"memory", ::mallinfo2().uordblks},
                 {"clients", all.clients},
                 {"refused", all.refused_by_limit},
                 {"without descriptors", all.refused_without_descriptors},
                 {"ended", all.ended_for_limits},
                 {"requests refused", all.requests_refused},
                 {"of user", user.connections + user.queued_bytes + user.queued_messages +
                                 user.pending_replies + user.open_requests + user.held_descriptors +
                                 user.partial_bytes}})
            vox_dictionary_set_value(reply, key, number(static_cast<std::int64_t>(value)));
    }

    const dispatch::queue queue_ = dispatch::queue::create("pressed");
    const Ref bigData_ = message(0, 64u << 10);
    std::map<vox_object_t, std::vector<Ref>> kept_;  // on the queue; first the client itself
    const Ref listener_;
};

// At most so many descriptors from now on, as far as this user may have them.
inline rlim_t limitDescriptors(rlim_t wanted) {
    rlimit limit{};
    EXPECT_EQ(::getrlimit(RLIMIT_NOFILE, &limit), 0);
    limit.rlim_cur = std::min(limit.rlim_max, wanted);
    EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &limit), 0);
    return limit.rlim_cur;
}

// One of its clients, which asks.
class Prober : public End {
  public:
    Prober() : End(vox_connection_create(kPressedName)) { resume(); }
    // The cost `key` as tellCosts() has it.
    [[nodiscard]] std::int64_t ask(const char* key, uid_t user = 0) {
        Inbox replies;
        request(dictionary({{"n", number(kProbe)}, {"user", number(user)}}), replies);
        return replies.wait(1) ? vox_int64_get_value(vox_dictionary_get_value(replies[0], key))
                               : -1;
    }
};

}  // namespace plr::test
