#pragma once

#include "plr/concurrency/qf_shared_ref.h"

namespace plr::qf {

// Owns a Qf string made from a NUL-terminated one (UTF-8): for keys and names
// that are lent to a call. Copies share the string. Null makes none.
class MakeQfString {
  public:
    explicit MakeQfString(const char* text)
        : string_(_Created<String>(text ? qf_string_create(text) : nullptr)) {}

    // A loan.
    [[nodiscard]] QfStringRef get() const noexcept { return string_.get(); }
    operator QfStringRef() const noexcept { return get(); }

  private:
    QfSharedRef<String> string_;
};

}  // namespace plr::qf
