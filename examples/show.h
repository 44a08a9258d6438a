#pragma once

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <iostream>
#include <string>
#include <string_view>

#include "plr/ipc/object.h"
#include "plr/ipc/values.h"

// What the example programs print, one line at a time and at once, and the values
// that they are given as words.
namespace radio {

inline void say(const std::string& line) {
    std::cout << line + '\n' << std::flush;
}

// A value on one line, however deep it is.
inline std::string oneLine(const vox::object& value) {
    std::string text = value.to_string();
    std::erase(text, '\t');
    std::ranges::replace(text, '\n', ' ');
    return text;
}

// true, false, null, an integer, else a string, which may stand in quotes: "1234".
inline vox::object valueOf(std::string_view word) {
    if (word == "true" || word == "false")
        return vox::boolean(word == "true");
    if (word == "null")
        return nullptr;
    if (word.size() >= 2 && word.starts_with('"') && word.ends_with('"'))
        return vox::string(word.substr(1, word.size() - 2));
    std::int64_t number = 0;
    const char* const end = word.data() + word.size();
    const auto read = std::from_chars(word.data(), end, number);
    if (read.ec == std::errc() && read.ptr == end)
        return vox::int64(number);
    return vox::string(word);
}

}  // namespace radio
