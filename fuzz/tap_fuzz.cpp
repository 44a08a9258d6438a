// A transport tap over any text in any exchanges, with secrets in it whose digits are
// sevens, which occur nowhere else: no record shows one, in either column, and but for
// hidden digits the records show what went over the line. Part of what is read or
// written may get lost.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

#include "Pelorin"
#include "plr/base/assert.h"
#include "plr/test/fake_transport.h"
#include "tests/support/tap_records.h"

namespace {

using plr::test::FakeTransport;
using plr::test::TapRecords;

// One direction: what is to be exchanged next, and what was.
struct Stream {
    char sign;
    std::string waiting;
    std::string exchanged;
};

class Session {
  public:
    Session() {
        const PelorinTransportTapConfig config = {&TapRecords::sink, &records_, nullptr, 0};
        PLR_ASSERT(PelorinTransportCreateTap(&tap_, &line_.transport, &config), "no tap");
    }
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;
    ~Session() { PelorinTransportFree(&tap_); }

    // Three bits say what, one which direction, the rest how much.
    void step(std::uint8_t what, std::span<const std::uint8_t>& more) {
        Stream& stream = (what & 8) != 0 ? written_ : read_;
        const std::size_t amount = what >> 4;
        const std::string sevens(amount + 1, '7');
        std::string& text = stream.waiting;
        switch (what & 7) {
            case 0:
                text += "AT+CPIN=\"" + sevens + "\"";
                break;
            case 1:
                text += "+cpwd=" + std::string(amount * 64, ' ') + sevens;
                break;
            case 2:
                text += "+CLCK=\"SC\",1,\"" + sevens + "\"";
                break;
            case 3:
                text += std::string(13, '7') + sevens;
                break;
            case 4:
                text += (amount & 1) != 0 ? '\r' : '\n';
                break;
            case 5:
                addNoise(text, amount, more);
                break;
            case 6:
                exchange(stream, amount);
                break;
            default:
                lose(stream, amount);
                break;
        }
    }
    void finish() {
        for (Stream* stream : {&written_, &read_}) {
            exchange(*stream, 0);
            check(*stream);
        }
    }

  private:
    static void addNoise(std::string& text, std::size_t amount,
                         std::span<const std::uint8_t>& more) {
        for (const std::uint8_t byte : more.first(std::min(amount, more.size())))
            text += byte == '7' ? '8' : static_cast<char>(byte);
        more = more.subspan(std::min(amount, more.size()));
    }

    // All that waits, or `most` bytes.
    void exchange(Stream& stream, std::size_t most) {
        std::string part = stream.waiting.substr(0, most == 0 ? std::string::npos : most);
        stream.waiting.erase(0, part.size());
        const auto length = static_cast<std::uint32_t>(part.size());
        stream.exchanged += part;
        std::uint32_t count = 0;
        line_.input = part;
        if (stream.sign == '>')
            tap_.write(&tap_, part.data(), length, &count, false, 0, nullptr);
        else
            tap_.read(&tap_, part.data(), length, &count, false, 0, nullptr);
        PLR_ASSERT(count == length, "bytes got lost");
    }
    // The next bytes never reach who reads; a writer hears that they were not taken.
    void lose(Stream& stream, std::size_t amount) {
        std::uint32_t count = 0;
        line_.succeeds = false;
        line_.mostWritten = 0;
        if (stream.sign == '>') {
            tap_.write(&tap_, "7", 1, &count, true, 0, nullptr);
        } else {
            stream.waiting.erase(0, amount);
            if ((amount & 1) != 0)
                tap_.read(&tap_, nullptr, 0, &count, true, 0, nullptr);
            else
                tap_.flushRead(&tap_);
        }
        line_.succeeds = true;
        line_.mostWritten = UINT32_MAX;
    }

    void check(const Stream& stream) const {
        const std::string shown = records_.bytes(stream.sign);
        PLR_ASSERT(shown.size() == stream.exchanged.size(), "bytes are missing");
        for (std::size_t i = 0; i < shown.size(); ++i) {
            const char byte = stream.exchanged[i];
            PLR_ASSERT(shown[i] != '7', "a secret shows");
            PLR_ASSERT(shown[i] == byte || (shown[i] == '*' && byte >= '0' && byte <= '9'),
                       "a byte changed");
        }
        for (const auto& record : records_.all)
            PLR_ASSERT(record.columnsAgree, "the columns differ");
    }

    FakeTransport line_;
    TapRecords records_;
    PelorinTransport tap_{};
    Stream written_{'>', {}, {}};
    Stream read_{'<', {}, {}};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::span<const std::uint8_t> more(data, std::min<std::size_t>(size, 4096));
    Session session;
    while (!more.empty()) {
        const std::uint8_t what = more.front();
        more = more.subspan(1);
        session.step(what, more);
    }
    session.finish();
    return 0;
}
