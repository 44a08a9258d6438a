#pragma once

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <optional>
#include <string>
#include <utility>

#include "platform/linux/qf/preferences_values.h"

// A file of preferences as it lies on the disk.
namespace qf::preferences {

// Owns a descriptor, or none.
class descriptor {
  public:
    explicit descriptor(int fd = -1) noexcept : fd_(fd) {}
    descriptor(descriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    descriptor& operator=(descriptor other) noexcept {
        std::swap(fd_, other.fd_);
        return *this;
    }
    ~descriptor() {
        if (fd_ >= 0)
            ::close(fd_);
    }
    [[nodiscard]] int get() const noexcept { return fd_; }
    explicit operator bool() const noexcept { return fd_ >= 0; }

  private:
    int fd_;
};

[[nodiscard]] std::string folder_of(const std::string& path);
[[nodiscard]] std::string base_of(const std::string& path);
// What the symbolic link at `path` says, whether that is there or not; empty for
// what is no link.
[[nodiscard]] std::string link_target(const std::string& path);
// Links that follow one another at most, as in the kernel.
inline constexpr int kMaximumLinks = 40;

// Tells one content of a file from another, as far as stat() can.
struct stamp {
    bool exists = false;
    bool is_settled = true;  // a write after it shows in the file's times
    struct stat state {};

    [[nodiscard]] bool is_same(const stamp& other) const noexcept;
};
[[nodiscard]] stamp stamp_of(const std::string& path) noexcept;

// Reads a whole regular file of at most kMaximumFileSize; no `text`, and no
// error, when there is none.
struct file_text {
    std::optional<std::string> text;
    struct stat state {};
    owned_error error;
};
[[nodiscard]] file_text read_file(const std::string& path);

// A file with its values as they were read last.
struct layer_file {
    std::string path;
    owned_dictionary values;  // null for no file
    owned_error error;        // what is wrong now; the values then are the last good ones
    stamp seen;

    void reload();
};

// All of them as one; the later ones win. Tables merge key by key, any other
// value replaces.
[[nodiscard]] owned_dictionary merge(QfDictionaryRef weaker, QfDictionaryRef stronger);

}  // namespace qf::preferences
