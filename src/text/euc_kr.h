#pragma once

#include "src/text/stage.h"

// Korean text in EUC-KR: ASCII, and for a character of KS X 1001 two octets from
// 0xA1 to 0xFE.
namespace plr {

class EucKRToUcs2Transform : public UnitStage<EucKRToUcs2Transform> {
  public:
    void reset() override;
    using UnitStage::convert;
    std::size_t convert(std::uint32_t* out, std::size_t most);

  private:
    struct Run {
        std::size_t octets;
        std::size_t characters;
    };

    std::size_t convertMemory(std::uint32_t* out, std::size_t most);
    template <class Octet>
    Run convertRun(const Octet* octets, std::size_t length, std::uint32_t* out, std::size_t most);
    std::uint32_t convertLast(std::uint32_t octet);
    std::size_t pullHeld(std::uint32_t* codes, std::size_t most);
    std::uint32_t characterOf(std::uint32_t lead, std::uint32_t trail);
    std::uint32_t replacement();

    std::uint32_t held_ = kEnd;  // pulled as a trail octet, which it is not; kEnd: none
};

}  // namespace plr
