#pragma once

#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <functional>

#include "support/waiting.h"

namespace plr::test {

// Runs `work` in a process of its own, which ends with its result.
inline pid_t startChild(const std::function<int()>& work) {
    const pid_t child = ::fork();
    if (child == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        ::alarm(static_cast<unsigned>(kBound.count()));
        ::_exit(work());
    }
    return child;
}

// With what it ended; -1 when it was killed, as it is after too long a time.
inline int resultOf(pid_t child) {
    int status = -1;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

inline int inChild(const std::function<int()>& work) {
    return resultOf(startChild(work));
}
inline bool holdsInChild(const std::function<bool()>& condition) {
    return inChild([&condition] { return condition() ? 0 : 1; }) == 0;
}

}  // namespace plr::test
