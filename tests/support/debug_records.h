#pragma once

#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "Pelorin"

namespace plr::test {

// Catches the debug prints of the flat interface as "function: text". One at a time.
class DebugRecords {
  public:
    DebugRecords() {
        PelorinDebugSetDelegate(
            [](void* context, const char* function, const char* text) {
                auto& self = *static_cast<DebugRecords*>(context);
                const std::lock_guard guard(self.lock_);
                self.lines_.push_back(std::string(function) + ": " + text);
            },
            this);
    }
    ~DebugRecords() { PelorinDebugSetDelegate(nullptr, nullptr); }
    DebugRecords(const DebugRecords&) = delete;
    DebugRecords& operator=(const DebugRecords&) = delete;

    // What was printed since the last call.
    [[nodiscard]] std::vector<std::string> take() {
        const std::lock_guard guard(lock_);
        return std::exchange(lines_, {});
    }

  private:
    std::mutex lock_;
    std::vector<std::string> lines_;
};

}  // namespace plr::test
