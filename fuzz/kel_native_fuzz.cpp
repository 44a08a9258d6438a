// Kel's encoder of the journal's native protocol: whatever keys and values a
// message has, an independent decoder reads back exactly the fields that the
// rules of kel/kel.h give, in order.
//
// Input: rows of key length, value length (one byte each), key, value; the value's
// length counts eightfold.
#include <algorithm>
#include <cctype>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/kel/record.h"
#include "tests/support/journal_fields.h"

namespace {

using plr::test::JournalFields;

void require(bool condition) {
    if (!condition)
        std::abort();
}

std::string take(std::string_view& input, std::size_t length) {
    const std::string taken(input.substr(0, length));
    input.remove_prefix(taken.size());
    return taken;
}

// As a C string: keys end at a NUL.
std::string takeKey(std::string_view& input, std::size_t length) {
    return take(input, length).c_str();
}

// The rule as the header tells it.
std::string fieldOf(const std::string& key) {
    if (key == "Message")
        return "MESSAGE";
    static const std::vector<std::string> kReserved = {"MESSAGE", "PRIORITY", "SYSLOG_IDENTIFIER",
                                                       "SYSLOG_FACILITY", "KEL_DROPPED"};
    std::string name;
    for (const char each : key.substr(0, 64)) {
        const bool isPlain = (each >= 'a' && each <= 'z') || (each >= 'A' && each <= 'Z') ||
                             (each >= '0' && each <= '9');
        name += isPlain ? static_cast<char>(std::toupper(each)) : '_';
    }
    const bool isReserved = std::find(kReserved.begin(), kReserved.end(), name) != kReserved.end();
    if (name.empty() || name[0] == '_' || std::isdigit(name[0]) != 0 || isReserved)
        name = "KEY_" + name;
    return name.substr(0, 64);
}

void set(JournalFields& rows, const std::string& key, const std::string& value) {
    for (auto& [each, old] : rows) {
        if (each == key) {
            old = value;
            return;
        }
    }
    rows.emplace_back(key, value);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::string_view input(reinterpret_cast<const char*>(data), size);
    const std::string ident = takeKey(input, 16);
    const kel::identity sender(ident.c_str(), "local7");
    const kel_message_t message = kel_new(0);
    JournalFields rows;
    while (input.size() >= 2) {
        const std::string lengths = take(input, 2);
        const std::string key = takeKey(input, static_cast<unsigned char>(lengths[0]));
        const std::string value = take(input, 8u * static_cast<unsigned char>(lengths[1]));
        require(kel_set_bytes(message, key.c_str(), value.data(), value.size()) == 0);
        set(rows, key, value);
    }
    JournalFields expected = {{"SYSLOG_IDENTIFIER", ident},
                              {"SYSLOG_FACILITY", "23"},
                              {"PRIORITY", std::to_string(kel::priority_of(*message))}};
    std::string text;
    for (const auto& [key, value] : rows) {
        if (key == "Message")
            text = value;
        if (key != "Level" || kel::priority_of(*message) == kel::kInfo)
            expected.emplace_back(fieldOf(key), value);
    }
    if (const std::string* level = message->find("Level"); level && *level == "Info")
        expected.erase(std::find(expected.begin() + 3, expected.end(),
                                 JournalFields::value_type("LEVEL", "Info")));
    const kel::record made = kel::encode(*message, sender);
    const auto decoded = plr::test::decodeJournalFields(made.bytes);
    require(decoded && *decoded == expected);
    require(made.view(made.text) == text);
    // One message is one line elsewhere, whatever it holds.
    const std::string line = kel::console_line(made, sender);
    require(std::none_of(line.begin(), line.end() - 1,
                         [](unsigned char each) { return each < ' ' || each == 0x7f; }));
    kel_free(message);
    return 0;
}
