#include "src/io/descriptor_transport.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

namespace plr::io {
namespace {

constexpr std::uint32_t kFlushChunk = 1024;

constexpr const char* kReadReturned = "read returned";
constexpr const char* kWriteReturned = "write returned";

}  // namespace

bool failed(const char* function, const char* what, int error) {
    PelorinDebugPrint(function, "%s %s (%u)\n", what, ::strerrordesc_np(error),
                      static_cast<unsigned>(error));
    return false;
}

namespace {

// The unblock that ended a read has done its work.
void takeUnblock(const UnblockableInput& input) {
    char token;
    static_cast<void>(!::read(input.unblockReadEnd, &token, 1));
}

}  // namespace

bool openUnblockPipe(const char* function, UnblockableInput& input) {
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) != 0)
        return failed(function, "Failed to create pipe FD's, err =", errno);
    input.unblockReadEnd = ends[0];
    input.unblockWriteEnd = ends[1];
    return true;
}

bool readInput(const char* function, const UnblockableInput& input, void* buffer,
               std::uint32_t length, std::uint32_t* count, bool toCompletion,
               std::uint32_t timeoutMs) {
    errno = 0;
    bool success = false;
    if (toCompletion) {
        success = PelorinUnblockableReadToCompletionWithTimeout(input.fd, input.unblockReadEnd,
                                                                buffer, length, timeoutMs);
        *count = success ? length : 0;
    } else {
        const std::int32_t result = PelorinUnblockableReadWithTimeout(
            input.fd, input.unblockReadEnd, buffer, length, timeoutMs);
        success = result >= 0;
        *count = static_cast<std::uint32_t>(std::max(result, 0));
    }
    const int error = errno;
    if (error == ECANCELED)
        takeUnblock(input);
    return success || failed(function, kReadReturned, error);
}

bool unblockInput(const char* function, const UnblockableInput& input) {
    constexpr char kToken = 0;
    // With a full pipe there are unblocks for more reads than anybody will make.
    if (::write(input.unblockWriteEnd, &kToken, 1) == 1 || errno == EAGAIN)
        return true;
    return failed(function, kWriteReturned, errno);
}

bool flushInput(const char* function, const UnblockableInput& input) {
    std::array<std::uint8_t, kFlushChunk> chunk;
    std::int32_t result = 0;
    // Without the pipe: an unblock is for a read, and ends no flush.
    do
        result = PelorinUnblockableReadWithTimeout(input.fd, -1, chunk.data(), kFlushChunk, 0);
    while (result > 0);
    return result == 0 || failed(function, kReadReturned, errno);
}

bool writeOutput(const char* function, int fd, const void* source, std::uint32_t length,
                 std::uint32_t* count, bool toCompletion) {
    if (toCompletion) {
        const std::int32_t error = PelorinWriteToCompletion(fd, source, length, count);
        return error == 0 || failed(function, "write to completion returned", error);
    }
    const ssize_t result = ::write(fd, source, length);
    *count = static_cast<std::uint32_t>(std::max<ssize_t>(result, 0));
    return result >= 0 || failed(function, kWriteReturned, errno);
}

}  // namespace plr::io
