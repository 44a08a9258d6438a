#pragma once

#include "src/text/octets.h"
#include "src/text/stage.h"

namespace plr {

class Ucs2ToUtf8Transform : public OctetStage<Ucs2ToUtf8Transform> {
  public:
    void reset() override;
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);

  private:
    std::size_t convertCodes(const std::uint32_t* codes, std::size_t length, char* out,
                             std::size_t most);
    // One character, from held_ on, goes to rest_.
    void convertHeld();
    octets::Few encode(std::uint32_t code);

    octets::Few rest_;           // of the last character, still to come
    std::uint32_t held_ = kEnd;  // a code that was pulled behind a high surrogate, or such a
                                 // surrogate, whose low one is still to be pulled; kEnd: none
};

}  // namespace plr
