#pragma once

#include <sys/types.h>

#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "vox/limits.h"
#include "vox/listener.h"

// vox::listener is a connection that takes clients, or the null object, on which
// every member does nothing. vox/listener.h says how listeners behave.
namespace vox {

// Whom a listener takes besides root and this process's own user.
struct policy {
    std::vector<uid_t> users;
    std::vector<gid_t> groups;  // primary or supplementary
    bool everybody = false;
};

class PLR_EXPORT listener : public connection {
  public:
    listener() noexcept = default;
    // The listener of the service `name`, or one that only endpoints reach.
    // `limits` null for the defaults. Made suspended; tells what is wrong by its
    // error event.
    [[nodiscard]] static listener create(const char* name, const vox_limits_t* limits = nullptr);
    [[nodiscard]] static listener create_anonymous(const vox_limits_t* limits = nullptr);

    // Before the first resume() only.
    void set_policy(const policy& policy) const;
    void set_taps(bool allowed) const;

    // Of the listener and all its clients; of the clients of one user.
    [[nodiscard]] vox_listener_statistics_t listener_statistics() const;
    [[nodiscard]] vox_user_statistics_t user_statistics(uid_t user) const;

  private:
    explicit listener(vox_connection_t made) noexcept : connection(object::adopt(made)) {}
};

}  // namespace vox
