#pragma once

#include <sys/uio.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <list>
#include <span>
#include <vector>

#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/frame.h"

// The frames of one connection that wait to be written, and what was written.
//
// Owner:   one connection, under its mutex. While one thread writes what
//          gather() gave it, without the mutex, others may append() only.
// Order:   frames leave in the order appended. One with descriptors begins a
//          system call of its own, because descriptors travel with the first byte.
// Cost:    appending copies small frames behind one another and adopts big ones.
namespace vox_link {

// What the next sendmsg(2) shall carry.
struct output_batch {
    std::array<iovec, 32> pieces;
    std::size_t count = 0;
    std::size_t bytes = 0;
    std::span<const int> descriptors;
};

// Empties `made` and closes its descriptors.
void discard(vox_wire::encoded& made) noexcept;

class output {
  public:
    output() = default;
    ~output() { clear(); }
    output(const output&) = delete;
    output& operator=(const output&) = delete;

    // One complete frame, taken over.
    void append(vox_wire::encoded& made);
    // For a frame that is written without waiting here: that it is on its way,
    // and then either that it was written completely, or that `sent` bytes were
    // and the rest is taken over and goes before everything that waits.
    void pass() noexcept { ++accepted_; }
    void passed(frame_type type) noexcept;
    void put_back(vox_wire::encoded& made, std::size_t sent);

    void gather(output_batch& batch) noexcept;
    // `count` bytes of the last batch were written.
    void written(std::size_t count) noexcept;
    // The ids of the requests that wait.
    [[nodiscard]] std::vector<std::uint64_t> waiting_requests() const;
    // Gives up everything that waits.
    void clear() noexcept;

    [[nodiscard]] bool empty() const noexcept { return chunks_.empty(); }
    [[nodiscard]] std::size_t bytes() const noexcept { return bytes_; }
    [[nodiscard]] std::uint64_t messages() const noexcept { return messages_; }
    [[nodiscard]] std::uint64_t descriptors() const noexcept { return descriptors_; }
    // Frames that ever came, and those that were written or given up.
    [[nodiscard]] std::uint64_t accepted() const noexcept { return accepted_; }
    [[nodiscard]] std::uint64_t finished() const noexcept { return finished_; }
    [[nodiscard]] std::uint64_t messages_written() const noexcept { return messages_written_; }

  private:
    struct chunk {
        vox_wire::byte_buffer bytes;   // whole frames
        std::size_t at = 0;            // first byte not written yet
        std::size_t frame_begin = 0;   // of the frame that byte belongs to
        std::vector<int> descriptors;  // owned; leave with the first byte
    };
    void count_waiting(const std::uint8_t* frame, std::size_t bytes) noexcept;
    void adopt_descriptors(chunk& into, vox_wire::encoded& made) noexcept;
    void close_descriptors(chunk& done) noexcept;
    void count_frames(chunk& progressed) noexcept;

    std::list<chunk> chunks_;
    bool tail_open_ = false;         // the last chunk may grow: nobody is writing it
    std::size_t bytes_ = 0;          // waiting
    std::uint64_t messages_ = 0;     // waiting, without frames that are no messages
    std::uint64_t descriptors_ = 0;  // waiting
    std::uint64_t accepted_ = 0;
    std::uint64_t finished_ = 0;
    std::uint64_t messages_written_ = 0;
};

}  // namespace vox_link
