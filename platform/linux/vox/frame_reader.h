#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "platform/linux/vox/byte_buffer.h"
#include "platform/linux/vox/frame.h"

// Turns the bytes and descriptors of a stream, however they were cut, into
// frames. It does no input itself:
//
//   space() -> the caller fills some of it -> arrived() -> next() until `more`
//   -> keep(), before the scratch memory is used for anything else
//
// Owner:   one connection. Descriptors that are held are closed with it.
// Threads: one at a time.
// Memory:  nothing while no frame is under way and none waits; a frame under way
//          holds at most twice the bytes that arrived of it, or 72 KiB, whatever
//          its header declares; each thread keeps memory for one such. Frames are taken straight
//          from the scratch memory when they lie there completely.
//
// Descriptors belong to frames in the order of arrival. More of them than the
// frames begun so far declare, or fewer at the end of a frame, is an error.
namespace vox_link {

struct frame {
    frame_header header;
    std::span<const std::uint8_t> body;  // until the next call of a member
    std::span<const int> descriptors;    // the receiver closes them
};

class frame_reader {
  public:
    enum class outcome : std::uint8_t { frame, more, error };

    explicit frame_reader(const frame_limits& limits) noexcept : limits_(limits) {}
    ~frame_reader() { clear(); }
    frame_reader(const frame_reader&) = delete;
    frame_reader& operator=(const frame_reader&) = delete;

    // Where the next bytes go: `scratch` (at least kLeastScratch bytes) or a
    // part of it, or memory of the reader. Only after next() said `more`.
    [[nodiscard]] std::span<std::uint8_t> space(std::span<std::uint8_t> scratch);
    // The first `count` bytes of the last space() have been filled, and
    // `descriptors` came with them; takes ownership of these.
    void arrived(std::size_t count, std::span<const int> descriptors);
    // The next complete frame, or that more bytes are needed, or that the
    // stream is broken for good (error() says why).
    [[nodiscard]] outcome next(frame& out);
    // Moves what is left in the scratch memory to memory of the reader.
    void keep();

    // Gives up everything held.
    void clear() noexcept;

    // Whether next() would give a frame or an error without more bytes.
    [[nodiscard]] bool has_next() const noexcept;
    // Whether bytes of an incomplete frame are held, once next() said `more`.
    [[nodiscard]] bool in_frame() const noexcept { return at_ != end_; }
    [[nodiscard]] const std::string& error() const noexcept { return error_; }
    // Bytes that arrived and were not taken by next(); descriptors the same.
    [[nodiscard]] std::size_t waiting_bytes() const noexcept { return left(); }
    [[nodiscard]] std::size_t waiting_descriptors() const noexcept {
        return descriptors_.size() - next_descriptor_;
    }
    // Memory held, in bytes.
    [[nodiscard]] std::size_t held() const noexcept { return kept_.capacity(); }

    static constexpr std::size_t kLeastScratch = 8192;

  private:
    [[nodiscard]] std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }
    [[nodiscard]] bool read_next_header();
    [[nodiscard]] outcome incomplete();
    [[nodiscard]] outcome refuse(std::string why);
    void release_taken();

    frame_limits limits_;
    const std::uint8_t* at_ = nullptr;   // first byte not yet taken by next()
    const std::uint8_t* end_ = nullptr;  // behind the last byte that arrived
    std::uint8_t* filling_ = nullptr;    // last space()
    bool in_kept_ = true;                // at_ and end_ point into kept_, not into scratch
    bool header_known_ = false;          // header_ is that of the frame at at_
    frame_header header_;
    vox_wire::byte_buffer kept_;
    std::vector<int> descriptors_;     // in order of arrival
    std::size_t next_descriptor_ = 0;  // first one that belongs to no frame yet
    std::string error_;
};

}  // namespace vox_link
