#include "plr/log/logger_common_base.h"

#include <utility>

#include "plr/log/trel_context.h"

namespace plr {

LoggerCommonBase::LoggerCommonBase(TrelContext&& context)
    : domain_(context.name()), handle_(context.take()) {}

LoggerCommonBase::LoggerCommonBase(const std::string& domain, trel_t handle)
    : domain_(domain), handle_(trel_retain(handle)) {}

LoggerCommonBase::LoggerCommonBase(const LoggerCommonBase& other)
    : domain_(other.domain_), handle_(other.handle_), levels_(other.load()) {
    // Deliberate: one reference less, not one more.
    trel_release(handle_);
}

LoggerCommonBase::LoggerCommonBase(LoggerCommonBase&& other) noexcept
    : domain_(std::move(other.domain_)),
      handle_(std::exchange(other.handle_, nullptr)),
      levels_(other.load()) {}

LoggerCommonBase& LoggerCommonBase::operator=(const LoggerCommonBase& other) {
    domain_ = other.domain_;
    trel_release(std::exchange(handle_, trel_retain(other.handle_)));
    levels_.store(other.load(), std::memory_order_relaxed);
    return *this;
}

LoggerCommonBase& LoggerCommonBase::operator=(LoggerCommonBase&& other) noexcept {
    // In this order it is right for an assignment to itself, too.
    const trel_t handle = std::exchange(other.handle_, nullptr);
    trel_release(std::exchange(handle_, handle));
    if (this != &other)
        domain_ = std::move(other.domain_);
    levels_.store(other.load(), std::memory_order_relaxed);
    return *this;
}

LoggerCommonBase::~LoggerCommonBase() {
    trel_release(handle_);
}

std::uint32_t LoggerCommonBase::wordOf(LogLevel local, LogLevel inherited) noexcept {
    const auto effective = combine(inherited, local);
    return std::uint32_t{asByte(effective)} << kEffectiveShift |
           std::uint32_t{asByte(inherited)} << kInheritedShift | asByte(local);
}

void LoggerCommonBase::setLogLevel(LogLevel level) noexcept {
    std::uint32_t word = load();
    while (!levels_.compare_exchange_weak(word, wordOf(level, inheritedOf(word)),
                                          std::memory_order_relaxed)) {
    }
}

void LoggerCommonBase::setInheritedLogLevel(LogLevel level) noexcept {
    std::uint32_t word = load();
    while (!levels_.compare_exchange_weak(word, wordOf(localOf(word), level),
                                          std::memory_order_relaxed)) {
    }
}

}  // namespace plr
