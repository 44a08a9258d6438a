#pragma once

#include <string>

#include "examples/at_line.h"
#include "plr/ipc/object.h"

// What the result codes of a modem mean for the radio service: which path of
// its tree gets which value.
//
//   +CREG +CGREG +CEREG  /radio/registration, /radio/packet_registration and
//                        /radio/eps_registration: a dictionary with "status"
//                        and "roaming", and "area", "cell" and "technology"
//                        when the modem tells them
//   +CSQ                 /radio/signal: dBm, or null when not known
//   +COPS                /radio/operator: its name, or null without one
//   +CPIN                /radio/sim: the state's name
//   RING, +CRING         /events/ring: the kind of call
//   +CLIP                /events/caller: "number", "type" and perhaps "name"
//   NO CARRIER …         /events/call_ended: how it ended
//   +CMTI, +CDSI         /events/sms, /events/delivery_report: "memory", "index"
//   +CUSD                /events/ussd: "state" and perhaps "text"
//
// Published in 3GPP TS 27.007 and 27.005 and ITU-T V.250. Any thread.
namespace radio {

struct Reading {
    std::string path;                 // empty when the line reports nothing
    vox::object value;                // of that path
    const char* complaint = nullptr;  // why a line was skipped; null: it was understood
};

// Answers to commands, such as "OK", are understood and report nothing.
[[nodiscard]] Reading readLine(const AtLine& line);

// Where a message of /events/sms is kept, as a word: SM-3.
[[nodiscard]] std::string placeOf(const vox::object& message);

}  // namespace radio
