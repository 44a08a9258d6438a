#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

namespace plr::test {

// A folder for the files of one test.
class ScratchFolder {
  public:
    ScratchFolder() {
        char name[] = "/tmp/pelorin.XXXXXX";
        const char* made = ::mkdtemp(name);
        EXPECT_NE(made, nullptr);
        path_ = made ? made : "";
    }
    ~ScratchFolder() { std::filesystem::remove_all(path_); }
    ScratchFolder(const ScratchFolder&) = delete;
    ScratchFolder& operator=(const ScratchFolder&) = delete;

    [[nodiscard]] std::string at(const std::string& name) const { return path_ + "/" + name; }
    // Empty when there is none.
    [[nodiscard]] std::string read(const std::string& name) const {
        std::ifstream file(at(name), std::ios::binary);
        return {std::istreambuf_iterator<char>(file), {}};
    }

  private:
    std::string path_;
};

}  // namespace plr::test
