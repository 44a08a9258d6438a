#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

// The frames that carry messages on a stream socket.
//
//   frame  = header body
//   header = magic type flags descriptors length zero id     ; 24 bytes, little-endian
//   magic  = "VOX1"
//   type   = u8          ; 1 hello, 2 message, 3 request, 4 reply, 5 cancel, 6 ping, 7 dropped,
//                        ; 8 refused, 9 tap
//   flags  = u8          ; ping: bit 0 asks for an answer; 0 otherwise
//   descriptors = u16    ; in message, request and reply; they arrive by SCM_RIGHTS
//                        ; with a byte of this frame
//   length = u32         ; bytes of the body, at least 1
//   zero   = u32         ; 0
//   id     = u64         ; request, reply, cancel, refused: of the request, from 1; ping: any;
//                        ; else 0
//   body   = one CBOR item that fills it: hello {"min","max","bytes","depth","fds"};
//            message, request, reply a dictionary; cancel, ping null; dropped an integer;
//            refused an error;
//            tap null from a client, a dictionary or an error from a service
//
// The first frame in each direction is a hello, and no other is.
namespace vox_link {

inline constexpr std::size_t kHeaderBytes = 24;
inline constexpr std::int64_t kProtocolVersion = 1;
// Bodies of the frames that are not messages are small.
inline constexpr std::uint32_t kControlBodyBytes = 1024;

enum class frame_type : std::uint8_t {
    hello = 1,
    message = 2,
    request = 3,
    reply = 4,
    cancel = 5,
    ping = 6,
    dropped = 7,
    refused = 8,
    tap = 9,
};
inline constexpr std::uint8_t kPingWantsAnswer = 1;

[[nodiscard]] constexpr bool carries_message(frame_type type) noexcept {
    return type == frame_type::message || type == frame_type::request || type == frame_type::reply;
}

struct frame_header {
    frame_type type = frame_type::message;
    std::uint8_t flags = 0;
    std::uint16_t descriptors = 0;
    std::uint32_t length = 0;
    std::uint64_t id = 0;
};

struct frame_limits {
    std::uint32_t body_bytes = 16u << 20;
    std::uint32_t descriptors = 64;
};

// Writes `header` to the 24 bytes at `out`.
void write_header(const frame_header& header, std::uint8_t* out) noexcept;
// Changes the id of a header that was written.
void write_header_id(std::uint64_t id, std::uint8_t* header) noexcept;

// Reads the header at the start of `bytes`, at least 24 of them. Returns false
// with the reason in `why` when it breaks the grammar or a limit.
[[nodiscard]] bool read_header(std::span<const std::uint8_t> bytes, const frame_limits& limits,
                               frame_header& header, std::string& why);
// What our own writer produced, without checks.
[[nodiscard]] frame_header read_own_header(const std::uint8_t* bytes) noexcept;
// Two of its fields.
[[nodiscard]] inline frame_type type_in_header(const std::uint8_t* bytes) noexcept {
    return static_cast<frame_type>(bytes[4]);
}
[[nodiscard]] inline std::uint32_t length_in_header(const std::uint8_t* bytes) noexcept {
    return bytes[8] | std::uint32_t{bytes[9]} << 8 | std::uint32_t{bytes[10]} << 16 |
           std::uint32_t{bytes[11]} << 24;
}
// Whether `bytes`, maybe too few for a header, can begin one.
[[nodiscard]] bool may_begin_frame(std::span<const std::uint8_t> bytes) noexcept;

}  // namespace vox_link
