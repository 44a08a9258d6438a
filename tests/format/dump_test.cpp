#include <gtest/gtest.h>

#include <numeric>
#include <string>
#include <vector>

#include "Pelorin"
#include "plr/format/byte_dump.h"
#include "plr/format/hex.h"
#include "support/byte_models.h"

// Dumps against a formatter that prints byte by byte.
namespace {

using namespace plr::test;

// Every value from a printable one on.
Bytes countUp(std::size_t length) {
    Bytes bytes(length);
    std::iota(bytes.begin(), bytes.end(), static_cast<unsigned char>('x'));
    return bytes;
}

Dump flatDump(const Bytes& bytes, std::int32_t lineLength, std::size_t size) {
    Dump dump;
    std::string out(size + 8, '~');
    PelorinLogLineOperation operation{
        &dump, nullptr, [](PelorinLogLineOperation* self, const char* line) {
            static_cast<Dump*>(self->context)->lines.emplace_back(line);
        }};
    dump.result = PelorinLogBinaryToBufferWithLineLengthAndOperation(
        out.data(), static_cast<std::uint32_t>(size), bytes.data(),
        static_cast<std::int32_t>(bytes.size()), lineLength, &operation);
    EXPECT_EQ(out.substr(size), "~~~~~~~~");
    dump.text = out.c_str();
    return dump;
}

TEST(FlatDump, EveryLengthAndLineLengthWholeAndCut) {
    for (std::size_t length = 0; length <= 200; ++length) {
        const Bytes bytes = countUp(length);
        for (std::int32_t lineLength = 1; lineLength <= 62; ++lineLength) {
            const Dump whole = modelDump(bytes, static_cast<std::size_t>(lineLength));
            const std::size_t end = whole.text.size();
            for (const std::size_t size : {1 + end / 2, std::max<std::size_t>(end, 1), end + 1})
                ASSERT_EQ(flatDump(bytes, lineLength, size), cutDump(whole, size))
                    << length << " bytes, " << lineLength << " in a line, size " << size;
        }
    }
}

TEST(FlatDump, DefaultLineLength) {
    const Bytes bytes = countUp(33);
    std::string out(PelorinLogGetBufferSize(33), '~');
    const std::uint32_t length = PelorinLogBinaryToBuffer(
        out.data(), static_cast<std::uint32_t>(out.size()), bytes.data(), 33);
    EXPECT_EQ(out.substr(0, length), modelDump(bytes, 32).text);
    EXPECT_EQ(out.substr(out.find('\n') + 1, 142),
              "0020  98 " + std::string(96, ' ') + ".\n" + '\0' + std::string(34, '~'))
        << "and nothing written behind the NUL";
    EXPECT_EQ(PelorinLogGetBufferSize(0), 1U);
    EXPECT_EQ(PelorinLogGetBufferSize(32), 147U);
    EXPECT_EQ(PelorinLogGetBufferSize(33), 293U);
    EXPECT_EQ(PelorinLogGetBufferSize(0xFFFFFFFF), 0xFFFFFFFF);

    std::string assigned;
    plr::assign(assigned, bytes.data(), 33, true, false);
    EXPECT_EQ(assigned, out.substr(0, length));
}

TEST(FlatDump, GreatOffsetsTakeMoreDigits) {
    const std::string text = flatDump(Bytes(65600), 62, 1 << 20).text;
    EXPECT_NE(text.find("\nfffe  00"), std::string::npos);
    EXPECT_NE(text.find("\n1003c  00"), std::string::npos);
}

TEST(FlatDump, ImpossibleSizesGiveNoLine) {
    for (const std::int32_t lineLength : {-1, 0, 63, 0x7FFFFFFF})
        EXPECT_EQ(flatDump(countUp(3), lineLength, 100), Dump()) << lineLength;
    char out[] = "~";
    EXPECT_EQ(PelorinLogBinaryToBuffer(out, 0, "abc", 3), 0U);
    EXPECT_STREQ(out, "~");
    EXPECT_EQ(PelorinLogBinaryToBuffer(out, 1, "abc", -1), 0U);
    EXPECT_STREQ(out, "");
}

TEST(ByteDump, EightBytesInALineAndNoLineFeedAtTheEnd) {
    for (unsigned length = 0; length <= 40; ++length) {
        const Bytes bytes = countUp(length);
        EXPECT_EQ(plr::getBytedumpPrettyPrintBinary(bytes.data(), length),
                  modelTextDump(plr::hex(bytes)));
    }
    EXPECT_EQ(plr::getBytedumpPrettyPrint("4142434445464748 "),
              "0000    41 42 43 44 45 46 47 48\n0008    ");
    EXPECT_EQ(plr::getBytedumpPrettyPrint("zz4G4"), "0000    00 40") << "lenient, in pairs";
    EXPECT_TRUE(plr::getBytedumpPrettyPrint(std::string(2 * 65537, '0')).ends_with("\n0000    00"));
}

TEST(ByteDump, LinesOfBytes) {
    EXPECT_EQ(plr::getBytePrettyPrint(3, 0x41, "tag"), "0003    41    01000001    tag");
    EXPECT_EQ(plr::getBytePrettyPrint(0x12345, 7, ""), "2345    07    00000111    ");
    EXPECT_EQ(plr::getBytesPrettyPrint(0x1FFFF, Bytes{1, 0xA2}, "d"), "ffff    01 a2    d");
    EXPECT_EQ(plr::getBytesPrettyPrint(9, std::string("A\xFF"), "d"), "0009    41 ff    d");
    EXPECT_EQ(plr::getBytesPrettyPrint(0, Bytes(), ""), "0000        ");
}

TEST(ByteDump, AssignTrimsZeroesAtTheEnd) {
    const unsigned char bytes[] = {0, 1, 0, 0};
    EXPECT_EQ(plr::count_trailing_zeroes(bytes, 4), 2U);
    EXPECT_EQ(plr::count_trailing_zeroes(bytes, 1), 1U);
    EXPECT_EQ(plr::count_trailing_zeroes(nullptr, 0), 0U);
    std::string out = "before";
    plr::assign(out, bytes, 4, false, true);
    EXPECT_EQ(out, "0001");
    plr::assign(out, bytes, 4, false, false);
    EXPECT_EQ(out, "00010000");
    plr::assign(out, bytes, 4, true, true);
    EXPECT_EQ(out, modelDump({0, 1}, 32).text);
    plr::assign(out, bytes, 1, true, true);
    EXPECT_EQ(out, "");
}

}  // namespace
