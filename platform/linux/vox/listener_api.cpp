// The functions of vox/listener.h.
#include "vox/listener.h"

#include "platform/linux/vox/limits.h"
#include "platform/linux/vox/listener.h"

using vox_link::connection;
using vox_link::listener;

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
