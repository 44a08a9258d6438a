#pragma once

#include <string>
#include <string_view>
#include <utility>

#include "qf/qf.h"

// What the preferences' code has in common: references that release themselves,
// and errors.
namespace qf::preferences {

// Holds one reference to a value, or none.
template <class Ref>
class owned {
  public:
    owned() noexcept = default;
    [[nodiscard]] static owned adopt(Ref value) noexcept {
        owned result;
        result.value_ = value;
        return result;
    }
    [[nodiscard]] static owned retain(Ref value) noexcept {
        return adopt(value ? static_cast<Ref>(const_cast<void*>(qf_retain(value))) : nullptr);
    }
    owned(const owned& other) noexcept : owned(retain(other.value_)) {}
    owned(owned&& other) noexcept : value_(std::exchange(other.value_, nullptr)) {}
    owned& operator=(owned other) noexcept {
        std::swap(value_, other.value_);
        return *this;
    }
    ~owned() {
        if (value_)
            qf_release(value_);
    }

    [[nodiscard]] Ref get() const noexcept { return value_; }
    // Hands the reference over.
    [[nodiscard]] Ref release() noexcept { return std::exchange(value_, nullptr); }
    explicit operator bool() const noexcept { return value_ != nullptr; }

  private:
    Ref value_ = nullptr;
};

using owned_value = owned<QfTypeRef>;
using owned_string = owned<QfStringRef>;
using owned_error = owned<QfErrorRef>;
using owned_array = owned<QfArrayRef>;
using owned_dictionary = owned<QfDictionaryRef>;

// Collections deeper than this are refused, read or written.
inline constexpr unsigned kMaximumDepth = 64;
// Files larger than this are refused, read or written.
inline constexpr std::size_t kMaximumFileSize = std::size_t{1} << 20;

[[nodiscard]] inline std::string_view view(QfStringRef string) noexcept {
    return {qf_string_get_string_ptr(string), qf_string_get_length(string)};
}

[[nodiscard]] inline owned_string make_string(std::string_view text) {
    return owned_string::adopt(qf_string_create_with_length(text.data(), text.size()));
}

// Null when `value` is no dictionary.
[[nodiscard]] inline QfDictionaryRef as_dictionary(QfTypeRef value) noexcept {
    return value && qf_get_type_id(value) == qf_dictionary_get_type_id()
               ? static_cast<QfDictionaryRef>(value)
               : nullptr;
}

// Calls function(key, value) for each entry, in order.
template <class Function>
void for_each_entry(QfDictionaryRef dictionary, const Function& function) {
    QfStringRef key = nullptr;
    for (std::size_t i = 0; i < qf_dictionary_get_count(dictionary); ++i) {
        QfTypeRef value = qf_dictionary_get_entry(dictionary, i, &key);
        function(key, value);
    }
}

// An error of domain "errno": "WHAT: text of the code".
[[nodiscard]] owned_error system_error(int code, std::string_view what);
// An error of domain "preferences".
[[nodiscard]] owned_error make_error(QfPreferencesError code, std::string_view text);

}  // namespace qf::preferences
