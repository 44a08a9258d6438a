#pragma once

#include <cstddef>
#include <utility>

#include "plr/ipc/object.h"

// vox::array holds an array or the null object. Copies share the array.
namespace vox {

class PLR_EXPORT array : public object {
  public:
    array() noexcept = default;
    array(std::nullptr_t) noexcept {}
    // Keeps `other` if it is an array.
    array(const object& other) noexcept : array(object(other)) {}
    array(object&& other) noexcept
        : object(other.type() == VOX_TYPE_ARRAY ? std::move(other) : nullptr) {}
    [[nodiscard]] static array create() { return object::adopt(vox_array_create()); }

    // 0 for the null object.
    [[nodiscard]] std::size_t count() const noexcept { return vox_array_get_count(get()); }
    // The null object past the end.
    [[nodiscard]] object operator[](std::size_t index) const noexcept {
        return object::retain(vox_array_get_value(get(), index));
    }
    // Nothing happens on the null object.
    void append(const object& value) const { vox_array_append_value(get(), value.get()); }
};

// Builds an array of strings: array_creator()("a")("b").
class PLR_EXPORT array_creator {
  public:
    array_creator() : array_(array::create()) {}
    array_creator& operator()(const char* text) {
        array_.append(object::adopt(vox_string_create(text)));
        return *this;
    }
    operator array() const { return array_; }
    operator object() const { return array_; }

  private:
    array array_;
};

}  // namespace vox
