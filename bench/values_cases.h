#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/process.h"

// What is measured of property-list values, written once for every peer. Every result is
// compared with the right one, and a wrong one ends the run without a figure.
//
//   build N      a dictionary of N numbers under N texts of 20 to 24 characters, made of
//                nothing and freed; ns an entry
//   find N       the number under a key that is a text of the caller's, read; keys in
//                random order; ns a look-up
//   find_kept N  the same, with keys of the peer's own kind that were made before
//   walk N       every key and its number; ns an entry
//   number 0     a number made, read and freed; ns
//   read N       N numbers read; ns a number
//
// The figure is that of the median lap; a lap is about 20,000 entries.
namespace bench::values_cases {

inline constexpr std::size_t kLapEntries = 20'000;

inline void expect(bool right) {
    if (!right)
        fail("a wrong result");
}

inline std::vector<std::string> makeKeys(std::size_t count) {
    constexpr const char* kGroups[] = {"radio.signal", "network.roaming", "sim.card",
                                       "call.waiting"};
    std::vector<std::string> keys;
    for (std::size_t i = 0; i < count; ++i)
        keys.push_back(std::string(kGroups[i % 4]) + ".setting." + std::to_string(i));
    return keys;
}

// The indexes of `count` things in a random order.
inline std::vector<std::size_t> shuffled(std::size_t count) {
    std::vector<std::size_t> order;
    for (std::size_t i = 0; i < count; ++i)
        order.push_back(i);
    std::uint64_t state = 42;
    for (std::size_t i = count; i > 1; --i) {
        state = state * 6364136223846793005u + 1442695040888963407u;
        std::swap(order[i - 1], order[(state >> 33) % i]);
    }
    return order;
}

inline std::int64_t sumTo(std::size_t count) {
    return static_cast<std::int64_t>(count * (count - 1) / 2);
}

// `pass` handles `entries` entries and returns the sum that is `expected`.
template <class Pass>
void measure(std::size_t entries, std::int64_t expected, Pass pass) {
    const std::size_t passes = kLapEntries / entries;
    LapRecorder laps(5, 50);
    laps.start();
    do {
        for (std::size_t i = 0; i < passes; ++i)
            expect(pass() == expected);
    } while (laps.lap());
    result("ns", static_cast<double>(laps.percentile(50)) / static_cast<double>(passes * entries));
}

// Peer: static functions and types
//   Dictionary build(const std::vector<std::string>& keys), the n-th with the number n
//   void free(Dictionary)
//   std::int64_t find(Dictionary, const std::string& key), and of a Key
//   Key makeKey(const std::string&), which nobody frees
//   std::int64_t walk(Dictionary): the sum of its numbers; touches each key's text
//   Number makeNumber(std::int64_t); std::int64_t read(Number); void free(Number)
template <class Peer>
class Cases {
  public:
    explicit Cases(std::size_t size) : size_(size), keys_(makeKeys(size)), order_(shuffled(size)) {}

    void build() const {
        measure(size_, 0, [this] {
            Peer::free(Peer::build(keys_));
            return 0;
        });
    }
    void find() const { findAll(keys_); }
    void findKept() const {
        std::vector<typename Peer::Key> kept;
        for (const std::string& key : keys_)
            kept.push_back(Peer::makeKey(key));
        findAll(kept);
    }
    void walk() const {
        const auto dictionary = Peer::build(keys_);
        measure(size_, sumTo(size_), [&] { return Peer::walk(dictionary); });
    }
    void number() const {
        std::int64_t next = 0;
        measure(1, 0, [&next] {
            const auto made = Peer::makeNumber(++next);
            const std::int64_t read = Peer::read(made);
            Peer::free(made);
            return read - next;
        });
    }
    void read() const {
        std::vector<typename Peer::Number> numbers;
        for (std::size_t i = 0; i < size_; ++i)
            numbers.push_back(Peer::makeNumber(static_cast<std::int64_t>(i)));
        measure(size_, sumTo(size_), [&] {
            std::int64_t sum = 0;
            for (const auto each : numbers)
                sum += Peer::read(each);
            return sum;
        });
    }

  private:
    template <class Keys>
    void findAll(const Keys& keys) const {
        const auto dictionary = Peer::build(keys_);
        measure(size_, sumTo(size_), [&] {
            std::int64_t sum = 0;
            for (const std::size_t i : order_)
                sum += Peer::find(dictionary, keys[i]);
            return sum;
        });
    }

    std::size_t size_;
    std::vector<std::string> keys_;
    std::vector<std::size_t> order_;
};

// Runs the case and size that the arguments name.
template <class Peer>
int run(std::string_view name, const char* size) {
    const Cases<Peer> cases(std::strtoul(size, nullptr, 10));
    if (name == "build")
        cases.build();
    else if (name == "find")
        cases.find();
    else if (name == "find_kept")
        cases.findKept();
    else if (name == "walk")
        cases.walk();
    else if (name == "number")
        cases.number();
    else if (name == "read")
        cases.read();
    else
        fail("unknown case");
    return 0;
}

}  // namespace bench::values_cases
