#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

// One line of a modem, taken apart: `+CREG: 1,"1A2B",,7` is the name "+CREG"
// with four fields, `RING` is a name alone.
//
// Result codes and their syntax: ITU-T V.250, 3GPP TS 27.007 and 27.005.
// Plain data; any thread.
namespace radio {

struct AtField {
    std::string text;     // without its quotes
    bool quoted = false;  // a string constant: `""` is one, nothing at all is none

    [[nodiscard]] bool missing() const noexcept { return text.empty() && !quoted; }
    // A decimal number without sign, an unquoted field only.
    [[nodiscard]] std::optional<unsigned> number() const noexcept;
    // A string of 1 to 8 hexadecimal digits, as areas and cells are written.
    [[nodiscard]] std::optional<unsigned> hex() const noexcept;
};

struct AtLine {
    std::string name;
    std::vector<AtField> fields;

    // The field at `index`; a missing one past the end.
    [[nodiscard]] const AtField& field(std::size_t index) const noexcept;
};

// Takes `text` (a line without its end) apart. Empty when it cannot be: bytes
// that are not printable ASCII, a quote that is not closed or that stands
// inside a field, no name.
[[nodiscard]] std::optional<AtLine> parseAtLine(std::string_view text);

}  // namespace radio
