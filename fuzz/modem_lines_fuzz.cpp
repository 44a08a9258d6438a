// What a modem says, from its bytes to values: the same lines come out however
// the bytes arrive, none is longer than promised, and whatever a line says is
// read or refused, also a short message in two lines.

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "examples/line_splitter.h"
#include "examples/radio_reports.h"
#include "examples/sms_inbox.h"
#include "plr/base/assert.h"

namespace {

std::vector<radio::ModemLine> split(std::string_view input, std::size_t piece) {
    std::vector<radio::ModemLine> lines;
    radio::LineSplitter splitter([&lines](const auto& line) { lines.push_back(line); });
    for (; input.size() > piece; input.remove_prefix(piece))
        splitter.feed(input.substr(0, piece));
    splitter.feed(input);
    splitter.finish();
    return lines;
}

void checkReading(const radio::Reading& reading) {
    PLR_ASSERT(!reading.complaint || reading.path.empty(), "a complaint has a path");
    PLR_ASSERT(!reading.value.to_string().empty(), "a value has no rendering");
}

void readMessages(const std::vector<radio::ModemLine>& lines) {
    radio::SmsInbox inbox;
    radio::PduLines joined([&inbox](const radio::ModemLine& line) {
        const auto parsed = radio::parseAtLine(line.text);
        if (parsed && radio::SmsInbox::isFor(*parsed))
            checkReading(inbox.read(*parsed));
    });
    for (const auto& line : lines)
        joined.feed(line);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(bytes), size);
    const auto lines = split(input, size + 1);
    const auto again = split(input, 1 + size % 7);
    PLR_ASSERT(lines.size() == again.size(), "the pieces change the lines");
    for (std::size_t i = 0; i < lines.size(); ++i) {
        const radio::ModemLine& line = lines[i];
        PLR_ASSERT(line.text == again[i].text && line.number == again[i].number &&
                       line.cut == again[i].cut,
                   "the pieces change a line");
        PLR_ASSERT(line.text.size() <= radio::LineSplitter::kLongestLine, "a line is too long");
        if (const auto parsed = radio::parseAtLine(line.text))
            checkReading(radio::readLine(*parsed));
    }
    readMessages(lines);
    return 0;
}
