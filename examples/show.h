#pragma once

#include <algorithm>
#include <iostream>
#include <string>

#include "plr/ipc/object.h"

// What the example programs print, one line at a time and at once.
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

}  // namespace radio
