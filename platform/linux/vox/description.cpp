#include "platform/linux/common/description.h"

#include <cinttypes>
#include <cstring>
#include <string>

#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

using namespace description;
using namespace vox_values;

namespace {

void append_uuid(std::string& out, std::string_view bytes) {
    for (std::size_t i = 0; i < bytes.size(); i++) {
        if (i == 4 || i == 6 || i == 8 || i == 10)
            out += '-';
        append_format(out, "%02x", static_cast<unsigned char>(bytes[i]));
    }
}

void append_error(std::string& out, const vox_error_object& error) {
    append_format(out, "<error %" PRId64, error.code);
    if (error.description) {
        out += ": ";
        append_text(out, static_cast<vox_bytes_object*>(error.description)->view(), true);
    }
    out += '>';
}

void describe(std::string& out, vox_object* object, unsigned depth);

void append_array(std::string& out, const vox_array_object& array, unsigned depth) {
    append_elements(out, "[]", array.count,
                    [&](std::size_t i) { describe(out, array.items[i], depth + 1); });
}

void append_dictionary(std::string& out, const vox_dictionary_object& dictionary, unsigned depth) {
    append_elements(out, "{}", dictionary.count, [&](std::size_t i) {
        append_text(out, dictionary.entries[i].key_view(), true);
        out += ": ";
        describe(out, dictionary.entries[i].value, depth + 1);
    });
}

void describe_container(std::string& out, vox_object* object, unsigned depth) {
    if (depth >= kMostDepth)
        out += "…";
    else if (object->type == VOX_TYPE_ARRAY)
        append_array(out, *static_cast<vox_array_object*>(object), depth);
    else
        append_dictionary(out, *static_cast<vox_dictionary_object*>(object), depth);
}

void describe(std::string& out, vox_object* object, unsigned depth) {
    switch (type_of(object)) {
        case VOX_TYPE_NULL:
            out += "null";
            return;
        case VOX_TYPE_BOOL:
            out += vox_bool_get_value(object) ? "true" : "false";
            return;
        case VOX_TYPE_INT64:
            return append_format(out, "%" PRId64, vox_int64_get_value(object));
        case VOX_TYPE_UINT64:
            return append_format(out, "%" PRIu64 "u", vox_uint64_get_value(object));
        case VOX_TYPE_DOUBLE:
            return append_format(out, "%.17g", vox_double_get_value(object));
        case VOX_TYPE_DATE:
            return append_date(out, vox_date_get_value(object));
        case VOX_TYPE_DATA:
            return append_data(out, static_cast<vox_bytes_object*>(object)->view());
        case VOX_TYPE_STRING:
            return append_text(out, static_cast<vox_bytes_object*>(object)->view(), true);
        case VOX_TYPE_UUID:
            return append_uuid(out, static_cast<vox_bytes_object*>(object)->view());
        case VOX_TYPE_ARRAY:
        case VOX_TYPE_DICTIONARY:
            return describe_container(out, object, depth);
        case VOX_TYPE_ERROR:
            return append_error(out, *static_cast<vox_error_object*>(object));
        case VOX_TYPE_CONNECTION: {
            const auto* custom = static_cast<vox_custom_object*>(object);
            return custom->vtable->describe(custom, out);
        }
        case VOX_TYPE_ENDPOINT:
        case VOX_TYPE_FD:
            return append_format(out, "<%s %d>", vox_type_get_name(type_of(object)),
                                 static_cast<vox_descriptor_object*>(object)->descriptor);
    }
}

}  // namespace

char* vox_copy_description(vox_object_t object) {
    std::string text;
    describe(text, object, 0);
    char* copy = strdup(text.c_str());
    PLR_ASSERT(copy, "out of memory");
    return copy;
}
