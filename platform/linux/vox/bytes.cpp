// Data, strings and UUIDs: bytes behind a header.
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <new>

#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

using namespace vox_values;

namespace {

constexpr std::size_t kUuidLength = 16;

vox_object* copy_bytes(vox_type type, const void* bytes, std::size_t length) noexcept {
    vox_bytes_object* object = make_bytes(type, length);
    if (length > 0)
        std::memcpy(object->text(), bytes, length);
    return object;
}

}  // namespace

namespace vox_values {

vox_bytes_object* make_bytes(vox_type type, std::size_t length) noexcept {
    PLR_ASSERT(length < SIZE_MAX - sizeof(vox_bytes_object), "out of memory");
    auto* object = new (allocate(sizeof(vox_bytes_object) + length + 1)) vox_bytes_object(type);
    object->length = length;
    object->text()[length] = '\0';
    return object;
}

}  // namespace vox_values

vox_object_t vox_data_create(const void* bytes, size_t length) {
    return copy_bytes(VOX_TYPE_DATA, bytes, bytes ? length : 0);
}
const void* vox_data_get_bytes_ptr(vox_object_t data) {
    const auto* bytes = as<vox_bytes_object>(data, VOX_TYPE_DATA);
    return bytes ? bytes->text() : nullptr;
}
size_t vox_data_get_length(vox_object_t data) {
    const auto* bytes = as<vox_bytes_object>(data, VOX_TYPE_DATA);
    return bytes ? bytes->length : 0;
}

vox_object_t vox_string_create(const char* text) {
    return copy_bytes(VOX_TYPE_STRING, text, text ? std::strlen(text) : 0);
}
vox_object_t vox_string_create_with_length(const char* text, size_t length) {
    return copy_bytes(VOX_TYPE_STRING, text, text ? length : 0);
}

vox_object_t vox_string_create_with_format(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    vox_object_t result = vox_string_create_with_format_and_arguments(format, arguments);
    va_end(arguments);
    return result;
}

// The caller's format is checked where it is a literal: at vox_string_create_with_format().
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
vox_object_t vox_string_create_with_format_and_arguments(const char* format, va_list arguments) {
    char small[256];
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(small, sizeof small, format, arguments);
    vox_object_t result;
    if (length < 0) {
        result = copy_bytes(VOX_TYPE_STRING, "", 0);
    } else if (static_cast<std::size_t>(length) < sizeof small) {
        result = copy_bytes(VOX_TYPE_STRING, small, static_cast<std::size_t>(length));
    } else {
        vox_bytes_object* string = make_bytes(VOX_TYPE_STRING, static_cast<std::size_t>(length));
        std::vsnprintf(string->text(), string->length + 1, format, again);
        result = string;
    }
    va_end(again);
    return result;
}
#pragma GCC diagnostic pop

const char* vox_string_get_string_ptr(vox_object_t string) {
    const auto* bytes = as<vox_bytes_object>(string, VOX_TYPE_STRING);
    return bytes ? bytes->text() : nullptr;
}
size_t vox_string_get_length(vox_object_t string) {
    const auto* bytes = as<vox_bytes_object>(string, VOX_TYPE_STRING);
    return bytes ? bytes->length : 0;
}

vox_object_t vox_uuid_create(const uint8_t bytes[16]) {
    return copy_bytes(VOX_TYPE_UUID, bytes, kUuidLength);
}
const uint8_t* vox_uuid_get_bytes(vox_object_t uuid) {
    const auto* bytes = as<vox_bytes_object>(uuid, VOX_TYPE_UUID);
    return bytes ? reinterpret_cast<const std::uint8_t*>(bytes->text()) : nullptr;
}
