#include "platform/linux/vox/output.h"

#include <unistd.h>

#include <algorithm>
#include <utility>

namespace vox_link {
namespace {

constexpr std::size_t kChunkBytes = 64u << 10;
// From here on a frame is adopted instead of copied.
constexpr std::size_t kAdoptedBytes = 8u << 10;

}  // namespace

void discard(vox_wire::encoded& made) noexcept {
    for (const int descriptor : made.descriptors)
        ::close(descriptor);
    made.descriptors.clear();
    made.bytes.clear();
}

void output::append(vox_wire::encoded& made) {
    const std::size_t size = made.bytes.size();
    ++accepted_;
    count_waiting(made.bytes.data(), size);
    const bool joins = tail_open_ && made.descriptors.empty() && size < kAdoptedBytes &&
                       chunks_.back().bytes.size() + size <= kChunkBytes;
    chunk& last = joins ? chunks_.back() : chunks_.emplace_back();
    if (size < kAdoptedBytes) {
        last.bytes.append(made.bytes.view());
        made.bytes.clear();
    } else {
        last.bytes = std::move(made.bytes);
    }
    if (!joins)
        adopt_descriptors(last, made);
    tail_open_ = true;
}

void output::put_back(vox_wire::encoded& made, std::size_t sent) {
    count_waiting(made.bytes.data(), made.bytes.size() - sent);
    tail_open_ = tail_open_ && !chunks_.empty();
    chunk& first = chunks_.emplace_front();
    first.bytes = std::move(made.bytes);
    first.at = sent;
    adopt_descriptors(first, made);
}

void output::count_waiting(const std::uint8_t* frame, std::size_t bytes) noexcept {
    bytes_ += bytes;
    if (carries_message(type_in_header(frame)))
        ++messages_;
}

void output::passed(frame_type type) noexcept {
    ++finished_;
    if (carries_message(type))
        ++messages_written_;
}

void output::gather(output_batch& batch) noexcept {
    batch.count = 0;
    batch.bytes = 0;
    batch.descriptors = {};
    for (chunk& waiting : chunks_) {
        if (batch.count == batch.pieces.size())
            return;
        if (batch.count == 0)
            batch.descriptors = waiting.descriptors;
        else if (!waiting.descriptors.empty())
            return;
        const std::size_t size = waiting.bytes.size() - waiting.at;
        batch.pieces[batch.count++] = {waiting.bytes.data() + waiting.at, size};
        batch.bytes += size;
    }
    tail_open_ = false;
}

void output::written(std::size_t count) noexcept {
    bytes_ -= count;
    while (count > 0) {
        chunk& first = chunks_.front();
        close_descriptors(first);
        const std::size_t step = std::min(count, first.bytes.size() - first.at);
        first.at += step;
        count -= step;
        count_frames(first);
        if (first.at < first.bytes.size())
            return;
        chunks_.pop_front();
    }
    if (chunks_.empty())
        tail_open_ = false;
}

void output::count_frames(chunk& progressed) noexcept {
    while (progressed.frame_begin < progressed.at) {
        const std::uint8_t* header = progressed.bytes.data() + progressed.frame_begin;
        const std::size_t end = progressed.frame_begin + kHeaderBytes + length_in_header(header);
        if (end > progressed.at)
            return;
        progressed.frame_begin = end;
        ++finished_;
        if (carries_message(type_in_header(header))) {
            --messages_;
            ++messages_written_;
        }
    }
}

std::vector<std::uint64_t> output::waiting_requests() const {
    std::vector<std::uint64_t> ids;
    for (const chunk& waiting : chunks_) {
        for (std::size_t at = waiting.frame_begin; at < waiting.bytes.size();) {
            const frame_header header = read_own_header(waiting.bytes.data() + at);
            if (header.type == frame_type::request)
                ids.push_back(header.id);
            at += kHeaderBytes + header.length;
        }
    }
    return ids;
}

void output::clear() noexcept {
    for (chunk& waiting : chunks_)
        close_descriptors(waiting);
    chunks_.clear();
    tail_open_ = false;
    bytes_ = 0;
    messages_ = 0;
    finished_ = accepted_;
}

void output::adopt_descriptors(chunk& into, vox_wire::encoded& made) noexcept {
    descriptors_ += made.descriptors.size();
    into.descriptors = std::move(made.descriptors);
    made.descriptors.clear();
}

void output::close_descriptors(chunk& done) noexcept {
    descriptors_ -= done.descriptors.size();
    for (const int descriptor : done.descriptors)
        ::close(descriptor);
    done.descriptors.clear();
}

}  // namespace vox_link
