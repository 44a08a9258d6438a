#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "plr/log/log_level.h"

// The configured levels by domain, sorted by domain, as any thread reads them
// without a lock: readers announce themselves in one of two counts, and who
// replaces the list waits until those who may still read the old one are gone.
namespace plr {

class LevelTable {
  public:
    using List = std::vector<std::pair<std::string, LogLevel>>;

    LevelTable() = default;
    LevelTable(const LevelTable&) = delete;
    LevelTable& operator=(const LevelTable&) = delete;

    // One caller at a time.
    void replace(std::shared_ptr<const List> list);

    // The level of `domain`, of the nearest domain above it, or of the root (the
    // empty name); Unset when none of them is listed. Any thread.
    [[nodiscard]] LogLevel lookUp(std::string_view domain) const;

  private:
    [[nodiscard]] static LogLevel find(const List& list, std::string_view domain);

    std::shared_ptr<const List> owned_;  // who replaces
    std::atomic<const List*> current_{nullptr};
    std::atomic<std::uint32_t> turn_{0};  // its lowest bit chooses the count
    mutable std::array<std::atomic<std::uint32_t>, 2> readers_{};
};

}  // namespace plr
