#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "plr/base/export.h"

// Text conversion for SMS, USSD and cell broadcast.
//
// A TextConverter pulls codes through a stack of stages: a source of octets at the
// bottom, on it what pushConversion() puts. Packed septets to UTF-8:
//
//   using enum plr::TextConverter::Conversion;
//   plr::TextConverter converter;
//   converter.setSource(octets, length);
//   converter.pushConversion(kSmsUnpack, 0, septets);
//   converter.pushConversion(kGsm7ToUcs2);
//   converter.pushConversion(kUcs2ToUtf8);
//   const std::string text = converter.readChars(1000);
//
// Owner:   a value; it owns its stages, and borrows the octets of setSource().
// Threads: one at a time. The static members: any.
// Failure: replacement characters and exceptionOccurred(), see Conversion. Nothing
//          throws but for want of memory.
// Cost:    reading allocates nothing but the result of readChars(); bench/text_pelorin.cpp.
namespace plr {

class OctetSourceBuffer;
class StaticLogger;
class TextTransform;

class PLR_EXPORT TextConverter {
  public:
    // The character sets of 3GPP TS 23.038, chapter 4. kKSC5601, KS X 1001 in EUC-KR, is
    // what Korean networks mean by a value that is reserved there.
    enum class MessageEncoding : std::int32_t { kGSM7, k8BitData, kUCS2, kKSC5601 };

    // 3GPP TS 23.038, 6.2.1.2.4.
    enum class NationalLanguageId : std::int32_t { kNone, kTurkish, kSpanish, kPortuguese };

    enum class MessageClass : std::int32_t { kClass0, kClass1, kClass2, kClass3, kClassNone };

    // Which national tables (3GPP TS 23.038, annex A) a text may use: a locking shift table
    // in place of the default alphabet, a single shift table in place of its extension.
    // Value: the NationalLanguageId of the locking shift, plus 16 times that of the single
    // shift.
    enum class Ucs2ToGsm7Tables : std::int32_t {
        kDefault = 0x00,
        kTurkishLocking = 0x01,
        kPortugueseLocking = 0x03,
        kTurkishSingle = 0x10,
        kSpanishSingle = 0x20,
        kPortugueseSingle = 0x30,
        kTurkish = 0x11,     // both
        kPortuguese = 0x33,  // both
    };

    // The stages: what each takes -> what it delivers; p and q, where it has them; what
    // becomes of input that it cannot convert, and whether that marks it
    // (exceptionOccurred()). "Unit": a UTF-16 code unit, one code. "Pair": a character
    // outside the basic plane, also one code, see TextTransform.
    enum class Conversion : std::int32_t {
        // Octet -> two lower-case hex digits, the high one first. Of a code above 0xFF the
        // low 8 bits count, without a mark.
        kBinaryToHex = 0,
        // Two hex digits of either case, the high one first -> octet. What is no digit counts
        // as 0, and a lone last digit is dropped, both without a mark.
        kHexToBinary = 1,
        // Octets of UTF-8 (RFC 3629) -> units and pairs. Each maximal subpart of an ill-formed
        // sequence (Unicode, 3.9), also one that the end cuts, becomes one U+FFFD and marks.
        kUtf8ToUcs2 = 2,
        // Units and pairs -> octets of UTF-8. A high surrogate and the low one after it are one
        // character, too; a lone surrogate and everything else become U+FFFD (EF BF BD) and
        // mark.
        kUcs2ToUtf8 = 3,
        // Octets of packed septets (3GPP TS 23.038, 6.1.2.1) -> septets. p: the fill bits in
        // front (3GPP TS 23.040, 9.2.3.24), modulo 7, below 0 too: 7 are none, and -1 are 6. Bits
        // that are left behind the last whole septet are dropped; callers limit the septets to
        // those there are. Of a code above 0xFF the low 8 bits count, and it marks.
        kSmsUnpack = 4,
        // Septets -> octets, packed. p: fill bits, as above; they are 0, and so are the bits
        // behind the last septet. A code above 0x7F is cut to 7 bits and marks.
        kSmsPack = 5,
        // As kSmsPack, for USSD (3GPP TS 23.038, 6.1.2.3.1): where exactly 7 bits would stay
        // free in the last octet a CR (0x0D) fills them, and a last septet that is a CR and
        // ends with its octet is followed by another CR.
        kUssdPack = 6,
        // Units and pairs -> septets, 0x1B in front of those of an extension table. p: a
        // Ucs2ToGsm7Tables; another value is kDefault. The locking shift table or the default
        // alphabet first, then the single shift table or, where there is none, the default
        // extension. A character that none of them has becomes '?' (0x3F) and marks.
        kUcs2ToGsm7 = 7,
        // Septets -> units. p: the NationalLanguageId of the locking shift table, q: that of
        // the single shift table; others are kNone. As 3GPP TS 23.038 tells receivers: after
        // 0x1B, a septet that the extension table has not stands for its character of the
        // alphabet, without a mark; 0x1B twice is a space and marks; 0x1B at the end is
        // nothing and marks. A code above 0x7F becomes U+FFFD and marks.
        kGsm7ToUcs2 = 8,
        // Two octets, the high one first -> unit. Surrogates stay two units. A lone last octet
        // is dropped and marks; a code above 0xFF in either place makes U+FFFD and marks.
        kOctetToUcs2 = 9,
        // Unit -> two octets, the high one first; pair -> four. Everything else becomes U+FFFD
        // and marks.
        kUcs2ToOctet = 10,
        // Units and pairs -> octets of an alpha identifier (3GPP TS 31.102, annex A: the body
        // behind the header 0x81 or 0x82). p: the base, of which 16 bits count. Characters of
        // the default alphabet are their septets; others from the base on to base + 0x7F are
        // 0x80 and more; of the rest those of the extension are septets behind 0x1B. What is
        // left becomes '?' and marks.
        kUcs2ToAdn8 = 11,
        // The reverse -> units, with the rules of kGsm7ToUcs2 below 0x80. p: the base. A code
        // above 0xFF becomes U+FFFD and marks.
        kAdn8ToUcs2 = 12,
        // Octets with one septet each, as SIM files have them -> septets. 0xFF, an unused
        // octet, is the end. 0x80 to 0xFE, and codes above, become '?' and mark.
        kOctetToGsm7 = 13,
        // Octets of EUC-KR (KS X 1001) -> units: below 0x80 as they are, from 0xA1 to 0xFE two
        // a character. What is no character, and a lone lead octet, become U+FFFD and mark; of
        // a lead and what cannot follow one, the lead alone.
        kEucKRToUcs2 = 14,
        // Octets with 7-bit characters, the most significant bit first (3GPP2 C.S0015) ->
        // characters. p: the bit of the first octet where they begin, of which the remainder
        // by 8 counts; a negative one begins as much before it, with zero bits. Bits that are
        // left at the end are dropped. Of a code above 0xFF the low 8 bits count, and it marks.
        kC2KSmsPackedToUnpacked = 15,
        // The reverse, from bit 0; the bits behind the last character are 0. A code above 0x7F
        // is cut to 7 bits and marks.
        kC2KSmsUnpackedToPacked = 16,
        // Unit -> the same. Above 0x7F, pairs too, '?' and marks.
        kUcs2ToAscii7 = 17,
        // Octet -> the same. Above 0x7F U+FFFD and marks.
        kAscii7ToUcs2 = 18,
        // Octet -> the same. Above 0xFF U+FFFD and marks.
        kISOLatin1ToUcs2 = 19,
    };

    static constexpr unsigned long kNoLimit = 0x7FFFFFFF;

    TextConverter();
    TextConverter(const TextConverter&) = delete;
    TextConverter& operator=(const TextConverter&) = delete;
    ~TextConverter();

    // Reads from these octets, which must outlive the reading, and resets every stage; the
    // limits stay what is left of them. `length` counts as a signed 32-bit number;
    // below zero there is nothing to read.
    void setSource(const char* data, unsigned long length);
    // Puts a stage on top, which delivers up to `limit` codes; it counts as a signed 32-bit
    // number, of which a negative one is no limit.
    // Deliberate: for a value that is no Conversion, `limit` is set to the top stage.
    void pushConversion(Conversion conversion, int p = 0, unsigned long limit = kNoLimit,
                        int q = 0);
    // Takes the top stage off. The source always stays.
    void popConversion() noexcept;

    // The top stage's next code; TextTransform::kEnd at the end.
    [[nodiscard]] std::uint32_t nextCode();
    // Up to `max` of them, of each the low 8 bits. `max` may be any number: memory is taken
    // for what there is.
    [[nodiscard]] std::string readChars(unsigned long max);
    // Whether any stage is marked: met what it could not convert.
    [[nodiscard]] bool exceptionOccurred() const noexcept;

    // Octets that were read, and that are left.
    [[nodiscard]] std::uint64_t getSourceCount() const noexcept;
    [[nodiscard]] std::uint64_t getSourceAvailableCount() const noexcept;
    // The last `n` octets read; empty if there are not so many.
    [[nodiscard]] std::string getBytesToCurrentOffset(unsigned long n) const;
    // The next `n` octets, which stay to be read; empty if there are not so many.
    // Deliberate: empty, too, if these are all that are left.
    [[nodiscard]] std::string getBytesFromCurrentOffset(unsigned long n) const;

    // The number that hex digits of either case are; what is no digit counts as 0.
    // Of more than eight the last eight.
    [[nodiscard]] static std::uint32_t decodeHexString(const char* text,
                                                       unsigned long length) noexcept;

    // Bits that a character, a unit or pair, takes in GSM 7-bit: 7, or 14 with 0x1B in front.
    [[nodiscard]] static int getGsm7EncodedSize(int code, Ucs2ToGsm7Tables tables) noexcept;
    // UTF-16 code units of a UTF-8 text. Its length as in setSource(), here and below.
    [[nodiscard]] static std::size_t countCharactersInUtf8Message(const char* text,
                                                                  unsigned long length);
    // Septets of a UTF-8 text in GSM 7-bit, those of 0x1B among them.
    [[nodiscard]] static std::size_t countSeptetsInMessage(const char* text, unsigned long length,
                                                           Ucs2ToGsm7Tables tables);

    // Reads the data coding scheme of an SMS (3GPP TS 23.038, chapter 4) and logs every field
    // of it. Always sets the class, kClassNone without one, and
    // `voicemailIndicationPresent`; every other output only in the coding groups that have
    // it. False for what is reserved, and for what is no octet.
    // Deliberate: where it is reserved there, kKSC5601 is an encoding.
    static bool decodeSmsDataCodingScheme(int dcs, MessageClass& messageClass,
                                          MessageEncoding& encoding, bool& autoDelete,
                                          bool& compressed, bool& voicemailIndicationPresent,
                                          bool& voicemailIndicationActive, bool& discardMessage,
                                          const StaticLogger& logger);
    // The same of a cell broadcast (3GPP TS 23.038, chapter 5), without a log.
    // `languageIndicated`: the text begins with its language. Always sets that and the class.
    static bool decodeCbsDataCodingScheme(int dcs, MessageClass& messageClass,
                                          MessageEncoding& encoding, bool& languageIndicated);

  private:
    TextTransform* top;               // owned, and so are the stages below it
    OctetSourceBuffer* sourceBuffer;  // the lowest of them
};

// "kGSM7", "k8BitData", "kUCS2", "kKSC5601"; "Unknown" otherwise. Static.
[[nodiscard]] PLR_EXPORT const char* asString(TextConverter::MessageEncoding encoding) noexcept;
// "None", "Turkish", "Spanish", "Portuguese"; "Unknown" otherwise. Static.
[[nodiscard]] PLR_EXPORT const char* asString(TextConverter::NationalLanguageId language) noexcept;

}  // namespace plr
