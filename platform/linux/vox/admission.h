#pragma once

#include <sys/types.h>

#include <span>
#include <vector>

#include "vox/listener.h"

// Whom a listener lets in.
namespace vox_link {

class admission {
  public:
    // Root and the user that the service runs as.
    admission() = default;
    // These two and whom `policy` names.
    explicit admission(const vox_policy_t& policy);
    [[nodiscard]] static admission of_everybody();

    // Whether a process of `user`, with the primary group `group` and the
    // supplementary `groups`, may connect to a service that runs as `self`.
    [[nodiscard]] bool admits(uid_t self, uid_t user, gid_t group,
                              std::span<const gid_t> groups) const noexcept;
    // Whether anybody else than `self` and root may get in.
    [[nodiscard]] bool lets_others_in() const noexcept;
    [[nodiscard]] bool names_groups() const noexcept { return !groups_.empty(); }

  private:
    [[nodiscard]] bool names(gid_t group) const noexcept;

    std::vector<uid_t> users_;
    std::vector<gid_t> groups_;
    bool everybody_ = false;
};

}  // namespace vox_link
