#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>

#include "dispatch/dispatch.h"

namespace radio {

struct ModemLine {
    unsigned number = 0;  // from 1, as an editor counts the lines of a recorded session
    std::string text;     // without its end
    bool cut = false;     // it was longer than kLongestLine; `text` is its start
};

// Bytes in, lines out. Lines end with LF; CR beside it is dropped, and so are
// empty lines. Not shared between threads.
class LineSplitter {
  public:
    static constexpr std::size_t kLongestLine = 1024;  // bytes
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

// A Modem reads what a terminal, a FIFO or a file says, line by line, and never
// blocks its queue. A file is read to its end; a FIFO stays open when its
// writers leave; a terminal is set to raw mode.
//
// Owner:   its creator, who makes it on any thread and destroys it on its queue;
//          no handler runs afterwards.
// Queues:  both handlers run on `queue`, from start() on.
class Modem {
  public:
    // Called once when nothing will follow: 0 at the end of a file or after a
    // hang-up, else the error number.
    using EndHandler = std::function<void(int error)>;

    // Throws std::system_error when `path` cannot be opened or watched.
    Modem(const std::string& path, const dispatch::queue& queue, LineSplitter::Handler onLine,
          EndHandler onEnd);
    Modem(const Modem&) = delete;
    Modem& operator=(const Modem&) = delete;
    ~Modem() { source_.cancel(); }

    void start() const { source_.resume(); }  // once

  private:
    dispatch::source source_;
};

}  // namespace radio
