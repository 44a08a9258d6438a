#include "src/log/record_buffer.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace plr {

std::size_t RecordBuffer::messages() const noexcept {
    return static_cast<std::size_t>(
        std::count_if(ends_.begin() + static_cast<std::ptrdiff_t>(first_), ends_.end(),
                      [](const End& end) { return !end.isNote; }));
}

std::string_view RecordBuffer::upTo(std::size_t room) const noexcept {
    const std::string_view all = waiting();
    if (all.size() <= room)
        return all;
    const auto first = ends_.begin() + static_cast<std::ptrdiff_t>(first_);
    const auto beyond = std::partition_point(
        first, ends_.end(), [limit = sent_ + room](const End& end) { return end.at <= limit; });
    if (beyond != first)
        return all.substr(0, std::prev(beyond)->at - sent_);
    return sent_ == startOfFirst() ? std::string_view() : this->first();
}

void RecordBuffer::consume(std::size_t bytes) noexcept {
    sent_ += bytes;
    if (sent_ == size_)
        return clear();
    while (ends_[first_].at <= sent_)
        ++first_;
}

std::size_t RecordBuffer::restartRecord() noexcept {
    return std::exchange(sent_, startOfFirst()) - startOfFirst();
}

std::size_t RecordBuffer::moveTo(RecordBuffer& to, std::size_t limit) {
    to.forgetSent();
    std::size_t start = startOfFirst();
    // Records are sent from here only while none wait there.
    const std::size_t begun = sent_ - start;
    for (; first_ < ends_.size() && to.waiting().size() < limit; ++first_) {
        to.put({bytes_.get() + start, ends_[first_].at - start});
        to.endRecord(ends_[first_].isNote);
        start = ends_[first_].at;
    }
    to.sent_ += begun;
    const std::size_t dropped = messages();
    clear();
    return dropped;
}

void RecordBuffer::clear() noexcept {
    size_ = 0;
    sent_ = 0;
    first_ = 0;
    ends_.clear();
}

void RecordBuffer::trim(std::size_t bytes) noexcept {
    if (size_ != 0 || capacity_ <= bytes)
        return;
    capacity_ = 0;
    bytes_.reset();
    ends_.shrink_to_fit();
}

void RecordBuffer::grow(std::size_t more) {
    const std::size_t capacity = std::max({std::size_t{4096}, capacity_ * 2, size_ + more});
    std::unique_ptr<char[]> larger(new char[capacity]);
    if (size_ != 0)
        std::memcpy(larger.get(), bytes_.get(), size_);
    bytes_.swap(larger);
    capacity_ = capacity;
}

// Moves the records that are left to the front once half of the room is behind
// them.
void RecordBuffer::forgetSent() {
    const std::size_t start = startOfFirst();
    if (start == 0 || start < size_ / 2)
        return;
    std::memmove(bytes_.get(), bytes_.get() + start, size_ - start);
    ends_.erase(ends_.begin(), ends_.begin() + static_cast<std::ptrdiff_t>(first_));
    for (End& end : ends_)
        end.at -= start;
    size_ -= start;
    sent_ -= start;
    first_ = 0;
}

}  // namespace plr
