#include "platform/linux/vox/passed_sockets.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <optional>
#include <string_view>

#include "platform/linux/vox/complaint.h"
#include "platform/linux/vox/lock.h"
#include "platform/linux/vox/socket_io.h"

namespace vox_link {

struct passed_socket {
    std::string name;
    int fd;  // never closed
    bool in_use = false;
};

namespace {

constexpr int kFirst = 3;  // SD_LISTEN_FDS_START
constexpr int kMost = 4096;

std::optional<int> number(std::string_view text) noexcept {
    int value = 0;
    const char* end = text.data() + text.size();
    const auto [stopped, error] = std::from_chars(text.data(), end, value);
    if (error != std::errc() || stopped != end || value < 0)
        return std::nullopt;
    return value;
}

std::vector<std::string> split(std::string_view names) {
    std::vector<std::string> parts;
    for (;;) {
        const std::size_t colon = names.find(':');
        parts.emplace_back(names.substr(0, colon));
        if (colon == std::string_view::npos)
            return parts;
        names.remove_prefix(colon + 1);
    }
}

const char* variable(const char* name) noexcept {
    return std::getenv(name);  // NOLINT(concurrency-mt-unsafe): only reads
}

struct table {
    mutex lock;
    std::deque<passed_socket> sockets PLR_GUARDED_BY(lock);
};

table* read_environment() {
    auto* made = new table;
    std::string why;
    const lock_guard guard(made->lock);
    for (passed_name& found :
         read_passed_names(::getpid(), variable("LISTEN_PID"), variable("LISTEN_FDS"),
                           variable("LISTEN_FDNAMES"), why)) {
        ::fcntl(found.fd, F_SETFD, FD_CLOEXEC);
        made->sockets.push_back({.name = std::move(found.name), .fd = found.fd});
    }
    if (!why.empty())
        complain("sockets of the service manager are not used: " + why);
    return made;
}

// Never destroyed: the sockets are the process's.
table& passed() {
    static table* const shared = read_environment();
    return *shared;
}

// The one of that name; null when there is none, or more than one.
passed_socket* find(std::deque<passed_socket>& sockets, const std::string& name, int& error) {
    passed_socket* found = nullptr;
    for (passed_socket& each : sockets) {
        if (each.name != name)
            continue;
        error = found ? ENOTUNIQ : 0;
        found = &each;
    }
    return error == 0 ? found : nullptr;
}

int duplicate(const passed_socket& socket, int& fd) {
    const int flags = ::fcntl(socket.fd, F_GETFL);
    if (flags < 0)
        return errno;
    if (!is_stream_socket(socket.fd, true))
        return ENOTSOCK;
    if (::fcntl(socket.fd, F_SETFL, flags | O_NONBLOCK) != 0)
        return errno;
    fd = ::fcntl(socket.fd, F_DUPFD_CLOEXEC, 0);
    return fd < 0 ? errno : 0;
}

std::string reason(int error, const std::string& service) {
    const std::string socket = "the socket that the service manager passed for '" + service + "'";
    switch (error) {
        case EADDRINUSE:
            return "EADDRINUSE: " + socket + " is served already";
        case ENOTUNIQ:
            return "the service manager passed several sockets for '" + service + "'";
        case ENOTSOCK:
            return socket + " is no listening AF_UNIX stream socket";
        default:
            return socket + " cannot be used: " + ::strerrordesc_np(error);
    }
}

}  // namespace

std::vector<passed_name> read_passed_names(pid_t self, const char* pid, const char* count,
                                           const char* names, std::string& why) {
    if (!pid || !count)
        return {};
    const std::optional<int> whose = number(pid);
    // They are often inherited from a parent that they were for.
    if (whose && *whose != self)
        return {};
    const std::optional<int> sockets = number(count);
    std::vector<std::string> parts;
    if (!whose)
        why = "LISTEN_PID is no number";
    else if (!sockets || *sockets > kMost)
        why = "LISTEN_FDS is no number up to " + std::to_string(kMost);
    else if (*sockets > 0 && !names)
        why = "LISTEN_FDNAMES is missing";
    else if (*sockets > 0 && (parts = split(names)).size() != static_cast<std::size_t>(*sockets))
        why = "LISTEN_FDNAMES has not as many names as LISTEN_FDS says";
    if (!why.empty())
        return {};
    std::vector<passed_name> found;
    found.reserve(parts.size());
    for (std::string& name : parts)
        found.push_back({std::move(name), kFirst + static_cast<int>(found.size())});
    return found;
}

int take_passed_socket(const std::string& service, passed_socket*& taken, int& fd,
                       std::string& why) {
    table& all = passed();
    const lock_guard guard(all.lock);
    int error = 0;
    passed_socket* found = find(all.sockets, service, error);
    if (!found && error == 0)
        found = find(all.sockets, service + ".socket", error);
    if (!found && error == 0)
        return ENOENT;
    if (error == 0)
        error = found->in_use ? EADDRINUSE : duplicate(*found, fd);
    if (error != 0) {
        why = reason(error, service);
        return error;
    }
    found->in_use = true;
    taken = found;
    return 0;
}

void give_back_passed_socket(passed_socket& taken) noexcept {
    const lock_guard guard(passed().lock);
    taken.in_use = false;
}

}  // namespace vox_link
