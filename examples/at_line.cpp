#include "examples/at_line.h"

#include <algorithm>
#include <charconv>

namespace radio {
namespace {

std::optional<unsigned> parse(std::string_view digits, int base) noexcept {
    unsigned value = 0;
    const auto [end, error] =
        std::from_chars(digits.data(), digits.data() + digits.size(), value, base);
    if (error != std::errc() || end != digits.data() + digits.size())
        return std::nullopt;
    return value;
}

std::string_view trimmed(std::string_view text) noexcept {
    const auto first = text.find_first_not_of(' ');
    if (first == std::string_view::npos)
        return {};
    return text.substr(first, text.find_last_not_of(' ') - first + 1);
}

// Where the field that starts `text` ends: at the first comma outside quotes.
std::size_t fieldLength(std::string_view text) noexcept {
    bool inside = false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '"')
            inside = !inside;
        else if (text[i] == ',' && !inside)
            return i;
    }
    return text.size();
}

std::optional<AtField> parseField(std::string_view text) {
    text = trimmed(text);
    const auto quotes = std::ranges::count(text, '"');
    if (quotes == 0)
        return AtField{std::string(text), false};
    if (quotes != 2 || text.front() != '"' || text.back() != '"')
        return std::nullopt;
    return AtField{std::string(text.substr(1, text.size() - 2)), true};
}

}  // namespace

std::optional<unsigned> AtField::number() const noexcept {
    return quoted ? std::nullopt : parse(text, 10);
}

std::optional<unsigned> AtField::hex() const noexcept {
    return text.size() > 8 ? std::nullopt : parse(text, 16);
}

const AtField& AtLine::field(std::size_t index) const noexcept {
    static const AtField absent;
    return index < fields.size() ? fields[index] : absent;
}

std::optional<AtLine> parseAtLine(std::string_view text) {
    if (!std::ranges::all_of(text, [](char c) { return c >= ' ' && c <= '~'; }))
        return std::nullopt;
    text = trimmed(text);
    // Only extended codes, which start with a sign, have fields behind a colon.
    const bool extended = text.starts_with('+');
    const auto colon = extended ? text.find(':') : std::string_view::npos;
    AtLine line{std::string(trimmed(text.substr(0, colon))), {}};
    if (line.name.empty() || line.name == "+" || line.name.find('"') != std::string::npos)
        return std::nullopt;
    if (colon == std::string_view::npos)
        return line;
    for (std::string_view rest = text.substr(colon + 1);;) {
        const auto length = fieldLength(rest);
        auto field = parseField(rest.substr(0, length));
        if (!field)
            return std::nullopt;
        line.fields.push_back(std::move(*field));
        if (length == rest.size())
            return line;
        rest.remove_prefix(length + 1);
    }
}

}  // namespace radio
