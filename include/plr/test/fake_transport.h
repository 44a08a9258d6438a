#pragma once

#include <algorithm>
#include <cstdint>
#include <string>

#include "Pelorin"

// A transport whose operations go as its members say. Plain data, one thread at a
// time for each direction.
namespace plr::test {

struct FakeTransport {
    std::string input;                       // what reads give, all that fits at once
    std::string output;                      // what was written
    std::uint32_t mostWritten = UINT32_MAX;  // by one write
    bool succeeds = true;                    // what every operation returns
    int unblocks = 0;
    PelorinTransport transport{};  // lent to whoever uses it

    FakeTransport() {
        transport.write = [](auto* self, const void* source, std::uint32_t length,
                             std::uint32_t* count, bool, std::uint32_t, void*) {
            *count = std::min(length, of(self).mostWritten);
            of(self).output.append(static_cast<const char*>(source), *count);
            return of(self).succeeds;
        };
        transport.read = [](auto* self, void* buffer, std::uint32_t length, std::uint32_t* count,
                            bool, std::uint32_t, void*) {
            std::string& left = of(self).input;
            *count = static_cast<std::uint32_t>(left.copy(static_cast<char*>(buffer), length));
            left.erase(0, *count);
            return of(self).succeeds;
        };
        transport.unblockRead = [](auto* self) { return ++of(self).unblocks, of(self).succeeds; };
        transport.flushRead = [](auto* self) { return of(self).input.clear(), of(self).succeeds; };
        transport.isValid = [](auto* self) { return of(self).succeeds; };
        transport.state = this;
    }
    FakeTransport(const FakeTransport&) = delete;
    FakeTransport& operator=(const FakeTransport&) = delete;
    ~FakeTransport() = default;

  private:
    static FakeTransport& of(PelorinTransport* transport) {
        return *static_cast<FakeTransport*>(transport->state);
    }
};

}  // namespace plr::test
