#pragma once

#include "src/text/octets.h"
#include "src/text/stage.h"

namespace plr {

class OctetToUcs2Transform : public Stage<OctetToUcs2Transform> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);

  private:
    std::size_t convertMemory(OctetSourceBuffer& memory, std::uint32_t* out, std::size_t most);
    std::uint32_t unitOf(std::uint32_t high, std::uint32_t low);
};

class Ucs2ToOctetTransform : public OctetStage<Ucs2ToOctetTransform> {
  public:
    void reset() override;
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);

  private:
    std::size_t convertCodes(const std::uint32_t* codes, std::size_t length, char* out,
                             std::size_t most);
    octets::Few encode(std::uint32_t code);

    octets::Few rest_;  // of the last code, still to come
};

}  // namespace plr
