#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>

#include "plr/base/export.h"
#include "vox/value.h"

// vox::object owns one reference of a Vox value. It is never empty: wherever
// it would be (default construction, a null pointer, moved from), it holds the
// Vox null object.
//
// Owner:   copies retain, destruction releases; a failure inside either ends
//          the process.
// Threads: as the value's (vox/value.h); the handle itself as a plain pointer.
// Cost:    a copy is one atomic count, a move none.
namespace vox {

class PLR_EXPORT object {
  public:
    object() noexcept : raw_(vox_null_create()) {}
    object(std::nullptr_t) noexcept : object() {}
    object(const object& other) noexcept : raw_(vox_retain(other.raw_)) {}
    object(object&& other) noexcept : raw_(std::exchange(other.raw_, vox_null_create())) {}
    object& operator=(object other) noexcept {
        std::swap(raw_, other.raw_);
        return *this;
    }
    ~object() { vox_release(raw_); }

    // Takes over the caller's reference; adds one. A null pointer gives the null
    // object.
    [[nodiscard]] static object adopt(vox_object_t owned) noexcept {
        object made;
        if (owned)
            made.raw_ = owned;
        return made;
    }
    [[nodiscard]] static object retain(vox_object_t lent) noexcept {
        return adopt(vox_retain(lent));
    }

    // A loan, never a null pointer.
    [[nodiscard]] vox_object_t get() const noexcept { return raw_; }
    [[nodiscard]] vox_type_t type() const noexcept { return vox_get_type(raw_); }
    // Whether it holds anything but the null object.
    explicit operator bool() const noexcept { return type() != VOX_TYPE_NULL; }

    // The bytes of a string, lent by the value; empty for every other type.
    [[nodiscard]] std::string_view text() const noexcept;

    // A rendering for people, in one fixed format: dictionaries and arrays over
    // several lines with tabs, strings without escaping. Works at any depth
    // without recursion; the text grows with the square of the depth.
    [[nodiscard]] std::string to_string() const;

  private:
    vox_object_t raw_;
};

// Same type and same content (vox_equal).
[[nodiscard]] inline bool operator==(const object& left, const object& right) noexcept {
    return vox_equal(left.get(), right.get()) != 0;
}

}  // namespace vox
