// Taps: clients that look on instead of taking part, at both ends.
#include <unistd.h>

#include <string>
#include <utility>

#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/peer_connection.h"
#include "platform/linux/vox/value_layout.h"

namespace vox_link {
namespace {

// What may wait for a tap that does not read.
constexpr std::size_t kMostWaiting = 1u << 20;

using vox_values::append;

}  // namespace

void peer_connection::handle_tap(const frame& arrived) {
    if (origin_.tap)
        return handle_entry(arrived);
    tap_hub* hub = tapped_.hub();
    if (!hub || !is_null_body(arrived.body) || stage_ == stage::tap || messages_received_ != 0)
        return violation("a tap frame where none is expected");
    const uid_t uid = credentials().uid;
    if (!hub->is_allowed())
        return refuse_tap("this service takes no taps");
    if (uid != 0 && uid != ::geteuid())
        return refuse_tap("taps are for root and the service's own user");
    tapped_.closed(nullptr);
    {
        const lock_guard guard(lock_);
        is_tap_ = true;
    }
    if (!hub->add(this))
        return refuse_tap("this service has too many taps already");
    stage_ = stage::tap;
}

void peer_connection::refuse_tap(const char* why) {
    send_control(frame_type::tap, 0, 0, vox_error_create(VOX_ERROR_CONNECTION_INVALID, why));
    flush();
    violation(std::string("it asked to be a tap: ") + why);
}

// A message from a tap, or one that the service sent to it before it knew.
void peer_connection::handle_stray(const frame& arrived) {
    let_go(arrived.descriptors);
    if (!origin_.tap)
        violation("a tap sent a message");
}

// ---- What taps see -------------------------------------------------------------------

void peer_connection::show_frame(const vox_wire::encoded& made, bool as_dropped) {
    if (!is_tap_)
        tapped_.show(tap_way::out, read_own_header(made.bytes.data()),
                     made.bytes.view().subspan(kHeaderBytes), as_dropped);
}

// ---- The service's end ---------------------------------------------------------------

bool peer_connection::has_room_for_entry() const {
    const lock_guard guard(lock_);
    return out_.bytes() < kMostWaiting && !abandoned_ && !broken_;
}

void peer_connection::send_entry(vox_object_t entry, std::uint64_t left_out) {
    vox_wire::encoded made;
    const int error = build_frame(frame_type::tap, 0, entry, peer_accepts_, made);
    const lock_guard guard(lock_);
    dropped_untold_ += left_out;
    if (abandoned_ || broken_)
        return;
    if (error == 0 && out_.bytes() < kMostWaiting)
        put(made, frame_type::tap);
    else
        ++dropped_untold_;
}

void peer_connection::leave_out(std::uint64_t entries) {
    const lock_guard guard(lock_);
    dropped_untold_ += entries;
    if (!can_write())
        return;  // it is told behind what waits
    if (out_.empty())
        tell_dropped();
    write_waiting();
}

// Writing to it is no work for the service's queue.
void peer_connection::unblock_tap() {
    hold();
    tapped_.hub()->async(dispatch::block<void()>([this] {
        unblock();
        unhold();
    }));
}

// ---- The tap's end -------------------------------------------------------------------

void peer_connection::handle_entry(const frame& arrived) {
    const char* why = nullptr;
    const vox_object_t value = vox_wire::decode(arrived.body, {}, accepts_, why);
    if (vox_dictionary_object* entry = vox_values::as_dictionary(value)) {
        messages_received_.fetch_add(1, std::memory_order_relaxed);
        show_value(*entry);
        deliver(entry);
    } else if (vox_get_type(value) == VOX_TYPE_ERROR) {
        const vox_object_t text = vox_error_get_value(value, vox_error_key_description);
        fail(VOX_ERROR_CONNECTION_INVALID, text ? vox_string_get_string_ptr(text) : "no taps");
    } else {
        violation(value ? "an entry is no dictionary" : why);
    }
    vox_release(value);
}

// The body as a value, as far as it is one, in place of its bytes.
void peer_connection::show_value(vox_dictionary_object& entry) const {
    const vox_object_t body = vox_dictionary_get_value(&entry, "b");
    if (vox_get_type(body) != VOX_TYPE_DATA)
        return;
    const char* why = nullptr;
    const auto* bytes = static_cast<const std::uint8_t*>(vox_data_get_bytes_ptr(body));
    const vox_object_t value =
        vox_wire::decode_without_descriptors({bytes, vox_data_get_length(body)}, {}, why);
    if (!value)
        return;
    vox_dictionary_set_value(&entry, "b", nullptr);
    append(entry, "v", value);
}

void peer_connection::deliver_missed(std::uint64_t entries) {
    vox_dictionary_object* event = vox_values::make_dictionary(2);
    append(*event, "k", vox_string_create("missed"));
    append(*event, "l", vox_uint64_create(entries));
    deliver(event);
    vox_release(event);
}

}  // namespace vox_link
