#pragma once

#include <stdint.h>
#include <string.h>

#include "Pelorin"

// The hot paths of the ring buffer of <Pelorin>, which includes this. They are inline
// functions of C11 and C++ at once; the library has them for callers that do not inline.
// bench/bytes_pelorin.cpp.
#ifdef __cplusplus
#define PELORIN_BYTES_AT(pointer) static_cast<uint8_t*>(pointer)
#define PELORIN_CONST_BYTES_AT(pointer) static_cast<const uint8_t*>(pointer)
#else
#define PELORIN_BYTES_AT(pointer) ((uint8_t*)(pointer))
#define PELORIN_CONST_BYTES_AT(pointer) ((const uint8_t*)(pointer))
#endif

// Copies the first and the last `size` bytes, which overlap where `length` is less than
// twice that.
#define PELORIN_COPY_ENDS(size)                      \
    do {                                             \
        uint8_t head[size];                          \
        uint8_t tail[size];                          \
        memcpy(head, first, size);                   \
        memcpy(tail, first + length - (size), size); \
        memcpy(start, head, size);                   \
        memcpy(start + length - (size), tail, size); \
    } while (false)

inline PLR_EXPORT void PelorinCopyBytes(void* to, const void* from, uint32_t length) {
    uint8_t* const start = PELORIN_BYTES_AT(to);
    const uint8_t* const first = PELORIN_CONST_BYTES_AT(from);
    if (length > 64)
        memcpy(to, from, length);
    else if (length >= 32)
        PELORIN_COPY_ENDS(32);
    else if (length >= 16)
        PELORIN_COPY_ENDS(16);
    else if (length >= 8)
        PELORIN_COPY_ENDS(8);
    else if (length >= 4)
        PELORIN_COPY_ENDS(4);
    else if (length >= 2)
        PELORIN_COPY_ENDS(2);
    else if (length == 1)
        *start = *first;
}

inline PLR_EXPORT uint32_t PelorinRingBufferInsertRaw(PelorinRingBuffer* ring, const void* source,
                                                      uint32_t length) {
    const uint32_t write = ring->writeCount & (ring->capacity - 1);
    const uint32_t read = ring->readCount & (ring->capacity - 1);
    // Deliberate: one piece only, although there may be room at the front.
    const bool readerIsAhead = write <= read && ring->writeCount != ring->readCount;
    const uint32_t room = (readerIsAhead ? read : ring->capacity) - write;
    const uint32_t count = length < room ? length : room;
    ring->writeCount += count;
    PelorinCopyBytes(ring->buffer + write, source, count);
    return count;
}

inline PLR_EXPORT uint32_t PelorinRingBufferExtractRaw(PelorinRingBuffer* ring, void* destination,
                                                       uint32_t most) {
    const uint32_t size = ring->writeCount - ring->readCount;
    const uint32_t count = most < size ? most : size;
    const uint32_t read = ring->readCount & (ring->capacity - 1);
    const uint32_t toStorageEnd = ring->capacity - read;
    ring->readCount += count;
    if (ring->readCount == ring->writeCount)
        ring->readCount = ring->writeCount = 0;
    if (count <= toStorageEnd) {
        PelorinCopyBytes(destination, ring->buffer + read, count);
    } else {
        memcpy(destination, ring->buffer + read, toStorageEnd);
        memcpy(PELORIN_BYTES_AT(destination) + toStorageEnd, ring->buffer, count - toStorageEnd);
    }
    return count;
}

#undef PELORIN_COPY_ENDS
#undef PELORIN_CONST_BYTES_AT
#undef PELORIN_BYTES_AT
