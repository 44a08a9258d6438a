#include "plr/log/kel_log_writer.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>

#include "plr/concurrency/clock.h"

namespace plr {
namespace {

constexpr int kAllPriorities = 255;
constexpr unsigned kFlushBound = 100;  // ms
constexpr long long kNow = -1;

struct SystemLevel {
    const char* name;
    int priority;
};

SystemLevel systemLevel(LogLevel level) noexcept {
    switch (level) {
        case LogLevel::Trace:
        case LogLevel::Debug:
            return {"Debug", 7};
        case LogLevel::Notice:
            return {"Notice", 5};
        case LogLevel::Warn:
            return {"Warning", 4};
        case LogLevel::Error:
            return {"Error", 3};
        case LogLevel::Fatal:
            return {"Critical", 2};
        default:
            return {"Info", 6};
    }
}

struct FreeMessage {
    void operator()(kel_message_t message) const noexcept { kel_free(message); }
};

TimeStamp startOf(long long startTime) noexcept {
    return startTime == kNow ? static_cast<TimeStamp>(Clock::now_in_nanoseconds()) : startTime;
}

}  // namespace

const char* const KelLogWriter::ZT_START_TIME_KEY = "ZTStartTime";

std::shared_ptr<KelLogWriter> KelLogWriter::create(const char* ident, const char* facility,
                                                   long long startTime) {
    return std::make_shared<KelLogWriter>(ident, facility, startTime);
}

KelLogWriter::KelLogWriter(const char* ident, const char* facility, long long startTime)
    : client_(kel_open(ident, facility, 0)), startTime_(startOf(startTime)) {
    kel_set_filter(client_, kAllPriorities);
}

KelLogWriter::~KelLogWriter() {
    close_kel();
}

void KelLogWriter::setMsgParams(const std::map<std::string, std::string>& parameters) {
    std::map<std::string, std::string> replacement = parameters;
    const std::lock_guard guard(lock_);
    parameters_.swap(replacement);
}

// An elapsed time that 64 bits do not hold wraps.
void KelLogWriter::setElapsed(kel_message_t message, TimeStamp timeStamp) {
    const auto nanoseconds = static_cast<std::int64_t>(static_cast<std::uint64_t>(timeStamp) -
                                                       static_cast<std::uint64_t>(startTime_));
    const lldiv_t elapsed = std::lldiv(nanoseconds / 1000, 1'000'000);
    std::snprintf(elapsed_, sizeof elapsed_, "%6lld.%06lld", elapsed.quot, elapsed.rem);
    kel_set(message, ZT_START_TIME_KEY, elapsed_);
}

void KelLogWriter::write(const LogMessage& message) {
    if (!client_)
        return;
    const std::unique_ptr<kel_message, FreeMessage> made(kel_new(0));
    if (!made)
        return;
    kel_set(made.get(), "Facility", message.getDomain().c_str());
    kel_set(made.get(), "Level", systemLevel(message.getLevel()).name);
    kel_set_bytes(made.get(), "Message", message.getText().data(), message.getText().size());
    setElapsed(made.get(), message.getTimeStamp());
    {
        const std::lock_guard guard(lock_);
        for (const auto& [key, value] : parameters_)
            kel_set_bytes(made.get(), key.c_str(), value.data(), value.size());
    }
    kel_send(client_, made.get());
}

void KelLogWriter::flush(dispatch::group_session /*session*/) {
    kel_flush(client_, kFlushBound);
}

void KelLogWriter::close() {
    close_kel();
}

void KelLogWriter::close_kel() {
    kel_close(client_);
    client_ = nullptr;
}

void KelLogWriter::flushInCrash() noexcept {
    kel_flush_now(client_);
}

void KelLogWriter::writeInCrash(const LogMessage& message) noexcept {
    const std::string& text = message.getText();
    kel_send_now(client_, systemLevel(message.getLevel()).priority, message.getDomain().c_str(),
                 text.data(), text.size());
}

}  // namespace plr
