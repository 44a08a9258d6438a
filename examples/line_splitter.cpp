#include "examples/line_splitter.h"

#include <algorithm>

namespace radio {

void LineSplitter::feed(std::string_view bytes) {
    for (auto end = bytes.find('\n'); end != std::string_view::npos; end = bytes.find('\n')) {
        append(bytes.substr(0, end));
        endLine();
        bytes.remove_prefix(end + 1);
    }
    append(bytes);
}

void LineSplitter::finish() {
    endLine();
}

void LineSplitter::append(std::string_view bytes) {
    while (!bytes.empty() && line_.text.size() < kPrompt.size()) {
        line_.text += bytes.front();
        bytes.remove_prefix(1);
        if (line_.text == kPrompt)
            endLine();
    }
    const auto fitting = std::min(bytes.size(), kLongestLine - line_.text.size());
    line_.text.append(bytes.substr(0, fitting));
    line_.cut = line_.cut || fitting < bytes.size();
}

void LineSplitter::endLine() {
    const auto isReturn = [](char c) { return c == '\r'; };
    std::string& text = line_.text;
    text.erase(std::ranges::find_if_not(text.rbegin(), text.rend(), isReturn).base(), text.end());
    text.erase(text.begin(), std::ranges::find_if_not(text, isReturn));
    if (!text.empty())
        handler_(line_);
    line_ = ModemLine{line_.number + 1, {}, false};
}

}  // namespace radio
