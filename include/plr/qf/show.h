#pragma once

#include <string>

#include "plr/base/export.h"

namespace plr::qf {

// A Qf value as text for logs; "NULL" for null. `full`: the platform's
// description of all of it. Otherwise collections and data tell their size
// ("QfDictionary(3 keys)", "QfArray(2 elements)", "QfData(16 bytes)"), and
// other values are described. The value is lent. Any thread.
[[nodiscard]] PLR_EXPORT std::string show(bool full, const void* value);
// In full.
[[nodiscard]] PLR_EXPORT std::string show(const void* value);

}  // namespace plr::qf
