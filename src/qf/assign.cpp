#include "plr/qf/assign.h"

#include "plr/concurrency/qf_shared_ref.h"

namespace plr::qf {
namespace {

// The Qf number type that a T is read in. By width: a long is one of 64 bits here.
template <class T>
constexpr QfNumberType numberTypeOf() {
    switch (sizeof(T)) {
        case 1:
            return T(-1) < T(0) ? kQfNumberSInt8Type : kQfNumberUInt8Type;
        case 2:
            return T(-1) < T(0) ? kQfNumberSInt16Type : kQfNumberUInt16Type;
        case 4:
            return T(-1) < T(0) ? kQfNumberSInt32Type : kQfNumberUInt32Type;
        default:
            return T(-1) < T(0) ? kQfNumberSInt64Type : kQfNumberUInt64Type;
    }
}
template <>
constexpr QfNumberType numberTypeOf<float>() {
    return kQfNumberFloatType;
}
template <>
constexpr QfNumberType numberTypeOf<double>() {
    return kQfNumberDoubleType;
}

template <class T>
bool assignNumber(T& out, QfNumberRef value) {
    T number{};
    if (!value || !qf_number_get_value(value, numberTypeOf<T>(), &number))
        return false;
    out = number;
    return true;
}

void assignText(std::string& out, QfStringRef text) {
    out.assign(qf_string_get_string_ptr(text), qf_string_get_length(text));
}

}  // namespace

bool assign(signed char& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(short& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(int& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(long& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(long long& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(unsigned char& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(unsigned short& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(unsigned int& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(unsigned long& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(float& out, QfNumberRef value) {
    return assignNumber(out, value);
}
bool assign(double& out, QfNumberRef value) {
    return assignNumber(out, value);
}

bool assign(bool& out, QfBooleanRef value) {
    if (!value)
        return false;
    out = qf_boolean_get_value(value);
    return true;
}

bool assign(std::string& out, QfStringRef value) {
    if (!value)
        return false;
    assignText(out, value);
    return true;
}

bool assign(std::string& out, QfErrorRef value) {
    if (!value)
        return false;
    assignText(out, adopt(qf_error_copy_description(value)).get());
    return true;
}

bool assign(std::string& out, QfURLRef value, bool /*flag*/) {
    if (!value)
        return false;
    assignText(out, qf_url_get_string(value));
    return true;
}

bool assign(std::string& out, const void* value) {
    if (const QfStringRef string = typed<String>(value))
        return assign(out, string);
    if (const QfErrorRef error = typed<Error>(value))
        return assign(out, error);
    return assign(out, typed<URL>(value), false);
}

bool assign(std::string& out, double time, QfLocaleRef locale, QfDateFormatterStyle dateStyle,
            QfDateFormatterStyle timeStyle) {
    const auto formatter = adopt(qf_date_formatter_create(locale, dateStyle, timeStyle));
    return assign(out, adopt(qf_date_formatter_copy_string(formatter.get(), time)).get());
}

bool assign(std::vector<std::uint8_t>& out, QfDataRef value) {
    if (!value)
        return false;
    const auto* const bytes = static_cast<const std::uint8_t*>(qf_data_get_bytes_ptr(value));
    out.assign(bytes, bytes + qf_data_get_length(value));
    return true;
}

}  // namespace plr::qf
