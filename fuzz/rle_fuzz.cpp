#include "plr/format/rle.h"

#include <cstdint>
#include <cstdlib>
#include <string>

// Any text expanded, up to a bound; and any text compressed, which gives it back.
namespace {

constexpr std::size_t kMost = 10000;

void check(bool holds) {
    if (!holds)
        std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::string text(reinterpret_cast<const char*>(data), size);
    const std::string expanded = plr::from_rle(text, kMost);
    check(expanded.size() <= kMost);
    // What just fits stays, and one less makes it empty.
    check(plr::from_rle(text, expanded.size()) == expanded || expanded.empty());
    if (!expanded.empty())
        check(plr::from_rle(text, expanded.size() - 1).empty());
    if (text.find('<') == std::string::npos)
        check(expanded == (size <= kMost ? text : ""));

    for (char& character : text)
        character = character == '<' ? '>' : character;
    std::string compressed = text;
    plr::to_rle(compressed);
    check(compressed.size() <= text.size());
    check(plr::from_rle(compressed, text.size()) == text);
    const std::string hexText = plr::from_rle(plr::to_rle(data, size));
    check(hexText.size() == 2 * size);
    return 0;
}
