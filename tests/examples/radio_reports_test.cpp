#include "examples/radio_reports.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace radio {
namespace {

// "PATH VALUE", the value on one line; or the complaint.
std::string shown(const char* text) {
    const auto line = parseAtLine(text);
    if (!line)
        return "unreadable";
    const Reading reading = readLine(*line);
    if (reading.complaint)
        return reading.complaint;
    if (reading.path.empty())
        return "nothing";
    std::string value = reading.value.to_string();
    std::erase(value, '\t');
    std::ranges::replace(value, '\n', ' ');
    return reading.path + ' ' + value;
}

TEST(RadioReports, MeanWhatTheStandardsSay) {
    const struct {
        const char* line;
        const char* report;
    } rows[] = {
        {"+CREG: 0", R"(/radio/registration { "status": "not registered", "roaming": false })"},
        {"+CREG: 1,\"1A2B\",\"0C3D4E5F\",7",
         R"(/radio/registration { "status": "home", "roaming": false, "area": 6699u, "cell": 205344351u, "technology": "E-UTRAN" })"},
        {"+CREG: 2,1,\"00FF\",\"1\"",
         R"(/radio/registration { "status": "home", "roaming": false, "area": 255u, "cell": 1u })"},
        {"+CREG: 2,5", R"(/radio/registration { "status": "roaming", "roaming": true })"},
        {"+CGREG: 7,\"1\",\"2\"",
         R"(/radio/packet_registration { "status": "roaming, SMS only", "roaming": true, "area": 1u, "cell": 2u })"},
        {"+CEREG: 10,,\"2\"",
         R"(/radio/eps_registration { "status": "roaming, CSFB not preferred", "roaming": true, "cell": 2u })"},
        {"+CREG:", "malformed"},
        {"+CREG: 11", "malformed"},
        {"+CREG: -1", "malformed"},
        {"+CREG: \"1\"", "malformed"},
        {"+CREG: 1,\"1A2G\",\"1\"", "malformed"},
        {"+CREG: 1,\"1\",\"1\",14", "malformed"},
        {"+CREG: 1,\"1\",\"123456789\"", "malformed"},
        {"+CSQ: 0,0", "/radio/signal -113"},
        {"+CSQ: 1,99", "/radio/signal -111"},
        {"+CSQ: 31,7", "/radio/signal -51"},
        {"+CSQ: 99,99", "/radio/signal null"},
        {"+CSQ: 32,99", "malformed"},
        {"+CSQ: 20,8", "malformed"},
        {"+CSQ: 20", "malformed"},
        {"+CSQ: 20,", "malformed"},
        {"+CSQ: 4294967297,0", "malformed"},
        {"+COPS: 0", "/radio/operator null"},
        {"+COPS: 0,2,\"26201\",7", "/radio/operator \"26201\""},
        {"+COPS: 0,0,\"\"", "/radio/operator \"\""},
        {"+COPS: 0,0,Example", "malformed"},
        {"+COPS:", "malformed"},
        {"+CPIN: SIM PIN", "/radio/sim \"SIM PIN\""},
        {"+CPIN:", "malformed"},
        {"RING", "/events/ring \"unspecified\""},
        {"+CRING: VOICE", "/events/ring \"VOICE\""},
        {"+CLIP: \"+4915550123456\",145,,,\"Ann\"",
         R"(/events/caller { "number": "+4915550123456", "type": 145u, "name": "Ann" })"},
        {"+CLIP: \"\",128,,,,1", R"(/events/caller { "number": "", "type": 128u })"},
        {"+CLIP: 110,129", "malformed"},
        {"NO CARRIER", "/events/call_ended \"NO CARRIER\""},
        {"+CMTI: \"SM\",3", R"(/events/sms { "memory": "SM", "index": 3u })"},
        {"+CDSI: \"ME\",0", R"(/events/delivery_report { "memory": "ME", "index": 0u })"},
        {"+CMTI: SM,3", "malformed"},
        {"+CMTI: \"SM\"", "malformed"},
        {"+CUSD: 0,\"Your %s is 12.40\",15",
         R"(/events/ussd { "state": "done", "text": "Your %s is 12.40" })"},
        {"+CUSD: 4", R"(/events/ussd { "state": "not supported" })"},
        {"+CUSD: 6", "malformed"},
        {"  +CSQ:  23 , 99  ", "/radio/signal -67"},
        {"+COPS: 0,0,\"Example, Inc.\",7", "/radio/operator \"Example, Inc.\""},
        {"+CSQ: +1,99", "malformed"},
        {"+CREG: 1,\"0x1A\",\"1\"", "malformed"},
        {"", "unreadable"},
        {"   ", "unreadable"},
        {"+", "unreadable"},
        {"+: 1", "unreadable"},
        {"+COPS: 0,0,\"Example", "unreadable"},
        {"+COPS: 0,0,Exa\"mp\"le", "unreadable"},
        {"+COPS: 0,0,\"a\"\"b\"", "unreadable"},
        {"\"RING\"", "unreadable"},
        {"RI\x01NG", "unreadable"},
        {"+COPS: 0,0,\"Caf\xc3\xa9\"", "unreadable"},
        {"OK", "nothing"},
        {"+CME ERROR: 10", "nothing"},
        {"+creg: 1", "not known"},
        {"CONNECT 9600", "not known"},
        {"+XQDATA: 17", "not known"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(shown(row.line), row.report) << row.line;
}

}  // namespace
}  // namespace radio
