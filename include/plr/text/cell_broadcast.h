#pragma once

#include <cstdint>
#include <optional>
#include <span>

#include "plr/base/export.h"
#include "plr/text/ussd_text.h"

// Pages of cell broadcast messages, as modems hand them over (3GPP TS 23.041, 9.4.1.2;
// +CBM and +CBR of 3GPP TS 27.005):
//
//   serial number       2 octets: scope, message code, update number
//   message identifier  2 octets
//   data coding scheme  1 octet (3GPP TS 23.038, chapter 5)
//   page parameter      1 octet: number and total of pages
//   content             82 octets at most
//
// Threads: any; values.
namespace plr {

struct CellBroadcastPage {
    enum class Scope : std::uint8_t {
        kCellImmediate,  // to be shown at once
        kNetwork,        // PLMN wide
        kArea,           // of a location, service or tracking area
        kCell,
    };
    Scope scope = Scope::kCellImmediate;
    std::uint16_t messageCode = 0;  // 0 to 1023; with the scope's area, what the message is about
    std::uint8_t updateNumber = 0;  // 0 to 15; another one: the message has changed
    std::uint16_t messageIdentifier = 0;  // the source and kind: what a user subscribes to
    std::uint8_t number = 1;              // of the page, 1 to 15
    std::uint8_t total = 1;               // of the pages
    UssdText content;                     // without the CRs that a page is filled with
};

// `page`: from outside, any octets. The pages of a message, joined in order, are its text. Nothing
// if it is shorter than 6 or longer than 88 octets, for a page beyond the total, and for
// a scheme that decodeUssd() has nothing for. A page parameter with a 0 counts as page 1 of 1.
[[nodiscard]] PLR_EXPORT std::optional<CellBroadcastPage> decodeCellBroadcastPage(
    std::span<const std::uint8_t> page);

}  // namespace plr
