// Writing: now or later, one writer at a time.
#include <sys/epoll.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/now.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/send_turn.h"
#include "platform/linux/vox/socket_io.h"

namespace vox_link {
namespace {

// A thread that sends this often in a row, each within kBurstGap of the one
// before and with nothing received between, is about to send more.
constexpr unsigned kBurstSends = 4;
constexpr std::int64_t kBurstGap = 3'000;  // ns
// What a burst puts together before it is written, by the sender itself …
constexpr std::size_t kBurstBytes = 32u << 10;
// … or, at its end, after this time.
constexpr std::chrono::microseconds kBurstDelay(100);
// A thread writes so often at most for what others append meanwhile.
constexpr unsigned kMostWrites = 64;
// The kernel is short of memory or of room for descriptors under way.
constexpr std::chrono::milliseconds kShortageDelay(10);
constexpr std::uint32_t kReading = EPOLLIN | EPOLLRDHUP;

void discard_descriptors(vox_wire::encoded& made) noexcept {
    for (const int descriptor : made.descriptors)
        ::close(descriptor);
    made.descriptors.clear();
}

}  // namespace

void peer_connection::put(vox_wire::encoded& made, frame_type kind) {
    if (dropped_untold_ > 0) [[unlikely]]
        tell_dropped();
    if (!can_write()) {
        out_.append(made);
    } else if (defer()) {
        out_.append(made);
        if (out_.bytes() >= kBurstBytes)
            write_waiting();
    } else if (!out_.empty()) {
        out_.append(made);
        write_waiting();
    } else {
        write_through(made, kind);
    }
}

// The peer learns the count in the place where the messages are missing.
void peer_connection::tell_dropped() {
    vox_wire::encoded made;
    const auto count = static_cast<std::int64_t>(std::exchange(dropped_untold_, 0));
    build_control(frame_type::dropped, 0, 0, vox_int64_create(count), made);
    out_.append(made);
}

// Whether somebody will write soon, so that more can be put together.
bool peer_connection::defer() {
    send_turn* turn = send_turn::on(queue().get());
    const bool burst = !(turn && turn->has_more()) && is_burst();
    if (turn && (turn->has_more() || burst)) {
        if (!std::exchange(in_turn_, true))
            turn->add(this);
        return true;
    }
    if (burst)
        arm_flush(kBurstDelay);
    return burst;
}

// Reads the clock only from the second of successive sends on.
bool peer_connection::is_burst() {
    if (heard_.load(std::memory_order_relaxed)) {
        heard_.store(false, std::memory_order_relaxed);
        run_ = 0;
        last_send_ = 0;
    }
    if (run_ == 0) {
        run_ = 1;
        return false;
    }
    const std::int64_t time = now();
    run_ = last_send_ == 0 || time - last_send_ <= kBurstGap ? run_ + 1 : 1;
    last_send_ = time;
    return run_ > kBurstSends;
}

void peer_connection::arm_flush(std::chrono::microseconds delay) {
    if (std::exchange(flush_armed_, true))
        return;
    hold();
    dispatch::queue::global().after(dispatch::time::after(delay), dispatch::block<void()>([this] {
                                        {
                                            const lock_guard guard(lock_);
                                            flush_armed_ = false;
                                        }
                                        flush();
                                        unhold();
                                    }));
}

void peer_connection::flush() {
    const lock_guard guard(lock_);
    if (can_write() && !out_.empty())
        write_waiting();
}

void peer_connection::flush_turn() {
    {
        const lock_guard guard(lock_);
        in_turn_ = false;
    }
    flush();
}

// A frame that nothing waits before: straight from the sender's memory.
void peer_connection::write_through(vox_wire::encoded& made, frame_type kind) {
    iovec piece = {made.bytes.data(), made.bytes.size()};
    const int fd = fd_.load(std::memory_order_relaxed);
    writing_ = true;
    out_.pass();
    lock_.unlock();
    const io_result result = send_pieces(fd, {&piece, 1}, made.descriptors);
    lock_.lock();
    writing_ = false;
    if (run_ > 1)
        last_send_ = now();
    if (result.bytes == piece.iov_len) [[likely]] {
        out_.passed(kind);
        discard(made);
    } else {
        if (result.bytes > 0)
            discard_descriptors(made);
        out_.put_back(made, result.bytes);
        write_stopped(result.error);
    }
    if (can_write() && !out_.empty())
        write_waiting();
    else
        finish_writing();
}

void peer_connection::write_waiting() {
    const int fd = fd_.load(std::memory_order_relaxed);
    writing_ = true;
    for (unsigned round = 0; !out_.empty() && !abandoned_ && !blocked_ && !broken_; ++round) {
        if (round == kMostWrites) {
            arm_flush({});
            break;
        }
        output_batch batch;
        out_.gather(batch);
        lock_.unlock();
        const io_result result =
            send_pieces(fd, {batch.pieces.data(), batch.count}, batch.descriptors);
        lock_.lock();
        if (result.bytes > 0)
            out_.written(result.bytes);
        if (result.bytes < batch.bytes)
            write_stopped(result.error);
        else if (out_.empty() && dropped_untold_ > 0)
            tell_dropped();
    }
    writing_ = false;
    finish_writing();
}

// A write took less than it was given. `error` is 0 when it took some.
void peer_connection::write_stopped(int error) {
    if (abandoned_)
        return;
    switch (error) {
        case 0:
        case EAGAIN:
            blocked_ = true;
            if (watch_.modify(kReading | EPOLLOUT) != 0)
                retry_later();
            break;
        case ENOBUFS:
        case ENOMEM:
        case ETOOMANYREFS:
            blocked_ = true;
            retry_later();
            break;
        case EPIPE:
        case ECONNRESET:
            // What the peer sent before it went is read first. One that only reads no
            // more still answers what it has read.
            broken_ = true;
            fail_unsent_requests();
            out_.clear();
            schedule();
            break;
        default:
            fail_locked(VOX_ERROR_CONNECTION_INVALID,
                        std::string("cannot write: ") + ::strerrordesc_np(error));
    }
}

// The last act of every writer.
void peer_connection::finish_writing() {
    if (abandoned_) {
        out_.clear();
        if (std::exchange(closing_, false))
            ::close(fd_.exchange(-1));
    }
    settle();
    if (!barriers_.empty()) [[unlikely]]
        run_finished_barriers();
}

void peer_connection::retry_later() {
    hold();
    dispatch::queue::global().after(dispatch::time::after(kShortageDelay),
                                    dispatch::block<void()>([this] {
                                        unblock();
                                        unhold();
                                    }));
}

void peer_connection::unblock() {
    const lock_guard guard(lock_);
    if (!std::exchange(blocked_, false) || !can_write())
        return;
    write_waiting();
    if (!blocked_ && watching_ && watch_.modify(kReading) != 0)
        schedule();  // nothing is lost: one wake-up more for each write of the peer
}

}  // namespace vox_link
