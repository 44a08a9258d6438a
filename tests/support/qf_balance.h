#pragma once

#include <gtest/gtest.h>

#include "qf/qf.h"

// Fails each test of the program that leaves Qf values behind, or releases more
// than it made; in builds that count them (dev). To be included by one file of it.
namespace plr::test {

class QfBalance : public testing::EmptyTestEventListener {
    void OnTestStart(const testing::TestInfo& /*test*/) override { before_ = qf_get_live_count(); }
    void OnTestEnd(const testing::TestInfo& /*test*/) override {
        EXPECT_EQ(qf_get_live_count(), before_) << "Qf values alive after the test, and before";
    }
    long before_ = 0;
};

inline const bool kQfBalanceIsChecked = [] {
    testing::UnitTest::GetInstance()->listeners().Append(new QfBalance);
    return true;
}();

}  // namespace plr::test
