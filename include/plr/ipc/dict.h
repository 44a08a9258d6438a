#pragma once

#include <cstddef>
#include <string_view>
#include <utility>

#include "plr/ipc/array.h"
#include "plr/ipc/object.h"

// vox::dict holds a dictionary or the null object. Copies share the
// dictionary, so that assigning to an entry changes what all of them see.
namespace vox {

class PLR_EXPORT dict : public object {
  public:
    class object_proxy;

    dict() noexcept = default;
    dict(std::nullptr_t) noexcept {}
    // Keeps `other` if it is a dictionary.
    dict(const object& other) noexcept : dict(object(other)) {}
    dict(object&& other) noexcept
        : object(other.type() == VOX_TYPE_DICTIONARY ? std::move(other) : nullptr) {}
    explicit dict(const object_proxy& entry) noexcept;
    [[nodiscard]] static dict create() { return object::adopt(vox_dictionary_create()); }

    // 0 for the null object.
    [[nodiscard]] std::size_t count() const noexcept { return vox_dictionary_get_count(get()); }
    [[nodiscard]] bool contains(const char* key) const noexcept {
        return vox_dictionary_get_value(get(), key) != nullptr;
    }
    // The bytes of the string under `key`, lent by it; empty for every other type
    // and when the key is missing. Counts nothing, unlike a copy of the entry.
    [[nodiscard]] std::string_view text(const char* key) const noexcept;
    using object::text;
    // The entry under `key` (NUL-terminated, lent for the proxy's life), to read
    // or to assign. On the null object reads give null, assignments do nothing.
    [[nodiscard]] object_proxy operator[](const char* key) const noexcept;
};

// One entry of a dictionary, present or not: what indexing yields.
class PLR_EXPORT dict::object_proxy {
  public:
    object_proxy(const dict& owner, const char* key) noexcept : dict_(owner), key_(key) {}
    object_proxy(const object_proxy&) noexcept = default;

    // The value; the null object when the key is missing, or when the value is
    // of another type.
    operator object() const noexcept {
        return object::retain(vox_dictionary_get_value(dict_.get(), key_));
    }
    operator dict() const noexcept { return dict(object(*this)); }
    operator array() const noexcept { return array(object(*this)); }

    // Stores a value under the key.
    const object_proxy& operator=(const object& value) const {
        if (dict_)
            vox_dictionary_set_value(dict_.get(), key_, value.get());
        return *this;
    }
    const object_proxy& operator=(object&& value) const {
        const object moved(std::move(value));
        return *this = moved;
    }
    const object_proxy& operator=(const object_proxy& value) const { return *this = object(value); }
    object_proxy& operator=(const object_proxy& value) {
        std::as_const(*this) = object(value);
        return *this;
    }
    // Deliberate: the key stays (or becomes) present with a null value; it is not
    // removed.
    const object_proxy& operator=(std::nullptr_t) const { return *this = object(); }

  private:
    const dict& dict_;
    const char* key_;
};

inline dict::dict(const object_proxy& entry) noexcept : dict(object(entry)) {}

inline dict::object_proxy dict::operator[](const char* key) const noexcept {
    return object_proxy(*this, key);
}

}  // namespace vox
