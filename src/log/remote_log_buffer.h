#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <vector>

#include "plr/ipc/dict.h"
#include "src/base/brief_mutex.h"

// The messages of a VoxLogger, in order, from the call that logged them until the
// server has confirmed them: first those on their way, then those that wait. When
// it is full, new messages are dropped; a note says how many, at their place.
//
// Threads: add(), limit() and the counts on any; the rest on the logger's queue.
// Numbers: count every message, notes included, since the start.
namespace plr {

class RemoteLogBuffer {
  public:
    // Whether the queue has to be woken to collect(), now.
    [[nodiscard]] bool add(vox::dict&& message);
    void limit(std::size_t messages, std::size_t bytes);
    [[nodiscard]] std::size_t held() const;
    [[nodiscard]] std::uint64_t dropped() const;

    // Takes in what was added; false when there was nothing. The queue has to look
    // again soon in the one case, and when it `willLookAgain` anyhow, so that
    // messages that follow each other wake nobody one by one.
    bool collect(bool willLookAgain);

    [[nodiscard]] bool hasUnsent() const noexcept { return sent_ < messages_.size(); }
    // The first message that is not on its way.
    [[nodiscard]] const vox::dict& unsent() const { return messages_[sent_].message; }
    // It is now; in the second form a note is, in its place.
    void advance();
    void refuse(const vox::dict& note);
    // Nothing is on its way any more.
    void rewind() noexcept;

    [[nodiscard]] bool hasSent() const noexcept { return sent_ > 0; }
    [[nodiscard]] std::uint64_t firstHeld() const noexcept { return first_; }
    [[nodiscard]] std::uint64_t firstUnsent() const noexcept { return first_ + sent_; }
    [[nodiscard]] std::uint64_t end() const noexcept { return first_ + messages_.size(); }
    // Whether as much is on its way as is good: what has to be sent again when
    // the server goes, and what waits in the connection.
    [[nodiscard]] bool enoughSent() const noexcept {
        return sent_ >= kMostSent || sentBytes_ >= kMostSentBytes;
    }

    // The messages before number `end` are where they belong.
    void forgetUntil(std::uint64_t end);

  private:
    static constexpr std::size_t kMostSent = 4096;
    static constexpr std::size_t kMostSentBytes = std::size_t{1} << 20;
    static constexpr std::size_t kPromptMessages = 256;

    struct Entry {
        vox::dict message;          // null: a note, yet to be made
        std::size_t bytes = 0;      // 0 for notes
        std::uint64_t dropped = 0;  // what a note tells
    };

    [[nodiscard]] bool hasRoomFor(std::size_t bytes) const PLR_REQUIRES(lock_);
    void tellGap() PLR_REQUIRES(lock_);

    mutable detail::BriefMutex lock_;
    std::size_t mostMessages_ PLR_GUARDED_BY(lock_) = 8192;
    std::size_t mostBytes_ PLR_GUARDED_BY(lock_) = std::size_t{4} << 20;
    std::vector<Entry> added_ PLR_GUARDED_BY(lock_);
    std::size_t held_ PLR_GUARDED_BY(lock_) = 0;   // messages, the queue's too
    std::size_t bytes_ PLR_GUARDED_BY(lock_) = 0;  // of all these
    std::uint64_t dropped_ PLR_GUARDED_BY(lock_) = 0;
    std::uint64_t gap_ PLR_GUARDED_BY(lock_) = 0;  // dropped, and no note tells it yet
    bool isAwake_ PLR_GUARDED_BY(lock_) = false;   // collect() will be called soon

    // The queue's.
    std::vector<Entry> collected_;  // empty, with room
    std::deque<Entry> messages_;
    std::size_t sent_ = 0;  // on their way, of messages_
    std::size_t sentBytes_ = 0;
    std::uint64_t first_ = 0;  // the number of messages_.front()
};

}  // namespace plr
