#pragma once

#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/log/logger_base.h"

// A StaticLogger has no queue and is not tracked: it asks the server for its
// domain's level when it is made, and when it is told to.
//
// Owner:   a value.
// Threads: one at a time.
// Cost:    making one looks its domain up, without a lock.
namespace plr {

class PLR_EXPORT StaticLogger : public LoggerBase<std::shared_ptr<LogServer>> {
  public:
    // No domain, no server.
    StaticLogger();
    StaticLogger(const std::string& domain, std::shared_ptr<LogServer> server);
    // The context's name is the domain.
    StaticLogger(TrelContext context, std::shared_ptr<LogServer> server);
    // Same domain, server and local level.
    StaticLogger(const LoggerBase<std::shared_ptr<LogServer>>& other);

    // Asks the server again; nothing happens without one.
    void updateLogLevel();
    // The level stays what it was until the next updateLogLevel().
    void setLogDomain(const std::string& domain) { replaceLogDomain(domain); }
};

}  // namespace plr
