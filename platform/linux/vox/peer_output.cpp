// Sending: the send_ members, admission, and the one writer at a time.
#include <sys/epoll.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "platform/linux/vox/complaint.h"
#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/request.h"
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
// Buffers that grew beyond this are not kept by their thread.
constexpr std::size_t kScratchToKeep = 256u << 10;

constexpr std::uint32_t kReading = EPOLLIN | EPOLLRDHUP;

std::int64_t now() noexcept {
    return dispatch::time::now().nanoseconds();
}

// Memory that one thread encodes into.
vox_wire::encoded& scratch() {
    thread_local vox_wire::encoded memory;
    if (memory.bytes.capacity() > kScratchToKeep)
        memory.bytes = {};
    memory.bytes.clear();
    return memory;
}

int encode_frame(vox_object_t message, frame_type type, std::uint64_t id,
                 const vox_wire::codec_limits& limits, vox_wire::encoded& out) {
    skip_header(out);
    if (const int error = vox_wire::encode(message, limits, out); error != 0)
        return error;
    write_header({.type = type,
                  .flags = 0,
                  .descriptors = static_cast<std::uint16_t>(out.descriptors.size()),
                  .length = static_cast<std::uint32_t>(out.bytes.size() - kHeaderBytes),
                  .id = id},
                 out.bytes.data());
    return 0;
}

void discard_descriptors(vox_wire::encoded& made) noexcept {
    for (const int descriptor : made.descriptors)
        ::close(descriptor);
    made.descriptors.clear();
}

}  // namespace

int peer_connection::send_message(vox_object_t message) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    if (!dictionary)
        return EINVAL;
    if (!is_reply(*dictionary))
        return send(message, frame_type::message, 0, nullptr);
    if (dictionary->remote != this)
        return EINVAL;
    if (!claim_reply(*dictionary))
        return EALREADY;
    const int error = send(message, frame_type::reply, dictionary->reply_id, nullptr);
    if (error != 0)
        unclaim_reply(*dictionary);
    return error;
}

void peer_connection::send_request(vox_object_t message, dispatch::queue queue,
                                   reply_block handler) {
    vox_dictionary_object* dictionary = vox_values::as_dictionary(message);
    waiting_reply reply{.id = 0, .queue = std::move(queue), .handler = std::move(handler)};
    const int error = !dictionary || is_reply(*dictionary)
                          ? EINVAL
                          : send(message, frame_type::request, 0, &reply);
    if (error != 0)
        fail_request(std::move(reply), error);
}

void peer_connection::fail_request(waiting_reply reply, int error) {
    const std::int64_t code =
        error == EPIPE ? VOX_ERROR_CONNECTION_INVALID : VOX_ERROR_MESSAGE_REFUSED;
    const std::string why = error == EPIPE
                                ? std::string("the connection has ended")
                                : std::string("cannot send: ") + ::strerrordesc_np(error);
    reply.queue.async(
        [handler = std::move(reply.handler), result = vox_error_create(code, why.c_str())] {
            handler(result);
            vox_release(result);
        });
}

void peer_connection::send_barrier(dispatch::block<void()> barrier) {
    const lock_guard guard(lock_);
    const bool greeted = greeted_.load(std::memory_order_relaxed);
    barriers_.push_back({greeted ? out_.accepted() : early_.size(), std::move(barrier)});
    if (wound_up_ || fd_.load(std::memory_order_relaxed) >= 0)
        run_finished_barriers();
}

// Before the hello nothing but our own hello leaves.
bool peer_connection::is_finished(const waiting_barrier& barrier) const {
    if (wound_up_)
        return true;
    return greeted_.load(std::memory_order_relaxed)
               ? barrier.behind <= out_.finished()
               : barrier.behind == 0 && out_.finished() == out_.accepted();
}

void peer_connection::run_finished_barriers() {
    while (!barriers_.empty() && is_finished(barriers_.front())) {
        queue().async([work = std::move(barriers_.front().work)] { work(); });
        barriers_.pop_front();
    }
}

// Hot path: bench/vox_bench.cpp.
int peer_connection::send(vox_object_t message, frame_type kind, std::uint64_t id,
                          waiting_reply* reply) {
    for (;;) {
        const bool greeted = greeted_.load(std::memory_order_acquire);
        vox_wire::encoded& made = scratch();
        if (const int error =
                encode_frame(message, kind, id, greeted ? peer_accepts_ : accepts_, made);
            error != 0)
            return error;
        const lock_guard guard(lock_);
        if (greeted != greeted_.load(std::memory_order_relaxed)) {
            discard(made);
            continue;
        }
        const int error = accept(made, kind, reply);
        if (error != 0)
            discard(made);
        return error;
    }
}

int peer_connection::accept(vox_wire::encoded& made, frame_type kind, waiting_reply* reply) {
    if (const int error = admit(kind, made.bytes.size()); error != 0)
        return error;
    if (reply) {
        reply->id = ++last_id_;
        write_header_id(reply->id, made.bytes.data());
        replies_.insert(std::move(*reply));
    }
    if (greeted_.load(std::memory_order_relaxed)) {
        put(made, kind);
    } else {
        early_bytes_ += made.bytes.size();
        early_.push_back(std::exchange(made, {}));
    }
    return 0;
}

// Whether `times` the limits leave room for one more message of `size` bytes.
bool peer_connection::has_room(std::size_t size, unsigned times) const {
    const std::size_t bytes = out_.bytes() + early_bytes_;
    const std::uint64_t messages = out_.messages() + early_.size();
    return (out_.empty() && early_.empty()) ||
           (bytes + size <= std::uint64_t{times} * limits_.max_queued_bytes &&
            messages < std::uint64_t{times} * limits_.max_queued_messages);
}

int peer_connection::admit(frame_type kind, std::size_t size) {
    if (abandoned_ || broken_)
        return EPIPE;
    if (has_room(size, 1)) [[likely]]
        return 0;
    if (can_write()) {
        write_waiting();  // it was only put together
        if (abandoned_ || broken_)
            return EPIPE;
        if (has_room(size, 1))
            return 0;
    }
    if (limits_.overflow == VOX_OVERFLOW_DROP) {
        if (kind == frame_type::message || kind == frame_type::request) {
            ++dropped_;
            ++dropped_untold_;
            return ENOBUFS;
        }
        if (has_room(size, 2))
            return 0;
    }
    fail_locked(VOX_ERROR_CONNECTION_INVALID,
                "the peer does not read: " + std::to_string(out_.messages() + early_.size()) +
                    " messages, " + std::to_string(out_.bytes() + early_bytes_) + " bytes wait",
                blame::peer);
    return EPIPE;
}

void peer_connection::send_control(frame_type kind, std::uint8_t marks, std::uint64_t id,
                                   vox_object_t value) {
    vox_wire::encoded made;
    build_control(kind, marks, id, value, made);
    const lock_guard guard(lock_);
    if (admit(kind, made.bytes.size()) == 0)
        put(made, kind);
}

// ---- Writing now or later ----------------------------------------------------------

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
            // What the peer sent before it went is read first.
            broken_ = true;
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

// ---- The peer's hello ---------------------------------------------------------------

void peer_connection::greet(const vox_wire::codec_limits& peer) {
    const lock_guard guard(lock_);
    peer_accepts_ = peer;
    std::uint64_t moved = 0;
    std::size_t barrier = 0;
    const auto place_barriers = [&]() PLR_REQUIRES(lock_) {
        for (; barrier < barriers_.size() && barriers_[barrier].behind <= moved; ++barrier)
            barriers_[barrier].behind = out_.accepted();
    };
    place_barriers();
    for (vox_wire::encoded& waiting : early_) {
        if (fit_to_peer(waiting))
            out_.append(waiting);
        else
            give_up(waiting);
        ++moved;
        place_barriers();
    }
    early_.clear();
    early_bytes_ = 0;
    greeted_.store(true, std::memory_order_release);
    if (can_write())
        write_waiting();
}

// Whether the peer accepts what was encoded before its limits were known.
bool peer_connection::fit_to_peer(vox_wire::encoded& made) {
    const std::size_t body = made.bytes.size() - kHeaderBytes;
    if (body > peer_accepts_.bytes || made.descriptors.size() > peer_accepts_.descriptors)
        return false;
    if (accepts_.depth <= peer_accepts_.depth)
        return true;
    // Only encoding tells the depth.
    const char* why = nullptr;
    const frame_header header = read_own_header(made.bytes.data());
    const vox_object_t message =
        vox_wire::decode(made.bytes.view().subspan(kHeaderBytes), made.descriptors, accepts_, why);
    made.descriptors.clear();
    vox_wire::encoded again;
    const int error =
        message ? encode_frame(message, header.type, header.id, peer_accepts_, again) : EINVAL;
    vox_release(message);
    if (error == 0)
        std::swap(made, again);
    return error == 0;
}

void peer_connection::give_up(vox_wire::encoded& made) {
    const frame_header header = read_own_header(made.bytes.data());
    if (header.type == frame_type::request) {
        if (waiting_reply reply = replies_.take(header.id); reply.id != 0)
            fail_request(std::move(reply), EMSGSIZE);
    }
    ++dropped_;
    complain("a message of " + std::to_string(header.length) + " bytes to '" + name() +
             "' is over its limits and was not sent");
    discard(made);
}

}  // namespace vox_link
