#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

// Parts of descriptions for logs, alike for all kinds of values: one line, text
// in quotes with its control characters escaped, so that text from outside cannot
// pass for a line of the log's own. Long and deep values are cut, marked by "…".
namespace description {

inline constexpr std::size_t kMostBytes = 16384;  // of a whole description, about
inline constexpr unsigned kMostDepth = 64;        // of nested collections

[[gnu::format(printf, 2, 3)]] void append_format(std::string& out, const char* format, ...);
// The text, without control characters and what is no UTF-8; in `quoted` form
// between quotes, which are escaped in it.
void append_text(std::string& out, std::string_view text, bool quoted);
void append_data(std::string& out, std::string_view data);
// Nanoseconds since 1970 as "2023-11-14T22:13:20.000000000Z".
void append_date(std::string& out, std::int64_t nanoseconds);

// "[a, b]" or "{a, b}", cut once `out` is long. `append` appends the element of an index.
template <class Append>
void append_elements(std::string& out, const char* brackets, std::size_t count, Append append) {
    out += brackets[0];
    for (std::size_t i = 0; i < count && out.size() < kMostBytes; i++) {
        if (i > 0)
            out += ", ";
        append(i);
    }
    if (out.size() >= kMostBytes)
        out += "…";
    out += brackets[1];
}

}  // namespace description
