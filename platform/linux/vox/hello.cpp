#include "platform/linux/vox/hello.h"

#include <algorithm>
#include <limits>

#include "plr/base/assert.h"
#include "vox/value.h"

namespace vox_link {
namespace {

constexpr std::int64_t kLowestVersion = kProtocolVersion;
constexpr std::int64_t kHighestVersion = kProtocolVersion;
constexpr vox_wire::codec_limits kBounds = {.bytes = 1u << 30, .depth = 64, .descriptors = 64};
constexpr vox_wire::codec_limits kControlLimits = {
    .bytes = kControlBodyBytes, .depth = 8, .descriptors = 0};

vox_object_t decode_control(std::span<const std::uint8_t> body) noexcept {
    const char* why = nullptr;
    return vox_wire::decode(body, {}, kControlLimits, why);
}

void set_number(vox_object_t dictionary, const char* key, std::size_t number) {
    const vox_object_t value = vox_int64_create(static_cast<std::int64_t>(number));
    vox_dictionary_set_value(dictionary, key, value);
    vox_release(value);
}

// A non-negative number of either integer type; -1 for anything else.
std::int64_t number_of(vox_object_t value) noexcept {
    if (vox_get_type(value) == VOX_TYPE_INT64)
        return std::max<std::int64_t>(vox_int64_get_value(value), -1);
    if (vox_get_type(value) != VOX_TYPE_UINT64)
        return -1;
    const std::uint64_t number = vox_uint64_get_value(value);
    constexpr auto most = std::numeric_limits<std::int64_t>::max();
    return number > static_cast<std::uint64_t>(most) ? most : static_cast<std::int64_t>(number);
}

std::int64_t number_at(vox_object_t dictionary, const char* key) noexcept {
    return number_of(vox_dictionary_get_value(dictionary, key));
}

bool suits(std::int64_t lowest, std::int64_t highest, std::string& why) {
    if (lowest <= kHighestVersion && kLowestVersion <= highest && lowest <= highest)
        return true;
    why = "no common version: the peer speaks " + std::to_string(lowest) + " to " +
          std::to_string(highest) + ", this side " + std::to_string(kLowestVersion) + " to " +
          std::to_string(kHighestVersion);
    return false;
}

bool read_fields(vox_object_t hello, vox_wire::codec_limits& accepted, std::string& why) {
    const std::int64_t lowest = number_at(hello, "min");
    const std::int64_t highest = number_at(hello, "max");
    const std::int64_t bytes = number_at(hello, "bytes");
    const std::int64_t depth = number_at(hello, "depth");
    const std::int64_t descriptors = number_at(hello, "fds");
    if (lowest < 0 || highest < 0) {
        why = "hello without versions";
        return false;
    }
    if (!suits(lowest, highest, why))
        return false;
    if (bytes < 1 || depth < 1 || descriptors < 0) {
        why = "hello without limits";
        return false;
    }
    accepted.bytes = std::min(static_cast<std::size_t>(bytes), kBounds.bytes);
    accepted.depth = static_cast<unsigned>(std::min<std::int64_t>(depth, kBounds.depth));
    accepted.descriptors =
        static_cast<unsigned>(std::min<std::int64_t>(descriptors, kBounds.descriptors));
    return true;
}

}  // namespace

void skip_header(vox_wire::encoded& out) noexcept {
    static_cast<void>(out.bytes.room(kHeaderBytes));
    out.bytes.set_size(kHeaderBytes);
}

int build_frame(frame_type type, std::uint64_t id, vox_object_t value,
                const vox_wire::codec_limits& limits, vox_wire::encoded& out) {
    skip_header(out);
    if (const int error = vox_wire::encode(value, limits, out); error != 0)
        return error;
    write_header({.type = type,
                  .flags = 0,
                  .descriptors = static_cast<std::uint16_t>(out.descriptors.size()),
                  .length = static_cast<std::uint32_t>(out.bytes.size() - kHeaderBytes),
                  .id = id},
                 out.bytes.data());
    return 0;
}

void build_control(frame_type type, std::uint8_t flags, std::uint64_t id, vox_object_t value,
                   vox_wire::encoded& out) {
    skip_header(out);
    const int error = vox_wire::encode(value, kControlLimits, out);
    PLR_ASSERT(error == 0, "a frame of our own cannot be encoded");
    vox_release(value);
    const frame_header header = {
        .type = type,
        .flags = flags,
        .descriptors = 0,
        .length = static_cast<std::uint32_t>(out.bytes.size() - kHeaderBytes),
        .id = id};
    write_header(header, out.bytes.data());
}

void build_hello(const vox_wire::codec_limits& accepted, vox_wire::encoded& out) {
    const vox_object_t hello = vox_dictionary_create();
    set_number(hello, "min", static_cast<std::size_t>(kLowestVersion));
    set_number(hello, "max", static_cast<std::size_t>(kHighestVersion));
    set_number(hello, "bytes", accepted.bytes);
    set_number(hello, "depth", accepted.depth);
    set_number(hello, "fds", accepted.descriptors);
    build_control(frame_type::hello, 0, 0, hello, out);
}

bool read_hello(std::span<const std::uint8_t> body, vox_wire::codec_limits& accepted,
                std::string& why) {
    const vox_object_t hello = decode_control(body);
    const bool usable = vox_get_type(hello) == VOX_TYPE_DICTIONARY;
    if (!usable)
        why = "hello is no dictionary";
    const bool read = usable && read_fields(hello, accepted, why);
    vox_release(hello);
    return read;
}

bool is_null_body(std::span<const std::uint8_t> body) noexcept {
    const vox_object_t value = decode_control(body);
    const bool null = value && vox_get_type(value) == VOX_TYPE_NULL;
    vox_release(value);
    return null;
}

vox_object_t read_refused(std::span<const std::uint8_t> body) noexcept {
    const vox_object_t value = decode_control(body);
    if (value && vox_get_type(value) == VOX_TYPE_ERROR)
        return value;
    vox_release(value);
    return nullptr;
}

std::int64_t read_dropped(std::span<const std::uint8_t> body) noexcept {
    const vox_object_t value = decode_control(body);
    const std::int64_t count = number_of(value);
    vox_release(value);
    return count;
}

}  // namespace vox_link
