#include <termios.h>

#include <cerrno>

#include "serial/serial.h"

extern "C" {

int serial_get_attributes(int port, struct termios* attributes) {
    return ::tcgetattr(port, attributes);
}

int serial_set_attributes(int port, const struct termios* attributes) {
    return ::tcsetattr(port, TCSANOW, attributes);
}

void serial_make_raw(struct termios* attributes, int flow_control) {
    const auto without = [](tcflag_t& flags, tcflag_t cleared) { flags &= ~cleared; };
    without(attributes->c_iflag, IXANY | IXOFF | IXON | ICRNL | ISTRIP | INPCK | BRKINT);
    attributes->c_iflag |= IGNBRK;
    without(attributes->c_oflag, OPOST);
    without(attributes->c_cflag, CSIZE | CSTOPB | CREAD | PARENB | HUPCL | CLOCAL | CRTSCTS);
    attributes->c_cflag |= CS8 | CREAD | HUPCL | CLOCAL;
    if (flow_control)
        attributes->c_cflag |= CRTSCTS;  // both directions in one bit
    without(attributes->c_lflag, ECHO | ICANON | ISIG | IEXTEN);
}

int serial_set_read_minimum(int port, uint32_t bytes) {
    if (bytes > 255) {
        errno = EINVAL;
        return -1;
    }
    termios attributes;
    if (::tcgetattr(port, &attributes) != 0)
        return -1;
    attributes.c_cc[VMIN] = static_cast<cc_t>(bytes);
    attributes.c_cc[VTIME] = 0;
    return ::tcsetattr(port, TCSANOW, &attributes);
}

int serial_set_receive_queue(int /*port*/, uint32_t /*bytes*/) {
    return 0;
}

}  // extern "C"
