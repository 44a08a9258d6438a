#include "io/uart_device.h"

#include <asm/termbits.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <pthread.h>
#include <sys/ioctl.h>

#include <cstdarg>
#include <cstdint>
#include <string_view>

using namespace plr::test;

namespace {

template <class Function>
Function* next(Function*, const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}
#define NEXT(name) next(::name, #name)

}  // namespace

#define IN_PLACE extern "C" __attribute__((visibility("default")))

IN_PLACE int open(const char* path, int flags, ...) {
    va_list more;
    va_start(more, flags);
    const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(more, mode_t) : 0;
    va_end(more);
    if (std::string_view(path).starts_with("/dev/uart.")) {
        device::asked = path;
        path = device::path.c_str();
    }
    return NEXT(open)(path, flags, mode);
}

IN_PLACE int ioctl(int fd, unsigned long request, ...) noexcept {
    va_list more;
    va_start(more, request);
    void* const argument = va_arg(more, void*);
    va_end(more);
    if (request == TIOCOUTQ && device::unsent) {
        *static_cast<int*>(argument) = device::unsent();
        return 0;
    }
    const int result = NEXT(ioctl)(fd, request, argument);
    if (request == TCGETS2) {
        speed_t& rate = static_cast<termios2*>(argument)->c_ospeed;
        rate = static_cast<speed_t>(std::uint64_t{rate} * device::baudPercent / 100);
    }
    return result;
}

extern "C" int tcflush(int fd, int queue) noexcept;
IN_PLACE int tcflush(int fd, int queue) noexcept {
    device::discarded += queue == TCOFLUSH;
    return NEXT(tcflush)(fd, queue);
}

// A thread with such a stack cannot be made. Sanitizers set other sizes.
IN_PLACE int pthread_attr_setstacksize(pthread_attr_t* attributes, size_t size) noexcept {
    if (size == 256 * 1024 && device::threadsLeft >= 0 && device::threadsLeft-- == 0)
        size = size_t{1} << 50;
    return NEXT(pthread_attr_setstacksize)(attributes, size);
}
