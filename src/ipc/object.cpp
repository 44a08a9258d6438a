#include "plr/ipc/object.h"

#include <cstdarg>

#include "plr/ipc/values.h"

namespace vox {

std::string_view object::text() const noexcept {
    if (type() != VOX_TYPE_STRING)
        return {};
    return {vox_string_get_string_ptr(raw_), vox_string_get_length(raw_)};
}

object string(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    const vox_object_t made = vox_string_create_with_format_and_arguments(format, arguments);
    va_end(arguments);
    return object::adopt(made);
}

}  // namespace vox
