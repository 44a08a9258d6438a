#pragma once

#include <functional>
#include <utility>

#include "plr/ipc/values.h"
#include "plr/log/log_message.h"
#include "plr/log/log_writer.h"

namespace plr::test {

// A log writer made of a function, which is called on the writers queue.
class FunctionLogWriter : public LogWriter {
  public:
    using Function = std::function<void(const LogMessage&)>;
    explicit FunctionLogWriter(Function function) : function_(std::move(function)) {}

    void close() override { closed = true; }
    using LogWriter::write;
    void write(const LogMessage& message) override { function_(message); }
    vox::object getFullConfig() override {
        const vox::dict config = vox::dict::create();
        config["path"] = vox::string("/log");
        return config;
    }

    bool closed = false;

  private:
    const Function function_;
};

}  // namespace plr::test
