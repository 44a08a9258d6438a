#include "src/io/uart_settings.h"

#include <termios.h>

#include <cerrno>
#include <cstring>

#include "Pelorin"
#include "serial/serial.h"

namespace plr::io {
namespace {

// Prints that `what` could not be set to `value`, unless a setting returned 0.
bool check(int result, const char* function, const char* what, std::uint32_t value) {
    const int error = errno;
    if (result != 0)
        PelorinDebugPrint(function, "Failed to configure %s of %u, err = %s (%u)\n", what, value,
                          errorText(error), static_cast<unsigned>(error));
    return result == 0;
}

}  // namespace

const char* errorText(int error) noexcept {
    const char* const text = ::strerrordesc_np(error);
    return text != nullptr ? text : "Unknown error";
}

bool setFlowControl(const char* function, int port, bool on) {
    termios attributes;
    const char* step = "get";
    int result = serial_get_attributes(port, &attributes);
    if (result == 0) {
        step = "set";
        serial_make_raw(&attributes, on);
        result = serial_set_attributes(port, &attributes);
    }
    if (result != 0)
        PelorinDebugPrint(function, "Failed to %s termios options, ret = %s (%u)\n", step,
                          errorText(errno), static_cast<unsigned>(errno));
    return result == 0;
}

bool setBaud(const char* function, int port, std::uint32_t baud) {
    return check(serial_set_baud(port, baud), function, "baud", baud);
}

bool setReadMinimum(const char* function, int port, std::uint32_t bytes) {
    return check(serial_set_read_minimum(port, bytes), function, "VMIN", bytes);
}

bool setReceiveQueue(const char* function, int port, std::uint32_t bytes) {
    return check(serial_set_receive_queue(port, bytes), function, "RX Queue size", bytes);
}

}  // namespace plr::io
