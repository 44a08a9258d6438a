#include "plr/format/bitfield_log.h"
#include "plr/log/static_logger.h"
#include "plr/text/text_converter.h"

// The data coding scheme octets of 3GPP TS 23.038: of an SMS, chapter 4; of a cell
// broadcast, chapter 5. By their bits 7 to 4:
//
//   SMS   00xx 01xx  general data coding; bit 6: delete automatically, bit 5: compressed
//         10xx       reserved, but for KS X 1001 in bits 3 and 2
//         1100 1101  message waiting, discard or store, GSM 7-bit
//         1110       message waiting, store, UCS-2
//         1111       data coding and message class
//   CBS   0000       GSM 7-bit, by language
//         0001       0: GSM 7-bit, 1: UCS-2, of a language that the text begins with
//         0010 0011  GSM 7-bit, by language
//         01xx       general data coding
//         1111       data coding and message class
namespace plr {
namespace {

using MessageClass = TextConverter::MessageClass;
using MessageEncoding = TextConverter::MessageEncoding;

// The octet. A field is logged as it is read.
class Scheme {
  public:
    Scheme(int octet, const StaticLogger& logger)
        : octet_(static_cast<unsigned char>(octet)), logger_(logger) {}

    [[nodiscard]] unsigned group() const { return octet_ >> 4U; }

    // The bits from `low` to `high`, of which each value has its description.
    template <std::size_t values>
    unsigned field(unsigned char low, unsigned char high,
                   const char* const (&descriptions)[values]) const {
        const unsigned value = bitfield(octet_, {low, high});
        log(low, high, descriptions[value]);
        return value;
    }
    [[nodiscard]] bool bit(unsigned char number, const char* clear, const char* set) const {
        return field(number, number, {clear, set}) != 0;
    }
    void log(unsigned char low, unsigned char high, const char* description) const {
        if (logger_.enabled(LogLevel::Debug))
            logBitFieldWithDesc(logger_, octet_, {low, high}, description);
    }

  private:
    unsigned char octet_;
    const StaticLogger& logger_;
};

MessageClass readClass(const Scheme& scheme) {
    return static_cast<MessageClass>(
        scheme.field(0, 1, {"Class 0", "Class 1", "Class 2", "Class 3"}));
}

// Bits 4 to 0 of general data coding.
void readGeneralCoding(const Scheme& scheme, MessageClass& messageClass,
                       MessageEncoding& encoding) {
    if (scheme.bit(4, "Reserved, no message class meaning", "Have a message class meaning"))
        messageClass = readClass(scheme);
    else
        scheme.log(0, 1, "Class unspecified");
    // Deliberate: the reserved value is KS X 1001, as Korean networks use it.
    encoding = static_cast<MessageEncoding>(
        scheme.field(2, 3,
                     {"Gsm7 encoding", "8bit data encoding", "UCS2 encoding",
                      "Reserved, used for KTF, KSC5601 encoding"}));
}

// Bits 3 to 0 of data coding and message class.
void readMessageHandling(const Scheme& scheme, MessageClass& messageClass,
                         MessageEncoding& encoding) {
    scheme.log(3, 3, "Reserved");
    encoding = scheme.bit(2, "Gsm7 encoding", "8bit data encoding") ? MessageEncoding::k8BitData
                                                                    : MessageEncoding::kGSM7;
    messageClass = readClass(scheme);
}

bool readReserved(const Scheme& scheme, MessageEncoding& encoding) {
    scheme.log(4, 7, "Reserved");
    const bool korean =
        scheme.field(2, 3, {"Reserved", "kKSC5601 encoding", "Reserved", "Reserved"}) == 1;
    scheme.log(0, 1, "Reserved");
    if (korean)
        encoding = MessageEncoding::kKSC5601;
    return korean;
}

bool isOctet(int dcs) {
    return dcs >= 0 && dcs < 0x100;
}

}  // namespace

bool TextConverter::decodeSmsDataCodingScheme(int dcs, MessageClass& messageClass,
                                              MessageEncoding& encoding, bool& autoDelete,
                                              bool& compressed, bool& voicemailIndicationPresent,
                                              bool& voicemailIndicationActive, bool& discardMessage,
                                              const StaticLogger& logger) {
    messageClass = MessageClass::kClassNone;
    voicemailIndicationPresent = false;
    if (!isOctet(dcs))
        return false;
    const Scheme scheme(dcs, logger);
    switch (scheme.group()) {
        case 0x8:
        case 0x9:
        case 0xA:
        case 0xB:
            return readReserved(scheme, encoding);
        case 0xC:
            scheme.log(4, 7, "Message waiting indication group: Discard message");
            discardMessage = true;
            break;
        case 0xD:
            scheme.log(4, 7, "Message waiting indication group: Store message (GSM-7)");
            break;
        case 0xE:
            scheme.log(4, 7, "Message Waiting Indication group: Store message (UCS2)");
            break;
        case 0xF:
            scheme.log(4, 7, "Data coding/message class");
            readMessageHandling(scheme, messageClass, encoding);
            return true;
        default:
            autoDelete = scheme.field(6, 7,
                                      {"General data coding indication",
                                       "Message marked for automatic deletion"}) != 0;
            compressed = scheme.bit(5, "Uncompressed", "Compressed");
            readGeneralCoding(scheme, messageClass, encoding);
            return true;
    }
    encoding = scheme.group() == 0xE ? MessageEncoding::kUCS2 : MessageEncoding::kGSM7;
    const bool active = scheme.bit(3, "Set indication inactive", "Set indication active");
    scheme.log(2, 2, "Reserved");
    if (scheme.field(0, 1,
                     {"Voicemail message waiting", "Fax message waiting",
                      "Electronic mail message waiting", "Other message waiting"}) == 0) {
        voicemailIndicationPresent = true;
        voicemailIndicationActive = active;
    }
    return true;
}

bool TextConverter::decodeCbsDataCodingScheme(int dcs, MessageClass& messageClass,
                                              MessageEncoding& encoding, bool& languageIndicated) {
    messageClass = MessageClass::kClassNone;
    languageIndicated = false;
    if (!isOctet(dcs))
        return false;
    StaticLogger silent;
    silent.setLogLevel(LogLevel::Never);
    const Scheme scheme(dcs, silent);
    switch (scheme.group()) {
        case 0x0:
        case 0x2:
        case 0x3:
            encoding = MessageEncoding::kGSM7;
            return true;
        case 0x1:
            if (dcs > 0x11)
                return false;
            encoding = dcs == 0x10 ? MessageEncoding::kGSM7 : MessageEncoding::kUCS2;
            languageIndicated = true;
            return true;
        case 0x4:
        case 0x5:
        case 0x6:
        case 0x7:
            readGeneralCoding(scheme, messageClass, encoding);
            return true;
        case 0xF:
            readMessageHandling(scheme, messageClass, encoding);
            return true;
        default:
            return false;
    }
}

}  // namespace plr
