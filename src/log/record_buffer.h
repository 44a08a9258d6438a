#pragma once

#include <cstddef>
#include <cstring>
#include <memory>
#include <string_view>
#include <vector>

namespace plr {

// Records on their way out, back to back, and where each one ends. The first
// may have been sent in part. Is the Sink of record_text.h.
//
// Threads: one at a time.
// Cost:    room is taken once and used again; see trim().
class RecordBuffer {
  public:
    void put(std::string_view text) {
        if (capacity_ - size_ < text.size()) [[unlikely]]
            grow(text.size());
        std::memcpy(bytes_.get() + size_, text.data(), text.size());
        size_ += text.size();
    }
    // A message's record unless it is a note.
    void endRecord(bool isNote = false) { ends_.push_back({size_, isNote}); }

    [[nodiscard]] bool empty() const noexcept { return sent_ == size_; }
    // What is still to be sent: bytes; messages, the one that was sent in part too.
    [[nodiscard]] std::string_view waiting() const noexcept {
        return {bytes_.get() + sent_, size_ - sent_};
    }
    [[nodiscard]] std::size_t messages() const noexcept;

    // What is left of the first record; there must be one.
    [[nodiscard]] std::string_view first() const noexcept {
        return {bytes_.get() + sent_, ends_[first_].at - sent_};
    }
    // As many whole records as fit into `room` bytes. The rest of a record that was
    // sent in part comes first, whatever the room.
    [[nodiscard]] std::string_view upTo(std::size_t room) const noexcept;

    void consume(std::size_t bytes) noexcept;
    // Takes back what was sent of the first record; returns how much that was.
    std::size_t restartRecord() noexcept;

    // Moves records to `to` until that one has `limit` bytes waiting, and drops the
    // rest. Returns how many messages were dropped.
    std::size_t moveTo(RecordBuffer& to, std::size_t limit);

    void clear() noexcept;
    // Gives room above `bytes` back, if nothing is in it.
    void trim(std::size_t bytes) noexcept;

  private:
    struct End {
        std::size_t at;
        bool isNote;
    };

    void grow(std::size_t more);
    void forgetSent();
    [[nodiscard]] std::size_t startOfFirst() const noexcept {
        return first_ == 0 ? 0 : ends_[first_ - 1].at;
    }

    std::unique_ptr<char[]> bytes_;
    std::size_t capacity_ = 0;
    std::size_t size_ = 0;
    std::size_t sent_ = 0;  // bytes
    std::vector<End> ends_;
    std::size_t first_ = 0;  // in ends_: the first that is not all sent
};

}  // namespace plr
