// The functions of vox/listener.h, and vox_listener_set_taps().
#include "vox/listener.h"

#include "platform/linux/vox/limits.h"
#include "platform/linux/vox/listener.h"
#include "plr/base/assert.h"
#include "vox/tap.h"

using vox_link::connection;
using vox_link::listener;

namespace {

// The listener that a caller must have given.
listener& required(vox_connection_t object) {
    connection* found = connection::from(object);
    PLR_ASSERT(found && found->is_listener(), "a Vox value that is no listener was used as one");
    return *static_cast<listener*>(found);
}

}  // namespace

vox_connection_t vox_connection_create_listener(const char* name, const vox_limits_t* limits) {
    return new listener(name ? name : "", false, vox_link::usable_limits(limits));
}

vox_connection_t vox_connection_create_anonymous_listener(const vox_limits_t* limits) {
    return new listener("", true, vox_link::usable_limits(limits));
}

vox_endpoint_t vox_endpoint_create(vox_connection_t object) {
    connection* found = connection::from(object);
    if (!found || !found->is_listener())
        return vox_null_create();
    return static_cast<listener*>(found)->make_endpoint();
}

void vox_listener_set_policy(vox_connection_t object, const vox_policy_t* policy) {
    required(object).set_policy(policy);
}

void vox_listener_set_taps(vox_connection_t object, int allowed) {
    required(object).taps().set_allowed(allowed != 0);
}

// ---- Looking -------------------------------------------------------------------------

void vox_listener_get_statistics(vox_connection_t object, vox_listener_statistics_t* statistics) {
    *statistics = required(object).account().statistics();
}

void vox_listener_get_user_statistics(vox_connection_t object, uid_t user,
                                      vox_user_statistics_t* statistics) {
    *statistics = required(object).account().user_statistics(user);
}
