#pragma once

#include <string>
#include <string_view>

#include "platform/linux/qf/preferences_values.h"

// TOML (toml.io, 1.0) as Qf values.
//
// | TOML                  | Qf                                              |
// |-----------------------|-------------------------------------------------|
// | string                | string                                          |
// | integer               | number, SInt64                                  |
// | float                 | number, Double                                  |
// | boolean               | boolean                                         |
// | date-time with offset | date                                            |
// | local date-time       | date, in the local time zone                    |
// | local date, time      | string: 2024-12-31, 07:30:00                    |
// | { base64 = "SGk=" }   | data: an inline table of this one key           |
// | array, table          | array, dictionary (in the order of keys' bytes) |
namespace qf::preferences {

// A text's values, or what is wrong with it.
struct parsed {
    owned_dictionary values;
    owned_error error;  // "FILE:LINE:COLUMN: text"; columns count characters
};
[[nodiscard]] parsed parse(std::string_view text, const std::string& file);

// What a quoted key or string of a well-formed text says.
[[nodiscard]] std::string unquote(std::string_view quoted);

}  // namespace qf::preferences
