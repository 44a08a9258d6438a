#include "plr/log/console_log_writer.h"

#include <cstdlib>
#include <string_view>

#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"
#include "src/log/console_device.h"
#include "src/log/record_writer.h"

namespace plr {
namespace {

constexpr std::size_t kKeptBytes = 262'144;

// Empty when it is not set.
std::string_view variable(const char* name) noexcept {
    const char* value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): only reads
    return value != nullptr ? value : "";
}

bool wantsColour(bool isTerminal) noexcept {
    if (!variable("NO_COLOR").empty())
        return false;
    const std::string_view forced = variable("CLICOLOR_FORCE");
    if (!forced.empty() && forced != "0")
        return true;
    const std::string_view terminal = variable("TERM");
    return isTerminal && !terminal.empty() && terminal != "dumb";
}

RecordFormat::Style styleFor(const ConsoleLogWriter::Options& options) noexcept {
    const bool isTerminal = ::isatty(options.descriptor) != 0;
    return {TimeText::zone(options.utc), isTerminal, wantsColour(isTerminal)};
}

}  // namespace

std::shared_ptr<ConsoleLogWriter> ConsoleLogWriter::create(Options options) {
    return std::shared_ptr<ConsoleLogWriter>(new ConsoleLogWriter(options));
}

ConsoleLogWriter::ConsoleLogWriter(const Options& options)
    : records_(std::make_unique<RecordWriter>(std::make_unique<ConsoleDevice>(options.descriptor),
                                              kKeptBytes, ", nobody read them",
                                              RecordFormat(styleFor(options)))) {}

ConsoleLogWriter::~ConsoleLogWriter() {
    ConsoleLogWriter::close();
}

void ConsoleLogWriter::close() {
    records_->close();
}

void ConsoleLogWriter::write(const LogMessage& message) {
    records_->write(message);
}

void ConsoleLogWriter::flush(dispatch::group_session session) {
    records_->flush(session);
}

void ConsoleLogWriter::endBatch() {
    records_->handOver();
}

void ConsoleLogWriter::flushInCrash() noexcept {
    records_->flushInCrash();
}

void ConsoleLogWriter::writeInCrash(const LogMessage& message) noexcept {
    records_->writeInCrash(message);
}

vox::object ConsoleLogWriter::getSimpleConfig() {
    const vox::dict config = vox::dict::create();
    config["kLogWriterType"] = vox::string(std::string_view("console"));
    return config;
}

vox::object ConsoleLogWriter::getFullConfig() {
    const vox::dict config(getSimpleConfig());
    records_->describe(config);
    return config;
}

}  // namespace plr
