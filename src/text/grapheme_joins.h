#pragma once

#include <cstdint>

namespace plr {

// Tells which characters stay with the one before them, see splitSms().
class GraphemeJoins {
  public:
    // `character`: the next one of the text.
    [[nodiscard]] bool next(char32_t character) noexcept;

  private:
    char32_t previous_ = 0;
    bool isFlagHalf_ = false;  // the previous one is the first regional indicator of a pair
};

}  // namespace plr
