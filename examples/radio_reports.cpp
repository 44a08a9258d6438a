#include "examples/radio_reports.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <optional>

#include "plr/ipc/dict.h"
#include "plr/ipc/read.h"
#include "plr/ipc/values.h"

namespace radio {
namespace {

using Value = std::optional<vox::object>;  // nothing: the line is malformed

// The name that a code number stands for; null when it stands for none.
template <std::size_t Size>
const char* nameOf(const std::array<const char*, Size>& names, const AtField& field) {
    const auto number = field.number();
    return number && *number < Size ? names[*number] : nullptr;
}

// TS 27.007, 7.2: <stat> and <AcT>.
constexpr std::array kStatus = {"not registered",
                                "home",
                                "searching",
                                "denied",
                                "unknown",
                                "roaming",
                                "home, SMS only",
                                "roaming, SMS only",
                                "emergency calls only",
                                "home, CSFB not preferred",
                                "roaming, CSFB not preferred"};
constexpr std::array kTechnology = {"GSM",         "GSM Compact", "UTRAN",        "GSM EGPRS",
                                    "UTRAN HSDPA", "UTRAN HSUPA", "UTRAN HSPA",   "E-UTRAN",
                                    "EC-GSM-IoT",  "E-UTRAN NB",  "E-UTRAN 5GCN", "NR 5GCN",
                                    "NG-RAN",      "E-UTRA-NR"};

// [<n>,]<stat>[,<lac>,<ci>[,<AcT>]]: with <n> it answers a question, without it
// the modem speaks by itself; only then a string, or nothing, follows.
Value registration(const AtLine& line) {
    const std::size_t at = line.field(1).number() ? 1 : 0;
    const char* status = nameOf(kStatus, line.field(at));
    if (!status)
        return std::nullopt;
    const auto value = vox::dict::create();
    value["status"] = vox::string("%s", status);
    value["roaming"] = vox::boolean(std::string_view(status).starts_with("roaming"));
    for (const auto& [index, key] : {std::pair{at + 1, "area"}, std::pair{at + 2, "cell"}}) {
        const AtField& field = line.field(index);
        if (field.missing())
            continue;
        const auto number = field.hex();
        if (!number)
            return std::nullopt;
        value[key] = vox::uint64(*number);
    }
    if (const AtField& field = line.field(at + 3); !field.missing()) {
        const char* technology = nameOf(kTechnology, field);
        if (!technology)
            return std::nullopt;
        value["technology"] = vox::string("%s", technology);
    }
    return value;
}

// TS 27.007, 8.5: <rssi>,<ber>. 0 is -113 dBm or less, 31 is -51 dBm or more.
Value signal(const AtLine& line) {
    constexpr unsigned kUnknown = 99;
    const auto rssi = line.field(0).number(), errorRate = line.field(1).number();
    if (!rssi || !errorRate || (*errorRate > 7 && *errorRate != kUnknown))
        return std::nullopt;
    if (*rssi == kUnknown)
        return vox::object();
    return *rssi > 31 ? std::nullopt : Value(vox::int64(-113 + 2 * std::int64_t{*rssi}));
}

// TS 27.007, 7.3: <mode>[,<format>,<oper>[,<AcT>]].
Value operatorName(const AtLine& line) {
    const AtField& name = line.field(2);
    if (!line.field(0).number() || (!name.missing() && !name.quoted))
        return std::nullopt;
    return name.missing() ? vox::object() : vox::string(name.text);
}

// TS 27.007, 8.3: a name such as READY or SIM PIN.
Value simState(const AtLine& line) {
    const AtField& state = line.field(0);
    return state.missing() || state.quoted ? std::nullopt : Value(vox::string(state.text));
}

// TS 27.007, 6.11: VOICE, SYNC, ….
Value ringing(const AtLine& line) {
    const AtField& kind = line.field(0);
    return kind.missing() ? vox::string("unspecified") : vox::string(kind.text);
}

// TS 27.007, 7.6: <number>,<type>[,<subaddr>,<satype>[,<alpha>[,<validity>]]].
Value caller(const AtLine& line) {
    const AtField& number = line.field(0);
    const AtField& name = line.field(4);
    const auto type = line.field(1).number();
    if (!number.quoted || !type)
        return std::nullopt;
    const auto value = vox::dict::create();
    value["number"] = vox::string(number.text);
    value["type"] = vox::uint64(*type);
    if (!name.text.empty())
        value["name"] = vox::string(name.text);
    return value;
}

// ITU-T V.250, 6.3: the name alone says it.
Value callEnd(const AtLine& line) {
    return vox::string(line.name);
}

// TS 27.005, 3.4.1: <mem>,<index>.
Value storedMessage(const AtLine& line) {
    const auto index = line.field(1).number();
    if (!line.field(0).quoted || !index)
        return std::nullopt;
    const auto value = vox::dict::create();
    value["memory"] = vox::string(line.field(0).text);
    value["index"] = vox::uint64(*index);
    return value;
}

// TS 27.007, 7.15: <m>[,<str>,<dcs>].
Value ussd(const AtLine& line) {
    constexpr std::array kState = {
        "done",          "answer expected", "ended by the network", "another answered",
        "not supported", "timed out"};
    const char* state = nameOf(kState, line.field(0));
    if (!state)
        return std::nullopt;
    const auto value = vox::dict::create();
    value["state"] = vox::string("%s", state);
    if (line.field(1).quoted)
        value["text"] = vox::string(line.field(1).text);
    return value;
}

struct Code {
    const char* name;
    const char* path;  // null: an answer to a command, which reports nothing
    Value (*read)(const AtLine&);
};

constexpr Code kCodes[] = {
    {"+CREG", "/radio/registration", registration},
    {"+CGREG", "/radio/packet_registration", registration},
    {"+CEREG", "/radio/eps_registration", registration},
    {"+CSQ", "/radio/signal", signal},
    {"+COPS", "/radio/operator", operatorName},
    {"+CPIN", "/radio/sim", simState},
    {"RING", "/events/ring", ringing},
    {"+CRING", "/events/ring", ringing},
    {"+CLIP", "/events/caller", caller},
    {"NO CARRIER", "/events/call_ended", callEnd},
    {"NO ANSWER", "/events/call_ended", callEnd},
    {"BUSY", "/events/call_ended", callEnd},
    {"+CMTI", "/events/sms", storedMessage},
    {"+CDSI", "/events/delivery_report", storedMessage},
    {"+CUSD", "/events/ussd", ussd},
    {"+CMGS", nullptr, nullptr},
    {"OK", nullptr, nullptr},
    {"ERROR", nullptr, nullptr},
    {"+CME ERROR", nullptr, nullptr},
    {"+CMS ERROR", nullptr, nullptr},
};

}  // namespace

Reading readLine(const AtLine& line) {
    const auto* code = std::ranges::find(kCodes, line.name, &Code::name);
    if (code == std::end(kCodes))
        return {{}, {}, "not known"};
    if (!code->path)
        return {};
    if (Value value = code->read(line))
        return {code->path, std::move(*value), nullptr};
    return {{}, {}, "malformed"};
}

std::string placeOf(const vox::object& message) {
    const vox::dict place(message);
    const unsigned long index = vox::dyn_cast_or_default(place["index"], 0UL);
    return std::string(place.text("memory")) + '-' + std::to_string(index);
}

}  // namespace radio
