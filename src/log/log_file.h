#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "plr/log/file_log_writer.h"
#include "src/log/record_output.h"

namespace plr {

// The file of a FileLogWriter: appends, and starts anew when the file is full or
// somebody asks. Rotation is at the ends of records only, and leaves the old file
// in use when it fails.
//
// Threads: one at a time; RecordOutput's lock.
class LogFile final : public RecordDevice {
  public:
    using Options = FileLogWriter::Options;

    // Throws std::system_error when the file cannot be opened.
    explicit LogFile(Options options);
    ~LogFile() override { close(); }
    LogFile(const LogFile&) = delete;
    LogFile& operator=(const LogFile&) = delete;

    [[nodiscard]] bool send(RecordBuffer& records) noexcept override;
    [[nodiscard]] int error() const noexcept override { return error_; }
    void close() noexcept override;
    void sendInCrash(std::string_view bytes) noexcept override;

    // Opens the path again. What the old file has of the first record is taken off
    // it. False when that fails: the old file stays in use.
    bool reopen(RecordBuffer& kept) noexcept;

    [[nodiscard]] const Options& options() const noexcept { return options_; }
    [[nodiscard]] std::uint64_t bytes() const noexcept { return size_; }
    [[nodiscard]] std::uint64_t rotations() const noexcept { return rotations_; }

  private:
    [[nodiscard]] bool open() noexcept;
    [[nodiscard]] bool sendAll(RecordBuffer& records) noexcept;
    [[nodiscard]] bool startNewLine() noexcept;
    [[nodiscard]] bool write(std::string_view bytes, RecordBuffer& from) noexcept;
    [[nodiscard]] std::uint64_t room() const noexcept;
    [[nodiscard]] bool rotate() noexcept;
    [[nodiscard]] bool wasTruncated() noexcept;
    [[nodiscard]] bool moveFilesUp() noexcept;
    [[nodiscard]] std::string oldPath(unsigned number) const;
    void setError(const char* what, int error) noexcept;

    const Options options_;
    int fd_ = -1;
    bool isRegular_ = false;
    bool endsInRecord_ = false;  // a line of an earlier process has no end
    std::uint64_t size_ = 0;     // bytes
    std::uint64_t rotations_ = 0;
    int error_ = 0;     // the last one (errno.h)
    int reported_ = 0;  // the one that was reported last, 0 after a success
};

}  // namespace plr
