#pragma once

#include <cstddef>
#include <system_error>

#include "plr/base/export.h"

namespace plr {

// A file's bytes in memory, read-only, as long as this object lives. Move-only.
//
// Content: that of the file, later changes of it included; its size is that of
//          the moment of creation. Bytes behind the end of a file that somebody
//          has cut since end the process when touched (SIGBUS): map files that
//          are replaced, not rewritten.
// Threads: one at a time changes the object; the bytes may be read by many.
class PLR_EXPORT MemoryMappedFile {
  public:
    // No mapping.
    MemoryMappedFile() noexcept = default;
    // Maps the regular file at `path`, an empty one too. On failure there is no
    // mapping and `error` says why: errno, and std::errc::invalid_argument for
    // what is no regular file. No error is a cleared one. Does not block on a
    // device or pipe.
    [[nodiscard]] static MemoryMappedFile create(const char* path, std::error_code& error) noexcept;

    MemoryMappedFile(MemoryMappedFile&& other) noexcept;
    MemoryMappedFile& operator=(MemoryMappedFile&& other) noexcept;
    ~MemoryMappedFile();

    [[nodiscard]] explicit operator bool() const noexcept { return bytes_ != nullptr; }
    // Null without a mapping, and only then.
    [[nodiscard]] const void* bytes() const noexcept { return bytes_; }
    [[nodiscard]] std::size_t size() const noexcept { return size_; }  // bytes

    // Gives up the mapping without ending it; whoever has its bytes and size
    // ends it by unmap().
    void release() noexcept;
    static void unmap(const void* bytes, std::size_t size) noexcept;

  private:
    MemoryMappedFile(const void* bytes, std::size_t size) noexcept : bytes_(bytes), size_(size) {}

    const void* bytes_ = nullptr;
    std::size_t size_ = 0;
};

}  // namespace plr
