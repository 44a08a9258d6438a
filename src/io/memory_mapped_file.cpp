#include "plr/io/memory_mapped_file.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "plr/base/assert.h"

namespace plr {
namespace {

// What stands for the bytes of an empty file, which cannot be mapped.
constexpr unsigned char kEmpty[1] = {};

// Opens the file, or is negative.
class Descriptor {
  public:
    explicit Descriptor(const char* path) noexcept
        // Not to wait for a pipe's writer, nor to become the owner of a terminal.
        : fd_(::open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY)) {}
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;
    ~Descriptor() {
        if (fd_ >= 0)
            ::close(fd_);
    }
    [[nodiscard]] int get() const noexcept { return fd_; }

  private:
    int fd_;
};

// 0, or errno.
int sizeOf(int fd, std::size_t& size) noexcept {
    struct stat status = {};
    if (fd < 0 || ::fstat(fd, &status) != 0)
        return errno;
    if (!S_ISREG(status.st_mode))
        return EINVAL;
    size = static_cast<std::size_t>(status.st_size);
    return 0;
}

// Null with errno set when it fails.
const void* map(int fd, std::size_t size) noexcept {
    if (size == 0)
        return kEmpty;
    void* const mapped = ::mmap(nullptr, size, PROT_READ, MAP_SHARED, fd, 0);
    return mapped == MAP_FAILED ? nullptr : mapped;
}

}  // namespace

MemoryMappedFile MemoryMappedFile::create(const char* path, std::error_code& error) noexcept {
    const Descriptor file(path);
    std::size_t size = 0;
    int failure = sizeOf(file.get(), size);
    const void* const bytes = failure == 0 ? map(file.get(), size) : nullptr;
    if (failure == 0 && !bytes)
        failure = errno;
    error.assign(failure, std::generic_category());
    return bytes ? MemoryMappedFile(bytes, size) : MemoryMappedFile();
}

MemoryMappedFile::MemoryMappedFile(MemoryMappedFile&& other) noexcept
    : bytes_(std::exchange(other.bytes_, nullptr)), size_(std::exchange(other.size_, 0)) {}

MemoryMappedFile& MemoryMappedFile::operator=(MemoryMappedFile&& other) noexcept {
    if (this != &other) {
        unmap(bytes_, size_);
        bytes_ = std::exchange(other.bytes_, nullptr);
        size_ = std::exchange(other.size_, 0);
    }
    return *this;
}

MemoryMappedFile::~MemoryMappedFile() {
    unmap(bytes_, size_);
}

void MemoryMappedFile::release() noexcept {
    bytes_ = nullptr;
    size_ = 0;
}

void MemoryMappedFile::unmap(const void* bytes, std::size_t size) noexcept {
    if (size == 0)  // no mapping, or that of an empty file
        return;
    const int result = ::munmap(const_cast<void*>(bytes), size);
    PLR_ASSERT(result == 0, "memory that is no mapped file was unmapped");
}

}  // namespace plr
