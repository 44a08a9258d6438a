#include "plr/test/scripted_modem.h"

#include <fcntl.h>
#include <poll.h>
#include <strings.h>
#include <sys/eventfd.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <system_error>
#include <utility>

namespace plr::test {
namespace {

constexpr char kEndOfText = '\x1A';  // Ctrl-Z, of what was prompted for

[[noreturn]] void throwErrno(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

std::string openClientSide(int master) {
    std::array<char, 64> path;
    if (master < 0 || ::grantpt(master) != 0 || ::unlockpt(master) != 0 ||
        ::ptsname_r(master, path.data(), path.size()) != 0)
        throwErrno("pseudo terminal");
    return path.data();
}

// Or the terminal itself would echo what the modem says.
void setRaw(int terminal) {
    termios settings{};
    if (::tcgetattr(terminal, &settings) != 0)
        throwErrno("pseudo terminal");
    ::cfmakeraw(&settings);
    if (::tcsetattr(terminal, TCSANOW, &settings) != 0)
        throwErrno("pseudo terminal");
}

}  // namespace

void ScriptedModem::Descriptor::close() {
    if (number_ >= 0)
        ::close(std::exchange(number_, -1));
}

ScriptedModem::ScriptedModem(ModemScript script)
    : script_(std::move(script)),
      master_(::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC | O_NONBLOCK)),
      path_(openClientSide(master_.number())),
      client_(::open(path_.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC)),
      wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (client_.number() < 0 || wake_.number() < 0)
        throwErrno("pseudo terminal");
    setRaw(client_.number());
    thread_ = std::thread([this] { run(); });
}

ScriptedModem::~ScriptedModem() {
    hangUp();
}

bool ScriptedModem::say(std::string_view text) {
    return sayBytes("\r\n" + std::string(text) + "\r\n");
}

bool ScriptedModem::sayBytes(std::string_view bytes) {
    const std::lock_guard lock(mutex_);
    if (isEnding_ || unsent_.size() + bytes.size() > kMostUnsent)
        return false;
    unsent_ += bytes;
    wake();
    return true;
}

std::vector<std::string> ScriptedModem::received() const {
    const std::lock_guard lock(mutex_);
    return {received_.begin(), received_.end()};
}

bool ScriptedModem::waitForCommands(std::size_t count, std::chrono::milliseconds bound) const {
    std::unique_lock lock(mutex_);
    return commandCame_.wait_for(lock, bound, [this, count] { return commands_ >= count; });
}

void ScriptedModem::hangUp() {
    const std::lock_guard onlyOne(endMutex_);
    if (!thread_.joinable())
        return;
    {
        const std::lock_guard lock(mutex_);
        isEnding_ = true;
        wake();
    }
    thread_.join();
    master_.close();
}

void ScriptedModem::pauseReading() {
    const std::lock_guard lock(mutex_);
    isPaused_ = true;
    wake();
}

void ScriptedModem::resumeReading() {
    const std::lock_guard lock(mutex_);
    isPaused_ = false;
    wake();
}

void ScriptedModem::sendInPieces(std::size_t bytes) {
    const std::lock_guard lock(mutex_);
    pieceBytes_ = bytes;
    wake();
}

void ScriptedModem::wake() const {
    const std::uint64_t one = 1;
    static_cast<void>(!::write(wake_.number(), &one, sizeof one));
}

// ---- The thread -------------------------------------------------------------------

void ScriptedModem::run() {
    while (await()) {
        const std::lock_guard lock(mutex_);
        if (!isPaused_ && unsent_.size() < kMostUnsent)
            receive();
        if (!unsent_.empty() && !isPieceUnread())
            send();
    }
}

// Waits until there may be something to do. False when that is to end.
bool ScriptedModem::await() {
    pollfd terminal = {.fd = master_.number(), .events = 0, .revents = 0};
    int timeoutMs = -1;
    {
        const std::lock_guard lock(mutex_);
        if (isEnding_)
            return false;
        if (!isPaused_ && unsent_.size() < kMostUnsent)
            terminal.events |= POLLIN;
        // Nothing tells when the client has read a piece.
        if (!unsent_.empty() && isPieceUnread())
            timeoutMs = 1;
        else if (!unsent_.empty())
            terminal.events |= POLLOUT;
    }
    std::array<pollfd, 2> both = {terminal, {.fd = wake_.number(), .events = POLLIN, .revents = 0}};
    ::poll(both.data(), both.size(), timeoutMs);
    std::uint64_t count = 0;
    static_cast<void>(!::read(wake_.number(), &count, sizeof count));
    return true;
}

void ScriptedModem::receive() {
    std::array<char, 256> bytes;
    const ssize_t count = ::read(master_.number(), bytes.data(), bytes.size());
    for (ssize_t i = 0; i < count; ++i)
        take(bytes[static_cast<std::size_t>(i)]);
}

void ScriptedModem::send() {
    const std::size_t most = pieceBytes_ == 0 ? unsent_.size() : pieceBytes_;
    const ssize_t count = ::write(master_.number(), unsent_.data(), std::min(most, unsent_.size()));
    if (count > 0)
        unsent_.erase(0, static_cast<std::size_t>(count));
}

// The terminal hands bytes on in its own time, but completes that in poll(2).
bool ScriptedModem::isPieceUnread() const {
    if (pieceBytes_ == 0)
        return false;
    pollfd client = {.fd = client_.number(), .events = POLLIN, .revents = 0};
    ::poll(&client, 1, 0);
    int bytes = 0;
    return ::ioctl(client.fd, FIONREAD, &bytes) == 0 && bytes > 0;
}

void ScriptedModem::take(char byte) {
    if (echo_)
        unsent_ += byte;
    if (byte == '\r' || byte == kEndOfText)
        finishCommand();
    else if (command_.size() == kLongestCommand)
        isTooLong_ = true;
    else if (byte != '\n')
        command_ += byte;
}

void ScriptedModem::finishCommand() {
    const std::string command = std::exchange(command_, {});
    if (command.empty())
        return;
    if (std::exchange(isTooLong_, false))
        queueLine("ERROR");
    else
        answer(command);
    if (received_.size() == kMostReceived)
        received_.pop_front();
    received_.push_back(command);
    ++commands_;
    commandCame_.notify_all();
}

void ScriptedModem::answer(const std::string& command) {
    const auto is = [&command](const char* other) {
        return ::strcasecmp(command.c_str(), other) == 0;
    };
    const bool setsEcho = is("ATE0") || is("ATE1");
    if (setsEcho)
        echo_ = is("ATE1");
    if (const ModemScript::Answer* lines = script_.find(command)) {
        for (const std::string& line : *lines)
            queueLine(line);
    } else {
        queueLine(setsEcho || is("AT") ? "OK" : "ERROR");
    }
}

void ScriptedModem::queueLine(std::string_view text) {
    unsent_.append("\r\n").append(text).append(text == ">" ? " " : "\r\n");
}

}  // namespace plr::test
