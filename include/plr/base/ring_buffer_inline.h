#pragma once

#include <stdint.h>
#include <string.h>

#include "Pelorin"

// The hot paths of the ring buffer of <Pelorin>, which includes this: inline functions
// of C11 and C++ at once; the library has them for callers that do not inline.
// bench/bytes_pelorin.cpp. The usual case is left to the branch predictor, so that one
// call's arithmetic does not wait for that of the call before.
#ifdef __cplusplus
#define PELORIN_BYTES_AT(pointer) (static_cast<uint8_t*>(pointer))
#else
#define PELORIN_BYTES_AT(pointer) ((uint8_t*)(pointer))
#endif

inline PLR_EXPORT uint32_t PelorinRingBufferInsertRaw(PelorinRingBuffer* ring, const void* source,
                                                      uint32_t length) {
    const uint32_t write = ring->writeCount & (ring->capacity - 1);
    const uint32_t room = ring->capacity - (ring->writeCount - ring->readCount);
    const uint32_t toStorageEnd = ring->capacity - write;
    if (__builtin_expect(length > room, 0))
        length = room;
    // memcpy may not be given null, which an empty storage is.
    if (__builtin_expect(length == 0, 0))
        return 0;
    // Deliberate: one piece only, although there may be room at the front.
    if (__builtin_expect(length > toStorageEnd, 0))
        length = toStorageEnd;
    ring->writeCount += length;
    memcpy(ring->buffer + write, source, length);
    return length;
}

inline PLR_EXPORT uint32_t PelorinRingBufferExtractRaw(PelorinRingBuffer* ring, void* destination,
                                                       uint32_t most) {
    const uint32_t size = ring->writeCount - ring->readCount;
    const uint32_t read = ring->readCount & (ring->capacity - 1);
    const uint32_t toStorageEnd = ring->capacity - read;
    if (__builtin_expect(most >= size, 0)) {
        most = size;
        ring->readCount = ring->writeCount = 0;
    } else {
        ring->readCount += most;
    }
    if (__builtin_expect(most == 0, 0))
        return 0;
    if (__builtin_expect(most <= toStorageEnd, 1)) {
        memcpy(destination, ring->buffer + read, most);
    } else {
        memcpy(destination, ring->buffer + read, toStorageEnd);
        memcpy(PELORIN_BYTES_AT(destination) + toStorageEnd, ring->buffer, most - toStorageEnd);
    }
    return most;
}

#undef PELORIN_BYTES_AT
