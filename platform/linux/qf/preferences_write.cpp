#include "platform/linux/qf/preferences_write.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <span>

#include "platform/linux/qf/preferences_base64.h"
#include "platform/linux/vox/codec.h"

namespace qf::preferences {
namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;

bool is_utf8(std::string_view text) noexcept {
    return vox_wire::is_utf8({reinterpret_cast<const std::uint8_t*>(text.data()), text.size()});
}

void append_quoted(std::string& out, std::string_view text) {
    static constexpr std::string_view kEscaped = "\b\t\n\f\r\"\\";
    static constexpr std::string_view kLetters = "btnfr\"\\";
    out += '"';
    for (const char c : text) {
        if (const std::size_t known = kEscaped.find(c); known != std::string_view::npos) {
            out += '\\';
            out += kLetters[known];
        } else if (static_cast<unsigned char>(c) < 0x20 || c == 0x7F) {
            std::array<char, 8> code{};
            std::snprintf(code.data(), code.size(), "\\u%04X", static_cast<unsigned>(c));
            out += code.data();
        } else {
            out += c;
        }
    }
    out += '"';
}

void append_double(std::string& out, double value) {
    if (std::isnan(value)) {
        out += "nan";
        return;
    }
    std::array<char, 32> digits{};
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), value);
    const std::string_view text(digits.data(), static_cast<std::size_t>(end.ptr - digits.data()));
    out += text;
    if (text.find_first_of(".en") == std::string_view::npos)
        out += ".0";
}

void append_number(std::string& out, QfNumberRef number) {
    if (!qf_number_is_float(number)) {
        std::int64_t whole = 0;
        (void)qf_number_get_value(number, kQfNumberSInt64Type, &whole);
        out += std::to_string(whole);
        return;
    }
    double value = 0;
    (void)qf_number_get_value(number, kQfNumberDoubleType, &value);
    append_double(out, value);
}

void append_date(std::string& out, QfDateRef date) {
    const std::int64_t nanoseconds = qf_date_get_nanoseconds(date);
    const std::int64_t fraction = (nanoseconds % kNanoseconds + kNanoseconds) % kNanoseconds;
    const std::time_t seconds = nanoseconds / kNanoseconds - (nanoseconds % kNanoseconds < 0);
    std::tm fields{};
    ::gmtime_r(&seconds, &fields);
    std::array<char, 40> text{};
    std::size_t length = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &fields);
    out.append(text.data(), length);
    if (fraction != 0)
        out += "." + std::to_string(kNanoseconds + fraction).substr(1);
    out += 'Z';
}

void append_data(std::string& out, QfDataRef data) {
    const auto* bytes = static_cast<const std::uint8_t*>(qf_data_get_bytes_ptr(data));
    out += "{ base64 = \"" + encode_base64(std::span(bytes, qf_data_get_length(data))) + "\" }";
}

void append_array(std::string& out, QfArrayRef array) {
    out += '[';
    for (std::size_t i = 0; i < qf_array_get_count(array); ++i) {
        if (i != 0)
            out += ", ";
        append_value(out, qf_array_get_value(array, i));
    }
    out += ']';
}

void append_inline_table(std::string& out, QfDictionaryRef table) {
    const char* before = "{ ";
    for_each_entry(table, [&out, &before](QfStringRef key, QfTypeRef value) {
        out += before;
        append_key(out, view(key));
        out += " = ";
        append_value(out, value);
        before = ", ";
    });
    out += qf_dictionary_get_count(table) == 0 ? "{}" : " }";
}

// Appends what stands in a table of its own: pairs first, then the tables in it.
void append_content(std::string& out, const key_path& path, QfDictionaryRef table) {
    for_each_entry(table, [&out](QfStringRef key, QfTypeRef value) {
        if (!as_dictionary(value))
            append_pair(out, view(key), value);
    });
    for_each_entry(table, [&out, &path](QfStringRef key, QfTypeRef value) {
        if (QfDictionaryRef inner = as_dictionary(value)) {
            key_path longer = path;
            longer.emplace_back(view(key));
            append_section(out, longer, inner);
        }
    });
}

// What a file cannot hold about `value`, as the end of a sentence; its place
// within is appended to `place`.
class inspector {
  public:
    explicit inspector(std::string_view key) : place_(key) {}

    const char* inspect(QfTypeRef value, unsigned depth) {
        const QfTypeID type = qf_get_type_id(value);
        if (depth > kMaximumDepth)
            return "is nested too deeply";
        if (type == qf_dictionary_get_type_id())
            return inspect_table(static_cast<QfDictionaryRef>(value), depth);
        if (type == qf_array_get_type_id())
            return inspect_array(static_cast<QfArrayRef>(value), depth);
        if (type == qf_number_get_type_id())
            return inspect_number(static_cast<QfNumberRef>(value));
        if (type == qf_string_get_type_id())
            return is_utf8(view(static_cast<QfStringRef>(value))) ? nullptr : "is not UTF-8";
        const bool can_be = type == qf_boolean_get_type_id() || type == qf_data_get_type_id() ||
                            type == qf_date_get_type_id();
        return can_be ? nullptr : "is of a type that preferences do not have";
    }
    [[nodiscard]] const std::string& place() const noexcept { return place_; }

  private:
    static const char* inspect_number(QfNumberRef number) {
        std::int64_t value = 0;
        const bool fits =
            qf_number_is_float(number) || qf_number_get_value(number, kQfNumberSInt64Type, &value);
        return fits ? nullptr : "is a number past 2^63 - 1";
    }

    const char* inspect_array(QfArrayRef array, unsigned depth) {
        const char* wrong = nullptr;
        for (std::size_t i = 0; !wrong && i < qf_array_get_count(array); ++i)
            wrong =
                inspect_part("[" + std::to_string(i) + "]", qf_array_get_value(array, i), depth);
        return wrong;
    }

    const char* inspect_table(QfDictionaryRef table, unsigned depth) {
        QfTypeRef encoded = qf_dictionary_get_value_for_utf8(table, "base64", 6);
        if (encoded && qf_dictionary_get_count(table) == 1 &&
            qf_get_type_id(encoded) == qf_string_get_type_id())
            return "would be read as data: its only key is base64";
        const char* wrong = nullptr;
        for_each_entry(table, [this, depth, &wrong](QfStringRef key, QfTypeRef value) {
            if (!wrong)
                wrong = is_utf8(view(key))
                            ? inspect_part("." + std::string(view(key)), value, depth)
                            : "has a key that is not UTF-8";
        });
        return wrong;
    }

    const char* inspect_part(const std::string& name, QfTypeRef value, unsigned depth) {
        const std::size_t length = place_.size();
        place_ += name;
        const char* wrong = inspect(value, depth + 1);
        if (!wrong)
            place_.resize(length);
        return wrong;
    }

    std::string place_;
};

}  // namespace

owned_error why_unwritable(std::string_view key, QfTypeRef value) {
    if (!is_utf8(key))
        return make_error(kQfPreferencesErrorValue, "a key is not UTF-8");
    inspector about(key);
    const char* wrong = about.inspect(value, 1);
    return wrong ? make_error(kQfPreferencesErrorValue, about.place() + " " + wrong)
                 : owned_error();
}

void append_key(std::string& out, std::string_view key) {
    const bool is_bare = !key.empty() && std::all_of(key.begin(), key.end(), [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
               c == '_' || c == '-';
    });
    if (is_bare)
        out += key;
    else
        append_quoted(out, key);
}

void append_path(std::string& out, const key_path& path) {
    for (std::size_t i = 0; i < path.size(); ++i) {
        if (i != 0)
            out += '.';
        append_key(out, path[i]);
    }
}

void append_value(std::string& out, QfTypeRef value) {
    const QfTypeID type = qf_get_type_id(value);
    if (type == qf_string_get_type_id())
        append_quoted(out, view(static_cast<QfStringRef>(value)));
    else if (type == qf_number_get_type_id())
        append_number(out, static_cast<QfNumberRef>(value));
    else if (type == qf_boolean_get_type_id())
        out += value == kQfBooleanTrue ? "true" : "false";
    else if (type == qf_date_get_type_id())
        append_date(out, static_cast<QfDateRef>(value));
    else if (type == qf_data_get_type_id())
        append_data(out, static_cast<QfDataRef>(value));
    else if (type == qf_array_get_type_id())
        append_array(out, static_cast<QfArrayRef>(value));
    else
        append_inline_table(out, static_cast<QfDictionaryRef>(value));
}

void append_pair(std::string& out, std::string_view key, QfTypeRef value) {
    append_key(out, key);
    out += " = ";
    append_value(out, value);
    out += '\n';
}

void append_section(std::string& out, const key_path& path, QfDictionaryRef table) {
    if (!out.empty() && out != "\n")
        out += '\n';
    out += '[';
    append_path(out, path);
    out += "]\n";
    append_content(out, path, table);
}

std::string write_file(QfDictionaryRef root) {
    std::string out;
    append_content(out, {}, root);
    return out;
}

}  // namespace qf::preferences
