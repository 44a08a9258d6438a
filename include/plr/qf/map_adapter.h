#pragma once

#include <string>

#include "plr/base/export.h"
#include "qf/qf.h"

// A map_adapter reads native values by key, whatever keeps them: a dictionary
// (dict_adapter), an application's preferences (plist_adapter).
//
//   const plr::qf::dict_adapter answers(dictionary);
//   const int bars = answers.getInt(plr::qf::MakeQfString("bars"), 0);
//
// Threads: any, as far as what it reads allows it.
// Errors:  keys are lent and not null; a missing value gives the default.
namespace plr::qf {

class PLR_EXPORT map_adapter {
  public:
    // The first of the virtual functions, the destructor behind it: binaries
    // rely on their order. A created reference, or null when there is no value.
    [[nodiscard]] virtual QfTypeRef copyQfTypeRef(QfStringRef key) const = 0;
    virtual ~map_adapter();

    // The value if it has that type, else null. The caller owns it.
    [[nodiscard]] QfStringRef copyQfStringRef(QfStringRef key) const;
    [[nodiscard]] QfBooleanRef copyQfBooleanRef(QfStringRef key) const;
    [[nodiscard]] QfNumberRef copyQfNumberRef(QfStringRef key) const;
    [[nodiscard]] QfArrayRef copyQfArrayRef(QfStringRef key) const;
    [[nodiscard]] QfDictionaryRef copyQfDictionaryRef(QfStringRef key) const;
    [[nodiscard]] QfDataRef copyQfDataRef(QfStringRef key) const;

    // Strictly, as assign() reads (assign.h): a string (an error's or a URL's
    // text, too), a boolean, a number that converts exactly; else `fallback`.
    [[nodiscard]] std::string getString(QfStringRef key, const std::string& fallback) const;
    [[nodiscard]] bool getBool(QfStringRef key, bool fallback) const;
    [[nodiscard]] int getInt(QfStringRef key, int fallback) const;
    [[nodiscard]] double getDouble(QfStringRef key, double fallback) const;

    // As assign_loosely() leaves it (assign_loosely.h): 2.5 is the int 2, and
    // what is missing or of another type 0.
    [[nodiscard]] bool getBoolLoosely(QfStringRef key, bool fallback) const;
    [[nodiscard]] int getIntLoosely(QfStringRef key) const;
    [[nodiscard]] double getDoubleLoosely(QfStringRef key) const;

  protected:
    map_adapter() = default;
    map_adapter(const map_adapter&) = default;
    map_adapter& operator=(const map_adapter&) = default;
};

}  // namespace plr::qf
