#pragma once

#include <Pelorin>
#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <thread>

#include "dispatch/dispatch.h"
#include "examples/line_splitter.h"

namespace radio {

struct ModemSettings {
    std::string path;             // a terminal; or a FIFO or file with a recorded session
    std::uint32_t baud = 115200;  // bits a second
    bool flowControl = true;      // by hardware
    bool operator==(const ModemSettings&) const = default;
};

struct ModemHandlers {
    LineSplitter::Handler onLine;
    std::function<void()> onEnd;                    // nothing will follow
    std::function<void(std::string_view)> onTrace;  // one exchange, see the tap in <Pelorin>
};

// A Modem is the open line to a modem, a byte transport: a terminal is a serial port
// with a queue of its own. A FIFO stays open when its writers leave; a file is read to
// its end; commands are for terminals only.
//
// Owner:   its creator, who destroys it on `queue`; no handler runs afterwards.
// Queues:  onLine and onEnd run on `queue`; onTrace on any thread, one call at a time.
// Threads: one of its own waits for bytes, so that the queue need not.
class Modem {
  public:
    // Throws std::runtime_error when the path cannot be opened.
    Modem(const ModemSettings& settings, dispatch::queue queue, ModemHandlers handlers);
    Modem(const Modem&) = delete;
    Modem& operator=(const Modem&) = delete;
    ~Modem();

    [[nodiscard]] bool isTerminal() const noexcept { return file_.number < 0; }
    // False when the line is gone. Waits only once more is under way than the driver
    // holds, which are some thousand bytes.
    [[nodiscard]] bool write(std::string_view bytes);

  private:
    struct Input;
    struct File {
        int number = -1;
        ~File();
    };
    struct Transport {
        PelorinTransport record{};
        ~Transport() { PelorinTransportFree(&record); }
    };

    [[nodiscard]] bool open(const ModemSettings& settings);
    [[nodiscard]] bool tap();
    void readUntilEnd();
    [[nodiscard]] std::uint32_t read(char* bytes, std::uint32_t most);

    const dispatch::queue queue_;
    const std::function<void(std::string_view)> onTrace_;
    const std::shared_ptr<Input> input_;
    File file_;  // none for a terminal
    Transport line_;
    Transport tap_;  // in front of it
    std::atomic<bool> isClosing_ = false;
    std::thread reader_;
};

}  // namespace radio
