#pragma once

#include "plr/base/export.h"
#include "plr/concurrency/qf_shared_ref.h"
#include "plr/ipc/object.h"

// Message values as Qf values, and back: what a service was told goes into
// settings, and settings go out in messages. Copies; what becomes what is in
// qf/vox_bridge.h. Any thread.
namespace vox {

// Null for what has no Qf value: connections, endpoints and descriptors.
// Deliberate: the null object has one, kQfNull.
[[nodiscard]] PLR_EXPORT plr::qf::QfSharedRef<const void> bridge(const object& value);
// The same for a raw value, which is lent; null for a null pointer.
[[nodiscard]] PLR_EXPORT plr::qf::QfSharedRef<const void> vox_to_qf(void* raw);
// `value` is a Qf value, which is lent, or null. The null object when there is
// nothing to make of it.
[[nodiscard]] PLR_EXPORT object qf_to_vox(const void* value);

}  // namespace vox
