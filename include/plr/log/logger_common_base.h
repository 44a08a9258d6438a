#pragma once

#include <atomic>
#include <cstdint>
#include <string>

#include "plr/base/export.h"
#include "plr/log/log_level.h"
#include "trel/trel.h"

// LoggerCommonBase is what every logger is: a domain, a trace-log handle, a
// level of its own and the level that its domain hands down.
//
// Owner:   the logger that derives from it.
// Threads: levels are read and set on any thread, without a lock. A level that
//          was set is seen by other threads soon, not at once. Domain and handle
//          are set while nobody else uses the logger.
// Cost:    enabled() is one load and one comparison.
namespace plr {

class TrelContext;

class PLR_EXPORT LoggerCommonBase {
  public:
    // The context's name becomes the domain; takes the context's handle over.
    explicit LoggerCommonBase(TrelContext&& context);
    // One more reference of the handle, which may be null.
    LoggerCommonBase(const std::string& domain, trel_t handle);

    // Deliberate: releases a reference of the shared handle where it should take
    // one. Handles live as long as the process, whatever their counts say.
    LoggerCommonBase(const LoggerCommonBase& other);
    // Leaves `other` without a handle.
    LoggerCommonBase(LoggerCommonBase&& other) noexcept;
    // Assignments are balanced: the old handle is released, the new one retained
    // or taken over.
    LoggerCommonBase& operator=(const LoggerCommonBase& other);
    LoggerCommonBase& operator=(LoggerCommonBase&& other) noexcept;
    ~LoggerCommonBase();

    // Components joined by ".", such as "radio.modem".
    [[nodiscard]] const std::string& getLogDomain() const noexcept { return domain_; }
    [[nodiscard]] trel_t getTrelHandle() const noexcept { return handle_; }

    // Whether messages of that level go out; ask before composing one.
    // Hot path: one load, one comparison; bench/log_pelorin.cpp.
    [[nodiscard]] bool enabled(LogLevel level) const noexcept {
        return load() < (std::uint64_t{asByte(level)} + 1) << kEffectiveShift;
    }

    // The effective level, combine(inherited, local): the local one if it is set,
    // and Never from the domain whatever is set here.
    [[nodiscard]] LogLevel getLogLevel() const noexcept {
        return static_cast<LogLevel>(load() >> kEffectiveShift);
    }
    [[nodiscard]] LogLevel getLocalLogLevel() const noexcept { return localOf(load()); }
    [[nodiscard]] LogLevel getInheritedLogLevel() const noexcept { return inheritedOf(load()); }

    // The local level; Unset leaves it to the domain.
    void setLogLevel(LogLevel level) noexcept;
    void setInheritedLogLevel(LogLevel level) noexcept;

  protected:
    void replaceLogDomain(const std::string& domain) { domain_ = domain; }

  private:
    // All levels in one word, so that setters of the one and of the other never
    // leave an effective level that is neither's. The effective one is on top:
    // whether it passes is a comparison of the whole word.
    static constexpr unsigned kEffectiveShift = 24;
    static constexpr unsigned kInheritedShift = 8;

    [[nodiscard]] static constexpr std::uint8_t asByte(LogLevel level) noexcept {
        return static_cast<std::uint8_t>(level);
    }
    [[nodiscard]] static LogLevel localOf(std::uint32_t word) noexcept {
        return static_cast<LogLevel>(word & 0xFFU);
    }
    [[nodiscard]] static LogLevel inheritedOf(std::uint32_t word) noexcept {
        return static_cast<LogLevel>(word >> kInheritedShift & 0xFFU);
    }
    [[nodiscard]] static std::uint32_t wordOf(LogLevel local, LogLevel inherited) noexcept;
    // Relaxed: nothing is published with a level.
    [[nodiscard]] std::uint32_t load() const noexcept {
        return levels_.load(std::memory_order_relaxed);
    }

    std::string domain_;
    trel_t handle_;                          // see the constructors for who owns a reference
    std::atomic<std::uint32_t> levels_ = 0;  // all Unset
};

}  // namespace plr
