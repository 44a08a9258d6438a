#include "src/log/log_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <limits>
#include <system_error>
#include <utility>

#include "plr/base/report.h"
#include "src/log/signal_block.h"

namespace plr {

LogFile::LogFile(Options options) : options_(std::move(options)) {
    if (!open())
        throw std::system_error(error_, std::generic_category(), options_.path);
}

bool LogFile::open() noexcept {
    // Readable, for a look at its end; what gives itself to writers only, is so.
    int fd = ::open(options_.path.c_str(), O_RDWR | O_APPEND | O_CREAT | O_CLOEXEC | O_NOCTTY,
                    options_.mode);
    if (fd < 0 && errno == EACCES)
        fd = ::open(options_.path.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC | O_NOCTTY);
    struct stat status {};
    if (fd < 0 || ::fstat(fd, &status) != 0) {
        setError("cannot be opened", errno);
        if (fd >= 0)
            ::close(fd);
        return false;
    }
    close();
    fd_ = fd;
    isRegular_ = S_ISREG(status.st_mode);
    size_ = isRegular_ ? static_cast<std::uint64_t>(status.st_size) : 0;
    char last = '\n';
    if (size_ != 0)
        static_cast<void>(!::pread(fd_, &last, 1, status.st_size - 1));
    endsInRecord_ = last != '\n';
    return true;
}

void LogFile::close() noexcept {
    if (fd_ >= 0)
        ::close(std::exchange(fd_, -1));
}

bool LogFile::send(RecordBuffer& records) noexcept {
    SignalBlock block(SIGXFSZ);
    const bool sent = sendAll(records);
    if (sent)
        reported_ = 0;
    else if (error_ == EFBIG)
        block.takeBack();
    return sent;
}

bool LogFile::sendAll(RecordBuffer& records) noexcept {
    if (endsInRecord_ && !startNewLine())
        return false;
    while (!records.empty()) {
        std::string_view piece = records.upTo(room());
        if (piece.empty() && rotate())
            piece = records.upTo(room());
        if (piece.empty())
            piece = size_ == 0 ? records.first() : records.waiting();
        if (!write(piece, records))
            return false;
    }
    return true;
}

bool LogFile::startNewLine() noexcept {
    if (::write(fd_, "\n", 1) != 1) {
        setError("cannot be written", errno);
        return false;
    }
    endsInRecord_ = false;
    ++size_;
    return true;
}

bool LogFile::write(std::string_view bytes, RecordBuffer& from) noexcept {
    while (!bytes.empty()) {
        const ssize_t written = ::write(fd_, bytes.data(), bytes.size());
        if (written > 0) {
            const auto count = static_cast<std::size_t>(written);
            from.consume(count);
            size_ += count;
            bytes.remove_prefix(count);
        } else if (written == 0 || errno != EINTR) {
            setError("cannot be written", written == 0 ? ENOSPC : errno);
            return false;
        }
    }
    return true;
}

// For the next records, in bytes. An empty file takes one, however long it is.
std::uint64_t LogFile::room() const noexcept {
    if (options_.maxBytes == 0 || !isRegular_)
        return std::numeric_limits<std::size_t>::max();
    return size_ < options_.maxBytes ? options_.maxBytes - size_ : 0;
}

// ---- Rotation ----

bool LogFile::rotate() noexcept try {
    if (wasTruncated())
        return true;
    if (size_ == 0)
        return false;
    if (options_.oldFiles == 0) {
        if (::ftruncate(fd_, 0) != 0) {
            setError("cannot be emptied", errno);
            return false;
        }
        size_ = 0;
    } else if (!moveFilesUp()) {
        return false;
    }
    ++rotations_;
    return true;
} catch (const std::bad_alloc&) {
    return false;
}

// By somebody else, who wants it to start anew.
bool LogFile::wasTruncated() noexcept {
    struct stat status {};
    if (::fstat(fd_, &status) != 0 || static_cast<std::uint64_t>(status.st_size) >= size_)
        return false;
    size_ = static_cast<std::uint64_t>(status.st_size);
    return true;
}

// Only as far as there are no gaps: attempts that fail again and again push no
// file over the end.
bool LogFile::moveFilesUp() noexcept try {
    unsigned last = 1;
    while (last < options_.oldFiles && ::access(oldPath(last).c_str(), F_OK) == 0)
        ++last;
    for (; last > 0; --last) {
        const std::string from = last == 1 ? options_.path : oldPath(last - 1);
        if (::rename(from.c_str(), oldPath(last).c_str()) != 0 && errno != ENOENT) {
            setError("cannot be rotated", errno);
            return false;
        }
    }
    if (open())
        return true;
    ::rename(oldPath(1).c_str(), options_.path.c_str());
    return false;
} catch (const std::bad_alloc&) {
    return false;
}

std::string LogFile::oldPath(unsigned number) const {
    return options_.path + '.' + std::to_string(number);
}

bool LogFile::reopen(RecordBuffer& kept) noexcept {
    const int old = std::exchange(fd_, -1);
    const std::uint64_t oldSize = size_;
    if (!open()) {
        fd_ = old;
        return false;
    }
    if (const std::size_t begun = kept.restartRecord(); begun != 0)
        static_cast<void>(!::ftruncate(old, static_cast<off_t>(oldSize - begun)));
    ::close(old);
    return true;
}

void LogFile::sendInCrash(std::string_view bytes) noexcept {
    const SignalBlock block(SIGXFSZ);
    while (!bytes.empty()) {
        const ssize_t written = ::write(fd_, bytes.data(), bytes.size());
        if (written > 0)
            bytes.remove_prefix(static_cast<std::size_t>(written));
        else if (written == 0 || errno != EINTR)
            return;
    }
}

void LogFile::setError(const char* what, int error) noexcept {
    error_ = error;
    if (std::exchange(reported_, error) != error)
        report("log file %s %s: %s", options_.path.c_str(), what, ::strerrordesc_np(error));
}

}  // namespace plr
