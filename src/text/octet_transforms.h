#pragma once

#include "src/text/octets.h"
#include "src/text/stage.h"

namespace plr {

class OctetToUcs2Transform : public UnitStage<OctetToUcs2Transform> {
  public:
    std::size_t convert(std::uint32_t* out, std::size_t most);
    std::size_t convert(char16_t* out, std::size_t most);

  private:
    template <class Code>
    std::size_t convertAny(Code* out, std::size_t most);
    template <class Code>
    std::size_t convertMemory(OctetSourceBuffer& memory, Code* out, std::size_t most);
    std::uint16_t unitOf(std::uint32_t high, std::uint32_t low);
};

class Ucs2ToOctetTransform : public OctetStage<Ucs2ToOctetTransform> {
  public:
    void reset() override;
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);

  private:
    octets::Few rest_;  // of the last code, still to come
};

}  // namespace plr
