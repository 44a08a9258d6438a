// ICU, with one converter for all messages. It neither packs septets nor swaps octets:
// GSM 7-bit is an octet each, UTF-16 in the order of the machine.

#include <unicode/ucnv.h>
#include <unicode/ustring.h>

#include "bench/text_cases.h"

namespace {

using namespace bench::text_cases;

constexpr int kRoom = 4 << 20;

int size(std::string_view text) {
    return static_cast<int>(text.size());
}

std::u16string_view asUnits(std::string_view octets) {
    return {reinterpret_cast<const UChar*>(octets.data()), octets.size() / sizeof(UChar)};
}

std::string_view asOctets(std::u16string_view units) {
    return {reinterpret_cast<const char*>(units.data()), units.size() * sizeof(UChar)};
}

// UTF-16 in the middle. UTF-8 goes through functions of their own, which are quicker than
// the converter of that name.
class Icu {
  public:
    explicit Icu(const char* name) : converter_(ucnv_open(name, &error_)) { succeed(); }

    std::u16string_view decode(std::string_view text) {
        return units(
            ucnv_toUChars(converter_, units_.data(), kRoom, text.data(), size(text), &error_));
    }
    std::string_view encode(std::u16string_view text) {
        return octets(ucnv_fromUChars(converter_, octets_.data(), kRoom, text.data(),
                                      static_cast<int>(text.size()), &error_));
    }
    std::u16string_view fromUtf8(std::string_view text) {
        int count = 0;
        u_strFromUTF8(units_.data(), kRoom, &count, text.data(), size(text), &error_);
        return units(count);
    }
    std::string_view toUtf8(std::u16string_view text) {
        int count = 0;
        u_strToUTF8(octets_.data(), kRoom, &count, text.data(), static_cast<int>(text.size()),
                    &error_);
        return octets(count);
    }

  private:
    void succeed() const { expect(U_SUCCESS(error_)); }
    std::u16string_view units(int count) const {
        succeed();
        return {units_.data(), static_cast<std::size_t>(count)};
    }
    std::string_view octets(int count) const {
        succeed();
        return {octets_.data(), static_cast<std::size_t>(count)};
    }

    UErrorCode error_ = U_ZERO_ERROR;
    UConverter* converter_;  // until the process ends
    std::vector<UChar> units_ = std::vector<UChar>(kRoom);
    std::vector<char> octets_ = std::vector<char>(kRoom);
};

template <class Work>
Maker with(const char* name, Work work) {
    return [name, work](std::string_view) -> Convert {
        return [icu = Icu(name), work](std::string_view text) mutable { return work(icu, text); };
    };
}

}  // namespace

int main(int argc, char** argv) {
    const char* const gsm = "gsm-03.38-2009";
    return run(argc, argv,
               {{"to_septets",
                 with(gsm, [](Icu& icu, auto text) { return icu.encode(icu.fromUtf8(text)); })},
                {"from_septets",
                 with(gsm, [](Icu& icu, auto text) { return icu.toUtf8(icu.decode(text)); })},
                {"to_ucs2",
                 with("UTF-8", [](Icu& icu, auto text) { return asOctets(icu.fromUtf8(text)); })},
                {"from_ucs2",
                 with("UTF-8", [](Icu& icu, auto text) { return icu.toUtf8(asUnits(text)); })},
                {"from_euc_kr",
                 with("EUC-KR", [](Icu& icu, auto text) { return asOctets(icu.decode(text)); })}},
               {.packed = false, .bigEndian = false});
}
