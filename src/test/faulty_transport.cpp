#include "plr/test/faulty_transport.h"

#include <algorithm>

namespace plr::test {

FaultyTransport::FaultyTransport(PelorinTransport& inner) noexcept : inner_(inner) {
    transport_.write = [](PelorinTransport* transport, const void* source, std::uint32_t length,
                          std::uint32_t* count, bool toCompletion, std::uint32_t timeoutMs,
                          void* mustBeNull) {
        FaultyTransport& self = of(transport);
        *count = 0;
        const bool survives = self.limit(length, toCompletion);
        if (length == 0 && !survives)
            return false;
        const bool result = self.inner_.write(&self.inner_, source, length, count, toCompletion,
                                              timeoutMs, mustBeNull);
        self.moved(*count);
        return result && survives;
    };
    transport_.read = [](PelorinTransport* transport, void* buffer, std::uint32_t length,
                         std::uint32_t* count, bool toCompletion, std::uint32_t timeoutMs,
                         void* mustBeNull) {
        FaultyTransport& self = of(transport);
        *count = 0;
        std::uint32_t left = self.interruptions_;
        while (left > 0 && !self.isDead())
            if (self.interruptions_.compare_exchange_weak(left, left - 1))
                return !toCompletion;
        const bool survives = self.limit(length, toCompletion);
        if (length == 0 && !survives)
            return false;
        const bool result = self.inner_.read(&self.inner_, buffer, length, count, toCompletion,
                                             timeoutMs, mustBeNull);
        self.moved(*count);
        return result && survives;
    };
    transport_.unblockRead = [](PelorinTransport* transport) {
        return of(transport).inner_.unblockRead(&of(transport).inner_);
    };
    transport_.flushRead = [](PelorinTransport* transport) {
        FaultyTransport& self = of(transport);
        return !self.isDead() && self.inner_.flushRead(&self.inner_);
    };
    transport_.isValid = [](PelorinTransport* transport) {
        FaultyTransport& self = of(transport);
        return !self.isDead() && self.inner_.isValid(&self.inner_);
    };
    transport_.state = this;
}

bool FaultyTransport::limit(std::uint32_t& length, bool toCompletion) const noexcept {
    if (!toCompletion)
        length = std::min(length, mostAtOnce_.load());
    const std::uint64_t left = bytesToLive_;
    if (left > 0 && (length <= left || !toCompletion)) {
        length = static_cast<std::uint32_t>(std::min<std::uint64_t>(length, left));
        return true;
    }
    length = static_cast<std::uint32_t>(left);
    return false;
}

void FaultyTransport::moved(std::uint32_t bytes) noexcept {
    std::uint64_t left = bytesToLive_;
    while (left != std::numeric_limits<std::uint64_t>::max() &&
           !bytesToLive_.compare_exchange_weak(left, left - std::min<std::uint64_t>(left, bytes))) {
    }
}

}  // namespace plr::test
