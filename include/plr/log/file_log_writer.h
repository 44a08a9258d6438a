#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/log/log_writer.h"

// A FileLogWriter appends each message to a file, as one record:
//
//   2026-11-21 15:06:43.123456+01:00 I radio.modem: registered {band=3}
//
// That is the local time (RFC 3339 with a space between date and time), the
// level's letter, the domain, the text, and each metadata item in braces. Further
// lines of a text start with four spaces, so that no text can pass for a record.
// Control characters but tab, and bytes that are not UTF-8, appear as \x and two
// hexadecimal digits; a backslash stands for itself.
//
//   auto writer = FileLogWriter::create({.path = "/var/log/radio.log", .maxBytes = 1 << 20});
//   server->addWriter(writer);
//   …on SIGHUP: writer->reopen();
//
// Owner:   std::shared_ptr, a log server's usually. One writer a file.
// Queue:   a server's writers queue; reopen() on any thread.
// Order:   logging order, also over rotations and full disks. A record stands in
//          one file as a whole, and once.
// Cost:    a burst of messages is one write(2); bench/log_cases.h.
//
// Rotation: a file that has no room for the next record becomes path.1, path.1
// becomes path.2, and so on; the oldest one goes. A record longer than a file
// has a file of its own. When rotation fails, the old file grows on, and the next
// burst tries again.
//
// A full disk, and any other error of write(2): what cannot be written is kept in
// memory up to a limit and tried again with each burst, each flush, and by a
// timer after 0.1 to 5 seconds. What comes when the limit is reached is dropped, counted, and
// reported at its place in the file: "Note: 17 log messages dropped, …". What is
// still unwritten at close() is lost, which is reported (plr/base/report.h), as
// errors are when they first occur.
//
// flush() is done when the kernel has everything; nothing is forced to the disk,
// so what the system has not written yet is lost with the power.
namespace plr {

class LogFile;
class RecordWriter;

class PLR_EXPORT FileLogWriter final : public BatchLogWriter {
  public:
    struct Options {
        std::string path;
        std::uint64_t maxBytes = 16 << 20;   // of one file; 0 for no rotation
        unsigned oldFiles = 4;               // path.1 and so on; 0: the file is emptied
        mode_t mode = 0640;                  // of new files, less the umask
        std::size_t maxKeptBytes = 1 << 20;  // that wait while the disk is full
        bool utc = false;                    // times in UTC instead of local ones
    };

    // Opens the file to append to it; its folder must exist. What is no regular
    // file (/dev/stdout) is never rotated. Throws std::system_error.
    [[nodiscard]] static std::shared_ptr<FileLogWriter> create(Options options);
    ~FileLogWriter() override;  // closes

    // Opens the path anew before the next message is written: somebody else has
    // moved the file away. When that fails, the old file stays in use, and each
    // burst tries again. Any thread, signal handlers too.
    void reopen() noexcept;

    void close() override;
    using LogWriter::write;
    void write(const LogMessage& message) override;
    void flush(dispatch::group_session session) override;
    void endBatch() override;
    void flushInCrash() noexcept override;
    void writeInCrash(const LogMessage& message) noexcept override;  // never rotates

    // "kLogWriterType": "file", "kLogWriterPath"; the full one has also "kBytes" (of
    // the file), "kKeptBytes", "kRotations", "kDropped" (messages) and "kLastError"
    // (a text, empty when there was none).
    [[nodiscard]] vox::object getSimpleConfig() override;
    [[nodiscard]] vox::object getFullConfig() override;

  private:
    explicit FileLogWriter(Options options);
    void reopenNow();

    struct State;
    const std::unique_ptr<State> state_;
};

}  // namespace plr
