#include <cctype>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "Pelorin"
#include "plr/format/byte_dump.h"
#include "plr/format/hex.h"
#include "tests/support/dump_model.h"

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

// Lines of 16 characters, read in pairs.
std::string modelOfText(const std::string& text) {
    std::string dump;
    for (std::size_t i = 0; i < text.size(); i += 2) {
        if (i % 16 == 0)
            dump +=
                print(i == 0 ? "%04x    " : "\n%04x    ", static_cast<unsigned>(i / 2 & 0xFFFF));
        if (i + 1 == text.size())
            break;
        unsigned value = 0;
        for (const char digit : text.substr(i, 2))
            value = value * 16 +
                    (std::isxdigit(static_cast<unsigned char>(digit)) != 0
                         ? static_cast<unsigned>(std::stoi(std::string(1, digit), nullptr, 16))
                         : 0);
        dump += print(i % 16 == 0 ? "%02x" : " %02x", value);
    }
    return dump;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size < 3)
        return 0;
    const Bytes bytes(data + 3, data + size);
    checkFlat(bytes, static_cast<std::int8_t>(data[0]),
              static_cast<std::uint16_t>(data[1] | data[2] << 8));
    const std::string text(bytes.begin(), bytes.end());
    check(plr::getBytedumpPrettyPrint(text) == modelOfText(text));
    check(plr::getBytedumpPrettyPrintBinary(bytes.data(), static_cast<unsigned>(bytes.size())) ==
          modelOfText(plr::hex(bytes)));
    return 0;
}
