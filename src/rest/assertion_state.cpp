#include "plr/rest/assertion_state.h"

#include "plr/ipc/dict.h"
#include "plr/ipc/read.h"
#include "plr/ipc/values.h"
#include "plr/rest/value_coding.h"

namespace plr::rest {

const char* asString(AssertionState state) noexcept {
    switch (state) {
        case AssertionState::kIdle:
            return "kIdle";
        case AssertionState::kPending:
            return "kPending";
        case AssertionState::kGranted:
            return "kGranted";
    }
    // Deliberate: three question marks, where an unknown operation has one.
    return "???";
}

vox::object write_rest_value(const AssertionAcquireState& value) {
    const vox::dict written = vox::dict::create();
    written["generation"] = vox::int64(value.generation);
    written["state"] = detail::write_enum_string_value(
        static_cast<long long>(static_cast<int>(value.state)), asString(value.state));
    return written;
}

void read_rest_value(AssertionAcquireState& out, const vox::object& value) {
    const vox::dict written(value);
    out.generation = vox::dyn_cast_or_default(written["generation"], out.generation);
    int state = static_cast<int>(out.state);
    detail::read_enum_string_value(state, written["state"]);
    out.state = static_cast<AssertionState>(state);
}

}  // namespace plr::rest
