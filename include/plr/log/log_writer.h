#pragma once

#include <memory>

#include "dispatch/group.h"
#include "plr/base/export.h"
#include "plr/ipc/object.h"
#include "plr/log/log_message.h"

// A LogWriter puts messages where people find them: the system log, a file, a
// terminal, memory.
//
// Owner:   a log server, by std::shared_ptr.
// Queue:   every member runs on the server's writers queue, one at a time, the
//          destructor wherever the last owner lets go.
// Order:   messages arrive in logging order. One slow writer delays the others:
//          writers wait for nothing that another program may hold up.
// Errors:  none are returned; a writer counts what it had to drop and says so
//          in its output and in its configuration.
namespace plr {

class PLR_EXPORT LogWriter {
  public:
    LogWriter() = default;
    LogWriter(const LogWriter&) = delete;
    LogWriter& operator=(const LogWriter&) = delete;
    virtual ~LogWriter();

    // The last call; what is still written afterwards is ignored.
    virtual void close() = 0;

    // Override one of the two; the second one calls the first, which does
    // nothing. (`using LogWriter::write;` keeps the other visible.)
    virtual void write(const LogMessage& message);
    virtual void write(std::shared_ptr<LogMessage> message);

    // Everything written before is to be where it belongs once the last copy of
    // `session` is gone.
    virtual void flush(dispatch::group_session session);

    // What the writer tells about itself in the server's configuration; what is
    // not a dictionary is left out. The first calls the second, which gives null.
    [[nodiscard]] virtual vox::object getSimpleConfig();
    [[nodiscard]] virtual vox::object getFullConfig();
};

// A writer that gathers messages before it passes them on, or that can still
// write in a process that is about to die.
class PLR_EXPORT BatchLogWriter : public LogWriter {
  public:
    // A burst of messages has been written; the next may be long in coming.
    virtual void endBatch();

    // Called by a signal handler of a dying process, on any thread, instead of
    // write(); no other member runs meanwhile or afterwards. Async-signal-safe
    // (POSIX signal-safety(7)): no lock, no allocation, a descriptor that was
    // open before. The first passes on what was gathered, the second writes one
    // message. Both do nothing here.
    virtual void flushInCrash() noexcept;
    virtual void writeInCrash(const LogMessage& message) noexcept;
};

}  // namespace plr
