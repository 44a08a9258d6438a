#pragma once

#include <functional>
#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"

// Deferred replies. A handle points at a slot for the reply's value, null at
// first. Whoever handles the request may assign the slot, now or later; the
// reply leaves when the last holder of the handle lets go.
//
// Threads: handles may be released on any thread, which then sends. The slot
//          itself is not locked: one handler at a time writes it.
namespace plr::rest {

// Answers `request`: sends its reply, with the slot's value unless that is null,
// always. An empty handle when the request cannot be answered.
[[nodiscard]] PLR_EXPORT std::shared_ptr<vox::object> createAutoReplyValue(
    const vox::dict& request);

// Contributes to another deferred reply: if that one's slot holds a dictionary
// then, the value, a null one too, is stored in it under `key`. The outer reply
// waits for this one.
[[nodiscard]] PLR_EXPORT std::shared_ptr<vox::object> createAutoReplyValueInsideOuterReply(
    const std::shared_ptr<vox::object>& outer, const std::string& key);

// Calls `action`, unless empty, once with the slot's value. An exception that
// leaves it ends the process.
[[nodiscard]] PLR_EXPORT std::shared_ptr<vox::object> createAutoReplyWithAction(
    std::function<void(vox::object)>&& action);

}  // namespace plr::rest
