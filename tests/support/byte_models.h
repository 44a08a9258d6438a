#pragma once

#include <algorithm>
#include <cctype>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <string>
#include <vector>

// Hex text and dumps by plain loops, for tests and fuzzers to compare with.
namespace plr::test {

using Bytes = std::vector<unsigned char>;

[[gnu::format(printf, 1, 2)]] inline std::string print(const char* format, ...) {
    char text[64];
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(text, sizeof text, format, arguments);
    va_end(arguments);
    return text;
}

inline bool isHexDigit(char character) {
    return std::isxdigit(static_cast<unsigned char>(character)) != 0;
}

// Of one or two digits, of which what is none counts as 0.
inline unsigned char modelByte(std::string digits) {
    std::replace_if(digits.begin(), digits.end(), std::not_fn(isHexDigit), '0');
    return static_cast<unsigned char>(std::stoi(digits, nullptr, 16));
}

// A dump's line, without its offset, of what stands from `at` on.
inline std::string modelLine(const Bytes& bytes, std::size_t at, std::size_t lineLength) {
    std::string digits;
    std::string characters;
    for (std::size_t i = at; i < std::min(bytes.size(), at + lineLength); ++i) {
        digits += print("%02X ", bytes[i]);
        characters += bytes[i] >= ' ' && bytes[i] <= '~' ? static_cast<char>(bytes[i]) : '.';
    }
    digits.resize((lineLength + 1) * 3, ' ');
    return digits + characters + "\n";
}

struct Dump {
    std::string text;
    std::uint32_t result = 0;
    std::vector<std::string> lines;  // what the operation saw

    bool operator==(const Dump&) const = default;
};

inline Dump modelDump(const Bytes& bytes, std::size_t lineLength) {
    Dump dump;
    for (std::size_t at = 0; at < bytes.size(); at += lineLength) {
        dump.lines.push_back(modelLine(bytes, at, lineLength));
        dump.text += print("%04x  ", static_cast<unsigned>(at)) + dump.lines.back();
    }
    dump.result = static_cast<std::uint32_t>(dump.text.size());
    return dump;
}

// What becomes of it in a buffer of `size` bytes, at least one.
inline Dump cutDump(Dump dump, std::size_t size) {
    dump.result = static_cast<std::uint32_t>(std::min(dump.text.size(), size));
    dump.text.resize(std::min(dump.text.size(), size - 1));
    const auto begun = 1 + std::count(dump.text.begin(), dump.text.end(), '\n');
    dump.lines.resize(std::min(dump.lines.size(), static_cast<std::size_t>(begun)));
    return dump;
}

// The dump of hex text: lines of 16 characters, read in pairs.
inline std::string modelTextDump(const std::string& text) {
    std::string dump;
    for (std::size_t i = 0; i < text.size(); i += 2) {
        if (i % 16 == 0)
            dump += print("%s%04x    ", i == 0 ? "" : "\n", static_cast<unsigned>(i / 2 & 0xFFFF));
        if (i + 1 < text.size())
            dump += print("%s%02x", i % 16 == 0 ? "" : " ", modelByte(text.substr(i, 2)));
    }
    return dump;
}

}  // namespace plr::test
