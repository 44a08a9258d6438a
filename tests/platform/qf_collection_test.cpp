#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "plr/concurrency/qf_shared_ref.h"

namespace {

using plr::qf::adopt;
using Number = plr::qf::QfSharedRef<plr::qf::Number>;

auto text(const std::string& of) {
    return adopt(qf_string_create_with_length(of.data(), of.size()));
}
Number number(int of) {
    return adopt(qf_number_create_int64(of));
}

// What a dictionary should have, in order.
using Model = std::vector<std::pair<std::string, int>>;

void expectEntries(QfDictionaryRef dictionary, const Model& model) {
    ASSERT_EQ(qf_dictionary_get_count(dictionary), model.size());
    for (std::size_t i = 0; i < model.size(); i++) {
        const auto& [name, value] = model[i];
        QfStringRef key = nullptr;
        const QfTypeRef found = qf_dictionary_get_entry(dictionary, i, &key);
        ASSERT_EQ(qf_string_get_string_ptr(key), name);
        ASSERT_TRUE(qf_equal(found, number(value).get())) << name;
        ASSERT_EQ(qf_dictionary_get_value(dictionary, text(name).get()), found) << name;
        ASSERT_EQ(qf_dictionary_get_value_for_utf8(dictionary, name.data(), name.size()), found);
    }
    EXPECT_EQ(qf_dictionary_get_entry(dictionary, model.size(), nullptr), nullptr);
}

// Few keys, so that they meet again, and enough to cross from walking to the index and back.
std::string randomKey(std::mt19937& random) {
    const auto chosen = random() % 60;
    return chosen % 3 == 0 ? std::string(chosen, 'k') : "key " + std::to_string(chosen);
}

void changeBoth(QfMutableDictionaryRef dictionary, Model& model, std::mt19937& random,
                bool growing) {
    const std::string key = randomKey(random);
    const auto known = std::find_if(model.begin(), model.end(),
                                    [&key](const auto& entry) { return entry.first == key; });
    if (random() % 4 == (growing ? 0 : 1) || !growing) {
        qf_dictionary_remove_value(dictionary, text(key).get());
        if (known != model.end())
            model.erase(known);
        return;
    }
    const auto value = static_cast<int>(random() % 1000);
    qf_dictionary_set_value(dictionary, text(key).get(), number(value).get());
    if (known != model.end())
        known->second = value;
    else
        model.emplace_back(key, value);
}

TEST(QfDictionary, IsItsModelAfterAnyChange) {
    std::mt19937 random(20);
    const auto dictionary = adopt(qf_dictionary_create_mutable());
    Model model;
    for (int step = 0; step < 4000; step++) {
        changeBoth(dictionary.get(), model, random, step / 200 % 2 == 0);
        ASSERT_NO_FATAL_FAILURE(expectEntries(dictionary.get(), model)) << "step " << step;
        ASSERT_EQ(qf_dictionary_get_value_for_utf8(dictionary.get(), "none", 4), nullptr);
    }
}

TEST(QfDictionary, KeepsTheFirstPlaceAndTheLastValueOfEqualKeys) {
    for (const int count : {3, 40}) {
        std::vector<decltype(text(""))> keys;
        std::vector<Number> values;
        std::vector<QfStringRef> rawKeys;
        std::vector<QfTypeRef> rawValues;
        for (int i = 0; i < 2 * count; i++) {
            rawKeys.push_back(keys.emplace_back(text("key " + std::to_string(i % count))).get());
            rawValues.push_back(values.emplace_back(number(i)).get());
        }
        const auto made =
            adopt(qf_dictionary_create(rawKeys.data(), rawValues.data(), rawKeys.size()));
        Model model;
        for (int i = 0; i < count; i++)
            model.emplace_back("key " + std::to_string(i), count + i);
        expectEntries(made.get(), model);
        EXPECT_EQ(qf_get_retain_count(rawValues[0]), 1);

        // Equal whatever the order, and hash alike.
        const auto reversed = adopt(qf_dictionary_create_mutable());
        for (int i = count; i-- > 0;)
            qf_dictionary_set_value(reversed.get(), rawKeys[static_cast<std::size_t>(i)],
                                    number(count + i).get());
        EXPECT_TRUE(qf_equal(made.get(), reversed.get()));
        EXPECT_EQ(qf_hash(made.get()), qf_hash(reversed.get()));
        qf_dictionary_set_value(reversed.get(), rawKeys[0], kQfNull);
        EXPECT_FALSE(qf_equal(made.get(), reversed.get()));
    }
}

TEST(QfArray, KeepsWhatIsAppendedInOrder) {
    const auto array = adopt(qf_array_create_mutable());
    std::vector<QfTypeRef> raw;
    for (int i = 0; i < 100; i++) {
        const Number value = number(i);
        qf_array_append_value(array.get(), value.get());
        EXPECT_EQ(qf_get_retain_count(value.get()), 2);
        raw.push_back(value.get());
        ASSERT_EQ(qf_array_get_count(array.get()), raw.size());
        for (std::size_t at = 0; at < raw.size(); at++)
            ASSERT_EQ(qf_array_get_value(array.get(), at), raw[at]);
    }
    EXPECT_EQ(qf_array_get_value(array.get(), raw.size()), nullptr);
    const auto constant = adopt(qf_array_create(raw.data(), raw.size()));
    EXPECT_TRUE(qf_equal(constant.get(), array.get()));
    EXPECT_EQ(qf_hash(constant.get()), qf_hash(array.get()));
    qf_array_append_value(array.get(), kQfNull);
    EXPECT_FALSE(qf_equal(constant.get(), array.get()));
}

// `depth` arrays and dictionaries in one another.
QfTypeRef nested(int depth) {
    const auto key = text("inner");
    QfTypeRef value = qf_number_create_int64(1);
    for (int i = 0; i < depth; i++) {
        const QfStringRef name = key.get();
        const QfTypeRef outer = i % 2 == 0 ? static_cast<QfTypeRef>(qf_array_create(&value, 1))
                                           : qf_dictionary_create(&name, &value, 1);
        qf_release(value);
        value = outer;
    }
    return value;
}

TEST(QfCollections, OfAnyDepthNeedNoStack) {
    constexpr int kDepth = 300'000;
    const plr::qf::QfSharedRef<const void> one{plr::_Created<const void>(nested(kDepth))};
    const plr::qf::QfSharedRef<const void> other{plr::_Created<const void>(nested(kDepth))};
    EXPECT_TRUE(qf_equal(one.get(), other.get()));
    EXPECT_EQ(qf_hash(one.get()), qf_hash(other.get()));
    const auto told = adopt(qf_copy_description(one.get()));
    EXPECT_LT(qf_string_get_length(told.get()), 1000u);
}

}  // namespace
