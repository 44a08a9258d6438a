#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "Pelorin"
#include "plr/format/byte_dump.h"
#include "plr/format/hex.h"
#include "tests/support/byte_models.h"

// Dumps of any bytes with any line length into any room, and of any text as if it
// were hex, against plain formatters. The input is a line length, a size of two bytes,
// then the bytes.
namespace {

using namespace plr::test;

void check(bool holds) {
    if (!holds)
        std::abort();
}

void checkFlat(const Bytes& bytes, std::int8_t lineLength, std::uint16_t size) {
    Dump dump;
    PelorinLogLineOperation operation{
        &dump, nullptr, [](PelorinLogLineOperation* self, const char* line) {
            static_cast<Dump*>(self->context)->lines.emplace_back(line);
        }};
    Bytes out(size);  // the sanitizer guards its end
    auto* const text = reinterpret_cast<char*>(out.data());
    dump.result = PelorinLogBinaryToBufferWithLineLengthAndOperation(
        text, size, bytes.data(), static_cast<std::int32_t>(bytes.size()), lineLength, &operation);
    if (size == 0 || lineLength < 1 || lineLength > 62)
        return check(dump == Dump() && (size == 0 || *text == '\0'));
    dump.text = text;
    check(dump == cutDump(modelDump(bytes, static_cast<std::size_t>(lineLength)), size));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size < 3)
        return 0;
    const Bytes bytes(data + 3, data + size);
    checkFlat(bytes, static_cast<std::int8_t>(data[0]),
              static_cast<std::uint16_t>(data[1] | data[2] << 8));
    const std::string text(bytes.begin(), bytes.end());
    check(plr::getBytedumpPrettyPrint(text) == modelTextDump(text));
    check(plr::getBytedumpPrettyPrintBinary(bytes.data(), static_cast<unsigned>(bytes.size())) ==
          modelTextDump(plr::hex(bytes)));
    return 0;
}
