#pragma once

#include <array>

#include "plr/text/text_transform.h"
#include "src/text/utf16.h"

namespace plr {

inline constexpr std::size_t kUnitsAtOnce = 2048;
using UnitBuffer = std::array<char16_t, kUnitsAtOnce + 1>;

// As TextTransform::nextUnits() of any source: of `stage`, which takes what is neither unit nor
// pair for U+FFFD and is marked.
inline std::size_t pullUnits(TextTransform& stage, char16_t* out, std::size_t most) {
    TextTransform* const source = stage.getSource();
    if (source == nullptr)
        return 0;
    if (source->deliversUnits())
        return source->nextUnits(out, most);
    const char16_t* const begin = out;
    const char16_t* const end = out + most;
    for (std::uint32_t code = 0; out < end && (code = source->nextCode()) != TextTransform::kEnd;) {
        if (code > 0xFFFF && !utf16::isPair(code)) {
            stage.markExceptionOccurred();
            code = utf16::kReplacement;
        }
        out = utf16::put(out, code);
    }
    return static_cast<std::size_t>(out - begin);
}

}  // namespace plr
