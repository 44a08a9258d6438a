// Pelorin's flat interface.

#include <Pelorin>

#include "bench/bytes_cases.h"
#include "bench/bytes_line.h"

namespace {

using namespace bench::bytes_cases;

class Ring {
  public:
    explicit Ring(std::size_t capacity) {
        expect(capacity == sizeof storage_ &&
               PelorinRingBufferInitialize(&ring_, storage_, sizeof storage_));
    }
    void insert(const char* bytes, std::size_t count) {
        for (auto left = static_cast<std::uint32_t>(count); left > 0;) {
            const std::uint32_t done = PelorinRingBufferInsertRaw(&ring_, bytes, left);
            bytes += done;
            left -= done;
        }
    }
    void extract(char* bytes, std::size_t count) {
        PelorinRingBufferExtractRaw(&ring_, bytes, static_cast<std::uint32_t>(count));
    }

  private:
    alignas(64) std::uint8_t storage_[kRing];
    PelorinRingBuffer ring_{};
};

class Port {
  public:
    explicit Port(const std::string& path) {
        PelorinDebugSetDelegate([](void*, const char*, const char*) {}, nullptr);
        PelorinUARTTimeoutConfig config{};
        path.copy(config.node, sizeof config.node - 1);
        config.baud = 115'200;
        config.rxQueueSize = 4'096;
        config.localQueueSize = 0x20000;
        config.disableFlowControl = 1;
        expect(PelorinTransportCreateWithUARTTimeout(&transport_, &config));
    }
    Port(const Port&) = delete;
    Port& operator=(const Port&) = delete;
    ~Port() { PelorinTransportFree(&transport_); }

    std::size_t read(char* buffer, std::size_t most) {
        std::uint32_t count = 0;
        expect(transport_.read(&transport_, buffer, static_cast<std::uint32_t>(most), &count, false,
                               10'000, nullptr));
        return count;
    }

  private:
    PelorinTransport transport_{};
};

void encode(char* out, std::size_t size, const std::uint8_t* data, std::size_t bytes) {
    PelorinBinToHexWithLowerCase(out, static_cast<std::uint32_t>(size), data,
                                 static_cast<std::uint32_t>(bytes), true);
}

void decode(std::uint8_t* out, std::size_t bytes, const char* text, std::size_t /*length*/) {
    PelorinHexToBin(out, static_cast<std::uint32_t>(bytes), text);
}

std::size_t print(char* out, std::size_t size, const std::uint8_t* data, std::size_t bytes) {
    return PelorinLogBinaryToBuffer(out, static_cast<std::uint32_t>(size), data,
                                    static_cast<std::int32_t>(bytes));
}

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv,
               {{"to_hex", toHex(encode)},
                {"from_hex", fromHex(decode)},
                {"ring", ring<Ring>()},
                {"dump", dump(print)},
                {"line", line<Port>()}});
}
