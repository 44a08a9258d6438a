#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>

#include "src/log/record_output.h"

namespace plr {

// Gathers the pieces of one record on the stack and sends them to a device, in a
// signal handler. Is the Sink of record_text.h. Async-signal-safe.
class CrashSink {
  public:
    explicit CrashSink(RecordDevice& device) noexcept : device_(device) {}
    ~CrashSink() { send(); }
    CrashSink(const CrashSink&) = delete;
    CrashSink& operator=(const CrashSink&) = delete;

    void put(std::string_view text) noexcept {
        if (text.size() > sizeof bytes_ - size_)
            send();
        if (text.size() > sizeof bytes_)
            return device_.sendInCrash(text);
        std::memcpy(bytes_ + size_, text.data(), text.size());
        size_ += text.size();
    }

  private:
    void send() noexcept {
        device_.sendInCrash({bytes_, size_});
        size_ = 0;
    }

    RecordDevice& device_;
    std::size_t size_ = 0;
    char bytes_[1024];
};

}  // namespace plr
