#pragma once

#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "Pelorin"

namespace plr::test {

// Catches the debug prints of the flat interface while it lives. One at a time.
class DebugRecords {
  public:
    DebugRecords() {
        PelorinDebugSetDelegate(
            [](void* context, const char* function, const char* text) {
                auto& self = *static_cast<DebugRecords*>(context);
                const std::lock_guard guard(self.lock_);
                self.lines_.push_back(std::string(function) + ": " + text);
                self.texts_ += text;
            },
            this);
    }
    ~DebugRecords() { PelorinDebugSetDelegate(nullptr, nullptr); }
    DebugRecords(const DebugRecords&) = delete;
    DebugRecords& operator=(const DebugRecords&) = delete;

    // What was printed since the last call of either: as "function: text", or the texts in one.
    [[nodiscard]] std::vector<std::string> take() { return takeBoth().first; }
    [[nodiscard]] std::string takeText() { return takeBoth().second; }

  private:
    std::pair<std::vector<std::string>, std::string> takeBoth() {
        const std::lock_guard guard(lock_);
        return {std::exchange(lines_, {}), std::exchange(texts_, {})};
    }

    std::mutex lock_;
    std::vector<std::string> lines_;
    std::string texts_;
};

}  // namespace plr::test
