#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "plr/text/octet_source_buffer.h"
#include "src/text/conversion_chain.h"
#include "src/text/stage_factory.h"

// Chains of any stages with any parameters and limits over any octets. A TextConverter
// and the same stages put together by hand are read side by side, one code by code and the
// other in runs, in turns: codes, marks and the place in the source stay the same. Then
// what must round trip does. The input:
//
//   stages { conversion p q limit }  at most 5, an octet each
//   reads  { kind and length }       at most 15, of any kinds; then all that is left
//   octets                           the source
namespace {

using plr::TextConverter;
using plr::TextTransform;
using enum TextConverter::Conversion;
using Codes = std::vector<std::uint32_t>;

void check(bool holds) {
    if (!holds)
        std::abort();
}

class Script {
  public:
    Script(const std::uint8_t* data, std::size_t size) : at_(data), end_(data + size) {}

    int next() { return at_ == end_ ? 0 : *at_++; }
    [[nodiscard]] std::string rest() const { return {at_, end_}; }

  private:
    const std::uint8_t* at_;
    const std::uint8_t* end_;
};

class Stages {
  public:
    void push(const plr::Conversion& conversion) {
        if (auto stage = plr::makeStage(conversion.stage, conversion.p, conversion.q)) {
            stage->setSource(&top());
            stages_.push_back(std::move(stage));
        }
        top().setCount(static_cast<int>(conversion.limit));
    }
    void setSource(const char* octets, int length) {
        memory_.setSource(octets, length);
        memory_.reset();
        for (const auto& stage : stages_)
            stage->reset();
    }
    TextTransform& top() { return stages_.empty() ? memory_ : *stages_.back(); }
    [[nodiscard]] std::uint64_t sourceCount() const { return memory_.getCount(); }

  private:
    plr::OctetSourceBuffer memory_;
    std::vector<std::unique_ptr<TextTransform>> stages_;
};

template <class Source>
Codes readSingly(Source& source, std::size_t most) {
    Codes codes;
    while (codes.size() < most) {
        codes.push_back(source.nextCode());
        if (codes.back() == TextTransform::kEnd) {
            codes.pop_back();
            break;
        }
    }
    return codes;
}

std::string asChars(const Codes& codes) {
    std::string chars;
    for (const std::uint32_t code : codes)
        chars += static_cast<char>(code);
    return chars;
}

class Pair {
  public:
    explicit Pair(Script& script) {
        for (int count = script.next() % 6; count > 0; --count)
            push(script);
    }

    void setSource(const char* octets, std::size_t length) {
        converter_.setSource(octets, length);
        stages_.setSource(octets, static_cast<int>(length));
    }

    // Returns the number of codes.
    std::size_t read(int kind, std::size_t most) {
        Codes codes;
        if (kind == 0) {
            codes = readSingly(stages_.top(), most);
            check(converter_.readChars(most) == asChars(codes));
        } else {
            codes = readSingly(converter_, most);
            check(kind == 1 ? runOfCodes(most) == codes : runOfChars(most) == asChars(codes));
        }
        check(converter_.getSourceCount() == stages_.sourceCount());
        check(converter_.exceptionOccurred() == stages_.top().getExceptionStatus());
        return codes.size();
    }

  private:
    void push(Script& script) {
        const auto conversion = static_cast<TextConverter::Conversion>(script.next() % 21);
        const int p =
            static_cast<std::int8_t>(script.next()) * (conversion == kUcs2ToAdn8 ? 97 : 1);
        const int q = script.next() % 5;
        const auto limit = static_cast<unsigned long>(script.next());
        const unsigned long counted = limit > 0xF0 ? 0UL - limit : 3 * limit;
        converter_.pushConversion(conversion, p, counted, q);
        stages_.push({conversion, p, counted, q});
    }
    Codes runOfCodes(std::size_t most) {
        Codes codes(most);
        codes.resize(stages_.top().nextCodes(codes.data(), most));
        return codes;
    }
    std::string runOfChars(std::size_t most) {
        std::string chars(most, ' ');
        chars.resize(stages_.top().nextChars(chars.data(), most));
        return chars;
    }

    TextConverter converter_;
    Stages stages_;
};

void readChain(Script& script) {
    Pair pair(script);
    std::string reads;
    for (int count = script.next() % 16; count > 0; --count)
        reads += static_cast<char>(script.next());
    const std::string octets = script.rest();
    // Of their very length, so that the sanitizer guards their end.
    const auto source = std::make_unique<char[]>(octets.size());
    std::copy(octets.begin(), octets.end(), source.get());
    pair.setSource(source.get(), octets.size());
    for (const char read : reads) {
        const auto value = static_cast<unsigned char>(read);
        if (value % 4 == 3)
            pair.setSource(source.get(), octets.size());
        else
            pair.read(value % 4, value / 4);
    }
    // A stage makes at most four codes of one, and a few at the end: five stages.
    std::size_t most = octets.size() + 8;
    for (int stage = 0; stage < 5; ++stage)
        most = 4 * most + 8;
    std::size_t all = 0;
    while (const std::size_t codes = pair.read(all % 3 == 0 ? 1 : 2, 1000)) {
        all += codes;
        check(all <= most);
    }
}

std::string convert(const std::string& octets, std::initializer_list<plr::Conversion> stages) {
    return plr::convert(octets, stages).octets;
}

void checkPacking(const std::string& octets) {
    std::string septets = octets;
    for (char& septet : septets)
        septet &= 0x7F;
    const std::size_t length = septets.size();
    const int fill = static_cast<int>(length % 7);
    const std::string packed = convert(septets, {{kSmsPack, fill}});
    check(packed.size() == (7 * length + static_cast<std::size_t>(length ? fill : 0) + 7) / 8);
    check(convert(packed, {{kSmsUnpack, fill, length}}) == septets);
    check(convert(septets, {{kUssdPack}, {kSmsUnpack, 0, length}}) == septets);
    check(convert(septets, {{kC2KSmsUnpackedToPacked}, {kC2KSmsPackedToUnpacked, 0, length}}) ==
          septets);
}

void checkText(const std::string& octets) {
    const auto text = plr::convert(octets, {{kUtf8ToUcs2}, {kUcs2ToUtf8}});
    check(text.hasReplacements || text.octets == octets);
    const auto again = plr::convert(text.octets, {{kUtf8ToUcs2}, {kUcs2ToUtf8}});
    check(!again.hasReplacements && again.octets == text.octets);
    check(convert(text.octets, {{kUtf8ToUcs2}, {kUcs2ToOctet}, {kOctetToUcs2}, {kUcs2ToUtf8}}) ==
          text.octets);
    for (const int tables : {0x00, 0x01, 0x03, 0x10, 0x20, 0x30, 0x11, 0x33}) {
        const auto septets = plr::convert(text.octets, {{kUtf8ToUcs2}, {kUcs2ToGsm7, tables}});
        const plr::Conversion back{kGsm7ToUcs2, tables & 15, TextConverter::kNoLimit, tables >> 4};
        check(septets.hasReplacements ||
              convert(septets.octets, {back, {kUcs2ToUtf8}}) == text.octets);
    }
    const int base = octets.empty() ? 0 : static_cast<unsigned char>(octets[0]) * 0x80;
    const auto name = plr::convert(text.octets, {{kUtf8ToUcs2}, {kUcs2ToAdn8, base}});
    check(name.hasReplacements ||
          convert(name.octets, {{kAdn8ToUcs2, base}, {kUcs2ToUtf8}}) == text.octets);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Script script(data, std::min<std::size_t>(size, 400));
    readChain(script);
    const std::string octets = script.rest();
    check(convert(octets, {{kBinaryToHex}, {kHexToBinary}}) == octets);
    checkPacking(octets);
    checkText(octets);
    return 0;
}
