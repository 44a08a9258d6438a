#pragma once

#include <algorithm>
#include <array>
#include <span>

#include "plr/text/octet_source_buffer.h"

namespace plr {

using OctetBuffer = std::array<unsigned char, 4096>;

// Up to `most` codes of a source that deliversOctets(), no more than the buffer has; fewer
// at its end. They stay where they are if that is in memory, and else go to `buffer`.
inline std::span<const unsigned char> pullOctets(TextTransform& source, std::size_t most,
                                                 OctetBuffer& buffer) {
    if (OctetSourceBuffer* const memory = source.asOctetSource()) {
        const auto octets = memory->peek();
        memory->skip(std::min(most, octets.size()));
        return octets.first(std::min(most, octets.size()));
    }
    return {buffer.data(), source.nextChars(reinterpret_cast<char*>(buffer.data()), most)};
}

}  // namespace plr
