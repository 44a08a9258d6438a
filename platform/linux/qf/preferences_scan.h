#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

// Where things stand in a TOML text, to the byte, so that it can be edited in
// place. The text must be well-formed: the parser has accepted it.
namespace qf::preferences {

// May stand before the text.
inline constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

// A key path from the root, decoded.
using key_path = std::vector<std::string>;

// A key with its value, or a table's header.
struct statement {
    enum class kind { pair, table, array_element };

    kind what = kind::pair;
    key_path path;  // with that of the table where it stands
    // Lines: the first one's begin to behind the last one's line feed.
    std::size_t begin = 0;
    std::size_t end = 0;
    // A pair's value.
    std::size_t value_begin = 0;
    std::size_t value_end = 0;
};

// All statements in order; nothing when the text is none that this reader
// understands.
[[nodiscard]] std::optional<std::vector<statement>> scan(std::string_view text);

// The first character that nests deeper than any file needs: more than
// kMaximumDepth open brackets, or parts of one key. npos when there is none.
// Any text.
[[nodiscard]] std::size_t find_deep_nesting(std::string_view text) noexcept;

}  // namespace qf::preferences
