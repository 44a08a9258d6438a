#include "plr/log/log_tag.h"

#include <pthread.h>

#include <algorithm>
#include <memory>
#include <mutex>
#include <utility>

namespace plr {

const char kLoggingTagKey[8] = "plr:log";
std::atomic<std::uint32_t> last_tag{0};

namespace {

pthread_key_t sThreadKey;
std::atomic<bool> sThreadKeyInitialized{false};

std::uint32_t tagOf(const void* specific) noexcept {
    return static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(specific));
}

TagVector* currentTags() noexcept {
    return static_cast<TagVector*>(::pthread_getspecific(sThreadKey));
}

}  // namespace

void initThreadId() {
    if (sThreadKeyInitialized.load(std::memory_order_acquire))
        return;
    static std::mutex g_pages_mutex;
    const std::lock_guard guard(g_pages_mutex);
    if (sThreadKeyInitialized.load(std::memory_order_relaxed))
        return;
    if (::pthread_key_create(&sThreadKey, &destr_function) == 0)
        sThreadKeyInitialized.store(true, std::memory_order_release);
}

void destr_function(void* tagVector) {
    delete static_cast<TagVector*>(tagVector);
}

void add_logging_tag(dispatch::queue queue) {
    initThreadId();
    std::uint32_t tag = last_tag.load();
    do {
        while (!last_tag.compare_exchange_weak(tag, tag + 1)) {
        }
        ++tag;
    } while (tag == 0);
    queue.set_specific(kLoggingTagKey, reinterpret_cast<void*>(std::uintptr_t{tag}));
}

void maybe_add_logging_tag(dispatch::queue queue) {
    initThreadId();
    if (tagOf(queue.get_specific(kLoggingTagKey)) == 0)
        add_logging_tag(std::move(queue));
}

void reset_last_tag() noexcept {
    last_tag.store(0);
}

std::string get_current_logging_tag() {
    initThreadId();
    TagVector* const tags = sThreadKeyInitialized.load() ? currentTags() : nullptr;
    return tags ? tags->getTagLabel() : std::string();
}

void TagVector::push_back(std::uint32_t tag) {
    tags_.push_back(tag);
    ++newCount_;
}

void TagVector::pop_back() noexcept {
    tags_.pop_back();
    if (newCount_ != 0)
        --newCount_;
}

std::string TagVector::getTagLabel() {
    // The newest `newCount_` tags are new; there may be fewer tags than that.
    const std::size_t known = tags_.size() - std::min<std::size_t>(newCount_, tags_.size());
    std::string label;
    for (std::size_t i = 0; i < tags_.size(); ++i) {
        if (i != 0)
            label += ',';
        label += std::to_string(tags_[i]);
        if (i >= known)
            label += '+';
    }
    newCount_ -= static_cast<std::uint32_t>(tags_.size() - known);
    return label;
}

LogTag::LogTag() : thread_(nullptr) {
    if (!sThreadKeyInitialized.load(std::memory_order_acquire))
        return;
    TagVector* tags = currentTags();
    if (!tags) {
        auto made = std::make_unique<TagVector>();
        if (::pthread_setspecific(sThreadKey, made.get()) != 0)
            return;
        tags = made.release();
    }
    tags->push_back(tagOf(dispatch::current_specific(kLoggingTagKey)));
    thread_ = tags;
}

LogTag::LogTag(LogTag&& other) noexcept : thread_(std::exchange(other.thread_, nullptr)) {}

LogTag& LogTag::operator=(LogTag&& other) noexcept {
    thread_ = std::exchange(other.thread_, nullptr);
    return *this;
}

LogTag::~LogTag() {
    if (thread_)
        thread_->pop_back();
}

}  // namespace plr
