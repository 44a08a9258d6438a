#pragma once

#include <array>

#include "src/text/octets.h"
#include "src/text/stage.h"
#include "src/text/utf8_kernel.h"

namespace plr {

class Ucs2ToUtf8Transform : public OctetStage<Ucs2ToUtf8Transform> {
  public:
    void reset() override;
    using OctetStage::convert;
    std::size_t convert(char* out, std::size_t most);

  private:
    void convertUnits(utf8kernel::Encoding& run);
    octets::Few encode(std::uint32_t code);

    octets::Few rest_;  // of the last character, still to come
    // Units that were pulled behind a high surrogate, or such a surrogate, whose low one is still
    // to be pulled.
    std::array<char16_t, 2> held_{};
    std::size_t heldLength_ = 0;
};

}  // namespace plr
