#pragma once

#include <cstddef>
#include <utility>
#include <variant>

#include "plr/ipc/object.h"
#include "plr/ipc/result_errors.h"

// A Result holds what an operation gave: a value, or an error, or nothing yet.
//
//   plr::Result<int> level = readLevel();  // return -85; or Result<int>::failure(…)
//   if (level)
//       show(level.value());
//   else
//       complain(level.error().to_string());
//
// The error is by default what Vox tells of failures: an error object with code
// and description (vox/value.h). Value and Error may be one type, and move-only.
//
// Threads: a value; one thread at a time changes it.
// Failure: reading what it does not hold throws, see result_errors.h. When a setter
//          throws, from copying what it was given, the old content stays.
namespace plr {

template <class Value, class Error = vox::object>
class [[nodiscard]] Result {
  public:
    // Not set.
    Result() = default;
    // A value.
    Result(Value value) : content_(std::in_place_index<kValue>, std::move(value)) {}
    [[nodiscard]] static Result failure(Error error) {
        Result made;
        made.setError(std::move(error));
        return made;
    }

    // What was set before is replaced.
    void setValue(Value value) { content_.template emplace<kValue>(std::move(value)); }
    void setError(Error error) { content_.template emplace<kError>(std::move(error)); }
    void reset() noexcept { content_.template emplace<kNothing>(); }

    [[nodiscard]] bool isSet() const noexcept { return content_.index() != kNothing; }
    [[nodiscard]] bool isError() const noexcept { return content_.index() == kError; }
    [[nodiscard]] bool hasValue() const noexcept { return content_.index() == kValue; }
    [[nodiscard]] explicit operator bool() const noexcept { return hasValue(); }

    // Lent by the result; moved out of one that is about to go.
    [[nodiscard]] Value& value() & { return checkedValue(*this); }
    [[nodiscard]] const Value& value() const& { return checkedValue(*this); }
    [[nodiscard]] Value value() && { return std::move(checkedValue(*this)); }
    [[nodiscard]] Error& error() & { return checkedError(*this); }
    [[nodiscard]] const Error& error() const& { return checkedError(*this); }
    [[nodiscard]] Error error() && { return std::move(checkedError(*this)); }

    // The value, or `other` when there is none.
    [[nodiscard]] Value valueOr(Value other) const& {
        return hasValue() ? std::get<kValue>(content_) : std::move(other);
    }
    [[nodiscard]] Value valueOr(Value other) && {
        return hasValue() ? std::move(std::get<kValue>(content_)) : std::move(other);
    }

  private:
    static constexpr std::size_t kNothing = 0;
    static constexpr std::size_t kValue = 1;
    static constexpr std::size_t kError = 2;

    template <class Self>
    static auto& checkedValue(Self& self) {
        self.requireSet();
        if (self.isError())
            throw ResultIsError();
        return *std::get_if<kValue>(&self.content_);
    }
    template <class Self>
    static auto& checkedError(Self& self) {
        self.requireSet();
        if (!self.isError())
            throw ResultIsNotError();
        return *std::get_if<kError>(&self.content_);
    }
    void requireSet() const {
        if (!isSet())
            throw ResultIsEmptyError();
    }

    std::variant<std::monostate, Value, Error> content_;
};

}  // namespace plr
