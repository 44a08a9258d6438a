#include <time.h>

#include <algorithm>
#include <cinttypes>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

// Descriptions are one line: text is quoted and its control characters are
// escaped, so that a peer's text cannot pass for a line of the log's own.
// Long and deep values are cut, marked by "…".
using namespace vox_values;

namespace {

constexpr std::size_t kMostBytes = 16384;  // of a whole description, about
constexpr std::size_t kMostData = 64;      // bytes of one data value that are shown
constexpr unsigned kMostDepth = 64;

[[gnu::format(printf, 2, 3)]] void append_format(std::string& out, const char* format, ...) {
    char text[64];
    va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    out.append(text, static_cast<std::size_t>(std::clamp(length, 0, int{sizeof text} - 1)));
}

void append_quoted(std::string& out, std::string_view text) {
    const bool valid =
        vox_wire::is_utf8({reinterpret_cast<const std::uint8_t*>(text.data()), text.size()});
    const std::size_t room = out.size() < kMostBytes ? kMostBytes - out.size() : 0;
    out += '"';
    for (const char c : text.substr(0, room)) {
        const auto byte = static_cast<unsigned char>(c);
        if (c == '"' || c == '\\')
            (out += '\\') += c;
        else if (byte < 0x20 || byte == 0x7f || (byte >= 0x80 && !valid))
            append_format(out, "\\x%02x", byte);
        else
            out += c;
    }
    out += text.size() > room ? "…\"" : "\"";
}

void append_data(std::string& out, std::string_view data) {
    append_format(out, "<%zu bytes", data.size());
    for (const char c : data.substr(0, kMostData))
        append_format(out, " %02x", static_cast<unsigned char>(c));
    out += data.size() > kMostData ? " …>" : ">";
}

void append_date(std::string& out, std::int64_t nanoseconds) {
    std::int64_t part = nanoseconds % 1'000'000'000;
    time_t seconds = nanoseconds / 1'000'000'000;
    if (part < 0) {
        part += 1'000'000'000;
        seconds--;
    }
    tm utc;
    gmtime_r(&seconds, &utc);
    char text[32];
    strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &utc);
    out += text;
    append_format(out, ".%09" PRId64 "Z", part);
}

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
        append_quoted(out, static_cast<vox_bytes_object*>(error.description)->view());
    }
    out += '>';
}

void describe(std::string& out, vox_object* object, unsigned depth);

void append_array(std::string& out, const vox_array_object& array, unsigned depth) {
    out += '[';
    for (std::uint32_t i = 0; i < array.count && out.size() < kMostBytes; i++) {
        if (i > 0)
            out += ", ";
        describe(out, array.items[i], depth + 1);
    }
    out += out.size() < kMostBytes ? "]" : "…]";
}

void append_dictionary(std::string& out, const vox_dictionary_object& dictionary, unsigned depth) {
    out += '{';
    for (std::uint32_t i = 0; i < dictionary.count && out.size() < kMostBytes; i++) {
        if (i > 0)
            out += ", ";
        append_quoted(out, dictionary.entries[i].key_view());
        out += ": ";
        describe(out, dictionary.entries[i].value, depth + 1);
    }
    out += out.size() < kMostBytes ? "}" : "…}";
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
            return append_quoted(out, static_cast<vox_bytes_object*>(object)->view());
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
