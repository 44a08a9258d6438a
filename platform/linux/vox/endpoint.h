#pragma once

#include <string>

#include "vox/value.h"

// Endpoints: values that lead to a listener, whether it has a name or not.
//
// An endpoint is one end of a SOCK_SEQPACKET pair; its listener watches the
// other. To connect is to make a stream pair and to send one end of it over
// the endpoint, with one byte: packet = 0x00 beside exactly one descriptor. The
// process that sends it is the one that made it (SO_PASSCRED, SO_PEERCRED), so
// that the client is who the kernel says it is.
namespace vox_link {

// The two ends of a new pair. Returns 0 or an error number.
[[nodiscard]] int make_endpoint_pair(int& listeners, int& holders) noexcept;

// Connects over `endpoint`; the socket is in `fd`. Returns 0, EAGAIN when the
// listener cannot take more now, EPIPE or ECONNRESET when it is gone, or another
// error number; `why` has the reason.
[[nodiscard]] int connect_endpoint(vox_object_t endpoint, int& fd, std::string& why);

// Takes one connecting socket from the listener's end. Returns 0 with `fd`,
// EAGAIN when there is none, EPROTO for a packet that is something else, EMFILE
// when its descriptor was lost here, or ECONNRESET when all holders are gone.
[[nodiscard]] int take_client(int listeners, int& fd) noexcept;

}  // namespace vox_link
