#include <gtest/gtest.h>

#include <random>

#include "tests/platform/vox_values.h"

// Values made at random, and their encodings with a byte changed.
namespace {

using namespace vox_test;

class value_maker {
  public:
    explicit value_maker(std::uint64_t seed) : random_(seed) {}

    owned make(unsigned depth = 0) {
        switch (below(depth < 5 ? 13 : 11)) {
            case 0:
                return own(vox_null_create());
            case 1:
                return own(vox_bool_create(static_cast<int>(below(2))));
            case 2:
            case 3:
                return number(static_cast<std::int64_t>(bits()));
            case 4:
                return own(vox_uint64_create(bits()));
            case 5:
                return own(vox_double_create(std::bit_cast<double>(bits())));
            case 6:
                return own(vox_date_create(static_cast<std::int64_t>(bits())));
            case 7: {
                const std::string bytes = string();
                return own(vox_data_create(bytes.data(), bytes.size()));
            }
            case 8:
                return text(string());
            case 9: {
                const std::uint64_t words[2] = {random_(), random_()};
                return own(vox_uuid_create(reinterpret_cast<const std::uint8_t*>(words)));
            }
            case 10:
                return own(vox_error_create(static_cast<std::int64_t>(bits()),
                                            below(2) ? string().c_str() : nullptr));
            case 11:
                return make_array(depth);
            default:
                return make_dictionary(depth);
        }
    }

    std::size_t below(std::size_t bound) { return random_() % bound; }

  private:
    // Small and large numbers alike, of both signs.
    std::uint64_t bits() {
        const std::uint64_t positive = random_() >> below(64);
        return below(2) ? positive : ~positive;
    }

    std::string string() {
        static const char* const characters[] = {"a", "Z", "é", "€", "😀", "\n", "/"};
        std::string result;
        for (std::size_t left = below(30); left > 0; left--)
            result += characters[below(std::size(characters))];
        return result;
    }

    owned make_array(unsigned depth) {
        owned result = own(vox_array_create());
        for (std::size_t left = below(8); left > 0; left--)
            vox_array_append_value(result.get(), make(depth + 1).get());
        return result;
    }

    owned make_dictionary(unsigned depth) {
        owned result = own(vox_dictionary_create());
        for (std::size_t left = below(below(10) ? 8 : 40); left > 0; left--)
            vox_dictionary_set_value(result.get(), string().c_str(), make(depth + 1).get());
        return result;
    }

    std::mt19937_64 random_;
};

constexpr int kRounds = 3000;

TEST(VoxCodecRandom, ValuesComeBackEqual) {
    for (int seed = 0; seed < kRounds; seed++) {
        value_maker maker(static_cast<std::uint64_t>(seed));
        const owned value = maker.make();
        const bytes encoded = encoding(value.get());
        const owned again = decoded(encoded);
        ASSERT_TRUE(again && vox_equal(value.get(), again.get())) << "seed " << seed;
        ASSERT_EQ(encoding(again.get()), encoded) << "seed " << seed;
    }
}

TEST(VoxCodecRandom, AChangedByteIsRefusedOrAnotherValue) {
    int accepted = 0;
    for (int seed = 0; seed < kRounds; seed++) {
        value_maker maker(static_cast<std::uint64_t>(seed));
        bytes encoded = encoding(maker.make().get());
        for (int change = 0; change < 20; change++) {
            bytes changed = encoded;
            changed[maker.below(changed.size())] ^= static_cast<std::uint8_t>(1 + maker.below(255));
            if (const owned value = decoded(changed)) {
                ASSERT_EQ(encoding(value.get()), changed) << "seed " << seed;
                accepted++;
            }
        }
    }
    EXPECT_GT(accepted, kRounds) << "most changes hit numbers and text";
}

}  // namespace
