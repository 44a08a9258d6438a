#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "kel/kel.h"

// A message while its user fills it in.
namespace kel {

struct field {
    std::string key;
    std::string value;
};

}  // namespace kel

struct kel_message {
    // The value of `key`; null when it was not set.
    [[nodiscard]] const std::string* find(std::string_view key) const noexcept;
    void set(std::string_view key, std::string_view value);

    std::vector<kel::field> fields;  // in the order in which keys were first set
};
