#include "platform/linux/kel/escape.h"

namespace kel {

namespace {

bool is_harmless(char previous, char byte) noexcept {
    const auto code = static_cast<unsigned char>(byte);
    if (code >= 0x80)
        return previous != '\xc2' || code >= 0xa0;
    return code >= ' ' && code != 0x7f && byte != '\\';
}

}  // namespace

std::size_t escape(char previous, char byte, char* out) noexcept {
    if (is_harmless(previous, byte)) {
        *out = byte;
        return 1;
    }
    const auto code = static_cast<unsigned char>(byte);
    out[0] = '\\';
    switch (byte) {
        case '\n':
            out[1] = 'n';
            return 2;
        case '\t':
            out[1] = 't';
            return 2;
        case '\\':
            out[1] = '\\';
            return 2;
        default:
            out[1] = 'x';
            out[2] = "0123456789abcdef"[code >> 4];
            out[3] = "0123456789abcdef"[code & 15];
            return 4;
    }
}

void append_escaped(std::string& out, std::string_view text) {
    char escaped[kEscapedBytes];
    char previous = 0;
    for (const char byte : text) {
        out.append(escaped, escape(previous, byte, escaped));
        previous = byte;
    }
}

}  // namespace kel
