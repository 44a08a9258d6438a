#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cmath>

#include "support/vox_values.h"

namespace {

using namespace plr::test;

TEST(VoxValue, GettersOfAnotherTypeGiveTheNeutralAnswer) {
    const Ref string = text("5");
    for (vox_object_t wrong : {vox_object_t(string), vox_object_t(nullptr)}) {
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
    EXPECT_EQ(vox_string_get_string_ptr(number(5)), nullptr);
    EXPECT_EQ(vox_string_get_length(number(5)), 0u);
    EXPECT_EQ(vox_uint64_get_value(number(5)), 0u) << "signed and unsigned are two types";
    EXPECT_EQ(vox_get_type(nullptr), VOX_TYPE_NULL);
    EXPECT_TRUE(vox_equal(nullptr, vox_null_create()));
    EXPECT_EQ(description(nullptr), "null");
}

TEST(VoxValue, NullAndBooleansOutliveAnyNumberOfReleases) {
    for (vox_object_t single : {vox_null_create(), vox_bool_create(0), vox_bool_create(7)})
        for (int i = 0; i < 3; i++)
            vox_release(single);
    EXPECT_EQ(vox_bool_create(7), vox_bool_create(1));
    EXPECT_FALSE(vox_bool_get_value(vox_bool_create(0)));
}

TEST(VoxValue, StringsKeepTheirLengthAndEndInNul) {
    const Ref with_nul = text({"a\0b", 3});
    EXPECT_EQ(vox_string_get_length(with_nul), 3u);
    EXPECT_EQ(vox_string_get_string_ptr(with_nul)[3], '\0');
    EXPECT_STREQ(vox_string_get_string_ptr(Ref(vox_string_create(nullptr))), "");
    // Around the length that a formatted string needs a second pass for.
    for (const int width : {1, 255, 256, 5000})
        EXPECT_EQ(vox_string_get_string_ptr(Ref(vox_string_create_with_format("%*d", width, 7))),
                  std::string(static_cast<std::size_t>(width) - 1, ' ') + "7");
}

TEST(VoxValue, EqualityIsByTypeAndContent) {
    const std::uint8_t uuid[16] = {1};
    const Ref one = number(1);
    const Ref two = number(2);
    const Ref all[] = {
        Ref(vox_null_create()),
        Ref(vox_bool_create(0)),
        Ref(vox_bool_create(1)),
        one,
        two,
        Ref(vox_uint64_create(1)),
        Ref(vox_double_create(1)),
        Ref(vox_double_create(0.0)),
        Ref(vox_double_create(-0.0)),
        Ref(vox_double_create(std::nan("1"))),
        Ref(vox_double_create(std::nan("2"))),
        Ref(vox_date_create(1)),
        text("a"),
        text({"a\0", 2}),
        Ref(vox_data_create("a", 1)),
        Ref(vox_uuid_create(uuid)),
        array({}),
        array({one}),
        array({two}),
        array({one, two}),
        dictionary({}),
        dictionary({{"k", one}}),
        dictionary({{"k", two}}),
        dictionary({{"j", one}}),
        Ref(vox_error_create(1, nullptr)),
        Ref(vox_error_create(1, "why")),
        Ref(vox_error_create(2, "why")),
        Ref(vox_fd_create(STDIN_FILENO)),
        Ref(vox_fd_create(STDIN_FILENO)),
    };
    for (const Ref& left : all)
        for (const Ref& right : all)
            EXPECT_EQ(vox_equal(left, right) != 0, &left == &right)
                << description(left) << " and " << description(right);
    EXPECT_TRUE(
        vox_equal(dictionary({{"a", one}, {"b", two}}), dictionary({{"b", two}, {"a", one}})));
}

// ---- Containers -----------------------------------------------------------------

TEST(VoxArray, GrowsAndIgnoresIndexesPastTheEnd) {
    const Ref list = array({});
    for (int i = 0; i < 1000; i++)
        vox_array_append_value(list, number(i));
    vox_array_set_value(list, 999, nullptr);
    vox_array_set_value(list, 1000, number(5));
    EXPECT_EQ(vox_array_get_count(list), 1000u);
    EXPECT_EQ(vox_int64_get_value(vox_array_get_value(list, 998)), 998);
    EXPECT_EQ(vox_array_get_value(list, 999), vox_null_create());
    EXPECT_EQ(vox_array_get_value(list, 1000), nullptr);
}

TEST(VoxDictionary, KeepsTheOrderInWhichKeysFirstCame) {
    const Ref one = number(1);
    const Ref map = dictionary({{"o", one}, {"a", one}, {"r", one}});
    vox_dictionary_set_value(map, "a", number(2));
    EXPECT_EQ(description(map), R"({"o": 1, "a": 2, "r": 1})");
    vox_dictionary_set_value(map, "o", nullptr);
    vox_dictionary_set_value(map, "missing", nullptr);
    EXPECT_EQ(description(map), R"({"a": 2, "r": 1})");
    vox_dictionary_set_value(map, "o", vox_null_create());  // a value like others
    EXPECT_EQ(description(map), R"({"a": 2, "r": 1, "o": null})");
}

// Key lengths around what an entry holds itself, counts around where an index begins.
TEST(VoxDictionary, FindsEveryKeyAtEverySize) {
    const Ref map = dictionary({});
    const auto key_of = [](int i) {
        return std::string(static_cast<std::size_t>(i % 19), 'k') + std::to_string(i);
    };
    const auto value_of = [&](int i) { return vox_dictionary_get_value(map, key_of(i).c_str()); };
    constexpr int count = 300;
    for (int i = 0; i < count; i++) {
        vox_dictionary_set_value(map, key_of(i).c_str(), number(i));
        ASSERT_EQ(vox_dictionary_get_count(map), static_cast<std::size_t>(i) + 1);
        for (int j = 0; j < count; j++)
            ASSERT_EQ(vox_int64_get_value(value_of(j)), j <= i ? j : 0) << key_of(j);
    }
    for (int i = 0; i < count; i += 2)
        vox_dictionary_set_value(map, key_of(i).c_str(), nullptr);
    const char* key = nullptr;
    for (int j = 0; j < count; j++)
        ASSERT_EQ(value_of(j) != nullptr, j % 2 == 1);
    for (std::size_t i = 0; vox_dictionary_get_entry(map, i, &key); i++)
        ASSERT_EQ(key, key_of(static_cast<int>(2 * i + 1)));
}

TEST(VoxDictionary, AMillionKeysAreNoTrouble) {
    const Ref map = dictionary({});
    for (int i = 0; i < 1'000'000; i++)
        vox_dictionary_set_value(map, std::to_string(i).c_str(), vox_null_create());
    EXPECT_TRUE(vox_equal(decode(encoding(map)).first, map));
}

// ---- Lifetime -------------------------------------------------------------------

TEST(VoxValue, AValueMayReplaceItself) {
    const Ref list = array({number(1)});
    vox_array_set_value(list, 0, vox_array_get_value(list, 0));
    const Ref map = dictionary({{"k", list}});
    vox_dictionary_set_value(map, "k", vox_dictionary_get_value(map, "k"));
    EXPECT_EQ(description(map), R"({"k": [1]})");
}

TEST(VoxValue, DepthCostsNoStack) {
    const std::size_t before = openDescriptors();
    const auto chain = [](const Ref& innermost) {
        Ref made = innermost;
        for (int i = 0; i < 1'000'000; i++)
            made = i % 2 ? array({made, made}) : dictionary({{"a", number(1)}, {"k", made}});
        return made;
    };
    EXPECT_NE(description(chain(Ref(vox_fd_create(STDIN_FILENO)))).find("…"), std::string::npos);
    EXPECT_FALSE(vox_equal(array({chain(number(1))}), array({number(1)})));
    EXPECT_EQ(openDescriptors(), before);
}

TEST(VoxFd, IsADuplicateThatProgramsDoNotInherit) {
    const Ends pipe;
    const int copy = vox_fd_dup(Ref(vox_fd_create(pipe.out())));
    EXPECT_GE(fcntl(pipe.out(), F_GETFD), 0) << "the object's duplicate alone is closed";
    EXPECT_NE(fcntl(copy, F_GETFD) & FD_CLOEXEC, 0);
    pipe.put("x");
    char byte = 0;
    EXPECT_EQ(read(copy, &byte, 1), 1);
    close(copy);
    EXPECT_EQ(vox_get_type(vox_fd_create(-1)), VOX_TYPE_NULL);
}

// ---- Descriptions ---------------------------------------------------------------

TEST(VoxDescription, IsOneLineWhateverTheText) {
    EXPECT_EQ(description(text("a\n\x1b[31m\"\\\x7f")), R"("a\x0a\x1b[31m\"\\\x7f")");
    EXPECT_EQ(description(text("bad \xff\xc3")), R"("bad \xff\xc3")");
    EXPECT_EQ(description(text("é")), "\"é\"");
}

TEST(VoxDescription, OfHugeValuesIsCut) {
    const Ref huge = text(std::string(1'000'000, 'x'));
    const Ref many = array({});
    for (int i = 0; i < 100'000; i++)
        vox_array_append_value(many, huge);
    const Ref data(vox_data_create(vox_string_get_string_ptr(huge), 1'000'000));
    for (const Ref& each : {huge, many, data})
        EXPECT_LT(description(each).size(), 17000u);
}

}  // namespace
