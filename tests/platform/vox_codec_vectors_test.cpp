#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <random>
#include <regex>

#include "platform/linux/vox/frame.h"
#include "support/vox_values.h"

// The examples of docs/wire-protocol.md, held against our codec.
namespace {

using namespace plr::test;

struct Vector {
    Bytes data;
    std::string description;
};

// The examples in the blocks of `kind`: one a line, or, when a line begins with
// "= " and the description, one a block.
std::vector<Vector> examples(const std::string& kind) {
    // One or two spaces stand between bytes, more before what they mean.
    static const std::regex line_of("((?:[0-9a-f]{2} {1,2})*[0-9a-f]{2})(?: {3,}(.*))?|= (.*)");
    std::ifstream file(WIRE_PROTOCOL);
    std::vector<Vector> found;
    Vector frame;
    bool inside = false;
    for (std::string line; std::getline(file, line);) {
        std::smatch parts;
        if (line.starts_with("```")) {
            inside = line == "```" + kind;
        } else if (inside && std::regex_match(line, parts, line_of)) {
            const Bytes data = fromHex(parts[1].str());
            frame.data.insert(frame.data.end(), data.begin(), data.end());
            frame.description = parts[2].str() + parts[3].str();
            if (kind != "vox-frame" || parts[3].matched)
                found.push_back(std::exchange(frame, {}));
        }
    }
    return found;
}

// Decodes `body`, checks what it is, and that it encodes to the same bytes.
void check(const Vector& expected, std::span<const std::uint8_t> body) {
    std::vector<int> descriptors;
    const std::string& text = expected.description;
    for (std::size_t at = 0; (at = text.find("d>", at)) != std::string::npos; ++at)  // <fd>
        descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
    for (std::size_t at = 0; (at = text.find("t>", at)) != std::string::npos; ++at)  // <endpoint>
        descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const auto [value, why] = decode(body, {}, descriptors);
    ASSERT_TRUE(value) << text << ": " << why;
    // The page writes "<fd>" where a description has its number.
    static const std::regex numbered("<(fd|endpoint) [0-9]+>");
    EXPECT_EQ(std::regex_replace(description(value), numbered, "<$1>"), text);
    vox_wire::encoded again;
    ASSERT_EQ(vox_wire::encode(value, {}, again), 0);
    EXPECT_TRUE(std::ranges::equal(again.bytes.view(), body)) << text;
    EXPECT_EQ(again.descriptors.size(), descriptors.size());
    for (const int descriptor : again.descriptors)
        close(descriptor);
}

TEST(WireProtocolPage, ValuesAreAsItShows) {
    const std::vector<Vector> all = examples("vox-values");
    ASSERT_GT(all.size(), 40u);
    for (const Vector& one : all)
        check(one, one.data);
}

TEST(WireProtocolPage, RefusesWhatItSays) {
    const std::vector<Vector> all = examples("vox-refused");
    ASSERT_GT(all.size(), 10u);
    for (const Vector& one : all)
        EXPECT_NE(decode(one.data).second, "") << one.description;
}

TEST(WireProtocolPage, FramesAreAsItShows) {
    const std::vector<Vector> all = examples("vox-frame");
    ASSERT_GT(all.size(), 7u);
    for (const Vector& one : all) {
        vox_link::frame_header header;
        std::string why;
        ASSERT_TRUE(vox_link::read_header(one.data, {}, header, why)) << why;
        const auto body = std::span(one.data).subspan(vox_link::kHeaderBytes);
        EXPECT_EQ(header.length, body.size()) << one.description;
        EXPECT_EQ(header.descriptors, one.description.find("<fd>") != std::string::npos ? 1 : 0);
        check(one, body);
        Bytes again(vox_link::kHeaderBytes);
        vox_link::write_header(header, again.data());
        EXPECT_TRUE(std::equal(again.begin(), again.end(), one.data.begin())) << one.description;
    }
}

// ---- What becomes of them, put together at random ------------------------------------

// An array of some of the page's values, with a dictionary around some more.
class Mixture {
  public:
    explicit Mixture(unsigned seed) : random_(seed) {}
    Bytes make() {
        Bytes made = {0x85};
        for (int item = 0; item < 4; ++item)
            append(made, some());
        made.push_back(0xa3);
        for (const char* key : {"", "short", "longer than 15 bytes"}) {
            append(made, encoding(text(key)));
            append(made, some());
        }
        return made;
    }
    std::size_t below(std::size_t bound) { return random_() % bound; }

  private:
    static void append(Bytes& made, const Bytes& more) {
        made.insert(made.end(), more.begin(), more.end());
    }
    const Bytes& some() {
        static const std::vector<Vector> all = examples("vox-values");
        for (;;) {
            const Vector& one = all[below(all.size())];
            if (one.description.find('<') == std::string::npos)  // no descriptor
                return one.data;
        }
    }
    std::mt19937 random_;
};

TEST(VoxCodec, ValuesComeBackEqualAndMayBeChanged) {
    for (unsigned seed = 0; seed < 2000; ++seed) {
        const Bytes bytes = Mixture(seed).make();
        const Ref value = decode(bytes).first;
        const Ref again = decode(bytes).first;
        ASSERT_TRUE(value && vox_equal(value, again)) << "seed " << seed;
        ASSERT_EQ(encoding(value), bytes) << "seed " << seed;
        for (const Ref& each : {value, again}) {
            vox_array_append_value(each, number(1));
            vox_dictionary_set_value(vox_array_get_value(each, 4), "new", number(2));
        }
        ASSERT_TRUE(vox_equal(value, again)) << "seed " << seed;
        ASSERT_NE(encoding(value), bytes) << "seed " << seed;
    }
}

TEST(VoxCodec, EveryTruncationIsRefusedAndEveryChangedByteOrAnotherValue) {
    int accepted = 0;
    for (unsigned seed = 0; seed < 500; ++seed) {
        Mixture mixture(seed);
        const Bytes whole = mixture.make();
        // A copy, so that a sanitizer sees a read past the end.
        for (auto end = whole.begin(); end != whole.end(); ++end)
            ASSERT_NE(decode(Bytes(whole.begin(), end)).second, "") << "seed " << seed;
        for (int change = 0; change < 100; ++change) {
            Bytes changed = whole;
            changed[mixture.below(whole.size())] ^=
                static_cast<std::uint8_t>(1 + mixture.below(255));
            if (const Ref value = decode(changed).first) {
                ASSERT_EQ(encoding(value), changed) << "seed " << seed;
                accepted++;
            }
        }
    }
    EXPECT_GT(accepted, 5000) << "many changes hit numbers and text";
}

}  // namespace
