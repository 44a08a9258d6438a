#include "platform/linux/dispatch/timer_wheel.h"

#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <random>
#include <set>
#include <vector>

namespace {

using dispatch::detail::timer_wheel;
using dispatch::detail::wheel_entry;

constexpr std::int64_t kLatest = (std::int64_t{1} << 62) - 1;

// The wheel beside a sorted map of the same timers, with a clock moved by hand.
class Model {
  public:
    explicit Model(unsigned seed) : random_(seed), entries_(200) {}

    void insert() {
        wheel_entry& entry = entries_[random_() % entries_.size()];
        if (entry.is_pending())
            remove(entry);
        // All magnitudes of delays, also none and past ones; often equal ones.
        const std::int64_t delay = static_cast<std::int64_t>(random_() >> (2 + random_() % 61));
        const std::int64_t deadline = random_() % 8 == 0
                                          ? std::max<std::int64_t>(now_ - delay, 0)
                                          : std::min(kLatest, now_ / 64 * 64 + delay);
        wheel_->insert(entry, deadline);
        if (deadline <= now_)
            late_.insert(&entry);
        sorted_.emplace(deadline, &entry);
    }
    void removeOne() {
        wheel_entry& entry = entries_[random_() % entries_.size()];
        if (entry.is_pending())
            remove(entry);
    }
    // Everything up to the new time comes out, and nothing else.
    void advance() {
        now_ =
            std::min(kLatest, now_ + static_cast<std::int64_t>(random_() >> (2 + random_() % 61)));
        std::int64_t last = 0;
        while (const wheel_entry* due = wheel_->take_due(now_)) {
            EXPECT_LE(due->deadline(), now_);
            // What was late already when it was inserted has no order to keep; of equal
            // deadlines the first comes first.
            if (late_.erase(due) == 0) {
                EXPECT_GE(due->deadline(), last);
                EXPECT_EQ(sorted_.lower_bound(due->deadline())->second, due);
                last = due->deadline();
            }
            ASSERT_TRUE(forget(*due));
        }
        EXPECT_TRUE(sorted_.empty() || sorted_.begin()->first > now_);
        if (sorted_.empty())
            EXPECT_EQ(wheel_->earliest(), timer_wheel::kNever);
        else
            EXPECT_LE(wheel_->earliest(), sorted_.begin()->first);
    }
    void setBack() {
        now_ -= std::min(now_, static_cast<std::int64_t>(random_() >> (2 + random_() % 61)));
        wheel_->set_back(now_);
        EXPECT_EQ(wheel_->earliest() > now_, sorted_.empty() || sorted_.begin()->first > now_);
    }
    void step() {
        const auto choice = random_() % 100;
        if (choice < 60)
            insert();
        else if (choice < 80)
            removeOne();
        else if (choice < 98)
            advance();
        else
            setBack();
    }

  private:
    void remove(wheel_entry& entry) {
        wheel_->remove(entry);
        late_.erase(&entry);
        EXPECT_FALSE(entry.is_pending());
        EXPECT_TRUE(forget(entry));
    }
    bool forget(const wheel_entry& entry) {
        const auto [begin, end] = sorted_.equal_range(entry.deadline());
        for (auto each = begin; each != end; ++each)
            if (each->second == &entry) {
                sorted_.erase(each);
                return true;
            }
        return false;
    }

    std::mt19937_64 random_;
    std::int64_t now_ = 1'000'000'000;
    std::vector<wheel_entry> entries_;
    std::unique_ptr<timer_wheel> wheel_ = std::make_unique<timer_wheel>();
    std::multimap<std::int64_t, const wheel_entry*> sorted_;
    std::set<const wheel_entry*> late_;
};

TEST(TimerWheel, AgreesWithASortedMap) {
    for (unsigned seed = 0; seed < 50; ++seed) {
        Model model(seed);
        for (int i = 0; i < 2'000 && !testing::Test::HasFailure(); ++i)
            model.step();
        ASSERT_FALSE(testing::Test::HasFailure()) << "seed " << seed;
    }
}

TEST(TimerWheel, EqualDeadlinesKeepTheirOrder) {
    auto wheel = std::make_unique<timer_wheel>();
    std::vector<wheel_entry> entries(6);
    const auto before = std::make_unique<wheel_entry>();
    constexpr std::int64_t kDue = 5'000'000'123;
    for (int i = 0; i < 3; ++i)
        wheel->insert(entries[static_cast<std::size_t>(i)], kDue);
    EXPECT_EQ(wheel->take_due(kDue - 1), nullptr);
    wheel->insert(*before, kDue - 7);  // opens the slot
    EXPECT_EQ(wheel->take_due(kDue - 1), before.get());
    for (int i = 3; i < 6; ++i)
        wheel->insert(entries[static_cast<std::size_t>(i)], kDue);
    for (wheel_entry& each : entries)
        EXPECT_EQ(wheel->take_due(kDue), &each);
    EXPECT_EQ(wheel->take_due(kLatest), nullptr);
}

}  // namespace
