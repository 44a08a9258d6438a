#include "src/log/remote_log_buffer.h"

#include <algorithm>
#include <utility>

#include "src/log/remote_log_format.h"

namespace plr {

// Hot path: bench/log_remote.cpp.
bool RemoteLogBuffer::add(vox::dict&& message) {
    const std::size_t bytes = remote_log::costOf(message);
    const detail::BriefLock guard(lock_);
    if (!hasRoomFor(bytes)) {
        ++gap_;
        ++dropped_;
        return false;
    }
    tellGap();
    added_.push_back({std::move(message), bytes, 0});
    ++held_;
    bytes_ += bytes;
    return !std::exchange(isAwake_, true) || added_.size() == kPromptMessages;
}

// One message always fits, whatever its size.
bool RemoteLogBuffer::hasRoomFor(std::size_t bytes) const {
    return held_ == 0 || (held_ < mostMessages_ && bytes_ + bytes <= mostBytes_);
}

void RemoteLogBuffer::tellGap() {
    if (gap_ == 0)
        return;
    added_.push_back({{}, 0, std::exchange(gap_, 0)});
    ++held_;
}

void RemoteLogBuffer::limit(std::size_t messages, std::size_t bytes) {
    const detail::BriefLock guard(lock_);
    mostMessages_ = messages;
    mostBytes_ = bytes;
}

std::size_t RemoteLogBuffer::held() const {
    const detail::BriefLock guard(lock_);
    return held_;
}

std::uint64_t RemoteLogBuffer::dropped() const {
    const detail::BriefLock guard(lock_);
    return dropped_;
}

bool RemoteLogBuffer::collect(bool willLookAgain) {
    {
        const detail::BriefLock guard(lock_);
        std::swap(added_, collected_);
        isAwake_ = willLookAgain || !collected_.empty();
    }
    const bool anything = !collected_.empty();
    for (Entry& entry : collected_) {
        if (!entry.message)
            entry.message = remote_log::noteOf(entry.dropped, "too many were waiting");
        messages_.push_back(std::move(entry));
    }
    collected_.clear();
    return anything;
}

void RemoteLogBuffer::advance() {
    sentBytes_ += messages_[sent_].bytes;
    ++sent_;
}

void RemoteLogBuffer::refuse(const vox::dict& note) {
    messages_[sent_].message = note;
    advance();
    const detail::BriefLock guard(lock_);
    ++dropped_;
}

void RemoteLogBuffer::rewind() noexcept {
    sent_ = 0;
    sentBytes_ = 0;
}

void RemoteLogBuffer::forgetUntil(std::uint64_t end) {
    std::size_t forgotten = 0, forgottenBytes = 0;
    for (; first_ < end && !messages_.empty(); ++first_, ++forgotten) {
        const std::size_t bytes = messages_.front().bytes;
        forgottenBytes += bytes;
        if (sent_ > 0) {
            --sent_;
            sentBytes_ -= bytes;
        }
        messages_.pop_front();
    }
    if (forgotten == 0)
        return;
    const detail::BriefLock guard(lock_);
    held_ -= forgotten;
    bytes_ -= forgottenBytes;
    tellGap();  // there is room now; and nothing may come for a long time
}

}  // namespace plr
