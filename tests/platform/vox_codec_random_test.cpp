#include <gtest/gtest.h>

#include <bit>
#include <random>

#include "support/vox_values.h"

// Values made at random, and what becomes of their encodings.
namespace {

using namespace plr::test;

class ValueMaker {
  public:
    explicit ValueMaker(int seed) : random_(static_cast<std::uint64_t>(seed)) {}

    Ref make(unsigned depth = 0) {
        const std::uint64_t number = bits();
        const std::string text = string();
        const std::uint64_t words[2] = {random_(), random_()};
        switch (below(depth < 5 ? 12 : 10)) {
            case 0:
                return Ref(vox_null_create());
            case 1:
                return Ref(vox_bool_create(static_cast<int>(below(2))));
            case 2:
            case 3:
                return plr::test::number(static_cast<std::int64_t>(number));
            case 4:
                return Ref(vox_uint64_create(number));
            case 5:
                return Ref(vox_double_create(std::bit_cast<double>(number)));
            case 6:
                return Ref(vox_date_create(static_cast<std::int64_t>(number)));
            case 7:
                return Ref(vox_data_create(text.data(), text.size()));
            case 8:
                return Ref(vox_error_create(static_cast<std::int64_t>(number),
                                            below(2) ? text.c_str() : nullptr));
            case 9:
                return Ref(vox_uuid_create(reinterpret_cast<const std::uint8_t*>(words)));
            default:
                return below(3) ? makeContainer(depth) : plr::test::text(text);
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
        std::string made;
        for (std::size_t left = below(30); left > 0; left--)
            made += characters[below(std::size(characters))];
        return made;
    }
    Ref makeContainer(unsigned depth) {
        const Ref list = array({});
        const Ref map = dictionary({});
        for (std::size_t left = below(below(10) ? 8 : 40); left > 0; left--) {
            vox_array_append_value(list, make(depth + 1));
            vox_dictionary_set_value(map, string().c_str(), vox_array_get_value(list, 0));
        }
        vox_dictionary_set_value(map, "list", list);
        return below(2) ? list : map;
    }

    std::mt19937_64 random_;
};

constexpr int kRounds = 3000;

TEST(VoxCodecRandom, ValuesComeBackEqualAndMayBeChanged) {
    for (int seed = 0; seed < kRounds; seed++) {
        ValueMaker maker(seed);
        const Ref value = maker.make();
        const Bytes encoded = encoding(value);
        const Ref again = decode(encoded).first;
        ASSERT_TRUE(again && vox_equal(value, again)) << "seed " << seed;
        ASSERT_EQ(encoding(again), encoded) << "seed " << seed;
        for (const Ref& each : {value, again}) {
            vox_array_append_value(each, number(1));
            vox_dictionary_set_value(each, "a new key", number(2));
        }
        ASSERT_TRUE(vox_equal(value, again)) << "seed " << seed;
    }
}

TEST(VoxCodecRandom, EveryTruncationIsRefused) {
    for (int seed = 0; seed < 300; seed++) {
        const Bytes whole = encoding(ValueMaker(seed).make());
        // A copy, so that a sanitizer sees a read past the end.
        for (auto end = whole.begin(); end != whole.end(); ++end)
            ASSERT_NE(decode(Bytes(whole.begin(), end)).second, "") << "seed " << seed;
    }
}

TEST(VoxCodecRandom, AChangedByteIsRefusedOrAnotherValue) {
    int accepted = 0;
    for (int seed = 0; seed < kRounds; seed++) {
        ValueMaker maker(seed);
        const Bytes encoded = encoding(maker.make());
        for (int change = 0; change < 20; change++) {
            Bytes changed = encoded;
            changed[maker.below(changed.size())] ^= static_cast<std::uint8_t>(1 + maker.below(255));
            if (const Ref value = decode(changed).first) {
                ASSERT_EQ(encoding(value), changed) << "seed " << seed;
                accepted++;
            }
        }
    }
    EXPECT_GT(accepted, kRounds) << "most changes hit numbers and text";
}

}  // namespace
