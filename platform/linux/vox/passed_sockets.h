#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

// Listening sockets that the service manager passed to this process, as
// sd_listen_fds(3) has it: $LISTEN_PID is this process, its descriptors from 3
// on are $LISTEN_FDS sockets, and $LISTEN_FDNAMES names them, with ':' between.
//
// They are read once, when the first is asked for, and are close-on-exec from
// then on. They stay the service manager's: a listener uses a duplicate and
// never shuts the socket down, so that clients wait in it for the next listener,
// in this process or another.
// Threads: any.
namespace vox_link {

// What was passed; empty, with the reason in `why` if somebody should hear of it,
// when the variables (null: not set) do not say.
struct passed_name {
    std::string name;
    int fd;
};
[[nodiscard]] std::vector<passed_name> read_passed_names(pid_t self, const char* pid,
                                                         const char* count, const char* names,
                                                         std::string& why);

// One socket of this process's.
struct passed_socket;

// Takes the socket named `service` or "<service>.socket": `fd` is a duplicate of
// the caller's, non-blocking. Returns 0, ENOENT when there is none, EADDRINUSE
// while another has taken it, or another error number; `why` has the reason.
[[nodiscard]] int take_passed_socket(const std::string& service, passed_socket*& taken, int& fd,
                                     std::string& why);
// It may be taken again.
void give_back_passed_socket(passed_socket& taken) noexcept;

}  // namespace vox_link
