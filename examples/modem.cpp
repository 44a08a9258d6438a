#include "examples/modem.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <semaphore>
#include <stdexcept>
#include <utility>

namespace radio {
namespace {

constexpr std::uint32_t kQueueBytes = 0x10000;  // received and not read
constexpr int kMostUnhandled = 8;               // pieces of what was read

bool openTerminal(const ModemSettings& settings, PelorinTransport& line) {
    PelorinUARTTimeoutConfig config{};
    if (settings.path.size() >= sizeof config.node)
        return false;
    std::memcpy(config.node, settings.path.c_str(), settings.path.size());
    config.baud = settings.baud;
    config.rxQueueSize = kQueueBytes;
    config.localQueueSize = kQueueBytes;
    config.disableFlowControl = settings.flowControl ? 0 : 1;
    return PelorinTransportCreateWithUARTTimeout(&line, &config);
}

}  // namespace

// What the queue has of the input; it is gone with the modem, pieces under way or not.
struct Modem::Input {
    explicit Input(ModemHandlers&& handlers)
        : lines(std::move(handlers.onLine)), onEnd(std::move(handlers.onEnd)) {}

    LineSplitter lines;
    const std::function<void()> onEnd;
    std::counting_semaphore<> room{kMostUnhandled};
};

Modem::File::~File() {
    if (number >= 0)
        ::close(number);
}

Modem::Modem(const ModemSettings& settings, dispatch::queue queue, ModemHandlers handlers)
    : queue_(std::move(queue)),
      onTrace_(std::move(handlers.onTrace)),
      input_(std::make_shared<Input>(std::move(handlers))) {
    if (!open(settings) || !tap())
        throw std::runtime_error("cannot open " + settings.path);
    reader_ = std::thread([this] { readUntilEnd(); });
}

Modem::~Modem() {
    isClosing_ = true;
    input_->room.release();
    tap_.record.unblockRead(&tap_.record);
    reader_.join();
}

bool Modem::open(const ModemSettings& settings) {
    struct stat status {};
    if (::stat(settings.path.c_str(), &status) != 0)
        return false;
    if (S_ISCHR(status.st_mode))
        return openTerminal(settings, line_.record);
    // Being a writer of one's own FIFO keeps it from ending with the others.
    const int access = S_ISFIFO(status.st_mode) ? O_RDWR : O_RDONLY;
    file_.number = ::open(settings.path.c_str(), access | O_CLOEXEC);
    return file_.number >= 0 && PelorinTransportCreateWithFD(&line_.record, file_.number);
}

bool Modem::tap() {
    PelorinTransportTapConfig config{};
    config.context = this;
    config.sink = [](void* context, const char* text) {
        static_cast<Modem*>(context)->onTrace_(text);
    };
    return PelorinTransportCreateTap(&tap_.record, &line_.record, &config);
}

bool Modem::write(std::string_view bytes) {
    std::uint32_t count = 0;
    return tap_.record.write(&tap_.record, bytes.data(), static_cast<std::uint32_t>(bytes.size()),
                             &count, true, PELORIN_FOREVER, nullptr);
}

// 0 when there will be no more.
std::uint32_t Modem::read(char* bytes, std::uint32_t most) {
    std::uint32_t count = 0;
    const bool isRead =
        tap_.record.read(&tap_.record, bytes, most, &count, false, PELORIN_FOREVER, nullptr);
    return isRead && !isClosing_ ? count : 0;
}

// On the thread. A queue that is behind holds the reading up, and so, in the end, the modem.
void Modem::readUntilEnd() {
    std::array<char, 4096> bytes;
    while (const std::uint32_t count = read(bytes.data(), bytes.size())) {
        input_->room.acquire();
        queue_.async([weak = std::weak_ptr(input_), piece = std::string(bytes.data(), count)] {
            if (const auto input = weak.lock()) {
                input->room.release();
                input->lines.feed(piece);
            }
        });
    }
    queue_.async([weak = std::weak_ptr(input_)] {
        if (const auto input = weak.lock()) {
            input->lines.finish();
            input->onEnd();
        }
    });
}

}  // namespace radio
