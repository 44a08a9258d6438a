#pragma once

#include <cstdint>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "plr/text/octet_source_buffer.h"
#include "src/text/stage_factory.h"

namespace plr::test {

using Codes = std::vector<std::uint32_t>;

// A source of any codes, one by one.
class CodeSource final : public TextTransform {
  public:
    explicit CodeSource(Codes codes = {}) : codes_(std::move(codes)) {}

    void setCodes(Codes codes) {
        codes_ = std::move(codes);
        pulled_ = 0;
    }
    [[nodiscard]] std::size_t pulled() const { return pulled_; }
    std::uint32_t nextCode() override {
        return pulled_ == codes_.size() ? kEnd : codes_[pulled_++];
    }

  private:
    Codes codes_;
    std::size_t pulled_ = 0;
};

// All codes of a stage, read in runs of `run`; of one that never ends, many.
inline Codes drain(TextTransform& stage, std::size_t run = 1) {
    constexpr std::size_t kMany = 1'000'000;
    Codes all;
    Codes codes(run);
    for (std::size_t got = 1; got != 0 && all.size() < kMany;) {
        got = stage.nextCodes(codes.data(), run);
        all.insert(all.end(), codes.data(), codes.data() + got);
    }
    return all;
}

// What one stage makes of codes.
struct Made {
    Codes codes;
    bool isMarked = false;
    std::size_t pulled = 0;

    bool operator==(const Made&) const = default;
    friend std::ostream& operator<<(std::ostream& to, const Made& made) {
        to << std::hex;
        for (const std::uint32_t code : made.codes)
            to << code << ' ';
        return to << (made.isMarked ? "marked" : "") << std::dec << ", of " << made.pulled;
    }
};

struct StageOf {
    TextConverter::Conversion conversion;
    int p = 0;
    int q = 0;
};

inline Codes codesOf(const std::string& octets) {
    const auto* begin = reinterpret_cast<const unsigned char*>(octets.data());
    return {begin, begin + octets.size()};
}

inline Made makeOf(TextTransform& source, const StageOf& of, std::size_t run, int limit) {
    const auto stage = makeStage(of.conversion, of.p, of.q);
    stage->setSource(&source);
    stage->setCount(limit);
    Codes codes = drain(*stage, run);
    return {std::move(codes), stage->getExceptionStatus(), 0};
}

inline Made make(const StageOf& of, const Codes& input, std::size_t run = 1, int limit = -1) {
    CodeSource source(input);
    Made made = makeOf(source, of, run, limit);
    made.pulled = source.pulled();
    return made;
}

// The same of octets that lie in memory, where a stage may read ahead.
inline Made makeFromMemory(const StageOf& of, const std::string& octets, std::size_t run = 1,
                           int limit = -1) {
    OctetSourceBuffer source;
    source.setSource(octets.data(), static_cast<int>(octets.size()));
    Made made = makeOf(source, of, run, limit);
    made.pulled = source.getCount();
    return made;
}

}  // namespace plr::test
