#pragma once

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <initializer_list>
#include <iterator>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/vox/codec.h"

// Helpers of the tests of values and codec.
namespace vox_test {

struct releaser {
    void operator()(vox_object_t object) const { vox_release(object); }
};
using owned = std::unique_ptr<vox_object, releaser>;

inline owned own(vox_object_t object) {
    return owned(object);
}
inline owned text(std::string_view string) {
    return own(vox_string_create_with_length(string.data(), string.size()));
}
inline owned number(std::int64_t value) {
    return own(vox_int64_create(value));
}

inline owned array(std::initializer_list<vox_object_t> items) {
    owned result = own(vox_array_create());
    for (vox_object_t item : items)
        vox_array_append_value(result.get(), item);
    return result;
}

inline owned dictionary(std::initializer_list<std::pair<const char*, vox_object_t>> entries) {
    owned result = own(vox_dictionary_create());
    for (const auto& [key, value] : entries)
        vox_dictionary_set_value(result.get(), key, value);
    return result;
}

// An array in an array …, `depth` of them.
inline owned nested(unsigned depth) {
    owned result = own(vox_array_create());
    for (unsigned i = 1; i < depth; i++)
        result = array({result.get()});
    return result;
}

inline std::string description(vox_object_t object) {
    char* copy = vox_copy_description(object);
    std::string result = copy;
    std::free(copy);
    return result;
}

// Descriptors this process has open.
inline long open_descriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

using bytes = std::vector<std::uint8_t>;

inline bytes from_hex(std::string_view hex) {
    bytes result;
    std::string digits;
    for (const char c : hex)
        if (c != ' ')
            digits += c;
    for (std::size_t i = 0; i + 1 < digits.size(); i += 2)
        result.push_back(static_cast<std::uint8_t>(std::stoi(digits.substr(i, 2), nullptr, 16)));
    return result;
}

inline std::string to_hex(std::span<const std::uint8_t> data) {
    std::string result;
    for (const std::uint8_t byte : data) {
        result += "0123456789abcdef"[byte >> 4];
        result += "0123456789abcdef"[byte & 15];
    }
    return result;
}

// The encoding of `value`, which must have one and no descriptors.
inline bytes encoding(vox_object_t value) {
    vox_wire::encoded out;
    if (vox_wire::encode(value, {}, out) != 0)
        return {};
    return {out.bytes.view().begin(), out.bytes.view().end()};
}

inline owned decoded(std::span<const std::uint8_t> data,
                     const vox_wire::codec_limits& limits = {}) {
    const char* why = nullptr;
    return own(vox_wire::decode(data, {}, limits, why));
}

// Why `data` is refused; "" when it is not.
inline std::string refusal(std::span<const std::uint8_t> data,
                           const vox_wire::codec_limits& limits = {}) {
    const char* why = nullptr;
    const owned value = own(vox_wire::decode(data, {}, limits, why));
    return value ? "" : why;
}

}  // namespace vox_test
