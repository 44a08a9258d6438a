#pragma once

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "dispatch/dispatch.h"
#include "plr/test/waiting.h"

namespace plr::test {

// Threads that run work(0), work(1) … work(count - 1); joined at the end.
class Threads {
  public:
    template <class Work>
    Threads(unsigned count, Work work) {
        for (unsigned i = 0; i < count; ++i)
            threads_.emplace_back([work, i] { work(i); });
    }
    void join() { threads_.clear(); }

  private:
    std::vector<std::jthread> threads_;
};

}  // namespace plr::test
