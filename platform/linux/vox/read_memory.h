#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>

// Memory of the calling thread to read into, so that idle connections need none
// of their own. A turn inside another one (through sync()) gets memory of its own.
namespace vox_link {

class read_memory {
  public:
    read_memory();
    ~read_memory();
    read_memory(const read_memory&) = delete;
    read_memory& operator=(const read_memory&) = delete;

    [[nodiscard]] std::span<std::uint8_t> bytes() const noexcept { return bytes_; }

    // More than 64 KiB, so that a message of such data is read at once.
    static constexpr std::size_t kBytes = 128u << 10;

  private:
    std::span<std::uint8_t> bytes_;
    std::unique_ptr<std::uint8_t[]> own_;  // when the thread's is in use
};

}  // namespace vox_link
