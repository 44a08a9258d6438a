#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "examples/sms_inbox.h"
#include "examples/sms_pdu.h"
#include "plr/format/hex.h"
#include "plr/ipc/dict.h"

// PDUs against octets of another codec, and what becomes of them.
namespace radio {
namespace {

// "SENDER TIME: TEXT", or the complaint.
std::string shown(const std::string& pdu) {
    const auto [message, complaint] = readDeliver(plr::parse_hex(pdu, plr::kHexWhitespaceNone));
    if (complaint)
        return complaint;
    return message.sender + ' ' + message.time + ": " + message.userData.text;
}

TEST(SmsPdu, ReceivedMessagesAreRead) {
    const std::string start = "0791947100000000";
    const struct {
        const char* name;
        std::string pdu;
        const char* message;
    } rows[] = {
        {"septets",
         start + "040D91945155103254F60000621122905120402847B9DF530685EB73D092CF76EB40E4F01C444D8FD"
                 "7653A68FD9ED3CB74102D07DA945D",
         "+4915550123456 2026-11-22T09:15:02+01:00: Grüße aus Köln: das Ticket kostet 49 €."},
        {"name of a sender, national tables",
         start + "4409D0C2B07B1D060000621122906133212506240101250101C07C1A74F6BBD965390BD4499BE5657"
                 "75A0F229719E90E3DED02",
         "Banka 2026-11-22T09:16:33+03:00: İyi günler, şifreniz değişti."},
        {"UCS-2",
         start + "040C9128012143658700086211227181006314C548B155D558C138C6940020D83DDC4BD83CDFFD",
         "+821012345678 2026-11-22T17:18:00+09:00: 안녕하세요 👋🏽"},
        {"odd number, zone behind", start + "0405812143F50011992113329595890178",
         "12345 2099-12-31T23:59:59-04:30: x"},
        {"no SMSC, no digits, no time",
         "000400810000"
         "00000000000000"
         "0178",
         " : x"},
        {"month 13",
         "000400810000"
         "62310101010100"
         "0178",
         " : x"},
        {"header that is not filled",
         "004400810000"
         "00000000000000"
         "050200708007",
         " : x"},
        {"to be sent", "0001000D91945155103254F600000141", "no received message"},
        {"nothing", "", "malformed"},
        {"SMSC beyond the PDU", "0891", "malformed"},
        {"21 digits", "000415911111111111111111111111", "malformed"},
        {"digits cut", "000404811", "malformed"},
        {"no length",
         "000400810000"
         "00000000000000",
         "malformed"},
        {"text cut",
         "000400810000"
         "00000000000000"
         "0278",
         "user data cut short"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(shown(row.pdu), row.message) << row.name;
}

TEST(SmsPdu, MessagesToSendAreWritten) {
    const plr::SmsPart plain{{0x78}, 1, 0x00, false};
    const plr::SmsPart part{{5, 0, 3, 7, 2, 1, 0, 0x41}, 8, 0x08, true};
    const struct {
        const char* number;
        plr::SmsPart part;
        const char* pdu;  // empty: refused
    } rows[] = {
        {"+4915550123456", plain, "0001000d91945155103254f600000178"},
        {"*123#", part,
         "0041000581"
         "1a32fb"
         "00080805000307020100"
         "41"},
        {"", plain, ""},
        {"+", plain, ""},
        {"123456789012345678901", plain, ""},
        {"12a", plain, ""},
    };
    for (const auto& row : rows) {
        const auto pdu = writeSubmit(row.number, row.part);
        EXPECT_EQ(pdu ? plr::hex(*pdu) : "", row.pdu) << row.number;
    }
}

TEST(PduLines, JoinTheTwoLinesOfAMessage) {
    std::string seen;
    PduLines lines([&seen](const ModemLine& line) { seen += line.text + '|'; });
    for (const char* line :
         {"OK", "+CMT: ,1", "00", "+CMT: ,2", "RING", "+CMGL: 1,0,,1", "+CMT: ,1", "01", "02"})
        lines.feed({1, line, false});
    EXPECT_EQ(seen, "OK|+CMT: ,1,00|+CMT: ,2|RING|+CMGL: 1,0,,1|+CMT: ,1,01|02|");
}

class Inbox {
  public:
    // "PLACE PARTS TEXT" of what is reported, or the complaint; empty for nothing.
    std::string read(const std::string& line) {
        const Reading reading = inbox_.read(parseAtLine(line).value());
        if (reading.path.empty())
            return reading.complaint ? reading.complaint : "";
        const vox::dict value(reading.value);
        return reading.path.substr(std::string("/radio/sms/").size()) + ' ' +
               vox::object(value["parts"]).to_string() + ' ' + std::string(value.text("text"));
    }
    // A message of +1, with the part as its user data.
    std::string receive(const plr::SmsPart& part) {
        const std::vector<std::uint8_t> fields{0, part.codingScheme, 0, 0, 0, 0, 0, 0,
                                               0, part.length};
        const std::string pdu = std::string(part.hasHeader ? "44" : "04") + "0191F1" +
                                plr::hex(fields) + plr::hex(part.userData);
        return read("+CMT: ," + std::to_string(pdu.size() / 2) + ",00" + pdu);
    }

  private:
    SmsInbox inbox_;
};

std::vector<plr::SmsPart> partsOf(const std::string& text, std::uint16_t number) {
    return plr::encodeSms(text, {}, plr::SmsReference::k8Bit, number);
}

TEST(SmsInbox, PutsPartsTogetherInAnyOrder) {
    Inbox inbox;
    const std::string first = std::string(153, 'a') + std::string(153, 'b') + "c";
    const std::string second = std::string(200, 'd');
    const auto parts = partsOf(first, 1);
    const auto others = partsOf(second, 2);
    EXPECT_EQ(inbox.receive(parts[2]), "");
    EXPECT_EQ(inbox.receive(others[1]), "");
    EXPECT_EQ(inbox.receive(parts[2]), "") << "twice";
    EXPECT_EQ(inbox.receive(parts[0]), "");
    EXPECT_EQ(inbox.receive(others[0]), "1 2u " + second);
    EXPECT_EQ(inbox.receive(parts[1]), "2 3u " + first);
    EXPECT_EQ(inbox.receive(partsOf("alone", 0)[0]), "3 1u alone");
    EXPECT_EQ(inbox.receive(partsOf("alone", 0)[0]), "") << "again, as after a refresh";
}

TEST(SmsInbox, IsBounded) {
    Inbox inbox;
    const std::string text(200, 'x');
    for (std::uint16_t number = 0; number <= SmsInbox::kMostIncomplete; ++number)
        EXPECT_EQ(inbox.receive(partsOf(text, number)[0]), "");
    EXPECT_EQ(inbox.receive(partsOf(text, 0)[1]), "") << "the first one was forgotten";
    EXPECT_EQ(inbox.receive(partsOf(text, SmsInbox::kMostIncomplete)[1]), "1 2u " + text);
    for (std::size_t number = 2; number <= SmsInbox::kMostKept; ++number)
        EXPECT_EQ(inbox.receive(partsOf(std::to_string(number), 0)[0]).substr(0, 2),
                  (std::to_string(number) + ' ').substr(0, 2));
    EXPECT_EQ(inbox.receive(partsOf("first again", 0)[0]), "1 1u first again");
}

TEST(SmsInbox, SkipsWhatIsNoMessage) {
    Inbox inbox;
    const std::string pdu =
        "0004008100000000000000000001"
        "78";
    EXPECT_EQ(inbox.read("+CMGL: 7,2,,14," + pdu), "") << "one to be sent";
    for (const std::string& line : {"+CMT: ,13," + pdu, "+CMT: ," + pdu, std::string("+CMT: ,14"),
                                    std::string("+CMT: ,14,zz"), "+CMGL: 7,0,,15," + pdu})
        EXPECT_EQ(inbox.read(line), "malformed") << line;
    EXPECT_EQ(inbox.read("+CMGL: 7,0,\"Ann\",14," + pdu), "1 1u x");
}

}  // namespace
}  // namespace radio
