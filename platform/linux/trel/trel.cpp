#include "trel/trel.h"

#include <atomic>
#include <map>
#include <mutex>
#include <string>
#include <utility>

struct trel {
    const std::string* subsystem = nullptr;  // both live in the table's key
    const std::string* category = nullptr;
    std::atomic<long> references{0};
};

namespace {

// Handles by their pair; the nodes never move.
struct handle_table {
    std::mutex lock;
    std::map<std::pair<std::string, std::string>, trel> handles;
};

// Never destroyed: handles are used until the process is gone.
handle_table& table() {
    static auto* const instance = new handle_table;
    return *instance;
}

std::string textOf(const char* text) {
    return text ? text : "";
}

// noexcept: out of memory ends the process.
trel_t find(std::pair<std::string, std::string> names) noexcept {
    handle_table& all = table();
    const std::lock_guard guard(all.lock);
    const auto [place, isNew] = all.handles.try_emplace(std::move(names));
    trel& handle = place->second;
    if (isNew) {
        handle.subsystem = &place->first.first;
        handle.category = &place->first.second;
    }
    return &handle;
}

}  // namespace

extern "C" {

trel_t trel_create(const char* subsystem, const char* category) {
    return trel_retain(find({textOf(subsystem), textOf(category)}));
}

trel_t trel_retain(trel_t handle) {
    if (handle)
        handle->references.fetch_add(1, std::memory_order_relaxed);
    return handle;
}

void trel_release(trel_t handle) {
    if (handle)
        handle->references.fetch_sub(1, std::memory_order_relaxed);
}

const char* trel_get_subsystem(trel_t handle) {
    return handle ? handle->subsystem->c_str() : "";
}

const char* trel_get_category(trel_t handle) {
    return handle ? handle->category->c_str() : "";
}

long trel_get_reference_count(trel_t handle) {
    return handle ? handle->references.load(std::memory_order_relaxed) : 0;
}

}  // extern "C"
