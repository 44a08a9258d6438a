#pragma once

#include <sys/types.h>

#include <string>

#include "platform/linux/vox/passed_sockets.h"

// The sockets behind service names.
//
// Names are taken under a lock file (flock(2)) beside the socket,
// named so that no service can have its name. A socket that nobody listens on
// any more is replaced; a live one never is.
namespace vox_link {

// A name that this process serves.
struct service_socket {
    passed_socket* passed = nullptr;  // from the service manager, who keeps it
    int fd = -1;                      // listening, non-blocking
    std::string path;
    dev_t device = 0;  // identity of the file, so that only our own is removed
    ino_t inode = 0;
};

// Takes `name`: the socket of the service manager if it passed one, else one of our
// own in the runtime directory, mode 0600 or, `for_everybody`, 0666. Returns 0, or an
// error number with the reason in `why`; EADDRINUSE when another serves it.
[[nodiscard]] int open_service(const std::string& name, bool for_everybody, service_socket& made,
                               std::string& why);
// Takes no more clients and removes the file if that is still ours. The
// socket stays open, and bound, until the caller closes it: nobody takes the
// file for a stale one meanwhile. One of the service manager is left as it is.
void withdraw_service(const service_socket& served) noexcept;

// Connects to `name` without blocking; the socket is in `fd`. Returns 0, EAGAIN
// when the service cannot take more now, ENOENT or ECONNREFUSED when nobody
// serves it, or another error number; `why` has the reason.
[[nodiscard]] int connect_service(const std::string& name, int& fd, std::string& why);

}  // namespace vox_link
