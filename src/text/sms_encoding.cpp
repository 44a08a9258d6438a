#include "plr/text/sms_encoding.h"

#include <optional>
#include <tuple>

#include "src/text/sms_layout.h"
#include "src/text/sms_text.h"

namespace plr {
namespace {

using Language = TextConverter::NationalLanguageId;
using MessageEncoding = TextConverter::MessageEncoding;

// All that `languages` allow, those with fewer tables first.
std::vector<SmsEncoding> candidates(const std::vector<Language>& languages) {
    std::vector<Language> lockings;
    std::vector<Language> singles;
    for (const Language language : languages) {
        if (language == Language::kTurkish || language == Language::kPortuguese)
            lockings.push_back(language);
        if (isSet(language) && language <= Language::kPortuguese)
            singles.push_back(language);
    }
    std::vector<SmsEncoding> all(1);
    for (const Language single : singles)
        all.push_back({MessageEncoding::kGSM7, Language::kNone, single});
    for (const Language locking : lockings)
        all.push_back({MessageEncoding::kGSM7, locking, Language::kNone});
    for (const Language locking : lockings)
        for (const Language single : singles)
            all.push_back({MessageEncoding::kGSM7, locking, single});
    return all;
}

// Of two that take as many parts the lower one is chosen.
int rankOf(const SmsEncoding& encoding) noexcept {
    return (isSet(encoding.single) ? 1 : 0) + (isSet(encoding.locking) ? 2 : 0);
}

}  // namespace

TextConverter::Ucs2ToGsm7Tables SmsEncoding::tables() const noexcept {
    return TextConverter::Ucs2ToGsm7Tables{static_cast<int>(locking) +
                                           16 * static_cast<int>(single)};
}

SmsEncoding chooseSmsEncoding(std::string_view text, const std::vector<Language>& languages,
                              SmsReference reference) {
    const SmsText whole(text);
    SmsEncoding best{MessageEncoding::kUCS2};
    std::optional<std::tuple<std::size_t, int, std::size_t>> least;
    for (const SmsEncoding& candidate : candidates(languages)) {
        if (!whole.isEncodable(candidate.tables()))
            continue;
        const SmsSize size = whole.cut(candidate, reference).size;
        const auto cost = std::tuple(size.parts, rankOf(candidate), size.units);
        if (!least || cost < *least) {
            least = cost;
            best = candidate;
        }
    }
    return best;
}

SmsSize measureSms(std::string_view text, const SmsEncoding& encoding, SmsReference reference) {
    return SmsText(text).cut(encoding, reference).size;
}

std::vector<std::string> splitSms(std::string_view text, const SmsEncoding& encoding,
                                  SmsReference reference) {
    const SmsText whole(text);
    std::vector<std::string> parts;
    std::size_t begin = 0;
    for (const std::size_t end : whole.cut(encoding, reference).ends) {
        parts.push_back(whole.text().substr(begin, end - begin));
        begin = end;
    }
    return parts;
}

}  // namespace plr
