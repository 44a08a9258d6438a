#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "plr/base/report.h"
#include "support/waiting.h"
#include "vox/vox.h"

// What the tests of Vox connections share.
namespace plr::test {

// One owned reference.
class Ref {
  public:
    Ref() = default;
    explicit Ref(vox_object_t adopted) : object_(adopted) {}
    Ref(const Ref& other) : object_(vox_retain(other.object_)) {}
    Ref(Ref&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    Ref& operator=(Ref other) noexcept {
        std::swap(object_, other.object_);
        return *this;
    }
    ~Ref() { vox_release(object_); }
    operator vox_object_t() const { return object_; }
    static Ref retain(vox_object_t lent) { return Ref(vox_retain(lent)); }

  private:
    vox_object_t object_ = nullptr;
};

// {"n": n}, and with "data" of `bytes` bytes when that is not 0.
inline Ref message(std::int64_t n, std::size_t bytes = 0) {
    Ref made(vox_dictionary_create());
    vox_dictionary_set_value(made, "n", Ref(vox_int64_create(n)));
    if (bytes > 0) {
        const std::string data(bytes, 'x');
        vox_dictionary_set_value(made, "data", Ref(vox_data_create(data.data(), bytes)));
    }
    return made;
}
inline std::int64_t numberIn(vox_object_t message) {
    return vox_int64_get_value(vox_dictionary_get_value(message, "n"));
}
inline std::string descriptionOf(vox_object_t error) {
    const vox_object_t text = vox_error_get_value(error, vox_error_key_description);
    return text ? vox_string_get_string_ptr(text) : "";
}

// The events of one connection, in order.
class Inbox {
  public:
    // For vox_connection_set_event_handler(); the inbox outlives the connection.
    dispatch::block<void(vox_object_t)> handler() {
        return dispatch::block<void(vox_object_t)>([this](vox_object_t event) { add(event); });
    }
    void add(vox_object_t event) {
        const std::lock_guard guard(lock_);
        events_.push_back(Ref::retain(event));
        changed_.notify_all();
    }
    // Whether `count` events came in time.
    [[nodiscard]] bool wait(std::size_t count) {
        std::unique_lock guard(lock_);
        return changed_.wait_for(guard, kBound, [&] { return events_.size() >= count; });
    }
    // The error event, waited for; null when none came in time.
    [[nodiscard]] Ref waitForError() {
        std::unique_lock guard(lock_);
        Ref found;
        changed_.wait_for(guard, kBound, [&] {
            if (!events_.empty() && vox_get_type(events_.back()) == VOX_TYPE_ERROR)
                found = events_.back();
            return vox_object_t(found) != nullptr;
        });
        return found;
    }
    [[nodiscard]] std::vector<Ref> all() const {
        const std::lock_guard guard(lock_);
        return events_;
    }
    // The "n" of every message so far.
    [[nodiscard]] std::vector<std::int64_t> numbers() const {
        std::vector<std::int64_t> found;
        for (const Ref& event : all()) {
            if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                found.push_back(numberIn(event));
        }
        return found;
    }
    void clear() {
        const std::lock_guard guard(lock_);
        events_.clear();
    }

  private:
    mutable std::mutex lock_;
    std::condition_variable changed_;
    std::vector<Ref> events_;
};

// Sets up and resumes.
inline void resumeWith(vox_connection_t connection, Inbox& inbox,
                       const dispatch::queue& queue = dispatch::queue()) {
    const auto handler = inbox.handler();
    vox_connection_set_event_handler(connection, &handler);
    if (queue)
        vox_connection_set_target_queue(connection, &queue);
    vox_connection_resume(connection);
}

// Sends `message` with reply; the reply or error arrives in `inbox`.
inline void request(vox_connection_t connection, vox_object_t message, const dispatch::queue& queue,
                    Inbox& inbox) {
    const auto handler = inbox.handler();
    vox_connection_send_message_with_reply(connection, message, &queue, &handler);
}

// The lines that went through the report hook since it was made. One at a time.
class Reports {
  public:
    Reports() {
        lines().clear();
        plr::setReportHook([](const char* line) noexcept {
            const std::lock_guard guard(lock());
            lines().emplace_back(line);
        });
    }
    ~Reports() { plr::setReportHook(nullptr); }
    Reports(const Reports&) = delete;
    Reports& operator=(const Reports&) = delete;
    // How many lines contain `text`.
    [[nodiscard]] std::size_t count(std::string_view text) const {
        const std::lock_guard guard(lock());
        std::size_t found = 0;
        for (const std::string& line : lines())
            found += line.find(text) != std::string::npos ? 1 : 0;
        return found;
    }

  private:
    static std::mutex& lock() {
        static std::mutex shared;
        return shared;
    }
    static std::vector<std::string>& lines() {
        static std::vector<std::string> shared;
        return shared;
    }
};

// A fresh runtime directory for this process.
class RuntimeDirectory {
  public:
    RuntimeDirectory() {
        std::string pattern =
            (std::filesystem::temp_directory_path() / "pelorin-vox-XXXXXX").string();
        if (::mkdtemp(pattern.data()))
            path_ = pattern;
        use(path_);
    }
    ~RuntimeDirectory() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    RuntimeDirectory(const RuntimeDirectory&) = delete;
    RuntimeDirectory& operator=(const RuntimeDirectory&) = delete;
    [[nodiscard]] const std::string& path() const { return path_; }
    static void use(const std::string& directory) {
        ::setenv("VOX_RUNTIME_DIR", directory.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    }

  private:
    std::string path_;
};

// Whether `condition` came true in time: for what no event tells.
template <class Condition>
[[nodiscard]] bool eventually(Condition condition) {
    const auto end = std::chrono::steady_clock::now() + kBound;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end)
            return false;
        ::usleep(1000);
    }
    return true;
}

// Descriptors that this process has open.
inline std::size_t openDescriptors() {
    std::size_t count = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        static_cast<void>(entry);
        ++count;
    }
    return count;
}

}  // namespace plr::test
