#pragma once

#include <utility>

#include "plr/base/export.h"
#include "trel/trel.h"

// Owners of trace-log handles (trel/trel.h).
//
// Owner:   values; each owns one reference of its handle, or none of no handle.
//          A moved-from owner has no handle.
// Threads: as plain pointers; the handles themselves are for any thread.
namespace plr {

// A handle and nothing else.
class PLR_EXPORT TrelLogger {
  public:
    TrelLogger() noexcept = default;
    // The handle of that pair, made on first use.
    TrelLogger(const char* subsystem, const char* category)
        : handle_(trel_create(subsystem, category)) {}
    // One more reference of a handle, which may be null.
    explicit TrelLogger(trel_t handle) noexcept : handle_(trel_retain(handle)) {}

    TrelLogger(const TrelLogger& other) noexcept : TrelLogger(other.handle_) {}
    TrelLogger(TrelLogger&& other) noexcept : handle_(other.take()) {}
    TrelLogger& operator=(TrelLogger other) noexcept {
        std::swap(handle_, other.handle_);
        return *this;
    }
    ~TrelLogger() { trel_release(handle_); }

    // A loan.
    [[nodiscard]] trel_t handle() const noexcept { return handle_; }
    // Gives the reference to the caller.
    [[nodiscard]] trel_t take() noexcept { return std::exchange(handle_, nullptr); }

  private:
    trel_t handle_ = nullptr;
};

// A handle with the name of its category: what loggers are made from.
class PLR_EXPORT TrelContext {
  public:
    // `category` becomes the name. Both are NUL-terminated; the name is not copied
    // and must outlive the context and all its copies.
    TrelContext(const char* subsystem, const char* category)
        : name_(category), logger_(subsystem, category) {}
    // One more reference of a handle, which may be null.
    TrelContext(trel_t handle, const char* name) noexcept : name_(name), logger_(handle) {}

    [[nodiscard]] const char* name() const noexcept { return name_; }
    [[nodiscard]] trel_t handle() const noexcept { return logger_.handle(); }
    [[nodiscard]] trel_t take() noexcept { return logger_.take(); }

  private:
    const char* name_;
    TrelLogger logger_;
};

}  // namespace plr
