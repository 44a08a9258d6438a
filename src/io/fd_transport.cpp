#include <unistd.h>

#include <new>

#include "Pelorin"
#include "plr/base/assert.h"
#include "src/io/descriptor_transport.h"

namespace {

using plr::io::UnblockableInput;

// The state: the caller's descriptor and our pipe.
UnblockableInput& stateOf(PelorinTransport* transport) {
    return *static_cast<UnblockableInput*>(transport->state);
}

bool writeFD(PelorinTransport* transport, const void* source, std::uint32_t length,
             std::uint32_t* count, bool toCompletion, std::uint32_t /*timeoutMs*/,
             void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return plr::io::writeOutput("PelorinTransportWriteFD", stateOf(transport).fd, source, length,
                                count, toCompletion);
}

bool readFD(PelorinTransport* transport, void* buffer, std::uint32_t length, std::uint32_t* count,
            bool toCompletion, std::uint32_t timeoutMs, void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return plr::io::readInput("PelorinTransportReadFD", stateOf(transport), buffer, length, count,
                              toCompletion, timeoutMs);
}

bool unblockReadFD(PelorinTransport* transport) {
    return plr::io::unblockInput("PelorinTransportUnblockReadFD", stateOf(transport));
}

bool flushReadFD(PelorinTransport* transport) {
    return plr::io::flushInput("PelorinTransportFlushReadFD", stateOf(transport));
}

bool isValidFD(PelorinTransport* transport) {
    return transport->state && stateOf(transport).fd >= 0;
}

void closePipeEnd(int& fd) {
    // Deliberate: descriptor 0 stays open, even where it is ours.
    if (fd >= 1)
        ::close(fd);
    fd = -1;
}

}  // namespace

extern "C" {

bool PelorinTransportCreateWithFD(PelorinTransport* transport, int fd) {
    constexpr const char* kFunction = "PelorinTransportCreateWithFD";
    *transport = {};
    auto* const state = new (std::nothrow) UnblockableInput{.fd = fd};
    if (!state) {
        PelorinDebugPrint(kFunction, "Out of memory!\n");
        return false;
    }
    if (!plr::io::openUnblockPipe(kFunction, *state)) {
        delete state;
        return false;
    }
    transport->write = &writeFD;
    transport->read = &readFD;
    transport->unblockRead = &unblockReadFD;
    transport->flushRead = &flushReadFD;
    transport->free = &PelorinTransportFreeFD;
    transport->isValid = &isValidFD;
    transport->state = state;
    return true;
}

bool PelorinTransportFreeFD(PelorinTransport* transport) {
    if (!transport->state)
        return true;
    UnblockableInput& state = stateOf(transport);
    closePipeEnd(state.unblockReadEnd);
    closePipeEnd(state.unblockWriteEnd);
    delete &state;
    transport->state = nullptr;
    return true;
}

}  // extern "C"
