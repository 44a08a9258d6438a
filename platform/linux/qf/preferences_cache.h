#pragma once

#include "platform/linux/qf/preferences_store.h"

namespace qf::preferences {

// What the selection's files say now. Hot path: what this thread has asked for
// before, and did not change since, is found in its own memory by comparing one
// number; no lock, no system call (tests/platform/preferences_test.cpp).
// Valid until this thread's next call. Null when the thread's objects have been
// destroyed already: then the store has to be asked.
[[nodiscard]] const snapshot* find_cached(QfStringRef application, QfStringRef user,
                                          QfStringRef host);

// Calls function(const snapshot&).
template <class Function>
auto with_current(QfStringRef application, QfStringRef user, QfStringRef host,
                  const Function& function) {
    if (const snapshot* known = find_cached(application, user, host))
        return function(*known);
    return function(store::instance().get(application, user, host));
}

// Drops what this thread keeps. For tests.
void forget_cached() noexcept;

}  // namespace qf::preferences
