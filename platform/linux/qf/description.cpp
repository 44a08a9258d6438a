#include "platform/linux/common/description.h"

#include <bit>
#include <charconv>
#include <cinttypes>
#include <string>

#include "platform/linux/qf/value.h"

using namespace description;

namespace {

template <class Value>
const Value* as(const qf::header* value) noexcept {
    return static_cast<const Value*>(value);
}

template <class Number>
void append_shortest(std::string& out, Number value) {
    char text[32];
    out.append(text, std::to_chars(text, text + sizeof text, value).ptr);
}

void append_number(std::string& out, const qf_number* number) {
    if (number->detail <= kQfNumberSInt64Type)
        append_shortest(out, static_cast<std::int64_t>(number->bits));
    else if (number->detail <= kQfNumberUInt64Type)
        append_shortest(out, number->bits);
    else if (number->detail == kQfNumberFloatType)
        append_shortest(out, static_cast<float>(std::bit_cast<double>(number->bits)));
    else
        append_shortest(out, std::bit_cast<double>(number->bits));
}

void append_error(std::string& out, const qf_error* error) {
    out += "<error ";
    append_text(out, error->domain->view(), false);
    append_format(out, " %" PRId64 ": ", error->code);
    append_text(out, error->description->view(), true);
    out += '>';
}

// "<what text>"
void append_named(std::string& out, const char* what, QfStringRef text) {
    (out += '<') += what;
    out += ' ';
    append_text(out, text->view(), false);
    out += '>';
}

void describe(std::string& out, const qf::header* value, unsigned depth);

void append_array(std::string& out, const qf_array* array, unsigned depth) {
    append_elements(out, "[]", array->count, [&](std::size_t i) {
        describe(out, qf::header_of(array->items[i]), depth + 1);
    });
}

void append_dictionary(std::string& out, const qf_dictionary* dictionary, unsigned depth) {
    append_elements(out, "{}", dictionary->count, [&](std::size_t i) {
        const qf::dictionary_entry& entry = dictionary->entries[i];
        append_text(out, entry.key->view(), true);
        out += ": ";
        describe(out, qf::header_of(entry.value), depth + 1);
    });
}

void describe(std::string& out, const qf::header* value, unsigned depth) {
    switch (value->kind) {
        case qf::type::none:
            return;
        case qf::type::null:
            out += "null";
            return;
        case qf::type::boolean:
            out += as<qf_boolean>(value)->value ? "true" : "false";
            return;
        case qf::type::number:
            return append_number(out, as<qf_number>(value));
        case qf::type::string:
            return append_text(out, as<qf_string>(value)->view(), depth > 0);
        case qf::type::data:
            return append_data(out, as<qf_data>(value)->view());
        case qf::type::date:
            return append_date(out, as<qf_date>(value)->nanoseconds);
        case qf::type::url:
            return append_named(out, "url", as<qf_url>(value)->text);
        case qf::type::error:
            return append_error(out, as<qf_error>(value));
        case qf::type::locale:
            return append_named(out, "locale", as<qf_locale>(value)->name);
        case qf::type::date_formatter:
            return append_named(out, "date formatter", as<qf_date_formatter>(value)->format);
        case qf::type::array:
        case qf::type::dictionary:
            break;
    }
    if (depth >= kMostDepth)
        out += "…";
    else if (value->kind == qf::type::array)
        append_array(out, as<qf_array>(value), depth);
    else
        append_dictionary(out, as<qf_dictionary>(value), depth);
}

// noexcept: out of memory ends the process.
QfStringRef described(const qf::header* value) noexcept {
    std::string text;
    describe(text, value, 0);
    return qf::make_string(text);
}

}  // namespace

extern "C" QfStringRef qf_copy_description(QfTypeRef value) {
    return described(qf::header_of(value));
}
