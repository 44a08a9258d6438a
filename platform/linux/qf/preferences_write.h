#pragma once

#include <string>
#include <string_view>

#include "platform/linux/qf/preferences_scan.h"
#include "platform/linux/qf/preferences_values.h"

// Qf values as TOML; preferences_parse.h has the way back.
namespace qf::preferences {

// Why a file cannot hold `value` under `key`: an error that names the value's
// place. Null when it can.
[[nodiscard]] owned_error why_unwritable(std::string_view key, QfTypeRef value);

// Appends, for values that can be written:
void append_key(std::string& out, std::string_view key);
void append_path(std::string& out, const key_path& path);
// On one line, tables in braces.
void append_value(std::string& out, QfTypeRef value);
void append_pair(std::string& out, std::string_view key, QfTypeRef value);
// A header with its pairs, then those of the tables in it; a blank line before each.
void append_section(std::string& out, const key_path& path, QfDictionaryRef table);
// A whole file.
[[nodiscard]] std::string write_file(QfDictionaryRef root);

}  // namespace qf::preferences
