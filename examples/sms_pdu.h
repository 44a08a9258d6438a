#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "plr/text/sms_user_data.h"

// Short messages as modems hand them over and take them, 3GPP TS 23.040, 9.2:
//
//   SMSC      length in octets, type, digits         both; length 0: the modem's own
//   flags     0x03 kind, 0x40 the user data has a header
//   MR        0                                      SUBMIT
//   address   length in digits, type, digits or septets
//   PID DCS
//   SCTS      seven octets, digits                   DELIVER
//   UDL UD    user data (plr/text/sms_user_data.h)
//
// Two digits stand in an octet, the first one in its lower half.
// Plain data; any thread.
namespace radio {

// A message that was received.
struct SmsDeliver {
    std::string sender;  // digits, + in front of international ones; or a name, UTF-8
    std::string time;    // of the service centre: 2026-11-22T01:02:03+02:00; empty: none
    plr::SmsUserData userData;
};

struct DeliverReading {
    SmsDeliver message;
    const char* complaint = nullptr;  // why it cannot be read; null: it was
};

// `pdu`: from outside, with its SMSC.
[[nodiscard]] DeliverReading readDeliver(std::span<const std::uint8_t> pdu);

// A message to send, with an SMSC of length 0. `number`: up to 20 digits, * and #, perhaps
// with + in front; nothing if it is none.
[[nodiscard]] std::optional<std::vector<std::uint8_t>> writeSubmit(std::string_view number,
                                                                   const plr::SmsPart& part);

}  // namespace radio
