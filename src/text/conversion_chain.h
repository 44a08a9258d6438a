#pragma once

#include <cstdint>
#include <initializer_list>
#include <span>
#include <string>
#include <string_view>

#include "plr/text/text_converter.h"

namespace plr {

// One stage, as pushConversion() takes it.
struct Conversion {
    TextConverter::Conversion stage;
    int p = 0;
    unsigned long limit = TextConverter::kNoLimit;
    int q = 0;
};

struct Converted {
    std::string octets;
    bool hasReplacements = false;
};

// All of `source`, through the stages in their order.
[[nodiscard]] Converted convert(std::string_view source, std::initializer_list<Conversion> stages);

[[nodiscard]] inline std::string_view asText(std::span<const std::uint8_t> octets) noexcept {
    return {reinterpret_cast<const char*>(octets.data()), octets.size()};
}

}  // namespace plr
