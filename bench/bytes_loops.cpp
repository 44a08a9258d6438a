// What one writes oneself: loops over tables, snprintf, read(2); and memcpy, the limit.

#include <array>

#include "bench/bytes_cases.h"
#include "bench/bytes_line.h"

namespace {

using namespace bench::bytes_cases;

constexpr char kDigits[] = "0123456789abcdef";

constexpr auto kPairs = [] {
    std::array<std::array<char, 2>, 256> pairs{};
    for (std::size_t i = 0; i < 256; ++i)
        pairs[i] = {kDigits[i >> 4], kDigits[i & 15]};
    return pairs;
}();

// 0 for what is no digit.
constexpr auto kValues = [] {
    std::array<std::uint8_t, 256> values{};
    for (std::uint8_t i = 0; i < 16; ++i) {
        values[static_cast<std::uint8_t>(kDigits[i])] = i;
        values[static_cast<std::uint8_t>("0123456789ABCDEF"[i])] = i;
    }
    return values;
}();

void encode(char* out, std::size_t /*size*/, const std::uint8_t* data, std::size_t bytes) {
    for (std::size_t i = 0; i < bytes; ++i) {
        *out++ = kDigits[data[i] >> 4];
        *out++ = kDigits[data[i] & 15];
    }
    *out = '\0';
}

void encodePairs(char* out, std::size_t /*size*/, const std::uint8_t* data, std::size_t bytes) {
    for (std::size_t i = 0; i < bytes; ++i)
        std::memcpy(out + 2 * i, kPairs[data[i]].data(), 2);
    out[2 * bytes] = '\0';
}

void decode(std::uint8_t* out, std::size_t bytes, const char* text, std::size_t /*length*/) {
    for (std::size_t i = 0; i < bytes; ++i)
        out[i] = static_cast<std::uint8_t>(kValues[static_cast<std::uint8_t>(text[2 * i])] << 4 |
                                           kValues[static_cast<std::uint8_t>(text[2 * i + 1])]);
}

void copy(std::size_t bytes) {
    std::string from = randomBytes(bytes);
    std::string to(bytes, 0);
    const double each = nanosecondsEach(bytes, [&] {
        touch(from.data());
        std::memcpy(to.data(), from.data(), bytes);
        touch(to.data());
    });
    expect(to == from);
    bench::result("gigabyte_per_s", static_cast<double>(bytes) / each);
}

class Port {
  public:
    explicit Port(const std::string& path)
        : fd_(bench::check(::open(path.c_str(), O_RDWR | O_NOCTTY), "open")) {}
    Port(const Port&) = delete;
    Port& operator=(const Port&) = delete;
    ~Port() { ::close(fd_); }

    std::size_t read(char* buffer, std::size_t most) const {
        const auto got = ::read(fd_, buffer, most);
        expect(got > 0);
        return static_cast<std::size_t>(got);
    }

  private:
    int fd_;
};

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv,
               {{"to_hex", toHex(encode)},
                {"to_hex_pairs", toHex(encodePairs)},
                {"from_hex", fromHex(decode)},
                {"copy", copy},
                {"dump", dump(dumpBySnprintf)},
                {"line", line<Port>()}});
}
