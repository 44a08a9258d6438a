#pragma once

#include <cstdint>
#include <cstdlib>
#include <initializer_list>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/vox/codec.h"
#include "support/descriptors.h"

// Vox values and their encodings, short to write.
namespace plr::test {

using Bytes = std::vector<std::uint8_t>;

// One owned reference.
class Ref {
  public:
    Ref() = default;
    explicit Ref(vox_object_t adopted) : object_(adopted) {}
    Ref(const Ref& other) : object_(vox_retain(other.object_)) {}
    Ref(Ref&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    Ref& operator=(Ref other) noexcept {
        std::swap(object_, other.object_);
        return *this;
    }
    ~Ref() { vox_release(object_); }
    operator vox_object_t() const { return object_; }
    static Ref retain(vox_object_t lent) { return Ref(vox_retain(lent)); }

  private:
    vox_object_t object_ = nullptr;
};

inline Ref number(std::int64_t value) {
    return Ref(vox_int64_create(value));
}
inline Ref text(std::string_view string) {
    return Ref(vox_string_create_with_length(string.data(), string.size()));
}
inline Ref array(std::initializer_list<vox_object_t> items) {
    Ref made(vox_array_create());
    for (vox_object_t item : items)
        vox_array_append_value(made, item);
    return made;
}
inline Ref dictionary(std::initializer_list<std::pair<const char*, vox_object_t>> entries) {
    Ref made(vox_dictionary_create());
    for (const auto& [key, value] : entries)
        vox_dictionary_set_value(made, key, value);
    return made;
}
// An array in an array …, `depth` of them.
inline Ref nested(unsigned depth) {
    return depth == 1 ? array({}) : array({nested(depth - 1)});
}

inline std::string description(vox_object_t object) {
    char* copy = vox_copy_description(object);
    std::string made = copy;
    std::free(copy);
    return made;
}

inline Bytes fromHex(std::string_view hex) {
    std::string digits(hex);
    std::erase(digits, ' ');
    Bytes made;
    for (std::size_t i = 0; i + 1 < digits.size(); i += 2)
        made.push_back(static_cast<std::uint8_t>(std::stoi(digits.substr(i, 2), nullptr, 16)));
    return made;
}

// The encoding of `value`, which must have one and no descriptors.
inline Bytes encoding(vox_object_t value) {
    vox_wire::encoded out;
    if (vox_wire::encode(value, {}, out) != 0)
        return {};
    return {out.bytes.view().begin(), out.bytes.view().end()};
}
// What `data` stands for, or why it is refused.
inline std::pair<Ref, std::string> decode(std::span<const std::uint8_t> data,
                                          const vox_wire::codec_limits& limits = {},
                                          std::span<const int> descriptors = {}) {
    const char* why = nullptr;
    Ref value(vox_wire::decode(data, descriptors, limits, why));
    return {value, why ? why : ""};
}

}  // namespace plr::test
