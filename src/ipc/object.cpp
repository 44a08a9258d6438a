#include "plr/ipc/object.h"

#include <cstdarg>

#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"

namespace vox {

namespace {

std::string_view textOf(vox_object_t value) noexcept {
    if (vox_get_type(value) != VOX_TYPE_STRING)
        return {};
    return {vox_string_get_string_ptr(value), vox_string_get_length(value)};
}

}  // namespace

std::string_view object::text() const noexcept {
    return textOf(raw_);
}

std::string_view dict::text(const char* key) const noexcept {
    return textOf(vox_dictionary_get_value(get(), key));
}

object string(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    const vox_object_t made = vox_string_create_with_format_and_arguments(format, arguments);
    va_end(arguments);
    return object::adopt(made);
}

}  // namespace vox
