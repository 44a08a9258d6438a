#include "Pelorin"

extern "C" bool PelorinTransportFree(PelorinTransport* transport) {
    if (!transport->free)
        return true;
    const bool result = transport->free(transport);
    *transport = {};
    return result;
}
