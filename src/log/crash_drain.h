#pragma once

#include <memory>

// A server's way to its delivery for the handlers of fatal signals.
namespace plr {

class LogServer;

class CrashDrain {
  public:
    static void add(const std::shared_ptr<LogServer>& server);
};

}  // namespace plr
