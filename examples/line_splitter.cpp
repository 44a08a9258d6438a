#include "examples/modem.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <memory>
#include <system_error>

namespace radio {
namespace {

[[noreturn]] void throwErrno(const std::string& path) {
    throw std::system_error(errno, std::generic_category(), path);
}

int openModem(const std::string& path) {
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0)
        throwErrno(path);
    // Being a writer of one's own FIFO keeps it from ending with the others.
    const int access = S_ISFIFO(status.st_mode) ? O_RDWR : O_RDONLY;
    const int fd = ::open(path.c_str(), access | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    if (fd < 0)
        throwErrno(path);
    termios settings{};
    if (::tcgetattr(fd, &settings) == 0) {
        ::cfmakeraw(&settings);
        ::tcsetattr(fd, TCSANOW, &settings);
    }
    return fd;
}

class Reader {
  public:
    Reader(const std::string& path, LineSplitter::Handler onLine, Modem::EndHandler onEnd)
        : fd_(openModem(path)), splitter_(std::move(onLine)), onEnd_(std::move(onEnd)) {}
    Reader(const Reader&) = delete;
    Reader& operator=(const Reader&) = delete;
    ~Reader() { ::close(fd_); }

    [[nodiscard]] int descriptor() const noexcept { return fd_; }

    // Reads once. False when that was the last time.
    [[nodiscard]] bool read() {
        std::array<char, 4096> bytes;
        const ssize_t count = ::read(fd_, bytes.data(), bytes.size());
        if (count > 0) {
            splitter_.feed({bytes.data(), static_cast<std::size_t>(count)});
            return true;
        }
        if (count < 0 && (errno == EAGAIN || errno == EINTR))
            return true;
        // A terminal whose line hung up says EIO.
        const int error = count == 0 || errno == EIO ? 0 : errno;
        splitter_.finish();
        onEnd_(error);
        return false;
    }

  private:
    int fd_;
    LineSplitter splitter_;
    Modem::EndHandler onEnd_;
};

}  // namespace

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

Modem::Modem(const std::string& path, const dispatch::queue& queue, LineSplitter::Handler onLine,
             EndHandler onEnd) {
    const auto reader = std::make_shared<Reader>(path, std::move(onLine), std::move(onEnd));
    source_ = dispatch::source::readable(reader->descriptor(), queue);
    source_.set_event_handler(dispatch::block<void()>([reader, source = source_] {
        if (!reader->read())
            source.cancel();
    }));
    // The source holds the reader, and so the descriptor, until it is cancelled.
}

}  // namespace radio
