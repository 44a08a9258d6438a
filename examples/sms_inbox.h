#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "examples/at_line.h"
#include "examples/line_splitter.h"
#include "examples/radio_reports.h"
#include "examples/sms_pdu.h"

namespace radio {

// A modem tells a message in two lines, of which the second is its PDU. PduLines makes one
// of them, with the PDU as its last field: +CMT: ,24,0791…
//
// Not shared between threads.
class PduLines {
  public:
    explicit PduLines(LineSplitter::Handler handler) : handler_(std::move(handler)) {}
    void feed(const ModemLine& line);

  private:
    const LineSplitter::Handler handler_;
    std::optional<ModemLine> first_;  // waits for its PDU
};

// An SmsInbox makes reports of the PDUs that a modem hands over (3GPP TS 27.005, 3.4):
//
//   +CMT +CMGL   /radio/sms/1, 2 and so on: a dictionary with "from", "time", "encoding",
//                "parts", and "text" or, of what is no text, "data" in hex
//
// A message in parts is reported when all are there, in whatever order they came; one that
// was reported and is kept is not reported again.
//
// Memory: bounded. Behind kMostKept reports the first one is replaced; of more than
//         kMostIncomplete messages the oldest is forgotten.
// Not shared between threads.
class SmsInbox {
  public:
    static constexpr std::size_t kMostKept = 32;
    static constexpr std::size_t kMostIncomplete = 8;

    [[nodiscard]] static bool isFor(const AtLine& line) noexcept;
    // `line`: by PduLines. Reports nothing while parts are missing.
    [[nodiscard]] Reading read(const AtLine& line);

  private:
    struct Incomplete {
        std::string sender;
        std::uint16_t reference;
        std::vector<std::optional<SmsDeliver>> parts;
    };
    using Place = std::deque<Incomplete>::iterator;

    [[nodiscard]] Place placeOf(const std::string& sender, const plr::SmsConcatenation& part);
    [[nodiscard]] Reading collect(const plr::SmsConcatenation& part, SmsDeliver&& message);
    [[nodiscard]] Reading report(const SmsDeliver& message, std::size_t parts);

    std::deque<Incomplete> incomplete_;  // oldest first
    std::deque<vox::object> kept_;       // what was reported, oldest first
    std::size_t reported_ = 0;           // ever
};

}  // namespace radio
