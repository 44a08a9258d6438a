#include "platform/linux/vox/limits.h"

#include <algorithm>

namespace vox_link {
namespace {

constexpr std::uint32_t kLargestMessage = 1u << 30;
constexpr std::uint32_t kMostDepth = 64;
constexpr std::uint32_t kMostDescriptors = 64;

}  // namespace

vox_limits_t usable_limits(const vox_limits_t* given) noexcept {
    vox_limits_t limits = given ? *given : vox_limits_default();
    limits.max_message_bytes = std::clamp(limits.max_message_bytes, 1u, kLargestMessage);
    limits.max_depth = std::clamp(limits.max_depth, 1u, kMostDepth);
    limits.max_descriptors = std::min(limits.max_descriptors, kMostDescriptors);
    limits.incomplete_frame_ms = std::max(limits.incomplete_frame_ms, 1u);
    limits.max_connections = std::max(limits.max_connections, 1u);
    limits.max_connections_per_uid = std::max(limits.max_connections_per_uid, 1u);
    limits.max_partial_bytes_per_uid = std::max(limits.max_partial_bytes_per_uid, 1u);
    return limits;
}

frame_limits frame_limits_of(const vox_limits_t& limits) noexcept {
    return {.body_bytes = limits.max_message_bytes, .descriptors = limits.max_descriptors};
}

vox_wire::codec_limits codec_limits_of(const vox_limits_t& limits) noexcept {
    return {.bytes = limits.max_message_bytes,
            .depth = limits.max_depth,
            .descriptors = limits.max_descriptors};
}

}  // namespace vox_link

extern "C" vox_limits_t vox_limits_default(void) {
    return {.max_message_bytes = 16u << 20,
            .max_depth = 64,
            .max_descriptors = 64,
            .max_queued_bytes = 16u << 20,
            .max_queued_messages = 65536,
            .max_pending_replies = 65536,
            .max_open_requests = 4096,
            .max_held_descriptors = 256,
            .incomplete_frame_ms = 30000,
            .max_connections = 4096,
            .max_connections_per_uid = 2048,
            .max_queued_bytes_per_uid = 64u << 20,
            .max_queued_messages_per_uid = 262144,
            .max_pending_replies_per_uid = 262144,
            .max_open_requests_per_uid = 16384,
            .max_held_descriptors_per_uid = 512,
            .max_partial_bytes_per_uid = 64u << 20,
            .overflow = VOX_OVERFLOW_DISCONNECT};
}
