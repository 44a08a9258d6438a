#pragma once

#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/frame.h"
#include "vox/limits.h"

// The limits of connections in the forms that the layers want them in.
namespace vox_link {

// `given` with every member in its range; the defaults for a null pointer.
[[nodiscard]] vox_limits_t usable_limits(const vox_limits_t* given) noexcept;

[[nodiscard]] frame_limits frame_limits_of(const vox_limits_t& limits) noexcept;
[[nodiscard]] vox_wire::codec_limits codec_limits_of(const vox_limits_t& limits) noexcept;

}  // namespace vox_link
