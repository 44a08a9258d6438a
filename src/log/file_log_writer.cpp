#include "plr/log/file_log_writer.h"

#include <atomic>
#include <utility>

#include "plr/base/report.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"
#include "src/log/log_file.h"
#include "src/log/record_writer.h"

namespace plr {

struct FileLogWriter::State {
    explicit State(const Options& options)
        : path(options.path),
          records(std::make_unique<LogFile>(options), options.maxKeptBytes,
                  ", the file could not be written", RecordFormat({TimeText::zone(options.utc)})) {}

    const std::string path;
    RecordWriter records;
    std::atomic<bool> reopen{false};
    bool reopenFailed = false;
};

std::shared_ptr<FileLogWriter> FileLogWriter::create(Options options) {
    return std::shared_ptr<FileLogWriter>(new FileLogWriter(std::move(options)));
}

FileLogWriter::FileLogWriter(Options options) : state_(std::make_unique<State>(options)) {}

FileLogWriter::~FileLogWriter() {
    FileLogWriter::close();
}

void FileLogWriter::reopen() noexcept {
    state_->reopen.store(true, std::memory_order_relaxed);
}

void FileLogWriter::write(const LogMessage& message) {
    if (state_->reopen.load(std::memory_order_relaxed)) [[unlikely]]
        reopenNow();
    state_->records.write(message);
}

void FileLogWriter::reopenNow() {
    state_->reopen.store(false, std::memory_order_relaxed);
    if (state_->records.isClosed())
        return;
    state_->records.handOver();
    state_->records.output().withDevice([this](RecordDevice& device, RecordBuffer& kept) {
        state_->reopenFailed = !static_cast<LogFile&>(device).reopen(kept);
    });
}

void FileLogWriter::endBatch() {
    state_->records.handOver();
    if (std::exchange(state_->reopenFailed, false))
        reopen();
}

void FileLogWriter::flush(dispatch::group_session session) {
    state_->records.flush(session);
}

void FileLogWriter::close() {
    if (const std::uint64_t lost = state_->records.close())
        report("log file %s closed without the last %llu log messages", state_->path.c_str(),
               static_cast<unsigned long long>(lost));
}

void FileLogWriter::flushInCrash() noexcept {
    state_->records.flushInCrash();
}

void FileLogWriter::writeInCrash(const LogMessage& message) noexcept {
    state_->records.writeInCrash(message);
}

vox::object FileLogWriter::getSimpleConfig() {
    const vox::dict config = vox::dict::create();
    config["kLogWriterType"] = vox::string(std::string_view("file"));
    config["kLogWriterPath"] = vox::string(std::string_view(state_->path));
    return config;
}

vox::object FileLogWriter::getFullConfig() {
    const vox::dict config(getSimpleConfig());
    state_->records.output().withDevice([&config](RecordDevice& device, RecordBuffer&) {
        const auto& file = static_cast<const LogFile&>(device);
        config["kBytes"] = vox::uint64(file.bytes());
        config["kRotations"] = vox::uint64(file.rotations());
    });
    state_->records.describe(config);
    return config;
}

}  // namespace plr
