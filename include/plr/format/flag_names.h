#pragma once

#include <string>

#include "plr/base/export.h"

// Names for the flags that are set in a word:
//
//     std::string names;
//     appendLabelIfBitSet(names, word, "|", 0x1, "A");
//     appendLabelIfBitSet(names, word, "|", 0x4, "B");
//     appendLeftoverBits(names, word, "|");     // "A|B|0x40" for 0x45
//
// `separator` is appended first unless `out` is empty; null for none.
//
// Threads: pure functions.
namespace plr {

// Appends `label` if any bit of `mask` is set in `remaining`, and clears them all there.
PLR_EXPORT void appendLabelIfBitSet(std::string& out, unsigned long& remaining,
                                    const char* separator, unsigned long mask, const char* label);

// Appends what no label claimed, as "0x" and hex digits; nothing for 0.
PLR_EXPORT void appendLeftoverBits(std::string& out, unsigned long bits, const char* separator);

}  // namespace plr
