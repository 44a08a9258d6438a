#pragma once

#include "src/base/brief_mutex.h"

namespace plr::detail {

// Of the store of recycled messages: nobody is in the middle of a change while it is
// held, as around a fork.
[[nodiscard]] BriefMutex& logMessageLock() noexcept;

}  // namespace plr::detail
