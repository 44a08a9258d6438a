/* serial_dump: shows what comes in on a serial port, as a dump, until it hangs up. The
   flat interface in C11.

     serial_dump DEVICE [BAUD]    115200 bits a second, if it says nothing else */

#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <Pelorin>

enum { kMostBytes = 256, kLineBytes = 16 };

/* Sees each line of a dump. */
static void print_line(PelorinLogLineOperation* operation, const char* line) {
    fputs(line, operation->context);
}

static void dump(const uint8_t* bytes, uint32_t count) {
    char text[kMostBytes * 8]; /* more than a dump takes */
    PelorinLogLineOperation operation = {.context = stdout, .callback = print_line};
    PelorinLogBinaryToBufferWithLineLengthAndOperation(text, sizeof text, bytes, (int32_t)count,
                                                       kLineBytes, &operation);
    fflush(stdout);
}

static bool open_port(PelorinTransport* port, const char* device, uint32_t baud) {
    PelorinUARTTimeoutConfig config = {
        .baud = baud, .rxQueueSize = 4096, .localQueueSize = 4096, .disableFlowControl = 1};
    if (strlen(device) >= sizeof config.node)
        return false;
    strcpy(config.node, device);
    return PelorinTransportCreateWithUARTTimeout(port, &config);
}

int main(int argc, char** argv) {
    if (argc != 2 && argc != 3) {
        fputs("usage: serial_dump DEVICE [BAUD]\n", stderr);
        return 2;
    }
    PelorinTransport port;
    if (!open_port(&port, argv[1], argc == 3 ? (uint32_t)strtoul(argv[2], NULL, 10) : 115200))
        return 1;
    uint8_t bytes[kMostBytes];
    uint32_t count = 0;
    while (port.read(&port, bytes, sizeof bytes, &count, false, PELORIN_FOREVER, NULL))
        dump(bytes, count);
    return PelorinTransportFree(&port) ? 0 : 1;
}
