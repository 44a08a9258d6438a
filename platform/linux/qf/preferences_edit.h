#pragma once

#include <string>
#include <string_view>

#include "platform/linux/qf/preferences_values.h"

namespace qf::preferences {

// A TOML text that says `wanted`, made of `text`, which says `old`. Comments,
// order and spelling of what stays the same are kept:
//   - a changed value is replaced where it stands;
//   - a removed key goes with its line, a removed table with its header;
//   - a new key comes behind the last one of its table (at the root: before the
//     first header), a new table at the end of the text.
// A root key for which that cannot be done (tables made by dotted keys, arrays
// of tables) is taken out and written anew, and where even that does not say
// `wanted`, the whole text is; those comments are lost.
// Everything in `wanted` can be written.
[[nodiscard]] std::string edit(std::string_view text, QfDictionaryRef old, QfDictionaryRef wanted);

}  // namespace qf::preferences
