#pragma once

#include <string>

#include "plr/base/export.h"

// Run-length compression of text, made for hex text: "aaaaaaab" is "<7>ab".
//
//   text  = *(run / character)
//   run   = "<" count ">" character        written from 5 equal characters on
//   count = ["+" / "-"] 1*DIGIT            in the range of int
//
// A '<' of the text itself is not escaped: such a text does not come back.
//
// Threads: pure functions.
namespace plr {

// Compresses `text` in place; it never grows.
PLR_EXPORT void to_rle(std::string& text);
// The hex text of bytes, compressed.
[[nodiscard]] PLR_EXPORT std::string to_rle(const void* data, unsigned long length);

// The text again; empty when a '<' has no '>' or no count between them. A count below 1
// appends nothing; of two counts in a row the second holds; one at the end
// is dropped.
// `most`: characters; a longer text gives an empty one, before it takes memory. Pass
// one for text from outside: ten characters can ask for 2 GiB.
[[nodiscard]] PLR_EXPORT std::string from_rle(const std::string& text,
                                              unsigned long most = std::string::npos);

}  // namespace plr
