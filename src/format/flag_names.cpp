#include "plr/format/flag_names.h"

#include "plr/format/hex.h"

namespace plr {
namespace {

void appendSeparated(std::string& out, const char* separator, const char* label) {
    if (separator && !out.empty())
        out += separator;
    out += label;
}

}  // namespace

void appendLabelIfBitSet(std::string& out, unsigned long& remaining, const char* separator,
                         unsigned long mask, const char* label) {
    if ((remaining & mask) == 0)
        return;
    remaining &= ~mask;
    appendSeparated(out, separator, label);
}

void appendLeftoverBits(std::string& out, unsigned long bits, const char* separator) {
    if (bits != 0)
        appendSeparated(out, separator, ("0x" + hex(bits)).c_str());
}

}  // namespace plr
