#include "platform/linux/vox/service_socket.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstring>
#include <utility>

#include "platform/linux/vox/names.h"

namespace vox_link {
namespace {

constexpr int kBacklog = 4096;  // the kernel caps it (net.core.somaxconn)
constexpr mode_t kOwnerOnly = 0600;
constexpr mode_t kEverybody = 0666;

class descriptor {
  public:
    explicit descriptor(int fd) noexcept : fd_(fd) {}
    descriptor(const descriptor&) = delete;
    descriptor& operator=(const descriptor&) = delete;
    ~descriptor() {
        if (fd_ >= 0)
            ::close(fd_);
    }
    [[nodiscard]] int get() const noexcept { return fd_; }
    [[nodiscard]] int release() noexcept { return std::exchange(fd_, -1); }

  private:
    int fd_;
};

int failure(int error, const std::string& what, std::string& why) {
    why = what + ": " + ::strerrordesc_np(error);
    return error;
}

bool make_address(const std::string& path, sockaddr_un& address) noexcept {
    address = {};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path)
        return false;
    std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
    return true;
}

const sockaddr* generic(const sockaddr_un& address) noexcept {
    return reinterpret_cast<const sockaddr*>(&address);
}

int connect_socket(int fd, const sockaddr_un& address) noexcept {
    while (::connect(fd, generic(address), sizeof address) != 0) {
        if (errno != EINTR)
            return errno;
    }
    return 0;
}

// A datagram socket cannot connect to a stream listener, but the kernel says
// whether one is alive; the listener notices nothing.
bool is_alive(const sockaddr_un& address) noexcept {
    const descriptor probe(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    return probe.get() < 0 || connect_socket(probe.get(), address) != ECONNREFUSED;
}

int take_lock(const std::string& path, std::string& why) {
    descriptor lock(
        ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, kOwnerOnly));
    if (lock.get() < 0)
        return -failure(errno, path, why);
    while (::flock(lock.get(), LOCK_EX) != 0) {
        if (errno != EINTR)
            return -failure(errno, path, why);
    }
    return lock.release();
}

int remove_stale(const std::string& path, const sockaddr_un& address, std::string& why) {
    struct stat found {};
    if (::lstat(path.c_str(), &found) != 0)
        return errno == ENOENT ? 0 : failure(errno, path, why);
    if (!S_ISSOCK(found.st_mode)) {
        why = path + " is no socket";
        return EEXIST;
    }
    if (is_alive(address)) {
        why = "EADDRINUSE: " + path + " is served already";
        return EADDRINUSE;
    }
    return ::unlink(path.c_str()) == 0 || errno == ENOENT ? 0 : failure(errno, path, why);
}

int bind_socket(const sockaddr_un& address, bool for_everybody, service_socket& made,
                std::string& why) {
    descriptor listening(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (listening.get() < 0)
        return failure(errno, "socket", why);
    // The file gets the mode that the socket has now, less the umask: it is never
    // open to others before it is meant to be.
    if (::fchmod(listening.get(), kOwnerOnly) != 0)
        return failure(errno, "fchmod", why);
    if (::bind(listening.get(), generic(address), sizeof address) != 0)
        return failure(errno, made.path, why);
    struct stat file {};
    if ((for_everybody && ::chmod(made.path.c_str(), kEverybody) != 0) ||
        ::listen(listening.get(), kBacklog) != 0 || ::lstat(made.path.c_str(), &file) != 0) {
        const int error = errno;
        ::unlink(made.path.c_str());
        return failure(error, made.path, why);
    }
    made.device = file.st_dev;
    made.inode = file.st_ino;
    made.fd = listening.release();
    return 0;
}

int make_socket(const std::string& name, bool for_everybody, service_socket& made,
                std::string& why) {
    const std::string directory = runtime_directory();
    if (const int error = check_directory(directory, true, why); error != 0)
        return error;
    made.path = directory + "/" + name;
    sockaddr_un address;
    if (!make_address(made.path, address))
        return failure(ENAMETOOLONG, made.path, why);
    const int lock = take_lock(directory + "/." + name + ".lock", why);
    if (lock < 0)
        return -lock;
    const descriptor held(lock);
    const int error = remove_stale(made.path, address, why);
    return error != 0 ? error : bind_socket(address, for_everybody, made, why);
}

}  // namespace

int open_service(const std::string& name, bool for_everybody, service_socket& made,
                 std::string& why) {
    if (!is_service_name(name)) {
        why = "'" + name + "' is no name of a service";
        return EINVAL;
    }
    const int error = take_passed_socket(name, made.passed, made.fd, why);
    return error == ENOENT ? make_socket(name, for_everybody, made, why) : error;
}

void withdraw_service(const service_socket& served) noexcept {
    if (served.passed)
        return give_back_passed_socket(*served.passed);
    ::shutdown(served.fd, SHUT_RDWR);
    struct stat file {};
    if (::lstat(served.path.c_str(), &file) == 0 && file.st_dev == served.device &&
        file.st_ino == served.inode)
        ::unlink(served.path.c_str());
}

int connect_service(const std::string& name, int& fd, std::string& why) {
    if (!is_service_name(name)) {
        why = "'" + name + "' is no name of a service";
        return EINVAL;
    }
    const std::string directory = runtime_directory();
    if (const int error = check_directory(directory, false, why); error != 0)
        return error;
    sockaddr_un address;
    const std::string path = directory + "/" + name;
    if (!make_address(path, address))
        return failure(ENAMETOOLONG, path, why);
    descriptor made(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (made.get() < 0)
        return failure(errno, "socket", why);
    if (const int error = connect_socket(made.get(), address); error != 0)
        return failure(error, path, why);
    fd = made.release();
    return 0;
}

}  // namespace vox_link
