#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>

#include "dispatch/group.h"
#include "plr/concurrency/queue_role.h"
#include "plr/ipc/connection.h"
#include "src/log/remote_log_buffer.h"

// Gets a VoxLogger's messages to its server, one connection after the other: each
// starts with what the one before did not get confirmed.
//
// Owner:   the logger. Replies find the sender gone once the logger is.
// Queue:   the logger's; buffer() is for any thread as far as it says so.
//
// One confirmation is under way at a time, for all that was sent before it. A
// server that confirms says so when the logger checks in; one that hands down a
// level without having said so does not confirm: what was handed to the kernel
// counts as delivered then.
namespace plr {

class RemoteLogSender : public std::enable_shared_from_this<RemoteLogSender> {
  public:
    explicit RemoteLogSender(const dispatch::queue& queue) : queue_(queue) {}

    [[nodiscard]] RemoteLogBuffer& buffer() noexcept { return buffer_; }

    // A new connection, running: its first message is `checkIn`.
    void start(const vox::connection& server, const vox::dict& checkIn) PLR_ON(queue_);
    // The connection is no more.
    void stop() PLR_ON(queue_);
    // The server handed a level down.
    void levelCame() PLR_ON(queue_);
    // Sends what waits, as much as is good at a time.
    void send() PLR_ON(queue_);
    // Everything that waits, at once: nobody will be here to send it later.
    void sendTheRest() PLR_ON(queue_);
    // Keeps `session` until what was logged before is confirmed, or the
    // connection is lost.
    void flush(const dispatch::group_session& session) PLR_ON(queue_);

    // For lambdas on the queue.
    void assertCurrent() const noexcept PLR_ASSERT_CAPABILITY(queue_) { queue_.assertCurrent(); }

  private:
    enum class Confirms : std::uint8_t { Unknown, Yes, No };
    struct Flush {
        std::uint64_t end;  // the number behind the last message
        dispatch::group_session session;
    };

    void collect() PLR_ON(queue_);
    [[nodiscard]] bool sendNext() PLR_ON(queue_);
    void ask() PLR_ON(queue_);
    void askServer() PLR_ON(queue_);
    void askKernel() PLR_ON(queue_);
    void confirmed(std::uint64_t end) PLR_ON(queue_);
    template <class Work>
    [[nodiscard]] dispatch::block<void(vox::object)> onReply(Work work);

    const QueueRole queue_;
    RemoteLogBuffer buffer_;
    vox::connection server_ PLR_CONFINED_TO(queue_);
    std::uint64_t connection_ PLR_CONFINED_TO(queue_)
    = 0;  // counts them
    Confirms confirms_ PLR_CONFINED_TO(queue_)
    = Confirms::Unknown;
    bool isAsking_ PLR_CONFINED_TO(queue_)
    = false;
    bool willLookAgain_ PLR_CONFINED_TO(queue_)
    = false;  // a timer is set
    std::deque<Flush> flushes_ PLR_CONFINED_TO(queue_);
};

}  // namespace plr
