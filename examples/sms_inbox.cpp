#include "examples/sms_inbox.h"

#include <algorithm>
#include <array>

#include "plr/format/hex.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"

namespace radio {
namespace {

bool isHex(std::string_view text) {
    return !plr::parse_hex(std::string(text), plr::kHexWhitespaceNone).empty();
}

// Where the length of a PDU stands, in octets without the SMSC; the PDU is the next field.
// TS 27.005, 3.4.1 and 3.4.2: [<alpha>],<length>; <index>,<stat>,[<alpha>],<length>.
struct Code {
    const char* name;
    std::size_t length;
};
constexpr std::array kCodes = {Code{"+CMT", 1}, Code{"+CMGL", 3}};

const Code* find(std::string_view name) noexcept {
    const auto* code = std::ranges::find(kCodes, name, &Code::name);
    return code == kCodes.end() ? nullptr : code;
}

// TS 27.005, 3.1: 0 and 1 were received, 2 and 3 are to be sent and sent.
bool isReceived(const AtLine& line) {
    return line.name == "+CMT" || line.field(1).number().value_or(2) < 2;
}

vox::object valueOf(const SmsDeliver& message, std::size_t parts) {
    const plr::SmsUserData& content = message.userData;
    const auto value = vox::dict::create();
    value["from"] = vox::string(message.sender);
    if (!message.time.empty())
        value["time"] = vox::string(message.time);
    value["encoding"] = vox::string("%s", asString(content.encoding));
    value["parts"] = vox::uint64(parts);
    if (content.data.empty())
        value["text"] = vox::string(content.text);
    else
        value["data"] = vox::string(plr::hex(content.data));
    return value;
}

}  // namespace

// What is no PDU may be the first line of another message.
void PduLines::feed(const ModemLine& line) {
    if (const auto first = std::exchange(first_, std::nullopt)) {
        if (!line.cut && isHex(line.text))
            return handler_({first->number, first->text + ',' + line.text, false});
        handler_(*first);
    }
    const std::string_view name = std::string_view(line.text).substr(0, line.text.find(':'));
    if (!line.cut && find(name) != nullptr)
        first_ = line;
    else
        handler_(line);
}

bool SmsInbox::isFor(const AtLine& line) noexcept {
    return find(line.name) != nullptr;
}

Reading SmsInbox::read(const AtLine& line) {
    const Code* const code = find(line.name);
    const auto length = line.field(code->length).number();
    const auto pdu = plr::parse_hex(line.field(code->length + 1).text, plr::kHexWhitespaceNone);
    if (pdu.empty() || !length || pdu.size() != 1U + pdu[0] + *length)
        return {{}, {}, "malformed"};
    if (!isReceived(line))
        return {};
    DeliverReading read = readDeliver(pdu);
    if (read.complaint)
        return {{}, {}, read.complaint};
    if (const auto part = read.message.userData.header.concatenation; part && part->total > 1)
        return collect(*part, std::move(read.message));
    return report(read.message, 1);
}

SmsInbox::Place SmsInbox::placeOf(const std::string& sender, const plr::SmsConcatenation& part) {
    const auto found = std::ranges::find_if(incomplete_, [&](const Incomplete& message) {
        return message.sender == sender && message.reference == part.reference &&
               message.parts.size() == part.total;
    });
    if (found != incomplete_.end())
        return found;
    if (incomplete_.size() == kMostIncomplete)
        incomplete_.pop_front();
    incomplete_.push_back(
        {sender, part.reference, std::vector<std::optional<SmsDeliver>>(part.total)});
    return incomplete_.end() - 1;
}

Reading SmsInbox::collect(const plr::SmsConcatenation& part, SmsDeliver&& message) {
    const Place place = placeOf(message.sender, part);
    place->parts[part.number - 1U] = std::move(message);
    if (!std::ranges::all_of(place->parts, [](const auto& one) { return one.has_value(); }))
        return {};
    SmsDeliver whole = *std::move(place->parts[0]);
    for (std::size_t i = 1; i < place->parts.size(); ++i) {
        const plr::SmsUserData& more = place->parts[i]->userData;
        whole.userData.text += more.text;
        whole.userData.data.insert(whole.userData.data.end(), more.data.begin(), more.data.end());
    }
    const std::size_t parts = place->parts.size();
    incomplete_.erase(place);
    return report(whole, parts);
}

Reading SmsInbox::report(const SmsDeliver& message, std::size_t parts) {
    vox::object value = valueOf(message, parts);
    if (std::ranges::find(kept_, value) != kept_.end())
        return {};
    if (kept_.size() == kMostKept)
        kept_.pop_front();
    kept_.push_back(value);
    return {"/radio/sms/" + std::to_string(reported_++ % kMostKept + 1), std::move(value), nullptr};
}

}  // namespace radio
