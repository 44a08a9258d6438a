#include "plr/rest/value_coding.h"

#include <algorithm>
#include <cstring>
#include <exception>
#include <type_traits>

#include "plr/ipc/read.h"
#include "plr/ipc/values.h"

namespace plr::rest::detail {
namespace {

// The standard conversion of each type's family. Deliberate: unsigned int goes
// through unsigned long and is cut, the smaller types through int.
template <class T>
T convert(const std::string& text) {
    if constexpr (std::is_same_v<T, unsigned int> || std::is_same_v<T, unsigned long>)
        return static_cast<T>(std::stoul(text, nullptr, 10));
    else if constexpr (std::is_same_v<T, long>)
        return std::stol(text, nullptr, 10);
    else if constexpr (std::is_same_v<T, long long>)
        return std::stoll(text, nullptr, 10);
    else if constexpr (std::is_same_v<T, unsigned long long>)
        return std::stoull(text, nullptr, 10);
    else
        return static_cast<T>(std::stoi(text, nullptr, 10));
}

}  // namespace

vox::object write_enum_string_value(long long value, const char* name) {
    return vox::string("%lld:%s", value, name);
}

vox::object write_enum_string_value(long long value, const std::string& name) {
    return write_enum_string_value(value, name.c_str());
}

vox::object write_enum_string_value(unsigned long long value, const char* name) {
    return vox::string("%llu:%s", value, name);
}

vox::object write_enum_string_value(unsigned long long value, const std::string& name) {
    return write_enum_string_value(value, name.c_str());
}

template <class T>
void read_enum_string_value(T& out, const vox::object& value) {
    try {
        out = convert<T>(vox::dyn_cast_or_default(value, ""));
    } catch (const std::exception&) {
        // No number, or one out of range: `out` stays as it was.
    }
}

template PLR_EXPORT void read_enum_string_value(signed char&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(unsigned char&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(short&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(unsigned short&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(int&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(unsigned int&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(long&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(unsigned long&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(long long&, const vox::object&);
template PLR_EXPORT void read_enum_string_value(unsigned long long&, const vox::object&);

void read_raw_binary_value(void* buffer, unsigned long size, const vox::object& value) {
    auto* out = static_cast<unsigned char*>(buffer);
    const std::size_t copied = std::min<std::size_t>(vox_data_get_length(value.get()), size);
    if (copied != 0)
        std::memcpy(out, vox_data_get_bytes_ptr(value.get()), copied);
    std::fill(out + copied, out + size, static_cast<unsigned char>(0));
}

}  // namespace plr::rest::detail
