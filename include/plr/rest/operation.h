#pragma once

#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/object.h"

// The operations of REST messages and their strings on the wire. Any thread.
namespace plr::rest {

// Fixed numbers, which resources and clients compare against.
enum class Operation : int {
    kNone = 0,  // absent, null, no string or an unknown one
    kSet = 1,
    kGet = 2,
    kPush = 3,
    kPop = 4,
    kNotify = 5,
    kPing = 6,
};

// Exact and case-sensitive; kNone for everything that is no operation.
[[nodiscard]] PLR_EXPORT Operation asOperation(std::string_view text) noexcept;
[[nodiscard]] inline Operation asOperation(const vox::object& value) noexcept {
    return asOperation(value.text());
}
// "set", "get", "push", "pop", "notify", "ping"; "?" for everything else.
[[nodiscard]] PLR_EXPORT const char* asString(Operation operation) noexcept;
// The same as a Vox string, made once; the null object for kNone and unknown.
[[nodiscard]] PLR_EXPORT const vox::object& asObject(Operation operation);

}  // namespace plr::rest
