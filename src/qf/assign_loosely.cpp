#include "plr/qf/assign_loosely.h"

#include <algorithm>
#include <string_view>

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/assign.h"

namespace plr::qf {
namespace {

// `word`: ASCII letters of lower case.
bool isWord(QfStringRef text, std::string_view word) {
    const std::string_view given(qf_string_get_string_ptr(text), qf_string_get_length(text));
    return std::equal(given.begin(), given.end(), word.begin(), word.end(),
                      [](char any, char lower) { return (any | 0x20) == lower; });
}

bool assignWord(bool& out, QfStringRef text) {
    const bool yes = isWord(text, "yes") || isWord(text, "true");
    if (!yes && !isWord(text, "no") && !isWord(text, "false"))
        return false;
    out = yes;
    return true;
}

template <class T>
bool assignNumber(T& out, const void* value, QfNumberType type, T (*numberIn)(QfStringRef)) {
    if (const QfNumberRef number = typed<Number>(value))
        return qf_number_get_value(number, type, &out);
    if (const QfStringRef text = typed<String>(value)) {
        out = numberIn(text);
        return true;
    }
    // Deliberate: what is no boolean either leaves 0.
    bool truth = false;
    const bool isBoolean = assign(truth, typed<Boolean>(value));
    out = truth;
    return isBoolean;
}

}  // namespace

bool assign_loosely(bool& out, const void* value) {
    if (const QfNumberRef number = typed<Number>(value)) {
        int cut = 0;
        static_cast<void>(qf_number_get_value(number, kQfNumberSInt32Type, &cut));
        out = cut != 0;
        return true;
    }
    if (const QfStringRef text = typed<String>(value))
        return assignWord(out, text);
    return assign(out, typed<Boolean>(value));
}

bool assign_loosely(int& out, const void* value) {
    return assignNumber(out, value, kQfNumberSInt32Type, &qf_string_get_int_value);
}

bool assign_loosely(double& out, const void* value) {
    return assignNumber(out, value, kQfNumberDoubleType, &qf_string_get_double_value);
}

}  // namespace plr::qf
