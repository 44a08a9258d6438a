#pragma once

#include <sys/socket.h>

#include <chrono>
#include <cstdint>
#include <list>
#include <memory>
#include <set>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "dispatch/source.h"
#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/connection.h"
#include "platform/linux/vox/frame_reader.h"
#include "platform/linux/vox/id_table.h"
#include "platform/linux/vox/idle_exit.h"
#include "platform/linux/vox/output.h"
#include "platform/linux/vox/request.h"
#include "platform/linux/vox/service_account.h"
#include "platform/linux/vox/tap_hub.h"

// A connection to one peer.
//
// Files:   peer_connection.cpp connects and ends, peer_input.cpp reads and
//          delivers, peer_send.cpp takes what is to be sent, peer_write.cpp writes it,
//          peer_requests.cpp has what is outstanding, peer_limits.cpp what all that costs,
//          peer_tap.cpp has those that only look on, peer_idle.cpp the end of an idle process.
// Threads: everything received is read, decoded and delivered on the target
//          queue. Senders encode on their own thread without the lock; then one
//          of them writes at a time, without the lock, and takes along what the
//          others append meanwhile.
// Closing: the descriptor is closed on the target queue, or by the writer that
//          still uses it then.
namespace vox_link {

class send_turn;
class user_turns;

// Where a peer connection gets its socket from.
struct peer_origin {
    enum class kind : std::uint8_t { socket, service, endpoint };
    kind from = kind::socket;
    int fd = -1;             // kind::socket: owned
    vox_object* endpoint{};  // kind::endpoint: an owned reference
    bool accepted = false;   // by a listener
    service_account::ticket place;
    bool tap = false;               // asks to be one
    std::shared_ptr<tap_hub> taps;  // of the listener
};

class peer_connection final : public connection, counted_client, idle_participant {
  public:
    // `name` is the service's, or empty. Starts with one reference.
    peer_connection(std::string name, const vox_limits_t& limits, peer_origin origin);

    // As vox_connection_send_message() says.
    [[nodiscard]] int send_message(vox_object_t message);
    // As vox_connection_send_request() says.
    std::uint64_t send_request(vox_object_t message, std::uint32_t timeout_ms,
                               dispatch::queue queue, reply_block handler);
    [[nodiscard]] int cancel_request(std::uint64_t number);
    void send_barrier(dispatch::block<void()> barrier);
    // Gives the handler of a request that could not be sent its error.
    static void fail_request(waiting_reply reply, int error);
    // For a request that came on this connection, or a reply that will go to it.
    [[nodiscard]] bool is_cancelled(const vox_dictionary_object& message);
    [[nodiscard]] int set_cancel_handler(const vox_dictionary_object& message,
                                         dispatch::block<void()> handler);

    [[nodiscard]] ucred credentials() const;
    // Supplementary ones; empty when not known, or no more.
    [[nodiscard]] std::vector<gid_t> groups() const;
    [[nodiscard]] vox_statistics_t statistics() const;
    [[nodiscard]] bool is_listener() const noexcept override { return false; }

    // Writes what a turn of the calling thread had put together.
    void flush_turn();
    // Reads, and writes what waited for room. On the target queue.
    void take_turn();

    // A tap's own end: sending fails.
    [[nodiscard]] bool is_tap() const noexcept { return origin_.tap; }
    // The service's end of a tap, for its hub.
    [[nodiscard]] bool has_room_for_entry() const;
    void send_entry(vox_object_t entry, std::uint64_t left_out);
    void leave_out(std::uint64_t entries);

  protected:
    void start() override;
    void turn() PLR_REQUIRES(queue_role_) override;
    void cut_off() PLR_REQUIRES(lock_) override;
    void wind_up(vox_object_t error) PLR_REQUIRES(queue_role_) override;
    [[nodiscard]] std::string title() override;
    void count_blame(blame blamed) PLR_REQUIRES(queue_role_) override;
    void message_gone(vox_dictionary_object& message) noexcept override;
    void descriptor_gone() noexcept override;

  private:
    struct turn_budget;
    // Of what the peer sends: its hello, then messages, or none from a tap or its service.
    enum class stage : std::uint8_t { hello, messages, tap };
    struct waiting_barrier {
        std::uint64_t behind;  // frames; before the hello, messages that wait for it
        dispatch::block<void()> work;
    };
    // What waits for the peer to read.
    struct burden {
        std::uint64_t bytes = 0;
        std::uint64_t messages = 0;
        std::uint64_t descriptors = 0;
        bool operator==(const burden&) const = default;
    };
    struct outgoing {
        frame_type kind;
        std::uint64_t id = 0;        // of a reply
        waiting_reply request = {};  // of a request; its handler is taken with it
        open_request answered = {};  // by a reply; not released under the lock
    };
    struct watch : dispatch::detail::io_watch {
        explicit watch(peer_connection* of) noexcept;
        peer_connection* owner;
    };
    ~peer_connection() override;

    // peer_connection.cpp
    void try_to_connect(unsigned attempt);
    void connect_failed(int error, const std::string& why);
    void open(int fd);
    void close_socket() PLR_ON(queue_role_);

    // peer_input.cpp
    void handle_events();
    void read_turn() PLR_ON(queue_role_);
    [[nodiscard]] bool may_deliver() const noexcept { return !is_ending() && !is_suspended(); }
    [[nodiscard]] bool deliver_frames(send_turn& sends, turn_budget& budget) PLR_ON(queue_role_);
    [[nodiscard]] bool receive(std::span<std::uint8_t> memory) PLR_ON(queue_role_);
    void handle(const frame& arrived) PLR_ON(queue_role_);
    void handle_hello(const frame& arrived) PLR_ON(queue_role_);
    void handle_message(const frame& arrived) PLR_ON(queue_role_);
    void handle_control(const frame& arrived) PLR_ON(queue_role_);
    [[nodiscard]] vox_dictionary_object* decode(const frame& arrived) PLR_ON(queue_role_);
    void read_failed(int error) PLR_ON(queue_role_);
    void violation(std::string reason);

    // peer_send.cpp
    [[nodiscard]] int send(vox_object_t message, outgoing& what);
    [[nodiscard]] int accept(vox_wire::encoded& made, outgoing& what) PLR_REQUIRES(lock_);
    [[nodiscard]] int admit(frame_type kind, const vox_wire::encoded& made) PLR_REQUIRES(lock_);
    void send_control(frame_type kind, std::uint8_t marks, std::uint64_t id, vox_object_t value);
    [[nodiscard]] bool is_finished(const waiting_barrier& barrier) const PLR_REQUIRES(lock_);
    void run_finished_barriers() PLR_REQUIRES(lock_);
    void greet(const vox_wire::codec_limits& peer);
    [[nodiscard]] bool fit_to_peer(vox_wire::encoded& made) PLR_REQUIRES(lock_);
    [[nodiscard]] std::size_t give_up(vox_wire::encoded& made) PLR_REQUIRES(lock_);

    // peer_idle.cpp
    [[nodiscard]] sight look() override;
    [[nodiscard]] bool leave(leaving_stage now) override;
    [[nodiscard]] int socket() const PLR_REQUIRES(lock_);
    [[nodiscard]] bool has_open_work() const PLR_REQUIRES(lock_);
    [[nodiscard]] bool has_unread() const PLR_REQUIRES(lock_);
    [[nodiscard]] bool is_own_end() PLR_ON(queue_role_);

    // peer_write.cpp
    void put(vox_wire::encoded& made, frame_type kind) PLR_REQUIRES(lock_);
    void tell_dropped() PLR_REQUIRES(lock_);
    [[nodiscard]] bool defer() PLR_REQUIRES(lock_);
    [[nodiscard]] bool is_burst() PLR_REQUIRES(lock_);
    void arm_flush(std::chrono::microseconds delay) PLR_REQUIRES(lock_);
    void flush();
    [[nodiscard]] bool can_write() const PLR_REQUIRES(lock_) {
        return fd_ >= 0 && !writing_ && !blocked_ && !abandoned_ && !broken_;
    }
    void write_through(vox_wire::encoded& made, frame_type kind) PLR_REQUIRES(lock_);
    void write_waiting() PLR_REQUIRES(lock_);
    void write_stopped(int error) PLR_REQUIRES(lock_);
    void finish_writing() PLR_REQUIRES(lock_);
    void unblock();
    void retry_later() PLR_REQUIRES(lock_);

    // peer_requests.cpp
    [[nodiscard]] bool expect_reply(waiting_reply& request) PLR_REQUIRES(lock_);
    [[nodiscard]] waiting_reply take_waiting(std::uint64_t id) PLR_REQUIRES(lock_);
    [[nodiscard]] std::vector<waiting_reply> take_all_waiting() PLR_REQUIRES(lock_);
    void tell_given_up(std::span<const waiting_reply> given_up) PLR_REQUIRES(lock_);
    void fail_unsent_requests() PLR_REQUIRES(lock_);
    [[nodiscard]] bool awaits_replies();
    void arm_deadline() PLR_REQUIRES(lock_);
    void deadline_due();
    static void fail_request(waiting_reply reply, std::int64_t code, const std::string& why);
    void run_reply(waiting_reply& reply, vox_object_t result) PLR_ON(queue_role_);
    void handle_refused(const frame& arrived) PLR_ON(queue_role_);
    [[nodiscard]] bool nobody_waits_for(const vox_wire::encoded& made) PLR_REQUIRES(lock_);
    [[nodiscard]] bool enter_request(const frame& arrived) PLR_ON(queue_role_);
    [[nodiscard]] open_request take_open(std::uint64_t id) PLR_REQUIRES(lock_);
    [[nodiscard]] bool is_given_up(std::uint64_t id) PLR_REQUIRES(lock_);
    void handle_cancel(std::uint64_t id) PLR_ON(queue_role_);
    [[nodiscard]] std::vector<dispatch::block<void()>> cancel_all_open() PLR_REQUIRES(lock_);

    // peer_limits.cpp
    [[nodiscard]] burden waiting() const PLR_REQUIRES(lock_);
    [[nodiscard]] limit_hit over(const vox_wire::encoded& made, unsigned times) PLR_REQUIRES(lock_);
    [[nodiscard]] limit_hit charge(const burden& all, unsigned times) PLR_REQUIRES(lock_);
    void settle() PLR_REQUIRES(lock_);
    void overflow(const limit_hit& hit) PLR_REQUIRES(lock_);
    [[nodiscard]] bool hold_descriptors(std::size_t count);
    void let_go(std::span<const int> descriptors) noexcept;
    [[nodiscard]] bool count_partial() PLR_ON(queue_role_);
    [[nodiscard]] bool is_silent() const PLR_ON(queue_role_)
    { return origin_.accepted && stage_ == stage::hello; }
    void limit_incomplete_frame() PLR_ON(queue_role_);
    void arm_incomplete_timer(std::chrono::nanoseconds delay) PLR_ON(queue_role_);
    void incomplete_frame_due();
    void limit_exceeded(std::string reason);
    void add_counts(vox_listener_statistics_t& sums) const override;

    // peer_tap.cpp
    // Hot path: a frame that is accepted for sending, or dropped.
    void show(const vox_wire::encoded& made, bool as_dropped = false) PLR_REQUIRES(lock_) {
        if (tapped_.is_watched()) [[unlikely]]
            show_frame(made, as_dropped);
    }
    void show_frame(const vox_wire::encoded& made, bool as_dropped) PLR_REQUIRES(lock_);
    void handle_tap(const frame& arrived) PLR_ON(queue_role_);
    void refuse_tap(const char* why);
    void handle_stray(const frame& arrived) PLR_ON(queue_role_);
    void unblock_tap();
    void handle_entry(const frame& arrived) PLR_ON(queue_role_);
    void show_value(vox_dictionary_object& entry) const;
    void deliver_missed(std::uint64_t entries) PLR_ON(queue_role_);

    const vox_limits_t limits_;
    const vox_wire::codec_limits accepts_;  // what this side decodes

    // Set up.
    peer_origin origin_;
    watch watch_;
    tapped_client tapped_;
    const std::shared_ptr<user_account> user_;  // who pays; null unless accepted
    ucred credentials_ PLR_GUARDED_BY(lock_) = {-1, static_cast<uid_t>(-1), static_cast<gid_t>(-1)};

    // The line of its user; null unless accepted. Fixed when the socket is watched.
    std::shared_ptr<user_turns> turns_;
    bool in_line_ PLR_GUARDED_BY(queue_role_) = false;
    bool writable_ PLR_GUARDED_BY(queue_role_) = false;  // since the last turn

    // Receiving.
    frame_reader reader_ PLR_GUARDED_BY(queue_role_);
    bool readable_ PLR_GUARDED_BY(queue_role_) = false;
    bool hung_up_ PLR_GUARDED_BY(queue_role_) = false;  // an end of file is to be read
    stage stage_ PLR_GUARDED_BY(queue_role_) = stage::hello;
    bool watch_over_ PLR_GUARDED_BY(queue_role_) = false;  // one call still comes
    dispatch::source incomplete_timer_ PLR_GUARDED_BY(queue_role_);
    bool incomplete_armed_ PLR_GUARDED_BY(queue_role_) = false;
    std::int64_t incomplete_since_ PLR_GUARDED_BY(queue_role_) = 0;  // ns; 0: no frame begun
    std::atomic<std::uint64_t> partial_bytes_{0};                    // changes on the queue only
    std::atomic<std::uint64_t> held_{0};  // descriptors that came; grows under lock_ only
    std::atomic<std::uint64_t> messages_received_{0};
    std::atomic<std::uint64_t> peer_dropped_{0};
    std::atomic<bool> undelivered_{false};         // after the last turn, bytes that were read
    std::atomic<bool> receives_no_more_{false};    // the process leaves; changes under lock_ only
    bool all_read_ PLR_GUARDED_BY(lock_) = false;  // what came before that is delivered

    // Sending.
    std::atomic<bool> greeted_{false};  // peer_accepts_ is set and the gate open
    std::atomic<bool> heard_{false};    // a message came since the last one was sent
    vox_wire::codec_limits peer_accepts_;
    std::atomic<int> fd_{-1};  // changes under lock_ only
    bool watching_ PLR_GUARDED_BY(lock_) = false;
    bool writing_ PLR_GUARDED_BY(lock_) = false;  // a thread is in sendmsg
    bool blocked_ PLR_GUARDED_BY(lock_) = false;  // until the peer has read
    std::atomic<bool> broken_{false};  // the peer reads no more; changes under lock_ only
    bool abandoned_ PLR_GUARDED_BY(lock_) = false;  // cut off
    bool is_tap_ PLR_GUARDED_BY(lock_) = false;     // the service's end of one
    bool closing_ PLR_GUARDED_BY(lock_) = false;    // the writer closes the socket
    bool wound_up_ PLR_GUARDED_BY(lock_) = false;
    bool in_turn_ PLR_GUARDED_BY(lock_) = false;  // a turn will flush
    bool flush_armed_ PLR_GUARDED_BY(lock_) = false;
    unsigned run_ PLR_GUARDED_BY(lock_) = 0;            // sends in close succession
    std::int64_t last_send_ PLR_GUARDED_BY(lock_) = 0;  // ns; 0: not known
    output out_ PLR_GUARDED_BY(lock_);
    std::list<vox_wire::encoded> early_ PLR_GUARDED_BY(lock_);  // wait for the peer's hello
    std::size_t early_bytes_ PLR_GUARDED_BY(lock_) = 0;
    std::size_t early_descriptors_ PLR_GUARDED_BY(lock_) = 0;
    burden charged_ PLR_GUARDED_BY(lock_);  // of what waits, to the user
    std::list<waiting_barrier> barriers_ PLR_GUARDED_BY(lock_);

    // Requests.
    id_table<waiting_reply> replies_ PLR_GUARDED_BY(lock_);
    std::uint64_t last_id_ PLR_GUARDED_BY(lock_) = 0;
    std::set<std::pair<std::int64_t, std::uint64_t>> deadlines_ PLR_GUARDED_BY(lock_);  // and id
    dispatch::source deadline_timer_ PLR_GUARDED_BY(lock_);
    std::int64_t armed_for_ PLR_GUARDED_BY(lock_) = 0;  // a deadline; 0: not armed
    id_table<open_request> open_ PLR_GUARDED_BY(lock_);
    std::uint64_t requests_refused_ PLR_GUARDED_BY(lock_) = 0;
    std::uint64_t replies_refused_ PLR_GUARDED_BY(lock_) = 0;
    std::uint64_t peer_refused_ PLR_GUARDED_BY(lock_) = 0;

    // Overflow.
    std::uint64_t dropped_ PLR_GUARDED_BY(lock_) = 0;
    std::uint64_t dropped_untold_ PLR_GUARDED_BY(lock_) = 0;
};

}  // namespace vox_link
