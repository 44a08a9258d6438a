#include "plr/format/rle.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstddef>
#include <optional>
#include <string_view>

#include "plr/format/hex.h"

namespace plr {
namespace {

constexpr std::size_t kShortestRun = 5;

// Writes a run of `length` times `character` at `to`, and returns the end: at most
// `length` characters.
char* writeRun(char* to, std::size_t length, char character) {
    if (length < kShortestRun)
        return std::fill_n(to, length, character);
    *to++ = '<';
    // Brackets and character leave at least two places for the 5, and always enough.
    to = std::to_chars(to, to + (length - 3), length).ptr;
    *to++ = '>';
    *to++ = character;
    return to;
}

std::optional<int> parseCount(std::string_view text) {
    if (text.starts_with('+') && !text.starts_with("+-"))
        text.remove_prefix(1);
    int count = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
    if (error != std::errc() || end != text.data() + text.size())
        return std::nullopt;
    return count;
}

// Takes "<count>" from the front of `text`.
std::optional<int> takeCount(std::string_view& text) {
    const std::size_t end = text.find('>');
    if (end == std::string_view::npos)
        return std::nullopt;
    const auto count = parseCount(text.substr(1, end - 1));
    text.remove_prefix(end + 1);
    return count;
}

}  // namespace

void to_rle(std::string& text) {
    char* to = text.data();
    const char* const end = to + text.size();
    for (const char* from = to; from != end;) {
        const char character = *from;
        const char* const runEnd =
            std::find_if(from, end, [character](char next) { return next != character; });
        to = writeRun(to, static_cast<std::size_t>(runEnd - from), character);
        from = runEnd;
    }
    text.resize(static_cast<std::size_t>(to - text.data()));
}

std::string to_rle(const void* data, unsigned long length) {
    std::string text = hex(data, length);
    to_rle(text);
    return text;
}

std::string from_rle(const std::string& text, unsigned long most) {
    std::string result;
    int count = 1;
    for (std::string_view rest = text; !rest.empty();) {
        if (rest.front() == '<') {
            const auto next = takeCount(rest);
            if (!next)
                return {};
            count = *next;
            continue;
        }
        const auto copies = static_cast<std::size_t>(std::max(count, 0));
        if (copies > most - result.size())
            return {};
        result.append(copies, rest.front());
        rest.remove_prefix(1);
        count = 1;
    }
    return result;
}

}  // namespace plr
