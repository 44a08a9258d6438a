#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// Vox values from native ones: message["v"] = vox::int64(-85). Any thread.
namespace vox {

// Text from a printf-style format and its arguments.
[[nodiscard, gnu::format(printf, 1, 2)]] PLR_EXPORT object string(const char* format, ...);
// Text as it is, by its length.
[[nodiscard]] inline object string(std::string_view text) {
    return object::adopt(vox_string_create_with_length(text.data(), text.size()));
}

[[nodiscard]] inline object boolean(bool value) {
    return object::adopt(vox_bool_create(value));
}
[[nodiscard]] inline object int64(std::int64_t value) {
    return object::adopt(vox_int64_create(value));
}
[[nodiscard]] inline object uint64(std::uint64_t value) {
    return object::adopt(vox_uint64_create(value));
}
[[nodiscard]] inline object real(double value) {
    return object::adopt(vox_double_create(value));
}
// Copies the bytes.
[[nodiscard]] inline object data(std::span<const std::uint8_t> bytes) {
    return object::adopt(vox_data_create(bytes.data(), bytes.size()));
}
// POSIX time, in nanoseconds since 1970.
[[nodiscard]] inline object date(std::chrono::nanoseconds sinceEpoch) {
    return object::adopt(vox_date_create(sinceEpoch.count()));
}
[[nodiscard]] inline object uuid(std::span<const std::uint8_t, 16> bytes) {
    return object::adopt(vox_uuid_create(bytes.data()));
}
// `description` may be null.
[[nodiscard]] inline object error(std::int64_t code, const char* description) {
    return object::adopt(vox_error_create(code, description));
}

}  // namespace vox
