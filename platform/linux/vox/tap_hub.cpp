#include "platform/linux/vox/tap_hub.h"

#include <algorithm>
#include <array>
#include <ctime>
#include <string_view>
#include <utility>

#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/value_layout.h"

namespace vox_link {
namespace {

// Of the list.
constexpr std::size_t kMostEntries = 16384;
constexpr std::size_t kMostBytes = 4u << 20;
// Of one listener.
constexpr std::size_t kMostTaps = 16;
// Longer bodies are not shown.
constexpr std::size_t kMostBody = 64u << 10;

constexpr std::array<const char*, 9> kKinds = {"start",   "message", "request", "reply", "cancel",
                                               "refused", "dropped", "open",    "close"};
static_assert(kKinds.size() == static_cast<std::size_t>(tap_kind::close) + 1);

tap_kind kind_of(frame_type type) noexcept {
    switch (type) {
        case frame_type::request:
            return tap_kind::request;
        case frame_type::reply:
            return tap_kind::reply;
        case frame_type::cancel:
            return tap_kind::cancel;
        case frame_type::dropped:
            return tap_kind::dropped;
        case frame_type::refused:
            return tap_kind::refused;
        default:
            return tap_kind::message;
    }
}

std::int64_t wall_clock() noexcept {
    timespec time{};
    ::clock_gettime(CLOCK_REALTIME, &time);
    return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

// A new dictionary for the wire; docs/wire-protocol.md has its keys.
vox_object_t describe(const tap_entry& entry, const std::uint8_t* bodies) {
    vox_dictionary_object* made = vox_values::make_dictionary(10);
    const auto add = [made](std::string_view key, vox_object_t value) {
        vox_values::append(*made, key, value);
    };
    add("k", vox_string_create(kKinds[static_cast<std::size_t>(entry.kind)]));
    add("t", vox_date_create(entry.time));
    if (entry.kind == tap_kind::start)
        return made;
    add("c", vox_uint64_create(entry.client));
    add("p", vox_int64_create(entry.pid));
    add("u", vox_int64_create(entry.uid));
    if (entry.way != tap_way::none) {
        add("d", vox_string_create(entry.way == tap_way::in ? "in" : "out"));
        if (entry.request != 0)
            add("i", vox_uint64_create(entry.request));
        add("n", vox_uint64_create(entry.length));
        add("f", vox_uint64_create(entry.descriptors));
    }
    if (entry.kept > 0)
        add("b", vox_data_create(bodies + entry.at, entry.kept));
    return made;
}

}  // namespace

// ---- Taps ----------------------------------------------------------------------------

struct tap_hub::tap {
    tap(peer_connection* of, std::uint64_t first) : to(of), next(first) { to->hold(); }
    ~tap() { to->unhold(); }
    tap(const tap&) = delete;
    tap& operator=(const tap&) = delete;

    void send(const tap_entry& entry, vox_object_t value) {
        // What was published before it came is not for it.
        if (entry.index < next)
            return;
        to->send_entry(value, entry.index - next);
        next = entry.index + 1;
    }
    void start() {
        if (std::exchange(started, true))
            return;
        const vox_object_t value = describe({.time = wall_clock()}, nullptr);
        to->send_entry(value, 0);
        vox_release(value);
    }
    // Everything before the entry `end` was sent or is left out.
    void catch_up(std::uint64_t end) {
        if (end > next)
            to->leave_out(end - std::exchange(next, end));
    }

    peer_connection* const to;
    std::uint64_t next;  // entry; on the queue
    bool started = false;
};

void tap_hub::list::clear() noexcept {
    entries.clear();
    bodies.clear();
}

bool tap_hub::add(peer_connection* tap_connection) {
    {
        const lock_guard guard(lock_);
        if (taps_.size() == kMostTaps)
            return false;
        if (!queue_)
            queue_ = dispatch::queue::create("vox.taps",
                                             dispatch::queue::global(dispatch::priority::low));
        taps_.push_back(std::make_shared<tap>(tap_connection, published_));
        count_.store(static_cast<std::uint32_t>(taps_.size()), std::memory_order_relaxed);
    }
    async(dispatch::block<void()>([self = shared_from_this()] { self->drain(); }));
    return true;
}

void tap_hub::remove(peer_connection* tap_connection) {
    {
        const lock_guard guard(lock_);
        std::erase_if(taps_, [=](const auto& each) { return each->to == tap_connection; });
        count_.store(static_cast<std::uint32_t>(taps_.size()), std::memory_order_relaxed);
        if (!taps_.empty())
            return;
    }
    async(dispatch::block<void()>([self = shared_from_this()] { self->drain(); }));
}

void tap_hub::async(dispatch::block<void()> work) {
    dispatch::queue queue;
    {
        const lock_guard guard(lock_);
        queue = queue_;
    }
    queue.async(std::move(work));
}

// ---- Entries -------------------------------------------------------------------------

void tap_hub::publish(tapped_client& about, tap_entry entry, std::span<const std::uint8_t> body) {
    entry.time = wall_clock();
    {
        const lock_guard guard(lock_);
        if (!about.open_.exchange(entry.kind != tap_kind::close, std::memory_order_relaxed)) {
            tap_entry first = about.entry(tap_kind::open);
            first.time = entry.time;
            append(first, {});
        }
        if (entry.kind != tap_kind::open)
            append(entry, body);
        if (std::exchange(draining_, true))
            return;
    }
    async(dispatch::block<void()>([self = shared_from_this()] { self->drain(); }));
}

void tap_hub::append(tap_entry entry, std::span<const std::uint8_t> body) {
    entry.index = published_++;
    const std::size_t kept = body.size() > kMostBody ? 0 : body.size();
    if (list_.entries.size() == kMostEntries || list_.bodies.size() + kept > kMostBytes)
        return;
    entry.at = list_.bodies.size();
    entry.kept = kept;
    list_.bodies.append(body.first(kept));
    list_.entries.push_back(entry);
}

void tap_hub::drain() {
    taps to;
    std::uint64_t end = 0;
    {
        const lock_guard guard(lock_);
        draining_ = false;
        std::swap(list_, sending_);
        end = published_;
        to = taps_;
        if (to.empty())
            list_ = {};
    }
    for (const auto& each : to)
        each->start();
    send(to, sending_);
    for (const auto& each : to)
        each->catch_up(end);
    sending_.clear();
    if (to.empty())
        sending_ = {};
}

// While no tap has room nothing is made; what they miss is counted later.
void tap_hub::send(const taps& to, const list& what) {
    for (const tap_entry& entry : what.entries) {
        if (std::none_of(to.begin(), to.end(),
                         [](const auto& each) { return each->to->has_room_for_entry(); }))
            continue;
        const vox_object_t value = describe(entry, what.bodies.data());
        for (const auto& each : to)
            each->send(entry, value);
        vox_release(value);
    }
}

// ---- Clients -------------------------------------------------------------------------

void tapped_client::bind(std::shared_ptr<tap_hub> hub, const ucred& peer) {
    static std::atomic<std::uint64_t> last{0};
    hub_ = std::move(hub);
    if (hub_)
        number_ = last.fetch_add(1, std::memory_order_relaxed) + 1;
    pid_ = peer.pid;
    uid_ = peer.uid;
}

tap_entry tapped_client::entry(tap_kind kind) const noexcept {
    return {.kind = kind, .client = number_, .pid = pid_, .uid = uid_};
}

void tapped_client::show_open() {
    if (is_watched())
        hub_->publish(*this, entry(tap_kind::open), {});
    else
        open_.store(true, std::memory_order_relaxed);
}

void tapped_client::show(tap_way way, const frame_header& header,
                         std::span<const std::uint8_t> body, bool as_dropped) {
    tap_entry made = entry(as_dropped ? tap_kind::dropped : kind_of(header.type));
    made.way = way;
    made.descriptors = header.descriptors;
    made.length = header.length;
    made.request = header.id;
    hub_->publish(*this, made, body);
}

void tapped_client::closed(vox_object_t reason) {
    if (!is_watched() || !open_.load(std::memory_order_relaxed))
        return;
    vox_wire::encoded body;
    if (reason)
        static_cast<void>(vox_wire::encode(reason, {}, body));
    hub_->publish(*this, entry(tap_kind::close), body.bytes.view());
}

}  // namespace vox_link
