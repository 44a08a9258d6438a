#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>

namespace radio {

struct ModemLine {
    unsigned number = 0;  // from 1, as an editor counts the lines of a recorded session
    std::string text;     // without its end
    bool cut = false;     // it was longer than kLongestLine; `text` is its start
};

// Bytes in, lines out. Lines end with LF; CR beside it is dropped, and so are
// empty lines. A prompt, "> " where a line begins, is a line of its own: modems ask for the
// text of a message so (3GPP TS 27.005, 3.5.1). Not shared between threads.
class LineSplitter {
  public:
    static constexpr std::size_t kLongestLine = 1024;  // bytes
    static constexpr std::string_view kPrompt = "> ";
    using Handler = std::function<void(const ModemLine&)>;

    explicit LineSplitter(Handler handler) : handler_(std::move(handler)) {}
    void feed(std::string_view bytes);
    // The input is over: what stands there without an end is the last line.
    void finish();

  private:
    void append(std::string_view bytes);
    void endLine();

    Handler handler_;
    ModemLine line_{1, {}, false};
};

}  // namespace radio
