#pragma once

#include <cstdint>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// What the parties of an assertion are told (assertion_resource.h). Any thread.
namespace plr::rest {

enum class AssertionState : int {
    kIdle = 0,
    kPending = 1,
    kGranted = 2,
};

// "kIdle", "kPending", "kGranted"; "???" for everything else.
[[nodiscard]] PLR_EXPORT const char* asString(AssertionState state) noexcept;

// The value of every notification of an assertion. On the wire a dictionary:
//
//   "generation"  signed integer, 0 to 4294967295
//   "state"       "0:kIdle", "1:kPending" or "2:kGranted"
struct AssertionAcquireState {
    std::uint32_t generation = 0;
    AssertionState state = AssertionState::kIdle;

    friend bool operator==(const AssertionAcquireState&, const AssertionAcquireState&) = default;
};

[[nodiscard]] PLR_EXPORT vox::object write_rest_value(const AssertionAcquireState& value);
// Lenient: what cannot be read of `value` keeps what `out` had.
PLR_EXPORT void read_rest_value(AssertionAcquireState& out, const vox::object& value);

}  // namespace plr::rest
