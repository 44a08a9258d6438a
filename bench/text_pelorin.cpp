// Pelorin's TextConverter: one that takes message after message, and one built for each.

#include <memory>

#include "bench/text_cases.h"
#include "plr/text.h"

namespace {

using namespace bench::text_cases;
using plr::TextConverter;
using Stages = std::vector<TextConverter::Conversion>;
using enum TextConverter::Conversion;

constexpr auto kUnlimited = static_cast<unsigned long>(-1);  // never spent, however many messages

void push(TextConverter& converter, const Stages& stages) {
    for (const auto stage : stages)
        converter.pushConversion(stage, 0, kUnlimited);
}

Maker reused(const Stages& stages) {
    return [stages](std::string_view) -> Convert {
        const auto converter = std::make_shared<TextConverter>();
        push(*converter, stages);
        return [converter, text = std::string()](std::string_view in) mutable -> std::string_view {
            converter->setSource(in.data(), in.size());
            return text = converter->readChars(TextConverter::kNoLimit);
        };
    };
}

Maker built(const Stages& stages) {
    return [stages](std::string_view) -> Convert {
        return [stages, text = std::string()](std::string_view in) mutable -> std::string_view {
            TextConverter converter;
            converter.setSource(in.data(), in.size());
            push(converter, stages);
            return text = converter.readChars(TextConverter::kNoLimit);
        };
    };
}

}  // namespace

int main(int argc, char** argv) {
    const Stages toSeptets{kUtf8ToUcs2, kUcs2ToGsm7, kSmsPack};
    const Stages fromSeptets{kSmsUnpack, kGsm7ToUcs2, kUcs2ToUtf8};
    return run(argc, argv,
               {{"to_septets", reused(toSeptets)},
                {"to_septets_built", built(toSeptets)},
                {"from_septets", reused(fromSeptets)},
                {"from_septets_built", built(fromSeptets)},
                {"to_ucs2", reused({kUtf8ToUcs2, kUcs2ToOctet})},
                {"from_ucs2", reused({kOctetToUcs2, kUcs2ToUtf8})},
                {"from_euc_kr", reused({kEucKRToUcs2, kUcs2ToOctet})}});
}
