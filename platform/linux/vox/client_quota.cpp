#include "platform/linux/vox/client_quota.h"

namespace vox_link {

client_quota::ticket client_quota::take(uid_t user) {
    const lock_guard guard(lock_);
    if (used_ >= most_)
        return {};
    std::uint32_t& of_user = by_user_[user];
    if (of_user >= most_per_user_)
        return {};
    ++of_user;
    ++used_;
    return {shared_from_this(), user};
}

void client_quota::give_back(uid_t user) noexcept {
    const lock_guard guard(lock_);
    --used_;
    const auto found = by_user_.find(user);
    if (--found->second == 0)
        by_user_.erase(found);
}

}  // namespace vox_link
