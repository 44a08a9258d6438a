#include "platform/linux/vox/connection.h"

#include <utility>

#include "platform/linux/vox/complaint.h"
#include "plr/base/assert.h"

namespace vox_link {
namespace {

bool is_concurrent(const dispatch::queue& queue) noexcept {
    using dispatch::priority;
    return queue == dispatch::queue::global(priority::normal) ||
           queue == dispatch::queue::global(priority::high) ||
           queue == dispatch::queue::global(priority::low);
}

}  // namespace

const vox_custom_vtable connection::kVtable = {
    [](vox_custom_object* object) noexcept { static_cast<connection*>(object)->references_gone(); },
    [](vox_custom_object* remote, vox_dictionary_object& message) noexcept {
        static_cast<connection*>(remote)->message_gone(message);
    },
    [](vox_custom_object* from) noexcept { static_cast<connection*>(from)->descriptor_gone(); },
    [](const vox_custom_object* object, std::string& out) {
        const auto* described = static_cast<const connection*>(object);
        out += described->is_listener() ? "listener" : "connection";
        if (!described->name().empty())
            out += " '" + described->name() + "'";
    },
};

connection::turn_item::turn_item(connection* of) noexcept
    : embedded_item(
          [](embedded_item* work) noexcept { static_cast<turn_item*>(work)->owner->run_turn(); }),
      owner(of) {}

connection::connection(std::string name)
    : vox_custom_object(VOX_TYPE_CONNECTION, &kVtable), name_(std::move(name)), turn_(this) {}

connection* connection::from(vox_object_t object) noexcept {
    return static_cast<connection*>(vox_values::as<vox_custom_object>(object, VOX_TYPE_CONNECTION));
}

void connection::unhold() noexcept {
    if (holds_.fetch_sub(1, std::memory_order_acq_rel) == 1)
        delete this;
}

void connection::references_gone() noexcept {
    cancel();
    unhold();
}

void connection::set_event_handler(event_block handler) {
    PLR_ASSERT(!started_.load(), "vox_connection_set_event_handler() after the first resume");
    if (!cancelled_.load())
        handler_ = std::move(handler);
}

void connection::set_target_queue(dispatch::queue queue) {
    PLR_ASSERT(!started_.load(), "vox_connection_set_target_queue() after the first resume");
    if (cancelled_.load())
        return;
    // Events come one at a time, on a concurrent queue too.
    queue_ = is_concurrent(queue) ? dispatch::queue::create(label(), queue) : std::move(queue);
}

void connection::resume() {
    const int before = suspensions_.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before > 0, "a Vox connection was resumed more often than suspended");
    if (before > 1)
        return;
    if (cancelled_.load() || started_.exchange(true)) {
        schedule();
        return;
    }
    settle_queue();
    start();
}

void connection::suspend() noexcept {
    suspensions_.fetch_add(1, std::memory_order_acq_rel);
}

void connection::cancel() {
    if (cancelled_.exchange(true))
        return;
    settle_queue();
    fail(VOX_ERROR_CONNECTION_INVALID, "the connection was cancelled");
    schedule();  // a connection that failed while suspended ends now
}

void connection::settle_queue() {
    const lock_guard guard(lock_);
    if (!queue_)
        queue_ = dispatch::queue::create(label());
}

void connection::fail(std::int64_t code, std::string reason, blame blamed) {
    const lock_guard guard(lock_);
    fail_locked(code, std::move(reason), blamed);
}

void connection::fail_locked(std::int64_t code, std::string reason, blame blamed) {
    if (why_)
        return;
    why_ = std::make_unique<ending>(ending{code, std::move(reason), blamed});
    cut_off();
    ending_.store(true, std::memory_order_release);
    schedule();
}

void connection::schedule() {
    if (scheduled_.exchange(true, std::memory_order_acq_rel))
        return;
    hold();
    dispatch::detail::submit(queue_.get(), &turn_);
}

void connection::run_turn() {
    queue_role_.entered();
    scheduled_.exchange(false, std::memory_order_acq_rel);
    if (is_ending()) {
        // Nothing is delivered while suspended; only cancelling overrides that.
        if (cancelled_.load() || !is_suspended())
            end();
    } else if (!is_suspended()) {
        turn();
    }
    unhold();
}

void connection::end() {
    if (std::exchange(ended_, true))
        return;
    std::unique_ptr<ending> why;
    {
        const lock_guard guard(lock_);
        why = std::make_unique<ending>(*why_);
    }
    if (why->blamed != blame::nobody) {
        complain(title() + " ended: " + why->reason);
        count_blame(why->blamed);
    }
    const vox_object_t error = vox_error_create(why->code, why->reason.c_str());
    wind_up(error);
    deliver(error);
    vox_release(error);
    handler_ = nullptr;
}

void connection::deliver(vox_object_t event) {
    if (handler_)
        handler_(event);
}

borrowed_reference::borrowed_reference(connection* of) noexcept : taken_(nullptr) {
    std::uint32_t count = of->references.load(std::memory_order_relaxed);
    while (count != 0) {
        if (of->references.compare_exchange_weak(count, count + 1, std::memory_order_acquire,
                                                 std::memory_order_relaxed)) {
            taken_ = of;
            return;
        }
    }
}

borrowed_reference::~borrowed_reference() {
    vox_release(taken_);
}

}  // namespace vox_link
