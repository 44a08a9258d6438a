#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <initializer_list>
#include <new>

#include "Pelorin"
#include "plr/base/assert.h"
#include "src/io/descriptor_transport.h"

namespace {

using plr::io::UnblockableInput;

constexpr const char* kCreate = "PelorinTransportCreateWithFile";

struct Files {
    ~Files() {
        for (const int fd : {input.fd, input.unblockReadEnd, input.unblockWriteEnd, output})
            if (fd >= 0)
                ::close(fd);
    }

    UnblockableInput input;
    int output = -1;
};

Files& filesOf(PelorinTransport* transport) {
    return *static_cast<Files*>(transport->state);
}

bool writeFile(PelorinTransport* transport, const void* source, std::uint32_t length,
               std::uint32_t* count, bool toCompletion, std::uint32_t /*timeoutMs*/,
               void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return plr::io::writeOutput("PelorinTransportFileWrite", filesOf(transport).output, source,
                                length, count, toCompletion);
}

bool readFile(PelorinTransport* transport, void* buffer, std::uint32_t length, std::uint32_t* count,
              bool toCompletion, std::uint32_t timeoutMs, void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    return plr::io::readInput("PelorinTransportFileRead", filesOf(transport).input, buffer, length,
                              count, toCompletion, timeoutMs);
}

bool unblockReadFile(PelorinTransport* transport) {
    return plr::io::unblockInput("PelorinTransportFileUnblockRead", filesOf(transport).input);
}

bool flushReadFile(PelorinTransport* transport) {
    return plr::io::flushInput("PelorinTransportFileFlushRead", filesOf(transport).input);
}

bool isValidFile(PelorinTransport* transport) {
    return transport->state != nullptr;
}

// Opens without waiting for the other end of a FIFO or for a terminal's carrier;
// what is done with the descriptor then waits as usual. -1 on failure.
int openFile(const char* path, int flags) {
    const int fd = ::open(path, flags | O_NONBLOCK | O_NOCTTY | O_CLOEXEC, 0600);
    if (fd >= 0 && ::fcntl(fd, F_SETFL, flags & O_APPEND) == 0)
        return fd;
    const int error = errno;
    if (fd >= 0)
        ::close(fd);
    PelorinDebugPrint(kCreate, "Failed to open %s, err = %s (%u)\n", path, ::strerrordesc_np(error),
                      static_cast<unsigned>(error));
    return -1;
}

bool openFiles(Files& files, const char* inputPath, const char* outputPath) {
    if (!inputPath && !outputPath) {
        PelorinDebugPrint(kCreate, "No path given\n");
        return false;
    }
    if (inputPath) {
        files.input.fd = openFile(inputPath, O_RDONLY);
        if (files.input.fd < 0 || !plr::io::openUnblockPipe(kCreate, files.input))
            return false;
    }
    if (outputPath)
        files.output = openFile(outputPath, O_WRONLY | O_APPEND | O_CREAT);
    return !outputPath || files.output >= 0;
}

}  // namespace

extern "C" {

bool PelorinTransportCreateWithFile(PelorinTransport* transport, const char* inputPath,
                                    const char* outputPath) {
    *transport = {};
    auto* const files = new (std::nothrow) Files;
    if (!files) {
        PelorinDebugPrint(kCreate, "Out of memory!\n");
        return false;
    }
    if (!openFiles(*files, inputPath, outputPath)) {
        delete files;
        return false;
    }
    if (outputPath)
        transport->write = &writeFile;
    if (inputPath) {
        transport->read = &readFile;
        transport->unblockRead = &unblockReadFile;
        transport->flushRead = &flushReadFile;
    }
    transport->free = &PelorinTransportFileFree;
    transport->isValid = &isValidFile;
    transport->state = files;
    return true;
}

bool PelorinTransportFileFree(PelorinTransport* transport) {
    delete static_cast<Files*>(transport->state);
    transport->state = nullptr;
    return true;
}

}  // extern "C"
