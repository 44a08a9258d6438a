#include "plr/text/cell_broadcast.h"

namespace plr {
namespace {

constexpr std::size_t kHeaderOctets = 6;
constexpr std::size_t kMostOctets = 88;

constexpr std::uint16_t pair(std::uint8_t high, std::uint8_t low) noexcept {
    return static_cast<std::uint16_t>(high << 8 | low);
}

void readSerialNumber(std::uint16_t serial, CellBroadcastPage& page) noexcept {
    page.scope = static_cast<CellBroadcastPage::Scope>(serial >> 14);
    page.messageCode = serial >> 4 & 0x3FF;
    page.updateNumber = serial & 0xF;
}

void readPageParameter(std::uint8_t parameter, CellBroadcastPage& page) noexcept {
    const std::uint8_t number = parameter >> 4;
    const std::uint8_t total = parameter & 0xF;
    if (number == 0 || total == 0)
        return;
    page.number = number;
    page.total = total;
}

}  // namespace

std::optional<CellBroadcastPage> decodeCellBroadcastPage(std::span<const std::uint8_t> page) {
    if (page.size() < kHeaderOctets || page.size() > kMostOctets)
        return std::nullopt;
    CellBroadcastPage result;
    readSerialNumber(pair(page[0], page[1]), result);
    result.messageIdentifier = pair(page[2], page[3]);
    readPageParameter(page[5], result);
    auto content = decodeUssd(page.subspan(kHeaderOctets), page[4]);
    if (!content || result.number > result.total)
        return std::nullopt;
    result.content = std::move(*content);
    std::string& text = result.content.text;
    text.erase(text.find_last_not_of('\r') + 1);
    return result;
}

}  // namespace plr
