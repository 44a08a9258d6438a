#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>

#include "plr/format/bitfield_log.h"
#include "plr/log/static_logger.h"
#include "plr/text/text_converter.h"
#include "support/log_fixture.h"

namespace {

using plr::TextConverter;
using Class = TextConverter::MessageClass;
using Encoding = TextConverter::MessageEncoding;
using testing::ElementsAre;
using testing::IsEmpty;

// Bits 7 to 0: 0, 1 and x for any; D: delete automatically, Z: compressed, A: active, C: of
// the class. What follows: encoding (G, 8, U, K, - for none), then d for discard,
// v for voicemail, l for language, ! for what is refused.
constexpr const char* kSms[] = {
    "0DZ000xx G",  "0DZ001xx 8",  "0DZ010xx U",  "0DZ011xx K", "0DZ100CC G",  "0DZ101CC 8",
    "0DZ110CC U",  "0DZ111CC K",  "10xx00xx -!", "10xx01xx K", "10xx1xxx -!", "1100Ax00 Gdv",
    "1100xx01 Gd", "1100xx1x Gd", "1101Ax00 Gv", "1101xx01 G", "1101xx1x G",  "1110Ax00 Uv",
    "1110xx01 U",  "1110xx1x U",  "1111x0CC G",  "1111x1CC 8",
};
constexpr const char* kCbs[] = {
    "0000xxxx G",  "00010000 Gl", "00010001 Ul", "0001001x -!", "000101xx -!", "00011xxx -!",
    "0010xxxx G",  "0011xxxx G",  "01x000xx G",  "01x001xx 8",  "01x010xx U",  "01x011xx K",
    "01x100CC G",  "01x101CC 8",  "01x110CC U",  "01x111CC K",  "10xxxxxx -!", "110xxxxx -!",
    "1110xxxx -!", "1111x0CC G",  "1111x1CC 8",
};

// What the row says of an octet; outputs that it does not speak of stay what they were.
struct Outputs {
    bool result = true;
    Class messageClass = Class::kClassNone;
    Encoding encoding{77};
    bool autoDelete, compressed, voicemail = false, active, discard, language = false;

    explicit Outputs(bool before)
        : autoDelete(before), compressed(before), active(before), discard(before) {}
    bool operator==(const Outputs&) const = default;
};

std::optional<Outputs> match(const std::string& row, int octet, bool before) {
    Outputs outputs(before);
    int messageClass = 0;
    for (int bit = 7; bit >= 0; --bit) {
        const char kind = row[static_cast<std::size_t>(7 - bit)];
        const bool isSet = (octet >> bit & 1) != 0;
        if (kind == (isSet ? '0' : '1'))
            return std::nullopt;
        if (kind == 'D')
            outputs.autoDelete = isSet;
        if (kind == 'Z')
            outputs.compressed = isSet;
        if (kind == 'A')
            outputs.active = isSet;
        if (kind == 'C')
            outputs.messageClass = static_cast<Class>(messageClass = 2 * messageClass + isSet);
    }
    if (row[9] != '-')
        outputs.encoding = static_cast<Encoding>(std::string("G8UK").find(row[9]));
    const auto has = [&row](char flag) { return row.find(flag, 10) != std::string::npos; };
    outputs.discard |= has('d');
    outputs.voicemail = has('v');
    outputs.language = has('l');
    outputs.result = !has('!');
    return outputs;
}

template <class Decode>
void expectTable(const auto& table, Decode decode) {
    for (const bool before : {false, true}) {
        for (int octet = 0; octet < 256; ++octet) {
            int rows = 0;
            for (const char* const row : table) {
                if (const auto expected = match(row, octet, before)) {
                    ++rows;
                    EXPECT_EQ(decode(octet, before), *expected) << row << ": " << octet;
                }
            }
            EXPECT_EQ(rows, 1) << octet;
        }
        for (const int none : {256, 0x7FFFFFFF, -1}) {
            Outputs refused(before);
            refused.result = false;
            EXPECT_EQ(decode(none, before), refused);
        }
    }
}

class DataCodingScheme : public plr::test::LogFixture {
  protected:
    Outputs decodeSms(int octet, bool before) {
        Outputs got(before);
        got.messageClass = Class::kClass3;
        got.voicemail = true;
        got.result = TextConverter::decodeSmsDataCodingScheme(
            octet, got.messageClass, got.encoding, got.autoDelete, got.compressed, got.voicemail,
            got.active, got.discard, logger_);
        return got;
    }
    // The lines, each from its picture of the bits on.
    std::vector<std::string> linesOf(int octet) {
        decodeSms(octet, false);
        std::vector<std::string> lines = takeLines();
        for (std::string& line : lines)
            line.erase(0,
                       std::string("D dcs ").size() + std::string(plr::kSpacesForBitField).size());
        return lines;
    }

    plr::StaticLogger logger_{std::string("dcs"), server_};
};

TEST_F(DataCodingScheme, OfEverySms) {
    expectTable(kSms, [this](int octet, bool before) { return decodeSms(octet, before); });
    EXPECT_THAT(takeLines(), IsEmpty());  // above Debug
}

TEST_F(DataCodingScheme, OfEveryCellBroadcast) {
    expectTable(kCbs, [](int octet, bool before) {
        Outputs got(before);
        got.messageClass = Class::kClass3;
        got.language = true;
        got.result = TextConverter::decodeCbsDataCodingScheme(octet, got.messageClass, got.encoding,
                                                              got.language);
        return got;
    });
}

TEST_F(DataCodingScheme, LogsEveryBitOnce) {
    logger_.setLogLevel(plr::LogLevel::Debug);
    for (int octet = 0; octet < 256; ++octet) {
        std::string bits(8, '-');
        for (const std::string& line : linesOf(octet)) {
            for (std::size_t i = 0; i < 8; ++i) {
                if (line[i] == '-')
                    continue;
                EXPECT_EQ(bits[i], '-') << octet;
                bits[i] = line[i];
            }
        }
        for (std::size_t i = 0; i < 8; ++i)
            EXPECT_EQ(bits[i], (octet >> (7 - i) & 1) != 0 ? '1' : '0') << octet;
    }
    EXPECT_THAT(linesOf(256), IsEmpty());
}

TEST_F(DataCodingScheme, Lines) {
    logger_.setLogLevel(plr::LogLevel::Debug);
    EXPECT_THAT(
        linesOf(0x00),
        ElementsAre("00------    General data coding indication", "--0-----    Uncompressed",
                    "---0----    Reserved, no message class meaning",
                    "------00    Class unspecified", "----00--    Gsm7 encoding"));
    EXPECT_THAT(
        linesOf(0x7D),
        ElementsAre("01------    Message marked for automatic deletion", "--1-----    Compressed",
                    "---1----    Have a message class meaning", "------01    Class 1",
                    "----11--    Reserved, used for KTF, KSC5601 encoding"));
    EXPECT_EQ(linesOf(0x14).back(), "----01--    8bit data encoding");
    EXPECT_EQ(linesOf(0x18).back(), "----10--    UCS2 encoding");
    EXPECT_THAT(linesOf(0x84), ElementsAre("1000----    Reserved", "----01--    kKSC5601 encoding",
                                           "------00    Reserved"));
    EXPECT_THAT(linesOf(0xB9), ElementsAre("1011----    Reserved", "----10--    Reserved",
                                           "------01    Reserved"));
    EXPECT_THAT(linesOf(0xC8),
                ElementsAre("1100----    Message waiting indication group: Discard message",
                            "----1---    Set indication active", "-----0--    Reserved",
                            "------00    Voicemail message waiting"));
    EXPECT_THAT(linesOf(0xD1),
                ElementsAre("1101----    Message waiting indication group: Store message (GSM-7)",
                            "----0---    Set indication inactive", "-----0--    Reserved",
                            "------01    Fax message waiting"));
    EXPECT_THAT(linesOf(0xE6),
                ElementsAre("1110----    Message Waiting Indication group: Store message (UCS2)",
                            "----0---    Set indication inactive", "-----1--    Reserved",
                            "------10    Electronic mail message waiting"));
    EXPECT_EQ(linesOf(0xE3).back(), "------11    Other message waiting");
    EXPECT_THAT(linesOf(0xF6),
                ElementsAre("1111----    Data coding/message class", "----0---    Reserved",
                            "-----1--    8bit data encoding", "------10    Class 2"));
    EXPECT_EQ(linesOf(0xFB)[2], "-----0--    Gsm7 encoding");
    EXPECT_EQ(linesOf(0xFB)[3], "------11    Class 3");
}

}  // namespace
