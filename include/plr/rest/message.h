#pragma once

#include "plr/base/export.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/object.h"
#include "plr/rest/operation.h"

// A REST message, in both directions, is one dictionary:
//
//   "o"  string   the operation (operation.h)
//   "a"  string   the author: the name of the client that sends, and in a
//                 notification the name of the client that receives
//   "r"  string   the path of the resource, '/'-separated (path_view.h)
//   "v"  any      the value to set, to push, notified, or returned in a reply
//   "e"  string   in replies, instead of "v": what went wrong
//
// A key that holds the null object and one that is absent mean the same. A ping
// holds "o" only. A reply repeats the request's "o" and "r".
//
// Threads: any; the functions keep no state.
// Errors:  none is thrown; what cannot be made is the null object.
namespace plr::rest {

namespace key {
inline constexpr const char* kOperation = "o";
inline constexpr const char* kAuthor = "a";
inline constexpr const char* kResource = "r";
inline constexpr const char* kValue = "v";
inline constexpr const char* kError = "e";
}  // namespace key

// All four keys in the order "o", "a", "r", "v", null ones too.
[[nodiscard]] PLR_EXPORT vox::dict createRestMessage(const vox::object& operation,
                                                     const vox::object& author,
                                                     const vox::object& resource,
                                                     const vox::object& value);
[[nodiscard]] PLR_EXPORT vox::dict createNotify(const vox::object& author,
                                                const vox::object& resource,
                                                const vox::object& value);
[[nodiscard]] PLR_EXPORT vox::dict createPingMessage();

// The reply to a received request, with its "o" and "r" where it has them. The
// null object when no reply is wanted, or one was made already.
[[nodiscard]] PLR_EXPORT vox::dict createReply(const vox::dict& request);
// Stores the value under "v", or the description of an error under "e" (null
// when it has none).
PLR_EXPORT void updateReplyValue(const vox::dict& reply, const vox::object& value);
[[nodiscard]] PLR_EXPORT vox::dict createReplyWithValue(const vox::dict& request,
                                                        const vox::object& value);
// The "v" of a reply; null for anything else. Does not look at "e".
[[nodiscard]] PLR_EXPORT vox::object getReplyValue(const vox::dict& reply);

}  // namespace plr::rest
