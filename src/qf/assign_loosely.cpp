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
    out = 0;
    if (const QfNumberRef number = typed<Number>(value))
        return qf_number_get_value(number, kQfNumberSInt32Type, &out);
    if (const QfStringRef text = typed<String>(value)) {
        out = qf_string_get_int_value(text);
        return true;
    }
    bool truth = false;
    const bool isBoolean = assign(truth, typed<Boolean>(value));
    out = truth;
    return isBoolean;
}

bool assign_loosely(double& out, const void* value) {
    out = 0;
    if (const QfNumberRef number = typed<Number>(value))
        return qf_number_get_value(number, kQfNumberDoubleType, &out);
    if (const QfStringRef text = typed<String>(value)) {
        out = qf_string_get_double_value(text);
        return true;
    }
    bool truth = false;
    const bool isBoolean = assign(truth, typed<Boolean>(value));
    out = truth;
    return isBoolean;
}

}  // namespace plr::qf
