#include "platform/linux/vox/frame.h"

#include <algorithm>
#include <bit>
#include <cstring>

namespace vox_link {
namespace {

constexpr std::uint8_t kMagic[4] = {'V', 'O', 'X', '1'};

template <class Unsigned>
Unsigned little_endian(Unsigned value) noexcept {
    if constexpr (std::endian::native == std::endian::little || sizeof value == 1)
        return value;
    else if constexpr (sizeof value == 2)
        return __builtin_bswap16(value);
    else if constexpr (sizeof value == 4)
        return __builtin_bswap32(value);
    else
        return __builtin_bswap64(value);
}

template <class Unsigned>
void store(Unsigned value, std::uint8_t* out) noexcept {
    value = little_endian(value);
    std::memcpy(out, &value, sizeof value);
}

template <class Unsigned>
Unsigned load(const std::uint8_t* in) noexcept {
    Unsigned value;
    std::memcpy(&value, in, sizeof value);
    return little_endian(value);
}

// The reason why a header with correct magic cannot be accepted; empty: it can.
std::string refusal(const frame_header& header, const frame_limits& limits) {
    const auto type = static_cast<unsigned>(header.type);
    if (type < 1 || type > 9)
        return "unknown frame type " + std::to_string(type);
    const bool message = carries_message(header.type);
    const std::uint32_t most =
        message || header.type == frame_type::tap ? limits.body_bytes : kControlBodyBytes;
    if (header.length > most)
        return "frame of " + std::to_string(header.length) + " bytes is over the limit of " +
               std::to_string(most);
    if (header.length == 0)
        return "frame without body";
    if (header.descriptors > (message ? limits.descriptors : 0))
        return "frame with " + std::to_string(header.descriptors) +
               " descriptors is over the limit of " +
               std::to_string(message ? limits.descriptors : 0);
    if ((header.flags & ~(header.type == frame_type::ping ? kPingWantsAnswer : 0)) != 0)
        return "frame with unknown flags " + std::to_string(header.flags);
    const bool names_request =
        header.type == frame_type::request || header.type == frame_type::reply ||
        header.type == frame_type::cancel || header.type == frame_type::refused;
    if (header.type != frame_type::ping && names_request != (header.id != 0))
        return names_request ? "frame needs the id of a request" : "frame with an unexpected id";
    return {};
}

}  // namespace

void write_header(const frame_header& header, std::uint8_t* out) noexcept {
    std::memcpy(out, kMagic, sizeof kMagic);
    out[4] = static_cast<std::uint8_t>(header.type);
    out[5] = header.flags;
    store(header.descriptors, out + 6);
    store(header.length, out + 8);
    store(std::uint32_t{0}, out + 12);
    store(header.id, out + 16);
}

void write_header_id(std::uint64_t id, std::uint8_t* header) noexcept {
    store(id, header + 16);
}

frame_header read_own_header(const std::uint8_t* bytes) noexcept {
    frame_header header;
    header.type = static_cast<frame_type>(bytes[4]);
    header.flags = bytes[5];
    header.descriptors = load<std::uint16_t>(bytes + 6);
    header.length = load<std::uint32_t>(bytes + 8);
    header.id = load<std::uint64_t>(bytes + 16);
    return header;
}

bool read_header(std::span<const std::uint8_t> bytes, const frame_limits& limits,
                 frame_header& header, std::string& why) {
    if (!may_begin_frame(bytes)) {
        why = "frame does not begin with VOX1";
        return false;
    }
    header = read_own_header(bytes.data());
    if (load<std::uint32_t>(bytes.data() + 12) != 0) {
        why = "reserved field of the frame is not zero";
        return false;
    }
    // Hot path: nothing below allocates unless it refuses.
    const bool plain = carries_message(header.type) && header.length != 0 &&
                       header.length <= limits.body_bytes &&
                       header.descriptors <= limits.descriptors && header.flags == 0 &&
                       (header.type == frame_type::message) == (header.id == 0);
    if (plain) [[likely]]
        return true;
    why = refusal(header, limits);
    return why.empty();
}

bool may_begin_frame(std::span<const std::uint8_t> bytes) noexcept {
    return std::memcmp(bytes.data(), kMagic, std::min(bytes.size(), sizeof kMagic)) == 0;
}

}  // namespace vox_link
