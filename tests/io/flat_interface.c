/* The flat interface as C11: every function is called, and its result looked at. */
#define _GNU_SOURCE
#include <errno.h>
#include <fcntl.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "Pelorin"

static int failures = 0;
#define CHECK(condition) check((condition), #condition, __LINE__)
static void check(bool holds, const char* condition, int line) {
    if (holds)
        return;
    fprintf(stderr, "line %d: %s\n", line, condition);
    failures++;
}

/* A terminal stands behind every serial port. */
static const char* terminal = "";
__attribute__((visibility("default"))) int open(const char* path, int flags, ...) {
    va_list more;
    va_start(more, flags);
    const unsigned mode = (flags & O_CREAT) != 0 ? va_arg(more, unsigned) : 0;
    va_end(more);
    return openat(AT_FDCWD, strncmp(path, "/dev/uart.", 10) == 0 ? terminal : path, flags, mode);
}

static char printed[2048];
static void keepPrint(void* context, const char* function, const char* text) {
    snprintf(context, sizeof printed, "%s|%s", function, text);
}

static void debugPrint(void) {
    PelorinDebugSetDelegate(keepPrint, printed);
    PelorinDebugPrint("main", "%d and %s\n", 12, "more");
    CHECK(strcmp(printed, "main|12 and more\n") == 0);
}

static void hex(void) {
    char high = 0;
    char low = 0;
    PelorinEncodeHex(0xA5, &high, &low);
    CHECK(high == 'A' && low == '5');
    PelorinEncodeHexWithLowerCase(0x5F, &high, &low, true);
    CHECK(high == '5' && low == 'f');
    CHECK(PelorinDecodeHexWithDefault('b', 99) == 11);
    CHECK(PelorinDecodeHexWithDefault('g', 99) == 99);
    CHECK(PelorinBinToHexGetBufferSize(3) == 7);

    char text[8];
    uint8_t bytes[4];
    CHECK(PelorinBinToHex(text, sizeof text, "\x01\xAB", 2) == 5);
    CHECK(strcmp(text, "01AB") == 0);
    CHECK(PelorinBinToHexWithLowerCase(text, 4, "\x01\xAB", 2, true) == 3);
    CHECK(strcmp(text, "01") == 0);
    CHECK(PelorinHexToBin(bytes, sizeof bytes, "ABC") == 2);
    CHECK(bytes[0] == 0x0A && bytes[1] == 0xBC);
}

static void countLine(PelorinLogLineOperation* operation, const char* line) {
    *(int*)operation->context += line[strlen(line) - 1] == '\n';
}

static void dump(void) {
    int lines = 0;
    PelorinLogLineOperation operation = {&lines, NULL, countLine};
    const char* const expected = "0000  41 54 0D    AT.\n";
    char text[512];
    CHECK(PelorinLogGetBufferSize(3) > strlen(expected));
    CHECK(PelorinLogBinaryToBuffer(text, PelorinLogGetBufferSize(3), "AT\r", 3) > 0);
    CHECK(PelorinLogBinaryToBufferWithLineLengthAndOperation(text, sizeof text, "AT\r", 3, 3,
                                                             &operation) == strlen(expected));
    CHECK(strcmp(text, expected) == 0);
    CHECK(lines == 1);
}

static void descriptors(const int* ends) {
    char text[8] = "";
    uint32_t written = 9;
    CHECK(PelorinWriteToCompletion(ends[1], "abcdef", 6, &written) == 0 && written == 6);
    CHECK(PelorinUnblockableReadWithTimeout(ends[0], -1, text, 2, PELORIN_FOREVER) == 2);
    CHECK(PelorinUnblockableReadToCompletionWithTimeout(ends[0], -1, text + 2, 4, 100));
    CHECK(strcmp(text, "abcdef") == 0);
    CHECK(PelorinUnblockableReadWithTimeout(-1, -1, text, 2, 0) == -9);
}

static int32_t countBytes(void* context, const void* piece, uint32_t length) {
    *(uint32_t*)context += length;
    return piece ? (int32_t)length : -1;
}

static void ringBuffer(const int* ends) {
    uint8_t storage[8];
    uint8_t flag = 9;
    char text[8] = "";
    uint32_t total = 0;
    PelorinRingBuffer ring;
    CHECK(!PelorinRingBufferInitialize(&ring, storage, 6));
    CHECK(strcmp(printed, "PelorinRingBufferInitialize|Capacity 6 is not a power of two\n") == 0);
    CHECK(PelorinRingBufferInitialize(&ring, storage, sizeof storage));
    CHECK(PelorinRingBufferInsertRaw(&ring, "abcdefghi", 9) == 8);
    CHECK(PelorinRingBufferGetLinearWriteRemaining(&ring) == 0);
    CHECK(PelorinRingBufferExtractRaw(&ring, text, 3) == 3 && strcmp(text, "abc") == 0);
    CHECK(PelorinRingBufferGetLinearWriteRemainingPrivate(&ring, &flag) == 3 && flag == 1);
    CHECK(PelorinRingBufferGetLinearReadRemaining(&ring) == 5);
    CHECK(PelorinRingBufferGetLinearReadRemainingPrivate(&ring, &flag) == 5 && flag == 1);
    CHECK(PelorinRingBufferSkip(&ring, 1) == 1);
    CHECK(PelorinRingBufferExtractFD(&ring, ends[1], 2) == 2);
    CHECK(PelorinRingBufferInsertFDUnblockable(&ring, ends[0], -1, 8, 0) == 2);
    CHECK(PelorinRingBufferLinearize(&ring) && memcmp(storage, "ghef", 4) == 0);
    CHECK(PelorinRingBufferExtractPrivate(&ring, countBytes, &total, 3) == 3 && total == 3);
    CHECK(PelorinRingBufferGetSize(&ring) == 1);
    PelorinRingBufferReset(&ring);
    CHECK(PelorinRingBufferGetSize(&ring) == 0);
}

static void fdAndFile(const int* ends) {
    uint8_t storage[8];
    PelorinRingBuffer ring;
    PelorinTransport transport;
    uint32_t count = 0;
    CHECK(PelorinTransportCreateWithFile(&transport, "/dev/zero", "/dev/null"));
    CHECK(PelorinRingBufferInitialize(&ring, storage, sizeof storage));
    CHECK(PelorinRingBufferInsertTransport(&ring, &transport, 5, PELORIN_FOREVER) == 5);
    CHECK(PelorinTransportFileFree(&transport));

    CHECK(PelorinTransportCreateWithFD(&transport, ends[1]));
    CHECK(transport.write(&transport, "x", 1, &count, true, 0, NULL) && count == 1);
    CHECK(PelorinTransportFreeFD(&transport));
    CHECK(PelorinTransportFree(&transport) && !transport.write);
}

static void serial(void) {
    PelorinUARTTimeoutConfig config = {.baud = 115200, .localQueueSize = 1024};
    PelorinTransport transport;
    const int master = posix_openpt(O_RDWR | O_NOCTTY);
    CHECK(master >= 0 && grantpt(master) == 0 && unlockpt(master) == 0);
    terminal = ptsname(master);
    CHECK(PelorinTransportCreateWithUART(&transport, "modem", 115200, 1, 4096));
    CHECK(PelorinTransportUARTFlushInput(&transport));
    CHECK(PelorinTransportUARTFlushOutput(&transport));
    CHECK(PelorinTransportFree(&transport));

    CHECK(PelorinTransportCreateWithUARTTimeout(&transport, &config));
    CHECK(transport.isValid(&transport));
    CHECK(PelorinTransportFree(&transport));
    close(master);
}

static void keepText(void* context, const char* text) {
    snprintf(context, 512, "%s", text);
}

static void tap(void) {
    char shown[512] = "";
    uint32_t count = 0;
    const char* const* const secrets = PelorinTransportTapSecrets(&count);
    const PelorinTransportTapConfig config = {keepText, shown, secrets, count};
    PelorinTransport inner;
    PelorinTransport transport;
    CHECK(secrets && count > 0);
    CHECK(PelorinTransportCreateWithFile(&inner, NULL, "/dev/null"));
    CHECK(PelorinTransportCreateTap(&transport, &inner, &config));
    CHECK(transport.write(&transport, "AT\r", 3, &count, true, 0, NULL) && count == 3);
    CHECK(strstr(shown, "> 3 bytes") && strstr(shown, "41 54 0D"));
    CHECK(PelorinTransportFree(&transport));
    CHECK(PelorinTransportFree(&inner));
}

int main(void) {
    int ends[2];
    CHECK(pipe(ends) == 0);
    debugPrint();
    hex();
    dump();
    descriptors(ends);
    ringBuffer(ends);
    fdAndFile(ends);
    serial();
    tap();
    return failures != 0;
}
