// OpenSSL, without a separator between bytes.

#include <openssl/crypto.h>

#include "bench/bytes_cases.h"

namespace {

using namespace bench::bytes_cases;

void encode(char* out, std::size_t size, const std::uint8_t* data, std::size_t bytes) {
    expect(OPENSSL_buf2hexstr_ex(out, size, nullptr, data, bytes, '\0') == 1);
}

void decode(std::uint8_t* out, std::size_t bytes, const char* text, std::size_t /*length*/) {
    expect(OPENSSL_hexstr2buf_ex(out, bytes, nullptr, text, '\0') == 1);
}

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv, {{"to_hex", toHex(encode, true)}, {"from_hex", fromHex(decode)}});
}
