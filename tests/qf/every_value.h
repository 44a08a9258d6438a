#pragma once

#include <charconv>
#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "plr/concurrency/qf_shared_ref.h"

// A value of every Qf type, several where readers tell them apart, with what
// every reader makes of it.
namespace plr::test {

using AnyValue = qf::QfSharedRef<const void>;

// `created`: owned by the result.
inline AnyValue owned(QfTypeRef created) {
    return qf::adopt(created);
}

inline std::string print(bool value) {
    return value ? "true" : "false";
}
template <class Number>
std::string print(Number value) {
    char text[32];
    return {text, std::to_chars(text, text + sizeof text, value).ptr};
}

// What a reader does: the value that it writes; with "!" behind it when it
// returns false all the same; "-" when it returns false and writes nothing.
struct ReadRow {
    std::string name;
    AnyValue value;
    const char* type;
    std::string text = "-";  // assign() to a string
    const char* asBool = "-";
    const char* asInt = "0!";
    const char* asDouble = "0!";
    const char* strictBool = "-";
    const char* strictInt = "-";
    const char* strictDouble = "-";
};

inline ReadRow textRow(const std::string& text, const char* asBool, const char* asInt,
                       const char* asDouble) {
    const AnyValue value = owned(qf_string_create_with_length(text.data(), text.size()));
    return {"string " + text, value, "QfString", text, asBool, asInt, asDouble};
}
inline ReadRow numberRow(const char* name, QfNumberRef created, const char* asBool,
                         const char* asInt, const char* asDouble, const char* strictInt,
                         const char* strictDouble) {
    return {name,  owned(created), "QfNumber", "-",       asBool,
            asInt, asDouble,       "-",        strictInt, strictDouble};
}

inline std::vector<ReadRow> everyValue() {
    const AnyValue text = owned(qf_string_create("text"));
    const AnyValue url = owned(qf_string_create("file:///etc"));
    const auto string = [](const AnyValue& of) { return qf::typed<qf::String>(of.get()); };
    return {
        {"nothing", AnyValue(), ""},
        {"null", AnyValue(kQfNull), "QfNull"},
        {"true", AnyValue(kQfBooleanTrue), "QfBoolean", "-", "true", "1", "1", "true"},
        {"false", AnyValue(kQfBooleanFalse), "QfBoolean", "-", "false", "0", "0", "false"},
        numberRow("0", qf_number_create_int64(0), "false", "0", "0", "0", "0"),
        numberRow("-7", qf_number_create_int64(-7), "true", "-7", "-7", "-7", "-7"),
        numberRow("7.0", qf_number_create_double(7), "true", "7", "7", "7", "7"),
        numberRow("0.5", qf_number_create_double(.5), "false", "0!", "0.5", "-", "0.5"),
        numberRow("2.5", qf_number_create_double(2.5), "true", "2!", "2.5", "-", "2.5"),
        numberRow("NaN", qf_number_create_double(std::nan("")), "false", "0!", "nan", "-", "nan"),
        numberRow("1e300", qf_number_create_double(1e300), "true", "2147483647!", "1e+300", "-",
                  "1e+300"),
        numberRow("2^32", qf_number_create_int64(1LL << 32), "false", "0!", "4294967296", "-",
                  "4294967296"),
        numberRow("2^53 + 1", qf_number_create_int64((1LL << 53) + 1), "true", "1!",
                  "9007199254740992!", "-", "-"),
        numberRow("2^64 - 1", qf_number_create_uint64(UINT64_MAX), "true", "-1!",
                  "18446744073709551616!", "-", "-"),
        textRow("yes", "true", "0", "0"),
        textRow("YES", "true", "0", "0"),
        textRow("tRuE", "true", "0", "0"),
        textRow("No", "false", "0", "0"),
        textRow("FALSE", "false", "0", "0"),
        textRow("maybe", "-", "0", "0"),
        textRow("yes ", "-", "0", "0"),
        textRow(std::string("no\0", 3), "-", "0", "0"),
        textRow("", "-", "0", "0"),
        textRow("1", "-", "1", "1"),
        textRow(" 12 apples", "-", "12", "12"),
        textRow("-1.5e3", "-", "-1", "-1500"),
        textRow("99999999999", "-", "2147483647", "99999999999"),
        {"error", owned(qf_error_create(string(url), 5, string(text))), "QfError", "text"},
        {"URL", owned(qf_url_create(string(url))), "QfURL", "file:///etc"},
        {"data", owned(qf_data_create("1", 1)), "QfData"},
        {"date", owned(qf_date_create(1)), "QfDate"},
        {"locale", owned(qf_locale_create("C")), "QfLocale"},
        {"date formatter",
         owned(qf_date_formatter_create(nullptr, kQfDateFormatterShortStyle,
                                        kQfDateFormatterNoStyle)),
         "QfDateFormatter"},
        {"array", owned(qf_array_create(nullptr, 0)), "QfArray"},
        {"mutable array", owned(qf_array_create_mutable()), "QfArray"},
        {"dictionary", owned(qf_dictionary_create(nullptr, nullptr, 0)), "QfDictionary"},
        {"mutable dictionary", owned(qf_dictionary_create_mutable()), "QfDictionary"},
    };
}

}  // namespace plr::test
