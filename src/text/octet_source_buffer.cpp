#include "plr/text/octet_source_buffer.h"

#include <cstring>

#include "src/text/octets.h"

namespace plr {

void OctetSourceBuffer::setSource(const char* octets, int octetCount) noexcept {
    count = std::max(octetCount, 0);
    data = octets;
    offset = 0;
    length = static_cast<std::uint64_t>(count);
}

std::uint32_t OctetSourceBuffer::nextCode() {
    // The count may have been raised beyond the octets.
    if (count == 0 || offset == length)
        return kEnd;
    spend(1);
    return static_cast<unsigned char>(data[offset++]);
}

void OctetSourceBuffer::reset() {
    TextTransform::reset();
    offset = 0;
}

std::size_t OctetSourceBuffer::nextCodes(std::uint32_t* out, std::size_t most) {
    const auto left = peek();
    const std::size_t taken = std::min(most, left.size());
    octets::widen(out, left.data(), taken);
    skip(taken);
    return taken;
}

std::size_t OctetSourceBuffer::nextChars(char* out, std::size_t most) {
    const auto left = peek();
    const std::size_t taken = std::min(most, left.size());
    if (taken != 0)
        std::memcpy(out, left.data(), taken);
    skip(taken);
    return taken;
}

OctetSourceBuffer* OctetSourceBuffer::asOctetSource() noexcept {
    return this;
}

bool OctetSourceBuffer::deliversOctets() const noexcept {
    return true;
}

std::span<const unsigned char> OctetSourceBuffer::peek() const noexcept {
    if (offset == length)
        return {};
    return {reinterpret_cast<const unsigned char*>(data) + offset, permitted(getAvailable())};
}

void OctetSourceBuffer::skip(std::size_t octets) noexcept {
    spend(octets);
    offset += octets;
}

}  // namespace plr
