#pragma once

#include <array>

#include "support/vox_test.h"

namespace plr::test {

// Both ends of a connection in this process.
class Pair : public ::testing::Test {
  protected:
    explicit Pair(const vox_limits_t* limits = nullptr) : Pair(made(limits)) {}
    void resumeBoth() {
        left.resume();
        right.resume();
    }

    End left;
    End right;

  private:
    explicit Pair(std::array<vox_connection_t, 2> ends) : left(ends[0]), right(ends[1]) {}
    static std::array<vox_connection_t, 2> made(const vox_limits_t* limits) {
        std::array<vox_connection_t, 2> ends{};
        vox_connection_create_pair(&ends[0], &ends[1], limits);
        return ends;
    }
};

}  // namespace plr::test
