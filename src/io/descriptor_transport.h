#pragma once

#include <cstdint>

#include "Pelorin"

// What transports on descriptors have in common: reads that a pipe of their own
// interrupts. Failures are printed as those of `function`.
namespace plr::io {

// An input with its pipe. Each byte in the pipe is an unblock that has yet to end a
// read. Both ends are non-blocking: whoever unblocks never waits.
struct UnblockableInput {
    int fd = -1;
    int unblockReadEnd = -1;
    int unblockWriteEnd = -1;
};

// Prints "WHAT TEXT (NUMBER)" of `error`. False.
bool failed(const char* function, const char* what, int error);

// Makes the pipe.
[[nodiscard]] bool openUnblockPipe(const char* function, UnblockableInput& input);

// The operations, as PelorinTransport has them.
bool readInput(const char* function, const UnblockableInput& input, void* buffer,
               std::uint32_t length, std::uint32_t* count, bool toCompletion,
               std::uint32_t timeoutMs);
bool unblockInput(const char* function, const UnblockableInput& input);
bool flushInput(const char* function, const UnblockableInput& input);
bool writeOutput(const char* function, int fd, const void* source, std::uint32_t length,
                 std::uint32_t* count, bool toCompletion);

}  // namespace plr::io
