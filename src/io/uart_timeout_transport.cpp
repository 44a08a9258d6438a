#include <new>

#include "Pelorin"
#include "plr/base/assert.h"
#include "src/io/timed_uart.h"

namespace {

using plr::io::TimedUart;

TimedUart& stateOf(PelorinTransport* transport) {
    return *static_cast<TimedUart*>(transport->state);
}

bool writeUARTTimeout(PelorinTransport* transport, const void* source, std::uint32_t length,
                      std::uint32_t* count, bool /*toCompletion*/, std::uint32_t /*timeoutMs*/,
                      void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return stateOf(transport).write(source, length, count);
}

bool readUARTTimeout(PelorinTransport* transport, void* buffer, std::uint32_t length,
                     std::uint32_t* count, bool toCompletion, std::uint32_t timeoutMs,
                     void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return stateOf(transport).read(buffer, length, count, toCompletion, timeoutMs);
}

bool unblockReadUARTTimeout(PelorinTransport* transport) {
    stateOf(transport).unblockRead();
    return true;
}

bool flushReadUARTTimeout(PelorinTransport* transport) {
    PelorinDebugPrint("PelorinTransportFlushReadUARTTimeout", "Flushing\n");
    return stateOf(transport).reconnect();
}

bool isValidUARTTimeout(PelorinTransport* transport) {
    return stateOf(transport).isValid();
}

bool freeUARTTimeout(PelorinTransport* transport) {
    PelorinDebugPrint("PelorinTransportFreeUARTTimeout", "Freeing\n");
    TimedUart* const state = &stateOf(transport);
    state->end();
    delete state;
    return true;
}

}  // namespace

extern "C" bool PelorinTransportCreateWithUARTTimeout(PelorinTransport* transport,
                                                      const PelorinUARTTimeoutConfig* config) {
    constexpr const char* kFunction = "PelorinTransportCreateWithUARTTimeout";
    *transport = {};
    auto* const state = new (std::nothrow) TimedUart(*config);
    if (!state) {
        PelorinDebugPrint(kFunction, "Out of memory!\n");
        return false;
    }
    PelorinDebugPrint(kFunction, "Creating with baud %u, Rx Queue size %u, local queue size %u\n",
                      config->baud, config->rxQueueSize, config->localQueueSize);
    if (!state->connect()) {
        state->end();
        delete state;
        return false;
    }
    transport->write = &writeUARTTimeout;
    transport->read = &readUARTTimeout;
    transport->unblockRead = &unblockReadUARTTimeout;
    transport->flushRead = &flushReadUARTTimeout;
    transport->free = &freeUARTTimeout;
    transport->isValid = &isValidUARTTimeout;
    transport->state = state;
    return true;
}
