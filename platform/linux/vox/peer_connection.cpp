#include "platform/linux/vox/peer_connection.h"

#include <sys/epoll.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>

#include "platform/linux/vox/endpoint.h"
#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/limits.h"
#include "platform/linux/vox/peer_identity.h"
#include "platform/linux/vox/service_socket.h"

namespace vox_link {
namespace {

// A busy service is asked again after 1, 2, 4, … 256, 256 … ms: about 5 seconds.
constexpr unsigned kMostAttempts = 28;
constexpr std::chrono::milliseconds retry_delay(unsigned attempt) noexcept {
    return std::chrono::milliseconds(1 << std::min(attempt, 8u));
}

// Whether a new connection may succeed where this one got `error`.
bool is_passing(int error) noexcept {
    switch (error) {
        case EINVAL:
        case EPERM:
        case EACCES:
        case ENAMETOOLONG:
        case ENOTDIR:
        case ELOOP:
        case ENOTSOCK:
        case EPROTOTYPE:
        case EBADF:
            return false;
        default:
            return true;
    }
}

}  // namespace

peer_connection::watch::watch(peer_connection* of) noexcept
    : io_watch(
          [](io_watch* called) noexcept { static_cast<watch*>(called)->owner->handle_events(); }),
      owner(of) {}

peer_connection::peer_connection(std::string name, const vox_limits_t& limits, peer_origin origin)
    : connection(std::move(name)),
      limits_(limits),
      accepts_(codec_limits_of(limits)),
      origin_(std::move(origin)),
      watch_(this),
      user_(origin_.place.user()),
      reader_(frame_limits_of(limits)) {
    vox_wire::encoded hello;
    build_hello(accepts_, hello);
    if (user_)
        user_->service().enter(*this);
    {
        const lock_guard guard(lock_);
        out_.append(hello);
        if (origin_.from == peer_origin::kind::socket)
            credentials_ = credentials_of(origin_.fd);
        tapped_.bind(std::move(origin_.taps), credentials_);
        if (origin_.tap) {
            vox_wire::encoded wish;
            build_control(frame_type::tap, 0, 0, vox_null_create(), wish);
            out_.append(wish);
        }
    }
    enlist();
}

peer_connection::~peer_connection() {
    if (user_)
        user_->service().leave(*this);
    if (origin_.from == peer_origin::kind::socket && origin_.fd >= 0)
        ::close(origin_.fd);
    vox_release(origin_.endpoint);
}

void peer_connection::start() {
    if (origin_.from == peer_origin::kind::socket)
        open(origin_.fd);
    else
        try_to_connect(0);
}

void peer_connection::try_to_connect(unsigned attempt) {
    if (is_ending())
        return;
    int fd = -1;
    std::string why;
    const int error = origin_.from == peer_origin::kind::service
                          ? connect_service(name(), fd, why)
                          : connect_endpoint(origin_.endpoint, fd, why);
    if (error == 0) {
        open(fd);
    } else if (error == EAGAIN && attempt < kMostAttempts) {
        hold();
        queue().after(dispatch::time::after(retry_delay(attempt)),
                      dispatch::block<void()>([this, attempt] {
                          try_to_connect(attempt + 1);
                          unhold();
                      }));
    } else {
        connect_failed(error, why);
    }
}

void peer_connection::connect_failed(int error, const std::string& why) {
    fail(is_passing(error) ? VOX_ERROR_CONNECTION_INTERRUPTED : VOX_ERROR_CONNECTION_INVALID,
         "cannot connect: " + why);
}

void peer_connection::open(int fd) {
    // The service's lock, which this takes, is not taken under a connection's.
    std::shared_ptr<user_turns> turns = user_ ? user_->turns_on(queue()) : nullptr;
    const lock_guard guard(lock_);
    origin_.fd = -1;
    if (abandoned_) {
        ::close(fd);
        return;
    }
    credentials_ = credentials_of(fd);
    fd_ = fd;
    turns_ = std::move(turns);
    hold();
    if (const int error = watch_.start(fd, EPOLLIN | EPOLLRDHUP, queue().get()); error != 0) {
        unhold();
        fail_locked(VOX_ERROR_CONNECTION_INVALID,
                    std::string("cannot watch the socket: ") + ::strerrordesc_np(error));
        return;
    }
    watching_ = true;
    write_waiting();
    if (origin_.accepted)
        schedule();  // its time to say hello begins
}

void peer_connection::cut_off() {
    abandoned_ = true;
    for (vox_wire::encoded& waiting : early_)
        discard(waiting);
    early_.clear();
    early_bytes_ = 0;
    early_descriptors_ = 0;
    if (fd_ >= 0)
        ::shutdown(fd_, SHUT_RDWR);
    if (!writing_)
        out_.clear();
    settle();
}

// The watch may call once more after it was stopped; that call drops its hold.
void peer_connection::close_socket() {
    bool call_comes = false;
    bool watched = false;
    {
        const lock_guard guard(lock_);
        watched = std::exchange(watching_, false);
        if (watched)
            call_comes = !watch_.stop();
        if (writing_)
            closing_ = true;
        else if (fd_ >= 0)
            ::close(fd_.exchange(-1));
    }
    if (call_comes)
        watch_over_ = true;
    else if (watched)
        unhold();
}

void peer_connection::wind_up(vox_object_t error) {
    discharge();
    close_socket();
    for (std::size_t left = reader_.waiting_descriptors(); left > 0; --left)
        descriptor_gone();
    reader_.clear();
    static_cast<void>(count_partial());
    if (incomplete_timer_)
        incomplete_timer_.cancel();
    incomplete_timer_ = {};
    std::vector<dispatch::block<void()>> cancel_handlers;
    std::vector<waiting_reply> replies;
    std::list<waiting_barrier> barriers;
    {
        const lock_guard guard(lock_);
        cancel_handlers = cancel_all_open();
        wound_up_ = true;
        replies = take_all_waiting();
        barriers.swap(barriers_);
    }
    for (const dispatch::block<void()>& handler : cancel_handlers)
        handler();
    for (waiting_reply& reply : replies)
        run_reply(reply, error);
    for (const waiting_barrier& barrier : barriers)
        barrier.work();
    if (stage_ == stage::tap && tapped_.hub())
        tapped_.hub()->remove(this);
    else
        tapped_.closed(error);
    origin_.place = {};
}

ucred peer_connection::credentials() const {
    const lock_guard guard(lock_);
    return credentials_;
}

std::vector<gid_t> peer_connection::groups() const {
    const lock_guard guard(lock_);
    return groups_of(fd_ >= 0 ? fd_.load() : origin_.fd);
}

std::string peer_connection::title() {
    const ucred peer = credentials();
    const std::string who =
        "pid " + std::to_string(peer.pid) + " (uid " + std::to_string(peer.uid) + ")";
    if (origin_.accepted)
        return "connection from " + who + (name().empty() ? "" : " to '" + name() + "'");
    if (name().empty())
        return "connection with " + who;
    return "connection to '" + name() + "' of " + who;
}

}  // namespace vox_link
