#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/frame.h"

// The first frame in each direction and the other small frames that connections
// send on their own account.
namespace vox_link {

// Leaves room for the header in `out`, which is empty.
void skip_header(vox_wire::encoded& out) noexcept;

// Builds a frame whose body is `value` in `out`, which is empty. Returns an error
// number as encode() does.
[[nodiscard]] int build_frame(frame_type type, std::uint64_t id, vox_object_t value,
                              const vox_wire::codec_limits& limits, vox_wire::encoded& out);

// Builds a frame whose body is `value` (taken over) in `out`, which is empty.
void build_control(frame_type type, std::uint8_t flags, std::uint64_t id, vox_object_t value,
                   vox_wire::encoded& out);

// A hello that offers our versions and tells what we accept.
void build_hello(const vox_wire::codec_limits& accepted, vox_wire::encoded& out);
// Reads the peer's hello: what it accepts, within our own bounds. Returns false
// with the reason in `why` when it is none or no version suits both.
[[nodiscard]] bool read_hello(std::span<const std::uint8_t> body, vox_wire::codec_limits& accepted,
                              std::string& why);

// Whether `body` is the null value, as in cancel and ping.
[[nodiscard]] bool is_null_body(std::span<const std::uint8_t> body) noexcept;
// The error in a refused frame, for the caller to release; null when it is none.
[[nodiscard]] vox_object_t read_refused(std::span<const std::uint8_t> body) noexcept;
// The count in a dropped frame; negative when it is none.
[[nodiscard]] std::int64_t read_dropped(std::span<const std::uint8_t> body) noexcept;

}  // namespace vox_link
