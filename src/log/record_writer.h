#pragma once

#include <cstddef>
#include <cstring>
#include <memory>
#include <string_view>
#include <utility>

#include "dispatch/group.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"
#include "plr/log/log_message.h"
#include "src/log/crash_sink.h"
#include "src/log/record_buffer.h"
#include "src/log/record_format.h"
#include "src/log/record_output.h"

namespace plr {

// What file and console writer have in common: gathers the records of a burst
// and hands them to the output together. On the writers queue, as LogWriter.
class RecordWriter {
  public:
    RecordWriter(std::unique_ptr<RecordDevice> device, std::size_t limit, std::string_view note,
                 RecordFormat format)
        : format_(format),
          output_(std::make_shared<RecordOutput>(std::move(device), limit, note, format)) {}

    // Hot path: bench/log_cases.h.
    void write(const LogMessage& message) {
        if (closed_)
            return;
        format_.put(gathered_, message);
        gathered_.endRecord();
        if (gathered_.waiting().size() >= kGathered) [[unlikely]]
            handOver();
    }
    void handOver() {
        if (gathered_.empty())
            return;
        output_->take(gathered_);
        gathered_.trim(4 * kGathered);
    }
    void flush(const dispatch::group_session& session) {
        handOver();
        output_->whenSent(session);
    }
    // Returns how many messages are missing at the end.
    std::uint64_t close() {
        if (std::exchange(closed_, true))
            return 0;
        handOver();
        return output_->close();
    }
    [[nodiscard]] bool isClosed() const noexcept { return closed_; }
    [[nodiscard]] RecordOutput& output() noexcept { return *output_; }

    // What all writers of records tell in their full configuration.
    void describe(const vox::dict& config) {
        const RecordOutput::Counts counts = output_->counts();
        config["kKeptBytes"] = vox::uint64(counts.kept);
        config["kDropped"] = vox::uint64(counts.dropped);
        config["kLastError"] =
            vox::string(std::string_view(counts.error == 0 ? "" : ::strerrordesc_np(counts.error)));
    }

    // Async-signal-safe.
    void flushInCrash() noexcept { output_->flushInCrash(gathered_.waiting()); }
    void writeInCrash(const LogMessage& message) noexcept {
        if (closed_)
            return;
        CrashSink sink(output_->deviceInCrash());
        format_.put(sink, message, RecordFormat::Offset::Keep);
    }

  private:
    static constexpr std::size_t kGathered = 65536;  // bytes

    RecordFormat format_;
    RecordBuffer gathered_;
    const std::shared_ptr<RecordOutput> output_;
    bool closed_ = false;
};

}  // namespace plr
