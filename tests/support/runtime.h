#pragma once

#include <cstdlib>
#include <filesystem>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "plr/base/report.h"

// What a process has once: its runtime directory and its report hook.
namespace plr::test {

// A fresh runtime directory for this process.
class RuntimeDirectory {
  public:
    RuntimeDirectory() {
        path_ = std::filesystem::temp_directory_path() / "pelorin-vox-XXXXXX";
        path_ = ::mkdtemp(path_.data());
        use(path_);
    }
    ~RuntimeDirectory() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    RuntimeDirectory(const RuntimeDirectory&) = delete;
    RuntimeDirectory& operator=(const RuntimeDirectory&) = delete;
    [[nodiscard]] const std::string& path() const { return path_; }
    static void use(const std::string& directory) {
        ::setenv("VOX_RUNTIME_DIR", directory.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    }

  private:
    std::string path_;
};

// The lines that went through the report hook since it was made. One at a time.
class Reports {
  public:
    Reports() {
        lines_.clear();
        plr::setReportHook([](const char* line) noexcept {
            const std::lock_guard guard(lock_);
            lines_.emplace_back(line);
        });
    }
    ~Reports() { plr::setReportHook(nullptr); }
    Reports(const Reports&) = delete;
    Reports& operator=(const Reports&) = delete;
    // How many lines contain `text`.
    [[nodiscard]] std::size_t count(std::string_view text) const {
        const std::lock_guard guard(lock_);
        std::size_t found = 0;
        for (const std::string& line : lines_)
            found += line.find(text) != std::string::npos ? 1 : 0;
        return found;
    }

  private:
    static inline std::mutex lock_;
    static inline std::vector<std::string> lines_;
};

}  // namespace plr::test
