#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "plr/text/sms_encoding.h"

namespace plr {

// A text taken apart, to find where it may be cut; see splitSms().
class SmsText {
  public:
    // UTF-8; what is ill-formed becomes U+FFFD.
    explicit SmsText(std::string_view utf8);

    struct Cuts {
        SmsSize size;
        std::vector<std::size_t> ends;  // of each part, in text()
    };
    [[nodiscard]] Cuts cut(const SmsEncoding& encoding, SmsReference reference) const;
    [[nodiscard]] bool isEncodable(TextConverter::Ucs2ToGsm7Tables tables) const noexcept;
    [[nodiscard]] const std::string& text() const noexcept { return text_; }

  private:
    struct Character {
        std::uint32_t code;  // a unit or a pair, see TextTransform
        bool joins;          // stays with the one before it
    };
    // What is cut in one piece, or the piece that may be cut.
    struct Sequence {
        std::size_t characters;
        std::size_t units;
    };

    [[nodiscard]] Sequence sequenceAt(std::size_t index, const SmsEncoding& encoding,
                                      std::size_t mostUnits) const noexcept;

    std::string text_;
    std::vector<Character> characters_;
};

}  // namespace plr
