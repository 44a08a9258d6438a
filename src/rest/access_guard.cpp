#include "plr/rest/access_guard.h"

#include <algorithm>
#include <chrono>
#include <string>
#include <string_view>

#include "dispatch/time.h"
#include "plr/base/report.h"
#include "plr/ipc/values.h"

namespace plr::rest {
namespace {

constexpr std::chrono::nanoseconds kLineEvery = std::chrono::seconds(1);
constexpr std::size_t kLongestPath = 200;  // bytes in a line

// A stranger's text for a log: no line feeds, no escape sequences.
std::string readable(std::string_view text) {
    std::string made(text.substr(0, kLongestPath));
    std::replace_if(
        made.begin(), made.end(), [](char c) { return c < ' ' || c > '~'; }, '?');
    return made;
}

}  // namespace

bool AccessGuard::judge(RestResourceContext& context, const RestResourceBase& root,
                        const PathView& path) {
    const vox::connection sender = context.getRawAuthorConnection();
    if (!sender)
        return true;
    const Operation operation = asOperation(context.getRestOperation());
    if (rules_.allows(operation, reachedBy(root, operation, path), sender))
        return true;
    ++refusals_;
    tell(operation, path, sender.peer().uid);
    context.sendReplyWithValue(vox::error(VOX_ERROR_APPLICATION, "access denied"));
    return false;
}

void AccessGuard::tell(Operation operation, const PathView& path, uid_t user) {
    const std::int64_t now = dispatch::time::now().nanoseconds();
    if (now < nextLine_)
        return;
    nextLine_ = now + kLineEvery.count();
    report("REST: access denied to user %u: %s of %s (refused since the last such line: %llu)",
           user, asString(operation), readable(path.full()).c_str(),
           static_cast<unsigned long long>(refusals_ - told_));
    told_ = refusals_;
}

}  // namespace plr::rest
