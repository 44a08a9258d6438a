#include "plr/ipc/listener.h"

#include "vox/tap.h"

namespace vox {

listener listener::create(const char* name, const vox_limits_t* limits) {
    return listener(vox_connection_create_listener(name, limits));
}

listener listener::create_anonymous(const vox_limits_t* limits) {
    return listener(vox_connection_create_anonymous_listener(limits));
}

void listener::set_policy(const policy& policy) const {
    const vox_policy_t lent = {.users = policy.users.data(),
                               .user_count = policy.users.size(),
                               .groups = policy.groups.data(),
                               .group_count = policy.groups.size(),
                               .everybody = policy.everybody};
    if (*this)
        vox_listener_set_policy(get(), &lent);
}

void listener::set_taps(bool allowed) const {
    if (*this)
        vox_listener_set_taps(get(), allowed);
}

vox_listener_statistics_t listener::listener_statistics() const {
    vox_listener_statistics_t result{};
    if (*this)
        vox_listener_get_statistics(get(), &result);
    return result;
}

vox_user_statistics_t listener::user_statistics(uid_t user) const {
    vox_user_statistics_t result{};
    if (*this)
        vox_listener_get_user_statistics(get(), user, &result);
    return result;
}

}  // namespace vox
