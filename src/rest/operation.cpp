#include "plr/rest/operation.h"

#include <array>
#include <cstddef>

#include "plr/ipc/values.h"

namespace plr::rest {
namespace {

// In the order of Operation.
constexpr std::array<std::string_view, 7> kNames = {"?",   "set",    "get", "push",
                                                    "pop", "notify", "ping"};

constexpr std::size_t indexOf(Operation operation) noexcept {
    const auto index = static_cast<std::size_t>(operation);
    return index < kNames.size() ? index : 0;
}

}  // namespace

Operation asOperation(std::string_view text) noexcept {
    for (const Operation known : {Operation::kGet, Operation::kSet, Operation::kPush,
                                  Operation::kPop, Operation::kNotify, Operation::kPing})
        if (text == kNames[indexOf(known)])
            return known;
    return Operation::kNone;
}

const char* asString(Operation operation) noexcept {
    return kNames[indexOf(operation)].data();
}

const vox::object& asObject(Operation operation) {
    // Never destroyed: messages are still sent while a process ends.
    static const auto& objects = *[] {
        auto* made = new std::array<vox::object, kNames.size()>();
        for (std::size_t i = 1; i < kNames.size(); ++i)
            (*made)[i] = vox::string(kNames[i]);
        return made;
    }();
    return objects[indexOf(operation)];
}

}  // namespace plr::rest
