#include "plr/ipc/read.h"

#include <stdexcept>

namespace vox {
namespace {

// The entry of `value` that one component of a path names.
object step(const object& value, const std::string& component) {
    switch (value.type()) {
        case VOX_TYPE_DICTIONARY:
            return object::retain(vox_dictionary_get_value(value.get(), component.c_str()));
        case VOX_TYPE_ARRAY:
            return object::retain(vox_array_get_value(value.get(), std::stoul(component)));
        default:
            return object();
    }
}

bool isContainer(const object& value) {
    return value.type() == VOX_TYPE_DICTIONARY || value.type() == VOX_TYPE_ARRAY;
}

}  // namespace

long long dyn_cast_or_default(const object& value, long long fallback) {
    switch (value.type()) {
        case VOX_TYPE_INT64:
            return vox_int64_get_value(value.get());
        case VOX_TYPE_UINT64:
            return static_cast<long long>(vox_uint64_get_value(value.get()));
        case VOX_TYPE_BOOL:
            return vox_bool_get_value(value.get());
        default:
            return fallback;
    }
}

long dyn_cast_or_default(const object& value, long fallback) {
    return static_cast<long>(dyn_cast_or_default(value, static_cast<long long>(fallback)));
}

unsigned long dyn_cast_or_default(const object& value, unsigned long fallback) {
    return static_cast<unsigned long>(dyn_cast_or_default(value, static_cast<long long>(fallback)));
}

int dyn_cast_or_default(const object& value, int fallback) {
    return static_cast<int>(dyn_cast_or_default(value, static_cast<long long>(fallback)));
}

unsigned int dyn_cast_or_default(const object& value, unsigned int fallback) {
    return static_cast<unsigned int>(dyn_cast_or_default(value, static_cast<long long>(fallback)));
}

unsigned long long dyn_cast_or_default(const object& value, unsigned long long fallback) {
    if (value.type() == VOX_TYPE_UINT64)
        return vox_uint64_get_value(value.get());
    if (value.type() != VOX_TYPE_INT64)
        return fallback;
    const long long number = vox_int64_get_value(value.get());
    if (number < 0)
        throw std::out_of_range("dyn_cast to uint64_t requires nonnegative values");
    return static_cast<unsigned long long>(number);
}

bool dyn_cast_or_default(const object& value, bool fallback) {
    switch (value.type()) {
        case VOX_TYPE_INT64:
            return vox_int64_get_value(value.get()) != 0;
        case VOX_TYPE_UINT64:
            return vox_uint64_get_value(value.get()) != 0;
        case VOX_TYPE_BOOL:
            return vox_bool_get_value(value.get()) != 0;
        default:
            return fallback;
    }
}

double dyn_cast_or_default(const object& value, double fallback) {
    return value.type() == VOX_TYPE_DOUBLE ? vox_double_get_value(value.get()) : fallback;
}

std::string dyn_cast_or_default(const object& value, const std::string& fallback) {
    return value.type() == VOX_TYPE_STRING ? std::string(value.text()) : fallback;
}

std::string dyn_cast_or_default(const object& value, const char* fallback) {
    return value.type() == VOX_TYPE_STRING ? std::string(value.text()) : std::string(fallback);
}

std::vector<std::uint8_t> dyn_cast_or_default(const object& value,
                                              const std::vector<std::uint8_t>& fallback) {
    if (value.type() != VOX_TYPE_DATA)
        return fallback;
    const auto* bytes = static_cast<const std::uint8_t*>(vox_data_get_bytes_ptr(value.get()));
    return {bytes, bytes + vox_data_get_length(value.get())};
}

bool is_logically_false(const object& value) {
    switch (value.type()) {
        case VOX_TYPE_NULL:
            return true;
        case VOX_TYPE_INT64:
            return vox_int64_get_value(value.get()) == 0;
        case VOX_TYPE_UINT64:
            return vox_uint64_get_value(value.get()) == 0;
        case VOX_TYPE_BOOL:
            return vox_bool_get_value(value.get()) == 0;
        case VOX_TYPE_DATA:
            return vox_data_get_length(value.get()) == 0;
        case VOX_TYPE_STRING:
            return vox_string_get_length(value.get()) == 0;
        case VOX_TYPE_ARRAY:
            return vox_array_get_count(value.get()) == 0;
        case VOX_TYPE_DICTIONARY:
            return vox_dictionary_get_count(value.get()) == 0;
        default:
            return false;
    }
}

bool is_logically_false(const dict& value) {
    return value.count() == 0;
}
bool is_logically_false(const array& value) {
    return value.count() == 0;
}

object get_subpath(const object& root, const std::string& path) {
    object value = root;
    std::size_t begin = 0;
    while (isContainer(value)) {
        const std::size_t end = path.find('.', begin);
        value = step(value, path.substr(begin, end - begin));
        if (end == std::string::npos)
            return value;
        begin = end + 1;
    }
    // Components are left over, but nothing to look them up in.
    return object();
}

}  // namespace vox
