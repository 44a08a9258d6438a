#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "kel/kel.h"
#include "plr/base/export.h"
#include "plr/log/log_writer.h"

// A KelLogWriter forwards each message to the system log (kel/kel.h): the
// journal, or what there is instead.
//
//     Key            Journal field   Value
//     "Facility"     FACILITY        the message's domain
//     "Level"        PRIORITY        7 for Trace and Debug, 6 Info, 5 Notice,
//                                    4 Warn, 3 Error, 2 Fatal; 6 for all others
//     "Message"      MESSAGE         the text, any bytes
//     "ZTStartTime"  ZTSTARTTIME     seconds since the start time, "     1.500000"
//     parameters     by Kel's rule   what setMsgParams() was given
//
// Owner:   std::shared_ptr, a log server's usually.
// Queue:   a server's writers queue; setMsgParams() on any thread.
// Cost:    waits for nobody. What the log cannot take at once waits in Kel's
//          bounded backlog, what does not fit there is counted and reported by
//          Kel; a flush waits up to 100 ms for the backlog.
// Crash:   the backlog and each message (32 KiB of its text, without the
//          elapsed time and the parameters) are tried once.
namespace plr {

class PLR_EXPORT KelLogWriter : public BatchLogWriter {
  public:
    static const char* const ZT_START_TIME_KEY;  // "ZTStartTime"

    // `ident` and `facility`: as for kel_open(); both may be null. `startTime`:
    // nanoseconds of the calendar clock, the origin of "ZTStartTime"; -1 is now.
    // All priorities pass. Throws std::bad_alloc.
    [[nodiscard]] static std::shared_ptr<KelLogWriter> create(const char* ident,
                                                              const char* facility,
                                                              long long startTime);
    KelLogWriter(const char* ident, const char* facility, long long startTime);
    ~KelLogWriter() override;  // closes

    // Keys and values for every message from now on, in place of the earlier ones.
    void setMsgParams(const std::map<std::string, std::string>& parameters);

    using LogWriter::write;
    void write(const LogMessage& message) override;
    void flush(dispatch::group_session session) override;
    // Both close the client, if it is open; at most 100 ms for its backlog.
    void close() override;
    void close_kel();

    void flushInCrash() noexcept override;
    void writeInCrash(const LogMessage& message) noexcept override;

  private:
    void setElapsed(kel_message_t message, TimeStamp timeStamp);

    kel_client_t client_;  // null when closed
    const TimeStamp startTime_;
    char elapsed_[32] = {};  // of the message being written
    std::mutex lock_;
    std::map<std::string, std::string> parameters_;  // under lock_
};

}  // namespace plr
