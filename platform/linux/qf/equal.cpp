#include <bit>
#include <cmath>
#include <utility>
#include <vector>

#include "platform/linux/common/key_index.h"
#include "platform/linux/qf/value.h"

namespace {

using pair = std::pair<QfTypeRef, QfTypeRef>;

template <class Value>
const Value* as(QfTypeRef value) noexcept {
    return static_cast<const Value*>(value);
}

// ---- Numbers ---------------------------------------------------------------------

// A number's value in one form: all integers as such, whatever they were made from.
struct exact {
    enum kind : std::uint8_t { natural, negative, fraction } kind;
    std::uint64_t bits;
    bool operator==(const exact&) const = default;
};

exact exact_integer(std::int64_t value) noexcept {
    return {value < 0 ? exact::negative : exact::natural, static_cast<std::uint64_t>(value)};
}

exact exact_float(double value) noexcept {
    constexpr double kTwoTo63 = 9223372036854775808.0;
    if (std::isnan(value))
        return {exact::fraction, UINT64_MAX};
    if (std::trunc(value) == value && value >= -kTwoTo63) {
        if (value < kTwoTo63)
            return exact_integer(static_cast<std::int64_t>(value));
        if (value < 2 * kTwoTo63)
            return {exact::natural, static_cast<std::uint64_t>(value)};
    }
    return {exact::fraction, std::bit_cast<std::uint64_t>(value)};
}

exact exact_value(QfNumberRef number) noexcept {
    if (number->detail <= kQfNumberSInt64Type)
        return exact_integer(static_cast<std::int64_t>(number->bits));
    if (number->detail <= kQfNumberUInt64Type)
        return {exact::natural, number->bits};
    return exact_float(std::bit_cast<double>(number->bits));
}

// ---- Equality; values in collections that remain to be compared go to `open` --------

bool open_arrays(const qf_array* left, const qf_array* right, std::vector<pair>& open) {
    if (left->count != right->count)
        return false;
    for (std::uint32_t i = 0; i < left->count; i++)
        open.emplace_back(left->items[i], right->items[i]);
    return true;
}

bool open_dictionaries(const qf_dictionary* left, const qf_dictionary* right,
                       std::vector<pair>& open) {
    if (left->count != right->count)
        return false;
    for (std::uint32_t i = 0; i < left->count; i++) {
        const qf::dictionary_entry* other = qf::find(right, left->entries[i].key);
        if (!other)
            return false;
        open.emplace_back(left->entries[i].value, other->value);
    }
    return true;
}

bool equal_texts(QfStringRef left, QfStringRef right) noexcept {
    return left->view() == right->view();
}

bool equal_errors(const qf_error* left, const qf_error* right) noexcept {
    return left->code == right->code && equal_texts(left->domain, right->domain) &&
           equal_texts(left->description, right->description);
}

bool equal_formatters(const qf_date_formatter* left, const qf_date_formatter* right) noexcept {
    return equal_texts(left->locale->name, right->locale->name) &&
           equal_texts(left->format, right->format);
}

bool equal_here(QfTypeRef left, QfTypeRef right, std::vector<pair>& open) {
    if (left == right)
        return true;
    const qf::type kind = qf::header_of(left)->kind;
    if (kind != qf::header_of(right)->kind)
        return false;
    switch (kind) {
        case qf::type::number:
            return exact_value(as<qf_number>(left)) == exact_value(as<qf_number>(right));
        case qf::type::string:
            return equal_texts(as<qf_string>(left), as<qf_string>(right));
        case qf::type::data:
            return as<qf_data>(left)->view() == as<qf_data>(right)->view();
        case qf::type::date:
            return as<qf_date>(left)->nanoseconds == as<qf_date>(right)->nanoseconds;
        case qf::type::url:
            return equal_texts(as<qf_url>(left)->text, as<qf_url>(right)->text);
        case qf::type::error:
            return equal_errors(as<qf_error>(left), as<qf_error>(right));
        case qf::type::locale:
            return equal_texts(as<qf_locale>(left)->name, as<qf_locale>(right)->name);
        case qf::type::date_formatter:
            return equal_formatters(as<qf_date_formatter>(left), as<qf_date_formatter>(right));
        case qf::type::array:
            return open_arrays(as<qf_array>(left), as<qf_array>(right), open);
        case qf::type::dictionary:
            return open_dictionaries(as<qf_dictionary>(left), as<qf_dictionary>(right), open);
        case qf::type::none:
        case qf::type::null:
        case qf::type::boolean:
            break;  // one object each
    }
    return false;
}

// noexcept: out of memory ends the process.
bool equal(QfTypeRef left, QfTypeRef right) noexcept {
    std::vector<pair> open;
    if (!equal_here(left, right, open))
        return false;
    while (!open.empty()) {
        const pair next = open.back();
        open.pop_back();
        if (!equal_here(next.first, next.second, open))
            return false;
    }
    return true;
}

// ---- Hashes ----------------------------------------------------------------------

std::size_t mixed(std::uint64_t seed, std::uint64_t word) noexcept {
    std::uint64_t hash = (seed ^ word) * 0x9e3779b97f4a7c15;  // 2^64 / the golden ratio
    hash ^= hash >> 32;
    return hash * 0x9e3779b97f4a7c15;
}

std::size_t hash_of_scalar(const qf::header* value) noexcept {
    const auto kind = static_cast<std::uint64_t>(value->kind);
    switch (value->kind) {
        case qf::type::number: {
            const exact number = exact_value(as<qf_number>(value));
            return mixed(kind << 8 | number.kind, number.bits);
        }
        case qf::type::boolean:
            return mixed(kind, as<qf_boolean>(value)->value);
        case qf::type::string:
            return qf::hash_of(as<qf_string>(value));
        case qf::type::data:
            return mixed(kind, key_index::hash_of(as<qf_data>(value)->view()));
        case qf::type::date:
            return mixed(kind, static_cast<std::uint64_t>(as<qf_date>(value)->nanoseconds));
        case qf::type::url:
            return mixed(kind, qf::hash_of(as<qf_url>(value)->text));
        case qf::type::error:
            return mixed(qf::hash_of(as<qf_error>(value)->domain),
                         static_cast<std::uint64_t>(as<qf_error>(value)->code));
        case qf::type::locale:
            return mixed(kind, qf::hash_of(as<qf_locale>(value)->name));
        case qf::type::date_formatter:
            return mixed(kind, qf::hash_of(as<qf_date_formatter>(value)->format));
        case qf::type::array:  // inside of another collection: no deeper
            return mixed(kind, as<qf_array>(value)->count);
        case qf::type::dictionary:
            return mixed(kind, as<qf_dictionary>(value)->count);
        case qf::type::none:
        case qf::type::null:
            break;
    }
    return mixed(kind, 0);
}

std::size_t hash_of_array(const qf_array* array) noexcept {
    std::size_t hash = hash_of_scalar(array);
    for (std::uint32_t i = 0; i < array->count; i++)
        hash = mixed(hash, hash_of_scalar(qf::header_of(array->items[i])));
    return hash;
}

// Whatever the order of the entries.
std::size_t hash_of_dictionary(const qf_dictionary* dictionary) noexcept {
    std::size_t hash = hash_of_scalar(dictionary);
    for (std::uint32_t i = 0; i < dictionary->count; i++) {
        const qf::dictionary_entry& entry = dictionary->entries[i];
        hash += mixed(qf::hash_of(entry.key), hash_of_scalar(qf::header_of(entry.value)));
    }
    return hash;
}

}  // namespace

extern "C" {

bool qf_equal(QfTypeRef left, QfTypeRef right) {
    return equal(left, right);
}

size_t qf_hash(QfTypeRef value) {
    switch (qf::header_of(value)->kind) {
        case qf::type::array:
            return hash_of_array(as<qf_array>(value));
        case qf::type::dictionary:
            return hash_of_dictionary(as<qf_dictionary>(value));
        default:
            return hash_of_scalar(qf::header_of(value));
    }
}

}  // extern "C"
