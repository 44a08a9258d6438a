#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cmath>
#include <limits>
#include <thread>

#include "tests/platform/vox_values.h"

namespace {

using namespace vox_test;

// ---- Scalars --------------------------------------------------------------------

TEST(VoxValue, GettersOfAnotherTypeGiveTheNeutralAnswer) {
    const owned string = text("5");
    const owned real = own(vox_double_create(5));
    const owned unsigned_five = own(vox_uint64_create(5));
    for (vox_object_t wrong : {string.get(), static_cast<vox_object_t>(nullptr)}) {
        EXPECT_EQ(vox_int64_get_value(wrong), 0);
        EXPECT_EQ(vox_uint64_get_value(wrong), 0u);
        EXPECT_EQ(vox_double_get_value(wrong), 0);
        EXPECT_EQ(vox_date_get_value(wrong), 0);
        EXPECT_EQ(vox_bool_get_value(wrong), 0);
        EXPECT_EQ(vox_data_get_bytes_ptr(wrong), nullptr);
        EXPECT_EQ(vox_data_get_length(wrong), 0u);
        EXPECT_EQ(vox_uuid_get_bytes(wrong), nullptr);
        EXPECT_EQ(vox_array_get_count(wrong), 0u);
        EXPECT_EQ(vox_array_get_value(wrong, 0), nullptr);
        EXPECT_EQ(vox_dictionary_get_count(wrong), 0u);
        EXPECT_EQ(vox_dictionary_get_value(wrong, "k"), nullptr);
        EXPECT_EQ(vox_dictionary_get_entry(wrong, 0, nullptr), nullptr);
        EXPECT_EQ(vox_error_get_code(wrong), 0);
        EXPECT_EQ(vox_error_get_value(wrong, vox_error_key_description), nullptr);
        EXPECT_EQ(vox_fd_dup(wrong), -1);
    }
    EXPECT_EQ(vox_string_get_string_ptr(real.get()), nullptr);
    EXPECT_EQ(vox_string_get_length(real.get()), 0u);
    EXPECT_EQ(vox_int64_get_value(unsigned_five.get()), 0) << "signed and unsigned are two types";
}

TEST(VoxValue, ANullPointerIsTheNullObject) {
    EXPECT_EQ(vox_get_type(nullptr), VOX_TYPE_NULL);
    EXPECT_TRUE(vox_equal(nullptr, vox_null_create()));
    EXPECT_EQ(vox_retain(nullptr), nullptr);
    vox_release(nullptr);
    EXPECT_EQ(description(nullptr), "null");
}

TEST(VoxValue, NullAndBooleansOutliveAnyNumberOfReleases) {
    for (vox_object_t single : {vox_null_create(), vox_bool_create(0), vox_bool_create(7)})
        for (int i = 0; i < 3; i++)
            vox_release(single);
    EXPECT_EQ(vox_bool_create(7), vox_bool_create(1));
    EXPECT_TRUE(vox_bool_get_value(vox_bool_create(1)));
    EXPECT_FALSE(vox_bool_get_value(vox_bool_create(0)));
}

TEST(VoxValue, StringsKeepTheirLengthAndEndInNul) {
    const owned with_nul = text({"a\0b", 3});
    EXPECT_EQ(vox_string_get_length(with_nul.get()), 3u);
    EXPECT_EQ(vox_string_get_string_ptr(with_nul.get())[3], '\0');
    EXPECT_STREQ(vox_string_get_string_ptr(own(vox_string_create(nullptr)).get()), "");

    // Around the length that a formatted string needs a second pass for.
    for (const int width : {1, 255, 256, 5000}) {
        const owned formatted = own(vox_string_create_with_format("%*d", width, 7));
        EXPECT_EQ(vox_string_get_string_ptr(formatted.get()),
                  std::string(static_cast<std::size_t>(width) - 1, ' ') + "7");
    }
}

// ---- Equality -------------------------------------------------------------------

TEST(VoxValue, EqualityIsByTypeAndContent) {
    const std::uint8_t uuid[16] = {1};
    std::vector<owned> all;
    all.push_back(own(vox_null_create()));
    all.push_back(own(vox_bool_create(0)));
    all.push_back(own(vox_bool_create(1)));
    all.push_back(number(1));
    all.push_back(number(2));
    all.push_back(own(vox_uint64_create(1)));
    all.push_back(own(vox_double_create(1)));
    all.push_back(own(vox_double_create(0.0)));
    all.push_back(own(vox_double_create(-0.0)));
    all.push_back(own(vox_double_create(std::nan("1"))));
    all.push_back(own(vox_double_create(std::nan("2"))));
    all.push_back(own(vox_date_create(1)));
    all.push_back(text("a"));
    all.push_back(text({"a\0", 2}));
    all.push_back(own(vox_data_create("a", 1)));
    all.push_back(own(vox_uuid_create(uuid)));
    all.push_back(array({}));
    all.push_back(array({all[3].get()}));
    all.push_back(array({all[4].get()}));
    all.push_back(array({all[3].get(), all[4].get()}));
    all.push_back(dictionary({}));
    all.push_back(dictionary({{"k", all[3].get()}}));
    all.push_back(dictionary({{"k", all[4].get()}}));
    all.push_back(dictionary({{"j", all[3].get()}}));
    all.push_back(own(vox_error_create(1, nullptr)));
    all.push_back(own(vox_error_create(1, "why")));
    all.push_back(own(vox_error_create(2, "why")));
    for (std::size_t i = 0; i < all.size(); i++)
        for (std::size_t j = 0; j < all.size(); j++)
            EXPECT_EQ(vox_equal(all[i].get(), all[j].get()) != 0, i == j)
                << description(all[i].get()) << " and " << description(all[j].get());
    for (const owned& one : all)
        EXPECT_TRUE(vox_equal(one.get(), decoded(encoding(one.get())).get()))
            << description(one.get());
}

TEST(VoxValue, EqualDictionariesMayDifferInOrder) {
    const owned one = number(1);
    const owned two = number(2);
    EXPECT_TRUE(vox_equal(dictionary({{"a", one.get()}, {"b", two.get()}}).get(),
                          dictionary({{"b", two.get()}, {"a", one.get()}}).get()));
}

TEST(VoxValue, DescriptorsAreEqualByIdentityOnly) {
    const owned one = own(vox_fd_create(STDIN_FILENO));
    const owned other = own(vox_fd_create(STDIN_FILENO));
    EXPECT_TRUE(vox_equal(one.get(), one.get()));
    EXPECT_FALSE(vox_equal(one.get(), other.get()));
}

// ---- Containers -----------------------------------------------------------------

TEST(VoxArray, GrowsAndIgnoresIndexesPastTheEnd) {
    const owned list = own(vox_array_create());
    for (int i = 0; i < 1000; i++)
        vox_array_append_value(list.get(), number(i).get());
    vox_array_set_value(list.get(), 999, nullptr);
    vox_array_set_value(list.get(), 1000, number(5).get());
    EXPECT_EQ(vox_array_get_count(list.get()), 1000u);
    EXPECT_EQ(vox_int64_get_value(vox_array_get_value(list.get(), 998)), 998);
    EXPECT_EQ(vox_array_get_value(list.get(), 999), vox_null_create());
    EXPECT_EQ(vox_array_get_value(list.get(), 1000), nullptr);
}

std::string keys_of(vox_object_t dictionary) {
    std::string result;
    const char* key = nullptr;
    for (std::size_t i = 0; vox_dictionary_get_entry(dictionary, i, &key); i++)
        result += std::string(key) + " ";
    return result;
}

TEST(VoxDictionary, KeepsTheOrderInWhichKeysFirstCame) {
    const owned value = number(1);
    const owned changed = dictionary(
        {{"o", value.get()}, {"a", value.get()}, {"r", value.get()}, {"v", value.get()}});
    vox_dictionary_set_value(changed.get(), "a", number(2).get());
    EXPECT_EQ(keys_of(changed.get()), "o a r v ");
    vox_dictionary_set_value(changed.get(), "o", nullptr);
    vox_dictionary_set_value(changed.get(), "missing", nullptr);
    EXPECT_EQ(keys_of(changed.get()), "a r v ");
    vox_dictionary_set_value(changed.get(), "o", vox_null_create());
    EXPECT_EQ(keys_of(changed.get()), "a r v o ") << "the null object is a value";
    EXPECT_EQ(vox_dictionary_get_value(changed.get(), "o"), vox_null_create());
    EXPECT_EQ(vox_dictionary_get_value(changed.get(), "missing"), nullptr);
    EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(changed.get(), "a")), 2);
}

// Key lengths around what an entry holds itself, counts around where an index begins.
TEST(VoxDictionary, FindsEveryKeyAtEverySize) {
    const owned large = own(vox_dictionary_create());
    const auto key_of = [](int i) {
        return std::string(static_cast<std::size_t>(i % 19), 'k') + std::to_string(i);
    };
    constexpr int count = 300;
    for (int i = 0; i < count; i++) {
        vox_dictionary_set_value(large.get(), key_of(i).c_str(), number(i).get());
        ASSERT_EQ(vox_dictionary_get_count(large.get()), static_cast<std::size_t>(i) + 1);
        for (int j = 0; j < count; j++) {
            vox_object_t value = vox_dictionary_get_value(large.get(), key_of(j).c_str());
            ASSERT_EQ(value != nullptr, j <= i) << key_of(j);
            ASSERT_TRUE(!value || vox_int64_get_value(value) == j) << key_of(j);
        }
    }
    for (int i = 0; i < count; i += 2)
        vox_dictionary_set_value(large.get(), key_of(i).c_str(), nullptr);
    for (int j = 0; j < count; j++)
        ASSERT_EQ(vox_dictionary_get_value(large.get(), key_of(j).c_str()) != nullptr, j % 2 == 1);
    const char* key = nullptr;
    for (std::size_t i = 0; vox_dictionary_get_entry(large.get(), i, &key); i++)
        ASSERT_EQ(key, key_of(static_cast<int>(2 * i + 1)));
}

// ---- Lifetime -------------------------------------------------------------------

TEST(VoxValue, ContainersHoldWhatIsPutIntoThemAndNoLonger) {
    const long before = open_descriptors();
    owned fd = own(vox_fd_create(STDIN_FILENO));
    owned list = array({fd.get(), fd.get()});
    owned outer = dictionary({{"list", list.get()}, {"fd", fd.get()}});
    fd.reset();
    list.reset();
    EXPECT_EQ(open_descriptors(), before + 1);

    owned inner = own(vox_retain(vox_dictionary_get_value(outer.get(), "list")));
    vox_dictionary_set_value(outer.get(), "list", vox_null_create());
    vox_dictionary_set_value(outer.get(), "fd", nullptr);
    vox_array_set_value(inner.get(), 0, nullptr);
    EXPECT_EQ(open_descriptors(), before + 1) << "the second element still holds it";
    vox_array_set_value(inner.get(), 1, nullptr);
    EXPECT_EQ(open_descriptors(), before);
}

TEST(VoxValue, AValueMayReplaceItself) {
    const owned list = array({number(1).get()});
    vox_array_set_value(list.get(), 0, vox_array_get_value(list.get(), 0));
    EXPECT_EQ(vox_int64_get_value(vox_array_get_value(list.get(), 0)), 1);
    const owned map = dictionary({{"k", number(1).get()}});
    vox_dictionary_set_value(map.get(), "k", vox_dictionary_get_value(map.get(), "k"));
    EXPECT_EQ(vox_int64_get_value(vox_dictionary_get_value(map.get(), "k")), 1);
}

TEST(VoxValue, DepthCostsNoStack) {
    const long before = open_descriptors();
    const auto chain = [](vox_object_t innermost) {
        owned result = own(vox_retain(innermost));
        for (int i = 0; i < 1'000'000; i++)
            result = i % 2 ? array({result.get(), result.get()})
                           : dictionary({{"a", number(1).get()}, {"k", result.get()}});
        return result;
    };
    const owned fd = own(vox_fd_create(STDIN_FILENO));
    owned deep = chain(fd.get());
    EXPECT_NE(description(deep.get()).find("…"), std::string::npos);
    deep.reset();
    deep = array({chain(number(1).get()).get()});
    EXPECT_FALSE(vox_equal(deep.get(), array({number(1).get()}).get()));
    deep.reset();
    EXPECT_EQ(open_descriptors(), before + 1);
}

TEST(VoxValue, ManyThreadsMayHoldOneValue) {
    const long before = open_descriptors();
    owned shared = array({own(vox_fd_create(STDIN_FILENO)).get(), text("text").get()});
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; i++)
        threads.emplace_back([mine = own(vox_retain(shared.get()))] {
            for (int round = 0; round < 20000; round++) {
                const owned again = own(vox_retain(mine.get()));
                const owned element = own(vox_retain(vox_array_get_value(again.get(), 1)));
                ASSERT_EQ(vox_string_get_length(element.get()), 4u);
                ASSERT_EQ(description(element.get()), "\"text\"");
            }
        });
    shared.reset();
    for (std::thread& thread : threads)
        thread.join();
    threads.clear();
    EXPECT_EQ(open_descriptors(), before);
}

// ---- Descriptors ----------------------------------------------------------------

TEST(VoxFd, IsADuplicateThatProgramsDoNotInherit) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    owned fd = own(vox_fd_create(ends[0]));
    close(ends[0]);
    const int copy = vox_fd_dup(fd.get());
    fd.reset();
    EXPECT_NE(fcntl(copy, F_GETFD) & FD_CLOEXEC, 0);
    ASSERT_EQ(write(ends[1], "x", 1), 1);
    char byte = 0;
    EXPECT_EQ(read(copy, &byte, 1), 1);
    EXPECT_EQ(byte, 'x');
    close(copy);
    close(ends[1]);
    EXPECT_EQ(vox_get_type(vox_fd_create(-1)), VOX_TYPE_NULL);
}

// ---- Descriptions ---------------------------------------------------------------

TEST(VoxDescription, IsOneLineWhateverTheText) {
    EXPECT_EQ(description(text("a\n\x1b[31m\"\\\x7f").get()), R"("a\x0a\x1b[31m\"\\\x7f")");
    EXPECT_EQ(description(text("bad \xff\xc3").get()), R"("bad \xff\xc3")");
    EXPECT_EQ(description(text("é").get()), "\"é\"");
}

TEST(VoxDescription, OfHugeValuesIsCut) {
    const owned long_text = text(std::string(1'000'000, 'x'));
    const owned many = own(vox_array_create());
    for (int i = 0; i < 100'000; i++)
        vox_array_append_value(many.get(), long_text.get());
    const owned data = own(vox_data_create(std::string(1'000'000, 'x').data(), 1'000'000));
    for (vox_object_t huge : {long_text.get(), many.get(), data.get()})
        EXPECT_LT(description(huge).size(), 17000u);
}

}  // namespace
