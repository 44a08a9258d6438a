#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"
#include "plr/log/logger_base.h"
#include "plr/log/tracked_logger.h"

// A VoxLoggerProxy stands in for a VoxLogger of another process inside the log
// server of this one: it logs what comes, in the order in which it comes, and
// passes the level of the client's domain on.
//
// Owner:   a VoxLogServer, as long as the client is connected.
// Threads: messages are handled on one queue, the connection's; levels come on
//          any thread.
// Trust:   a client chooses text, metadata, time and level of its messages, but
//          not the domain. It is read no faster than the writers write: about a
//          megabyte of its messages waits for them at most.
namespace plr {

class PLR_EXPORT VoxLoggerProxy : public TrackedLogger,
                                  public LoggerBase<std::shared_ptr<LogServer>> {
  public:
    // Registers with the server, which sends the client its level.
    [[nodiscard]] static std::shared_ptr<VoxLoggerProxy> create(std::shared_ptr<LogServer> server,
                                                                vox::connection connection,
                                                                std::string name,
                                                                std::string domain);
    // The server forgets the domain, unless others need it.
    ~VoxLoggerProxy() override;

    [[nodiscard]] const vox::connection& getConnection() const noexcept { return connection_; }

    // Sends the level to the client. Any thread.
    void updateTrackedConfig(LogLevel level) override;
    using TrackedLogger::updateTrackedConfig;
    [[nodiscard]] std::string getTrackedLoggerName() const override { return name_; }
    // What the client has last said.
    [[nodiscard]] LogLevel getTrackedLogLevel() const override { return getLocalLogLevel(); }

    // A message to log, which keeps the client's time unless that is 0; a local
    // level; or a request to say when everything before it has been written.
    void handleMessage(const vox::dict& message);

  private:
    VoxLoggerProxy(std::shared_ptr<LogServer> server, vox::connection connection, std::string name,
                   const std::string& domain);
    void log(const vox::dict& message);
    void confirm(const vox::dict& request) const;
    void readNoFasterThanWritten(std::size_t bytes);

    const std::string name_;
    const vox::connection connection_;
    std::size_t bytes_ = 0;  // logged since the writers had it all
};

}  // namespace plr
