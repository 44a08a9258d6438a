#pragma once

#include <string>
#include <string_view>

// System calls that never wait, and what their errors mean to a log.
namespace kel {

// What became of an attempt to hand over a message.
enum class outcome {
    sent,
    full,      // no room now; the socket becomes writable
    shortage,  // the kernel is short of something; later, without being told
    absent,    // nobody listens
    refused,   // this message will never be taken
};

// A datagram socket without a peer, or -1 with errno set.
[[nodiscard]] int make_socket() noexcept;
// Gives `fd` the socket at `path` as its peer, in place of the one it has.
[[nodiscard]] bool connect_socket(int fd, const std::string& path) noexcept;

// One datagram.
[[nodiscard]] outcome send_datagram(int fd, std::string_view bytes) noexcept;
// The same for the journal: what no datagram holds goes in a sealed memory file.
[[nodiscard]] outcome send_native(int fd, std::string_view bytes) noexcept;

// Writes the beginning of `bytes` to any descriptor and takes off what was
// written. Where waiting cannot be forbidden (pipes, terminals) it writes after
// poll() said that there is room, at most PIPE_BUF at a time.
// Async-signal-safe.
[[nodiscard]] outcome write_ready(int fd, std::string_view& bytes) noexcept;

// As errno of a failed send tells. Async-signal-safe.
[[nodiscard]] outcome outcome_of(int error) noexcept;

}  // namespace kel
