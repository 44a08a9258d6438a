#pragma once

#include <functional>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/format/bitfield.h"

// Lines in the log that explain the fields of a received message, bit by bit. All are
// logged at Debug, and only if the logger lets Debug through; nothing is composed
// otherwise.
//
// Threads: any that may use the logger.
namespace plr {

class StaticLogger;

// In front of every picture of a field, so that it stands below the binary digits of
// getBytePrettyPrint().
inline constexpr char kSpacesForBitField[] = "              ";

// "              1011----    description": the field's picture in `byte`.
PLR_EXPORT void logBitFieldWithDesc(const StaticLogger& logger, unsigned char byte,
                                    const BitRange& range, const std::string& description);
// The description is made of the field's value; an empty function makes none.
PLR_EXPORT void logBitFieldWithDesc(const StaticLogger& logger, unsigned char byte,
                                    const BitRange& range,
                                    const std::function<std::string(unsigned char)>& describe);

// Logs a field that may lie in several bytes. A byte whose first bit belongs to it is
// shown as a line of getBytePrettyPrint(); where only a part of a byte does, the picture
// of that part follows. The description stands in the last line.
// `bitPosition`: where the field ends: the number of the first bit behind it, counted
// from the most significant bit of the first byte, which is 0.
// `width`: bits. One below 1 shows an empty picture.
// `offset`: of the first byte, for the lines.
// A position outside the bytes is logged as "Invalid current byte position", after
// the lines of what lies inside. Deliberate: a field that begins up to 7 bits before
// the first byte is taken to begin in it, in bits above its own, which a picture
// leaves out.
PLR_EXPORT void logStraddlingBitField(const StaticLogger& logger, int bitPosition, int width,
                                      const std::vector<unsigned char>& bytes, unsigned long offset,
                                      const std::string& description);

}  // namespace plr
