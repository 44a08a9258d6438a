#include "plr/ipc/qf_bridge.h"

#include "qf/vox_bridge.h"

namespace vox {

using Ref = plr::qf::QfSharedRef<const void>;

Ref bridge(const object& value) {
    return vox_to_qf(value.get());
}

Ref vox_to_qf(void* raw) {
    return plr::qf::adopt(qf_create_from_vox(static_cast<vox_object_t>(raw)));
}

object qf_to_vox(const void* value) {
    return object::adopt(qf_create_vox(value));
}

}  // namespace vox
