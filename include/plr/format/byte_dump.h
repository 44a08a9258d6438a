#pragma once

#include <string>
#include <vector>

#include "plr/base/export.h"

// Lines that show bytes to people.
//
// Threads: pure functions.
// Offsets: of bytes, as four hex digits, of which greater ones lose the upper.
namespace plr {

// "0003    41    01000001    tag": offset, hex, binary, description.
[[nodiscard]] PLR_EXPORT std::string getBytePrettyPrint(unsigned long offset, unsigned char byte,
                                                        const std::string& description);

// "0003    41 54    tag": offset of the first, hex, description.
[[nodiscard]] PLR_EXPORT std::string getBytesPrettyPrint(unsigned long offset,
                                                         const std::vector<unsigned char>& bytes,
                                                         const std::string& description);
[[nodiscard]] PLR_EXPORT std::string getBytesPrettyPrint(unsigned long offset,
                                                         const std::string& bytes,
                                                         const std::string& description);

// Lines of eight bytes, "0008    41 54 0d"; no line feed after the last. In the text a
// character that is no digit counts as 0, and a lone last digit is dropped.
[[nodiscard]] PLR_EXPORT std::string getBytedumpPrettyPrint(const std::string& hexText);
[[nodiscard]] PLR_EXPORT std::string getBytedumpPrettyPrintBinary(const unsigned char* data,
                                                                  unsigned int length);

// Bytes of value 0 at the end.
[[nodiscard]] PLR_EXPORT unsigned int count_trailing_zeroes(const unsigned char* data,
                                                            unsigned int length);

// Sets `out` to the bytes in upper-case hex, or with `dump` to what
// PelorinLogBinaryToBuffer() makes of them (of at most 2^31 - 1 bytes, and as much as
// its buffer holds).
// `trimTrailingZeroes`: without the bytes of value 0 at the end.
PLR_EXPORT void assign(std::string& out, const unsigned char* data, unsigned int length, bool dump,
                       bool trimTrailingZeroes);

}  // namespace plr
