#include <cstring>
#include <new>

#include "platform/linux/vox/value_layout.h"

using namespace vox_values;

const char* const vox_error_key_description = "description";

vox_object_t vox_error_create(int64_t code, const char* description) {
    auto* error = new (allocate(sizeof(vox_error_object))) vox_error_object(VOX_TYPE_ERROR);
    error->code = code;
    error->description = description ? vox_string_create(description) : nullptr;
    return error;
}

int64_t vox_error_get_code(vox_object_t error) {
    const auto* object = as<vox_error_object>(error, VOX_TYPE_ERROR);
    return object ? object->code : 0;
}

vox_object_t vox_error_get_value(vox_object_t error, const char* key) {
    const auto* object = as<vox_error_object>(error, VOX_TYPE_ERROR);
    if (!object || !key || std::strcmp(key, vox_error_key_description) != 0)
        return nullptr;
    return object->description;
}
