#pragma once

#include "src/text/stage.h"

namespace plr {

// The value of a hex digit of either case; 0 of what is none.
constexpr std::uint32_t hexDigitValue(std::uint32_t digit) noexcept {
    if (digit - '0' < 10)
        return digit - '0';
    const std::uint32_t letter = (digit | 0x20) - 'a';
    return letter < 6 ? letter + 10 : 0;
}

class BinaryToHexTransform : public OctetStage<BinaryToHexTransform> {
  public:
    void reset() override;
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);

  private:
    char low_ = 0;  // the digit of the last octet that is still to come; 0 for none
};

class HexToBinaryTransform : public OctetStage<HexToBinaryTransform> {
  public:
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);
};

}  // namespace plr
