// Apart from the other settings: the kernel's header, which has any rate, and the C
// library's <termios.h> define the same names.
#include <asm/termbits.h>
#include <sys/ioctl.h>

#include <cerrno>
#include <cstdint>

#include "serial/serial.h"

namespace {

bool is_near(std::uint64_t rate, std::uint64_t wanted) noexcept {
    const std::uint64_t off = rate > wanted ? rate - wanted : wanted - rate;
    return off * 100 <= wanted * 3;
}

}  // namespace

extern "C" int serial_set_baud(int port, uint32_t baud) {
    termios2 attributes;
    if (::ioctl(port, TCGETS2, &attributes) != 0)
        return -1;
    // Bits of the input speed that are 0 make it that of the output.
    attributes.c_cflag &= ~static_cast<tcflag_t>(CBAUD | (CBAUD << IBSHIFT));
    attributes.c_cflag |= BOTHER;
    attributes.c_ispeed = attributes.c_ospeed = baud;
    if (baud != 0) {  // which would hang up
        if (::ioctl(port, TCSETS2, &attributes) != 0 || ::ioctl(port, TCGETS2, &attributes) != 0)
            return -1;
        if (is_near(attributes.c_ospeed, baud))
            return 0;
    }
    errno = EINVAL;
    return -1;
}
