#include "plr/log/memory_buffered_log_writer.h"

#include <utility>

namespace plr {

MemoryBufferedLogWriter::MemoryBufferedLogWriter(long maxMessages, long maxBytes) noexcept
    : maxMessages_(maxMessages), maxBytes_(maxBytes) {}

std::unique_ptr<MemoryBufferedLogWriter> MemoryBufferedLogWriter::create(long maxMessages,
                                                                         long maxBytes) {
    return std::make_unique<MemoryBufferedLogWriter>(maxMessages, maxBytes);
}

MemoryBufferedLogWriter::~MemoryBufferedLogWriter() = default;

void MemoryBufferedLogWriter::close() {}

// Deliberate: the limit of bytes is tested before the new message is counted, so
// that the text held may exceed it by one message.
void MemoryBufferedLogWriter::write(std::shared_ptr<LogMessage> message) {
    if (maxMessages_ >= 1)
        while (static_cast<std::int64_t>(messages_.size()) >= maxMessages_)
            dropFrontMessage();
    if (maxBytes_ >= 1)
        while (bytes_ >= maxBytes_ && !messages_.empty())
            dropFrontMessage();
    bytes_ += static_cast<std::int64_t>(message->getText().size());
    messages_.push_back(std::move(message));
}

void MemoryBufferedLogWriter::dropFrontMessage() {
    bytes_ -= static_cast<std::int64_t>(messages_.front()->getText().size());
    messages_.pop_front();
    ++dropped_;
}

std::deque<std::shared_ptr<LogMessage>> MemoryBufferedLogWriter::drain() {
    return std::exchange(messages_, {});
}

}  // namespace plr
