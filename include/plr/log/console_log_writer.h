#pragma once

#include <unistd.h>

#include <cstdint>
#include <memory>

#include "plr/base/export.h"
#include "plr/log/log_writer.h"

// A ConsoleLogWriter shows each message on a terminal, or sends it down a pipe,
// as FileLogWriter's records (plr/log/file_log_writer.h); a terminal gets the time
// of day only:
//
//   15:06:43.123456 I radio.modem: registered {band=3}
//
// Owner:   std::shared_ptr, a log server's usually. The descriptor is a loan, and
//          stays open as long as the writer.
// Queue:   a server's writers queue.
// Order:   logging order.
// Cost:    a burst of messages is one write(2).
//
// Colour: on a terminal, when the variable TERM is set and not "dumb", or
// anywhere when CLICOLOR_FORCE is neither empty nor "0" (bixense.com/clicolors);
// never when NO_COLOR is not empty (no-color.org). Read at creation.
//
// A reader that does not read: the writer waits for it, and with it the server's
// other writers, for at most 100 milliseconds; it waits again after a burst that
// went out at once. What cannot be written is kept up to 256 KiB and tried again
// with each burst, each flush, and by a timer after 0.1 to 5 seconds; then messages are dropped,
// counted, and reported where they are missing: "Note: 17 log messages dropped, …". This needs a
// descriptor of its own for pipes and terminals, by way of /proc. Where that is not to be had, they
// are written by 4 KiB when they are ready, which a terminal that is stopped just then can hold up.
// A reader that is gone (EPIPE, EIO) gets nothing any more; messages are counted
// as dropped, and no SIGPIPE is raised.
namespace plr {

class RecordWriter;

class PLR_EXPORT ConsoleLogWriter final : public BatchLogWriter {
  public:
    struct Options {
        int descriptor = STDERR_FILENO;
        bool utc = false;  // times in UTC instead of local ones
    };

    // Throws std::bad_alloc.
    [[nodiscard]] static std::shared_ptr<ConsoleLogWriter> create(Options options);
    [[nodiscard]] static std::shared_ptr<ConsoleLogWriter> create() { return create(Options()); }
    ~ConsoleLogWriter() override;  // closes

    void close() override;
    using LogWriter::write;
    void write(const LogMessage& message) override;
    void flush(dispatch::group_session session) override;
    void endBatch() override;
    void flushInCrash() noexcept override;
    void writeInCrash(const LogMessage& message) noexcept override;

    // "kLogWriterType": "console"; the full one has also "kKeptBytes", "kDropped"
    // (messages) and "kLastError" (a text, empty when there was none).
    [[nodiscard]] vox::object getSimpleConfig() override;
    [[nodiscard]] vox::object getFullConfig() override;

  private:
    explicit ConsoleLogWriter(const Options& options);

    const std::unique_ptr<RecordWriter> records_;
};

}  // namespace plr
