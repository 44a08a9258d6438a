// libsodium, whose time does not depend on the data.

#include <sodium.h>

#include "bench/bytes_cases.h"

namespace {

using namespace bench::bytes_cases;

void decode(std::uint8_t* out, std::size_t bytes, const char* text, std::size_t length) {
    sodium_hex2bin(out, bytes, text, length, nullptr, nullptr, nullptr);
}

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv, {{"to_hex", toHex(sodium_bin2hex)}, {"from_hex", fromHex(decode)}});
}
