#pragma once

#include <sys/types.h>
#include <sys/uio.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

// sendmsg(2) and recvmsg(2) on stream sockets, never blocking, EINTR retried,
// descriptors beside the bytes.
namespace vox_link {

// Whether `fd` is an AF_UNIX stream socket, and `listening` or not.
[[nodiscard]] bool is_stream_socket(int fd, bool listening) noexcept;

struct io_result {
    std::size_t bytes = 0;
    int error = 0;  // 0, EAGAIN, or what ended the stream
};

[[nodiscard]] io_result send_pieces(int fd, std::span<iovec> pieces,
                                    std::span<const int> descriptors) noexcept;

// As many as the kernel passes with one call (SCM_MAX_FD).
inline constexpr std::size_t kMostReceived = 253;

struct received {
    std::size_t bytes = 0;  // 0 without error: end of file
    int error = 0;
    bool lost_descriptors = false;  // this process could not take all
    pid_t sender = 0;               // sockets with SO_PASSCRED only
    std::size_t descriptor_count = 0;
    std::array<int, kMostReceived> descriptors;  // close-on-exec; the caller's

    [[nodiscard]] std::span<const int> taken() const noexcept {
        return {descriptors.data(), descriptor_count};
    }
    void close_descriptors() noexcept;
};

// Reads once into `space`; the members of `result` are set.
void receive_once(int fd, std::span<std::uint8_t> space, received& result) noexcept;

}  // namespace vox_link
