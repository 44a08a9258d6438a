#pragma once

#include <array>

#include "src/text/stage.h"

namespace plr {

class Utf8ToUcs2Transform : public Stage<Utf8ToUcs2Transform> {
  public:
    void reset() override;
    std::size_t convert(std::uint32_t* out, std::size_t most);
    std::size_t nextUnits(char16_t* out, std::size_t most) override;
    [[nodiscard]] bool deliversUnits() const noexcept override;

  private:
    struct Run {
        std::size_t units = 0;
        std::size_t pairs = 0;  // among them
    };

    // As TextTransform::nextUnits(), without a look at the count.
    Run convertUnits(char16_t* out, std::size_t most);
    Run convertMemory(OctetSourceBuffer& memory, char16_t* out, std::size_t most);
    Run convertPulled(char16_t* out, std::size_t most);
    std::size_t pullOctets(unsigned char* octets, std::size_t most);

    static constexpr std::size_t kPulled = 256;  // octets at a time

    // Octets that were pulled and not used: the beginning of a sequence, and what showed it
    // to be ill-formed.
    std::array<unsigned char, 4> held_{};
    std::size_t heldLength_ = 0;
};

}  // namespace plr
