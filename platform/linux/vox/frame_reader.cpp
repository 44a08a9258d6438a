#include "platform/linux/vox/frame_reader.h"

#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <utility>

namespace vox_link {
namespace {

// A frame under way may hold this much before its bytes have arrived.
constexpr std::size_t kEagerBytes = 72u << 10;
// A rest of at most this many bytes is moved to the scratch memory, so that
// small frames are always read in big gulps.
constexpr std::size_t kSmallRest = 4096;
static_assert(kSmallRest < frame_reader::kLeastScratch);

// Memory of the last big frame of this thread, for its next one. Given back to the
// allocator with each frame, it would make that return pages to the system and
// fetch them again (bench/vox_cases.h, one_way_large).
thread_local vox_wire::byte_buffer spare;

void give_spare(vox_wire::byte_buffer& used) noexcept {
    if (used.capacity() > kSmallRest && used.capacity() <= kEagerBytes)
        spare.swap(used);
    used = {};
}

}  // namespace

std::span<std::uint8_t> frame_reader::space(std::span<std::uint8_t> scratch) {
    const std::size_t rest = left();
    if (rest <= kSmallRest) {
        if (rest > 0)
            std::memmove(scratch.data(), at_, rest);
        at_ = scratch.data();
        end_ = at_ + rest;
        in_kept_ = false;
        if (kept_.capacity() > kEagerBytes)
            kept_ = {};
        filling_ = scratch.data() + rest;
        return scratch.subspan(rest);
    }
    // A big frame is under way: exactly its bytes, straight to their place.
    keep();
    if (at_ != kept_.data())
        kept_.drop_front(static_cast<std::size_t>(at_ - kept_.data()));
    const std::size_t total = kHeaderBytes + header_.length;
    const bool full = kept_.capacity() == rest;
    const std::size_t wanted = std::min(total, std::max(kEagerBytes, 2 * rest));
    if (full)
        kept_.reserve(wanted);
    filling_ = kept_.room(0);
    at_ = kept_.data();
    end_ = at_ + rest;
    return {filling_, std::min(kept_.capacity(), total) - rest};
}

void frame_reader::arrived(std::size_t count, std::span<const int> descriptors) {
    if (in_kept_)
        kept_.set_size(kept_.size() + count);
    end_ = filling_ + count;
    descriptors_.insert(descriptors_.end(), descriptors.begin(), descriptors.end());
}

frame_reader::outcome frame_reader::next(frame& out) {
    if (!error_.empty())
        return outcome::error;
    if (!header_known_) {
        if (left() < kHeaderBytes)
            return incomplete();
        if (!read_next_header())
            return outcome::error;
    }
    if (left() < kHeaderBytes + header_.length)
        return incomplete();
    if (waiting_descriptors() < header_.descriptors)
        return refuse("frame declares " + std::to_string(header_.descriptors) +
                      " descriptors but came with " + std::to_string(waiting_descriptors()));
    out.header = header_;
    out.body = {at_ + kHeaderBytes, header_.length};
    out.descriptors = {descriptors_.data() + next_descriptor_, header_.descriptors};
    next_descriptor_ += header_.descriptors;
    at_ += kHeaderBytes + header_.length;
    header_known_ = false;
    return outcome::frame;
}

bool frame_reader::read_next_header() {
    header_known_ = read_header({at_, kHeaderBytes}, limits_, header_, error_);
    return header_known_;
}

// Nothing but the frame under way can own what came so far.
frame_reader::outcome frame_reader::incomplete() {
    if (left() > 0 && !header_known_ && !may_begin_frame({at_, left()}))
        return refuse("frame does not begin with VOX1");
    const std::size_t declared = header_known_ ? header_.descriptors
                                 : left() > 0  ? limits_.descriptors
                                               : 0;
    if (waiting_descriptors() > declared)
        return refuse("more descriptors arrived than frames declare");
    if (next_descriptor_ == descriptors_.size() && next_descriptor_ > 0) {
        descriptors_.clear();
        next_descriptor_ = 0;
    }
    return outcome::more;
}

frame_reader::outcome frame_reader::refuse(std::string why) {
    error_ = std::move(why);
    return outcome::error;
}

bool frame_reader::has_next() const noexcept {
    if (!error_.empty())
        return true;
    if (left() < kHeaderBytes)
        return false;
    // A header that is refused later makes this answer wrong, and harmless.
    return left() - kHeaderBytes >= length_in_header(at_);
}

void frame_reader::keep() {
    if (in_kept_) {
        release_taken();
        return;
    }
    const std::size_t rest = left();
    kept_.clear();
    if (rest == 0) {
        release_taken();
        at_ = end_ = nullptr;
    } else {
        if (rest > kSmallRest && kept_.capacity() == 0) {
            kept_.swap(spare);
            kept_.clear();
        }
        kept_.append({at_, rest});
        at_ = kept_.data();
        end_ = at_ + rest;
    }
    in_kept_ = true;
}

void frame_reader::clear() noexcept {
    for (std::size_t i = next_descriptor_; i < descriptors_.size(); ++i)
        ::close(descriptors_[i]);
    descriptors_.clear();
    next_descriptor_ = 0;
    kept_ = {};
    at_ = end_ = nullptr;
    in_kept_ = true;
    header_known_ = false;
}

// An idle connection holds no memory here.
void frame_reader::release_taken() {
    if (left() > 0)
        return;
    give_spare(kept_);
    at_ = end_ = nullptr;
    if (next_descriptor_ == descriptors_.size()) {
        std::vector<int>().swap(descriptors_);
        next_descriptor_ = 0;
    }
}

}  // namespace vox_link
