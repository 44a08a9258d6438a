#pragma once

#include <cstdint>
#include <string>
#include <string_view>

// How many of what a service's memory is measured with, its clients being another
// process: each figure is the growth by many of a kind, divided by their number.
namespace bench::rest_memory_cases {

inline constexpr std::string_view kValue = "a value of thirty-two characters";
inline constexpr std::uint64_t kClients = 1'000;
inline constexpr std::uint64_t kNames = 10'000;  // of properties, …
inline constexpr std::uint64_t kWatched = 10;    // of these, by every client

// As long for each.
inline std::string name(std::uint64_t number) {
    return "name" + std::to_string(100'000 + number);
}

}  // namespace bench::rest_memory_cases
