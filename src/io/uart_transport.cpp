#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <new>

#include "Pelorin"
#include "plr/base/assert.h"
#include "serial/serial.h"
#include "src/io/descriptor_transport.h"
#include "src/io/uart_settings.h"

namespace {

using plr::io::errorText;
using plr::io::failed;

constexpr const char* kCreate = "PelorinTransportCreateWithUART";
constexpr const char* kRead = "PelorinTransportReadUART";
constexpr std::size_t kMostName = 255;
constexpr std::size_t kFlushChunk = 1024;

// Linux wakes no read that waits when the read minimum becomes 0: reads wait for the
// port and for a wake.
struct State {
    int port = -1;
    std::uint32_t readMinimum = 0;
    int wake = -1;
};

State& stateOf(PelorinTransport* transport) {
    return *static_cast<State*>(transport->state);
}

bool writeUART(PelorinTransport* transport, const void* source, std::uint32_t length,
               std::uint32_t* count, bool /*toCompletion*/, std::uint32_t /*timeoutMs*/,
               void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    std::size_t written = 0;
    const int error = serial_write(stateOf(transport).port, -1, source, length, &written);
    *count = static_cast<std::uint32_t>(written);
    return error == 0 || failed("PelorinTransportWriteUART", "write to completion returned", error);
}

// As read(2) of a port does with its read minimum. A read for less than that is
// complete with its length, which poll(2) would not report.
ssize_t readOnce(const State& state, void* buffer, std::uint32_t length) {
    if (state.readMinimum == 0 || length == 0)
        return serial_read_now(state.port, buffer, length);
    if (length >= state.readMinimum)
        return serial_read(state.port, state.wake, buffer, length);
    if (serial_set_read_minimum(state.port, length) != 0)
        return -1;
    const ssize_t result = serial_read(state.port, state.wake, buffer, length);
    return serial_set_read_minimum(state.port, state.readMinimum) == 0 || result > 0 ? result : -1;
}

bool readUART(PelorinTransport* transport, void* buffer, std::uint32_t length, std::uint32_t* count,
              bool toCompletion, std::uint32_t /*timeoutMs*/, void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    *count = 0;
    if (toCompletion) {
        PelorinDebugPrint(kRead, "Read to completion is not supported\n");
        return false;
    }
    const ssize_t result = readOnce(stateOf(transport), buffer, length);
    *count = static_cast<std::uint32_t>(std::max<ssize_t>(result, 0));
    return result >= 0 || failed(kRead, "read returned", errno);
}

bool unblockReadUART(PelorinTransport* transport) {
    serial_wake_post(stateOf(transport).wake);
    return true;
}

bool flushReadUART(PelorinTransport* transport) {
    constexpr const char* kFunction = "PelorinTransportFlushReadUART";
    const State& state = stateOf(transport);
    const bool waitsNot = plr::io::setReadMinimum(kFunction, state.port, 0);
    std::array<char, kFlushChunk> chunk;
    ssize_t result = 0;
    if (waitsNot)
        do
            result = serial_read_now(state.port, chunk.data(), chunk.size());
        while (result > 0);
    if (result < 0)
        failed(kFunction, "read returned", errno);
    const bool restored = plr::io::setReadMinimum(kFunction, state.port, state.readMinimum);
    return waitsNot && result == 0 && restored;
}

bool isValidUART(PelorinTransport* transport) {
    return stateOf(transport).port > 0;
}

void release(State* state) {
    // Deliberate: descriptor 0 is no port of ours.
    if (state->port >= 1)
        serial_close(state->port);
    if (state->wake >= 0)
        serial_wake_close(state->wake);
    delete state;
}

bool freeUART(PelorinTransport* transport) {
    PelorinDebugPrint("PelorinTransportFreeUART", "Freeing\n");
    release(&stateOf(transport));
    return true;
}

bool openPort(State& state, const char* name) {
    std::array<char, kMostName + sizeof "/dev/uart."> path;
    if (::strnlen(name, kMostName + 1) > kMostName) {
        PelorinDebugPrint(kCreate, "Name of more than %zu characters\n", kMostName);
        return false;
    }
    std::snprintf(path.data(), path.size(), "/dev/uart.%s", name);
    state.port = serial_open(path.data());
    if (state.port < 1)
        PelorinDebugPrint(kCreate, "failed to open node (%s), ret = %s(%u)\n", path.data(),
                          errorText(errno), static_cast<unsigned>(errno));
    return state.port >= 1;
}

bool openWake(State& state) {
    state.wake = serial_wake_open();
    return state.wake >= 0 || failed(kCreate, "Failed to create wake FD, err =", errno);
}

bool configure(const State& state, std::uint32_t baud, std::uint32_t rxQueueSize) {
    return plr::io::setFlowControl(kCreate, state.port, true) &&
           plr::io::setBaud(kCreate, state.port, baud) &&
           plr::io::setReadMinimum(kCreate, state.port, state.readMinimum) &&
           plr::io::setReceiveQueue(kCreate, state.port, rxQueueSize);
}

}  // namespace

extern "C" {

bool PelorinTransportCreateWithUART(PelorinTransport* transport, const char* name,
                                    std::uint32_t baud, std::uint32_t readMinimum,
                                    std::uint32_t rxQueueSize) {
    *transport = {};
    auto* const state = new (std::nothrow) State{.readMinimum = readMinimum};
    if (!state) {
        PelorinDebugPrint(kCreate, "Out of memory!\n");
        return false;
    }
    PelorinDebugPrint(kCreate, "Creating with baud %u, Rx Queue size %u\n", baud, rxQueueSize);
    if (!openPort(*state, name) || !openWake(*state) || !configure(*state, baud, rxQueueSize)) {
        release(state);
        return false;
    }
    transport->write = &writeUART;
    transport->read = &readUART;
    transport->unblockRead = &unblockReadUART;
    transport->flushRead = &flushReadUART;
    transport->free = &freeUART;
    transport->isValid = &isValidUART;
    transport->state = state;
    return true;
}

bool PelorinTransportUARTFlushInput(PelorinTransport* transport) {
    return serial_flush_input(stateOf(transport).port) == 0 ||
           failed("PelorinTransportUARTFlushInput", "Failed to read flush, err =", errno);
}

bool PelorinTransportUARTFlushOutput(PelorinTransport* transport) {
    return serial_flush_output(stateOf(transport).port) == 0 ||
           failed("PelorinTransportUARTFlushOutput", "Failed to write flush, err =", errno);
}

}  // extern "C"
