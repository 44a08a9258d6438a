#include "platform/linux/qf/preferences_parse.h"

#include <algorithm>
#include <ctime>
#include <limits>
#include <optional>
#include <vector>

#include "platform/linux/qf/preferences_base64.h"
#include "platform/linux/qf/preferences_scan.h"

// The parser is a header of another library. Under a name of its own it cannot
// meet the copy of another version in a program that links this one statically.
// NOLINTNEXTLINE(bugprone-reserved-identifier)
#define toml pelorin_toml
#define TOML_HEADER_ONLY 1
#define TOML_EXCEPTIONS 0
#define TOML_ENABLE_FORMATTERS 0
#include <toml++/toml.h>

namespace qf::preferences {
namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;

// What is wrong with a value that TOML allows, and where.
struct complaint {
    std::string text;
    toml::source_position where;
};

// Seconds since 1970 of a date and time in UTC, or in local time.
std::optional<std::time_t> seconds_of(const toml::date_time& from) {
    std::tm fields{};
    fields.tm_year = from.date.year - 1900;
    fields.tm_mon = from.date.month - 1;
    fields.tm_mday = from.date.day;
    fields.tm_hour = from.time.hour;
    fields.tm_min = from.time.minute;
    fields.tm_sec = from.time.second;
    fields.tm_isdst = -1;
    fields.tm_wday = -1;  // mktime() sets it, unless it fails
    if (from.offset)
        return ::timegm(&fields) - std::time_t{from.offset->minutes} * 60;
    const std::time_t result = std::mktime(&fields);
    if (fields.tm_wday < 0)
        return {};
    return result;
}

std::string two_digits(unsigned value) {
    std::string digits = std::to_string(value);
    return digits.size() < 2 ? "0" + digits : digits;
}

std::string text_of(const toml::date& date) {
    std::string year = std::to_string(date.year);
    year.insert(0, 4 - std::min<std::size_t>(4, year.size()), '0');
    return year + "-" + two_digits(date.month) + "-" + two_digits(date.day);
}

std::string text_of(const toml::time& time) {
    std::string text =
        two_digits(time.hour) + ":" + two_digits(time.minute) + ":" + two_digits(time.second);
    if (time.nanosecond == 0)
        return text;
    std::string fraction = std::to_string(kNanoseconds + time.nanosecond).substr(1);
    fraction.erase(fraction.find_last_not_of('0') + 1);
    return text + "." + fraction;
}

// Makes values of nodes. Null after the first complaint.
class converter {
  public:
    [[nodiscard]] const std::optional<complaint>& wrong() const noexcept { return wrong_; }

    owned_dictionary convert_table(const toml::table& table, unsigned depth) {
        const auto result = owned<QfMutableDictionaryRef>::adopt(qf_dictionary_create_mutable());
        for (const auto& [key, node] : table) {
            const owned_value value = convert(node, depth + 1);
            if (!value)
                return {};
            qf_dictionary_set_value(result.get(), make_string(key.str()).get(), value.get());
        }
        return owned_dictionary::retain(result.get());
    }

  private:
    owned_value complain(const toml::node& about, std::string text) {
        if (!wrong_)
            wrong_ = {std::move(text), about.source().begin};
        return {};
    }

    owned_value convert(const toml::node& node, unsigned depth) {
        if (depth > kMaximumDepth)
            return complain(node, "nested too deeply");
        switch (node.type()) {
            case toml::node_type::table:
                return convert_any_table(*node.as_table(), depth);
            case toml::node_type::array:
                return convert_array(*node.as_array(), depth);
            case toml::node_type::string:
                return of(make_string(**node.as_string()));
            case toml::node_type::integer:
                return adopt(qf_number_create_int64(**node.as_integer()));
            case toml::node_type::floating_point:
                return adopt(qf_number_create_double(**node.as_floating_point()));
            case toml::node_type::boolean:
                return owned_value::retain(**node.as_boolean() ? kQfBooleanTrue : kQfBooleanFalse);
            case toml::node_type::date:
                return of(make_string(text_of(**node.as_date())));
            case toml::node_type::time:
                return of(make_string(text_of(**node.as_time())));
            case toml::node_type::date_time:
                return convert_date(node, **node.as_date_time());
            default:
                return complain(node, "not a value");
        }
    }

    template <class Ref>
    static owned_value of(owned<Ref> value) {
        return owned_value::adopt(value.release());
    }
    static owned_value adopt(QfTypeRef value) { return owned_value::adopt(value); }

    owned_value convert_array(const toml::array& array, unsigned depth) {
        const auto result = owned<QfMutableArrayRef>::adopt(qf_array_create_mutable());
        for (const toml::node& node : array) {
            const owned_value value = convert(node, depth + 1);
            if (!value)
                return {};
            qf_array_append_value(result.get(), value.get());
        }
        return owned_value::retain(result.get());
    }

    owned_value convert_any_table(const toml::table& table, unsigned depth) {
        const toml::node* encoded =
            table.is_inline() && table.size() == 1 ? table.get("base64") : nullptr;
        if (!encoded || !encoded->is_string())
            return of(convert_table(table, depth));
        const std::optional<std::vector<std::uint8_t>> bytes =
            decode_base64(**encoded->as_string());
        if (!bytes)
            return complain(*encoded, "not base64 (RFC 4648, with padding)");
        return adopt(qf_data_create(bytes->data(), bytes->size()));
    }

    owned_value convert_date(const toml::node& node, const toml::date_time& from) {
        const std::optional<std::time_t> seconds = seconds_of(from);
        std::int64_t nanoseconds = 0;
        if (!seconds || __builtin_mul_overflow(*seconds, kNanoseconds, &nanoseconds) ||
            __builtin_add_overflow(nanoseconds, std::int64_t{from.time.nanosecond}, &nanoseconds))
            return complain(node, "a date out of range (years 1678 to 2261)");
        return adopt(qf_date_create(nanoseconds));
    }

    std::optional<complaint> wrong_;
};

parsed failure(const std::string& file, std::size_t line, std::size_t column,
               std::string_view text) {
    return {{},
            make_error(kQfPreferencesErrorMalformed, file + ":" + std::to_string(line) + ":" +
                                                         std::to_string(column) + ": " +
                                                         std::string(text))};
}

parsed failure_at(const std::string& file, std::string_view text, std::size_t offset) {
    const std::string_view before = text.substr(0, offset);
    const std::size_t line_begin = before.rfind('\n') + 1;  // npos + 1 is 0
    const auto characters = std::count_if(before.begin() + static_cast<std::ptrdiff_t>(line_begin),
                                          before.end(), [](char c) { return (c & 0xC0) != 0x80; });
    return failure(file,
                   static_cast<std::size_t>(std::count(before.begin(), before.end(), '\n')) + 1,
                   static_cast<std::size_t>(characters) + 1, "nested too deeply");
}

}  // namespace

parsed parse(std::string_view text, const std::string& file) {
    // The parser's tables go away recursively.
    if (const std::size_t deep = find_deep_nesting(text); deep != std::string_view::npos)
        return failure_at(file, text, deep);
    const toml::parse_result result = toml::parse(text);
    if (!result) {
        const toml::source_position where = result.error().source().begin;
        return failure(file, where.line, where.column, result.error().description());
    }
    converter made;
    owned_dictionary values = made.convert_table(result.table(), 0);
    if (made.wrong())
        return failure(file, made.wrong()->where.line, made.wrong()->where.column,
                       made.wrong()->text);
    return {std::move(values), {}};
}

std::string unquote(std::string_view quoted) {
    const toml::parse_result result = toml::parse("key = " + std::string(quoted));
    return result ? result["key"].value_or(std::string()) : std::string();
}

}  // namespace qf::preferences
