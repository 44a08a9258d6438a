#include "qf/string.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

#include "platform/linux/common/key_index.h"
#include "platform/linux/qf/value.h"

namespace {

unsigned char folded(char c) noexcept {
    const auto byte = static_cast<unsigned char>(c);
    return byte >= 'A' && byte <= 'Z' ? static_cast<unsigned char>(byte + ('a' - 'A')) : byte;
}

}  // namespace

namespace qf {

std::uint32_t hash_of(QfStringRef string) noexcept {
    std::uint32_t hash = string->hash.load(std::memory_order_relaxed);
    if (hash == 0) {
        hash = key_index::hash_of(string->view());
        string->hash.store(hash, std::memory_order_relaxed);
    }
    return hash;
}

}  // namespace qf

extern "C" {

QfStringRef qf_string_create(const char* text) {
    PLR_ASSERT(text, "a string is made of null");
    return qf::make_string(std::string_view(text));
}

QfStringRef qf_string_create_with_length(const char* text, size_t length) {
    return qf::make_string(std::string_view(text, length));
}

QfStringRef qf_string_create_with_format(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, arguments);
    va_end(arguments);
    PLR_ASSERT(length >= 0, "a format that printf refuses");
    const auto bytes = static_cast<std::size_t>(length);
    qf_string* const made = qf::make_string(bytes);
    std::vsnprintf(made->inline_text(), bytes + 1, format, again);
    va_end(again);
    return made;
}

const char* qf_string_get_string_ptr(QfStringRef string) {
    return qf::checked(string)->text;
}
size_t qf_string_get_length(QfStringRef string) {
    return qf::checked(string)->length;
}

int qf_string_compare(QfStringRef left, QfStringRef right) {
    return qf::checked(left)->view().compare(qf::checked(right)->view());
}

int qf_string_compare_case_insensitive(QfStringRef left, QfStringRef right) {
    const std::string_view one = qf::checked(left)->view();
    const std::string_view other = qf::checked(right)->view();
    const std::size_t common = std::min(one.size(), other.size());
    for (std::size_t i = 0; i < common; i++)
        if (const int difference = folded(one[i]) - folded(other[i]); difference != 0)
            return difference;
    return one.size() == other.size() ? 0 : one.size() < other.size() ? -1 : 1;
}

}  // extern "C"
