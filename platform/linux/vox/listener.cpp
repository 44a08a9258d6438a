#include "platform/linux/vox/listener.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <utility>
#include <vector>

#include "platform/linux/vox/complaint.h"
#include "platform/linux/vox/endpoint.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/peer_identity.h"
#include "plr/base/assert.h"

namespace vox_link {
namespace {

constexpr unsigned kClientsPerTurn = 16;
constexpr std::chrono::milliseconds kPause(100);
// Out of descriptors: clients that try again at once must not keep us busy.
constexpr unsigned kRefusedBeforePause = 64;

int open_reserve() noexcept {
    return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

bool is_out_of_descriptors(int error) noexcept {
    return error == EMFILE || error == ENFILE;
}

bool is_out_of_memory(int error) noexcept {
    return error == ENOMEM || error == ENOBUFS;
}

}  // namespace

listener::gate::gate(listener* of, int adopted, bool accepts) noexcept
    : io_watch([](io_watch* called) noexcept {
          auto* self = static_cast<gate*>(called);
          self->owner->gate_called(self);
      }),
      owner(of),
      fd(adopted),
      listening(accepts) {}

listener::gate::~gate() {
    ::close(fd);
}

listener::listener(std::string name, bool anonymous, const vox_limits_t& limits)
    : connection(std::move(name)),
      limits_(limits),
      anonymous_(anonymous),
      account_(std::make_shared<service_account>(limits)) {
    set_policy(nullptr);
    enlist();
}

std::string listener::title() {
    return name().empty() ? "anonymous listener" : "listener '" + name() + "'";
}

void listener::set_policy(const vox_policy_t* policy) {
    PLR_ASSERT(!is_started(), "vox_listener_set_policy() after the first resume");
    if (policy)
        admission_ = admission(*policy);
    else
        admission_ = anonymous_ ? admission::of_everybody() : admission();
}

// ---- Opening and closing ------------------------------------------------------------

void listener::start() {
    service_socket service;
    std::string why;
    if (!anonymous_ && open_service(name(), admission_.lets_others_in(), service, why) != 0) {
        fail(VOX_ERROR_CONNECTION_INVALID, "cannot listen: " + why);
        return;
    }
    const lock_guard guard(lock_);
    int error = 0;
    if (!anonymous_) {
        if (closed_) {
            withdraw_service(service);
            ::close(service.fd);
            return;
        }
        service_ = service;
        error = add_gate(service.fd, true);
    }
    opened_ = true;
    for (const std::unique_ptr<gate>& made : gates_)
        error = error != 0 ? error : open_gate(*made);
    if (error != 0)
        fail_locked(VOX_ERROR_CONNECTION_INVALID,
                    std::string("cannot watch the socket: ") + ::strerrordesc_np(error));
    schedule();
}

int listener::add_gate(int fd, bool listening) {
    gates_.push_back(std::make_unique<gate>(this, fd, listening));
    return opened_ ? open_gate(*gates_.back()) : 0;
}

int listener::open_gate(gate& opened) {
    if (std::exchange(opened.watched, true))
        return 0;
    hold();
    const int error = opened.start(opened.fd, EPOLLIN, queue().get());
    if (error != 0) {
        opened.watched = false;
        unhold();
    }
    return error;
}

vox_object_t listener::make_endpoint() {
    int listeners = -1;
    int holders = -1;
    if (make_endpoint_pair(listeners, holders) != 0)
        return vox_null_create();
    const lock_guard guard(lock_);
    if (closed_)
        ::close(listeners);
    else if (add_gate(listeners, false) != 0)
        gates_.pop_back();
    return vox_values::adopt_descriptor(VOX_TYPE_ENDPOINT, holders);
}

void listener::cut_off() {
    closed_ = true;
    if (service_)
        withdraw_service(*service_);
    service_.reset();
}

void listener::wind_up(vox_object_t) {
    discharge();
    for (;;) {
        gate* last = nullptr;
        {
            const lock_guard guard(lock_);
            if (gates_.empty())
                break;
            last = gates_.back().get();
        }
        close_gate(last);
    }
    if (reserve_ >= 0)
        ::close(std::exchange(reserve_, -1));
}

// A call that still comes deletes the gate.
void listener::close_gate(gate* closed) {
    std::unique_ptr<gate> owned;
    bool watched = false;
    bool call_comes = false;
    {
        const lock_guard guard(lock_);
        const auto found = std::find_if(gates_.begin(), gates_.end(), [closed](const auto& each) {
            return each.get() == closed;
        });
        owned = std::move(*found);
        gates_.erase(found);
        watched = owned->watched;
        call_comes = watched && !owned->stop();
    }
    std::erase(ready_, closed);
    if (call_comes) {
        owned->over = true;
        static_cast<void>(owned.release());
    } else if (watched) {
        unhold();
    }
}

// ---- Clients -------------------------------------------------------------------------

void listener::gate_called(gate* called) {
    queue_role_.entered();
    if (called->over) {
        delete called;
        unhold();
        return;
    }
    const std::uint32_t events = called->take_events();
    // Not by us: then it is ending already.
    if (called->listening && (events & EPOLLHUP) != 0)
        return fail(VOX_ERROR_CONNECTION_INVALID, "somebody shut the listening socket down");
    if (!std::exchange(called->ready, true))
        ready_.push_back(called);
    if (may_take())
        take_clients();
}

void listener::turn() {
    take_clients();
}

void listener::take_clients() {
    // Before any client: it may have been lost to another thread while it was used.
    if (reserve_ < 0 && !anonymous_)
        reserve_ = open_reserve();
    unsigned budget = kClientsPerTurn;
    while (!ready_.empty() && !paused_ && may_take()) {
        if (budget-- == 0)
            return schedule();
        gate* first = ready_.front();
        switch (take_one(*first)) {
            case taken::client:  // the next from another gate, if there is one
                ready_.pop_front();
                ready_.push_back(first);
                break;
            case taken::nothing:
                ready_.pop_front();
                first->ready = false;
                break;
            case taken::pause:
                pause();
                break;
            case taken::gone:
                close_gate(first);
                break;
        }
    }
}

listener::taken listener::take_one(const gate& from) {
    return from.listening ? accept_one(from.fd) : take_from_endpoint(from.fd);
}

listener::taken listener::accept_one(int listening) {
    const int fd = ::accept4(listening, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    if (fd >= 0) {
        welcome(fd);
        return taken::client;
    }
    if (errno == EAGAIN)
        return taken::nothing;
    if (errno == EINTR || errno == ECONNABORTED)
        return taken::client;
    if (is_out_of_descriptors(errno))
        return refuse_one(listening);
    return cannot_take(errno);
}

// The reserve descriptor makes room to take the client and let it go.
listener::taken listener::refuse_one(int listening) {
    note_shortage("is out of descriptors and refuses clients");
    if (reserve_ >= 0)
        ::close(std::exchange(reserve_, -1));
    const int fd = ::accept4(listening, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    const int error = fd >= 0 ? 0 : errno;
    if (fd >= 0)
        ::close(fd);
    reserve_ = open_reserve();
    if (error == EAGAIN)
        return taken::nothing;
    const taken done = error == 0 ? refused_one() : taken::pause;
    return reserve_ >= 0 ? done : taken::pause;
}

listener::taken listener::refused_one() {
    account_->count(service_account::event::refused_without_descriptors);
    return ++refused_ % kRefusedBeforePause == 0 ? taken::pause : taken::client;
}

listener::taken listener::cannot_take(int error) {
    note_shortage(std::string("cannot take clients: ") + ::strerrordesc_np(error));
    return taken::pause;
}

// One line when a shortage begins and one when it is over.
void listener::note_shortage(const std::string& what) {
    if (!std::exchange(short_, true))
        complain(title() + " " + what);
}

void listener::note_relief() {
    if (std::exchange(short_, false))
        complain(title() + " takes clients again, " + std::to_string(std::exchange(refused_, 0)) +
                 " were refused");
}

listener::taken listener::take_from_endpoint(int pair) {
    int fd = -1;
    const int error = take_client(pair, fd);
    switch (error) {
        case 0:
            welcome(fd);
            return taken::client;
        case EAGAIN:
            return taken::nothing;
        case EPROTO:
            complain(title() + ": an endpoint carried something that is no connection");
            return taken::client;
        case EMFILE:
            note_shortage("is out of descriptors and refuses clients");
            return refused_one();
        default:
            return is_out_of_memory(error) ? cannot_take(error) : taken::gone;
    }
}

void listener::welcome(int fd) {
    note_relief();
    const ucred peer = credentials_of(fd);
    if (!is_admitted(fd, peer)) {
        account_->count(service_account::event::refused_by_policy);
        return turn_away(fd, peer, "the policy does not let it in");
    }
    limit_hit hit;
    service_account::ticket place = account_->take(peer.uid, hit);
    if (!place)
        return turn_away(fd, peer, "it has " + hit.text() + " clients");
    peer_origin origin;
    origin.fd = fd;
    origin.accepted = true;
    origin.taps = taps_;
    origin.place = std::move(place);
    // Unless the handler keeps it, this reference is the only one.
    connection* client = new peer_connection(name(), limits_, std::move(origin));
    account_->count(service_account::event::accepted);
    deliver(client);
    vox_release(client);
}

bool listener::is_admitted(int fd, const ucred& client) const {
    const std::vector<gid_t> groups =
        admission_.names_groups() ? groups_of(fd) : std::vector<gid_t>();
    return admission_.admits(::geteuid(), client.uid, client.gid, groups);
}

void listener::turn_away(int fd, const ucred& client, const std::string& why) {
    ::close(fd);
    complain(title() + " refused pid " + std::to_string(client.pid) + " (uid " +
             std::to_string(client.uid) + "): " + why);
}

void listener::pause() {
    paused_ = true;
    hold();
    queue().after(dispatch::time::after(kPause), dispatch::block<void()>([this] {
                      queue_role_.entered();
                      paused_ = false;
                      if (may_take())
                          take_clients();
                      unhold();
                  }));
}

}  // namespace vox_link
