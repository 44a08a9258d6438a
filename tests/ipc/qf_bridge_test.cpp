#include "plr/ipc/qf_bridge.h"

#include <gtest/gtest.h>

#include <bit>
#include <random>

#include "plr/ipc/values.h"
#include "support/qf_balance.h"
#include "support/vox_values.h"

namespace {

using namespace plr::test;
using plr::qf::adopt;
using Qf = plr::qf::QfSharedRef<const void>;

// Values of every type that comes back as it went.
class RandomValues {
  public:
    Ref any(int depth) {
        const std::string text = bytes();
        switch (random_() % (depth > 0 ? 11 : 9)) {
            case 0:
                return Ref(vox_null_create());
            case 1:
                return Ref(vox_bool_create(random_() % 2));
            case 2:
                return Ref(vox_int64_create(std::bit_cast<std::int64_t>(number())));
            case 3:
                return Ref(vox_uint64_create(number()));
            case 4:
                return Ref(vox_double_create(std::bit_cast<double>(number())));
            case 5:
                return Ref(vox_date_create(std::bit_cast<std::int64_t>(number())));
            case 6:
                return Ref(vox_string_create_with_length(text.data(), text.size()));
            case 7:
                return Ref(vox_data_create(text.data(), text.size()));
            case 8:
                return Ref(vox_error_create(std::bit_cast<std::int64_t>(number()), text.c_str()));
            default:
                return collection(depth - 1, random_() % 2 == 0);
        }
    }

  private:
    std::uint64_t number() { return random_() >> random_() % 64; }
    std::string bytes() {
        std::string made(random_() % 20, 'a');
        for (char& byte : made)
            byte = random_() % 4 == 0 ? static_cast<char>(random_()) : byte;
        return made;
    }
    Ref collection(int depth, bool isArray) {
        Ref made(isArray ? vox_array_create() : vox_dictionary_create());
        for (auto count = random_() % 6; count > 0; count--)
            isArray ? vox_array_append_value(made, any(depth))
                    : vox_dictionary_set_value(made, bytes().c_str(), any(depth));
        return made;
    }

    std::mt19937_64 random_{20261122};
};

TEST(QfBridge, RandomValuesComeBackAsTheyWent) {
    RandomValues values;
    for (int i = 0; i < 3000; i++) {
        const vox::object value = vox::object::retain(values.any(5));
        const vox::object back = vox::qf_to_vox(vox::bridge(value).get());
        ASSERT_EQ(back, value);
        ASSERT_EQ(back.to_string(), value.to_string()) << "the order of the entries";
    }
}

TEST(QfBridge, OtherVoxTypesBecomeWhatTheTableSays) {
    const std::uint8_t id[16] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 255};
    const Ref descriptor(vox_fd_create(0));
    const struct {
        const char* name;
        Ref value;
        const char* type;  // null: no Qf value
        const char* back;
    } rows[] = {
        {"uuid", Ref(vox_uuid_create(id)), "QfString", "\"00010203-0405-0607-0809-0a0b0c0d0eff\""},
        {"error", Ref(vox_error_create(7, "gone")), "QfError", "<error 7: \"gone\">"},
        {"error without a text", Ref(vox_error_create(7, nullptr)), "QfError",
         "<error 7: \"vox error 7\">"},
        {"descriptor", descriptor, nullptr, "null"},
        {"a place in an array", array({descriptor, number(2)}), "QfArray", "[null, 2]"},
        {"a place in a dictionary", dictionary({{"lost", descriptor}, {"kept", number(1)}}),
         "QfDictionary", "{\"kept\": 1}"},
        {"as deep as messages", nested(64), "QfArray", nullptr},
        {"deeper", nested(65), nullptr, "null"},
        {"null pointer", Ref(), nullptr, "null"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const Qf bridged = vox::vox_to_qf(row.value);
        ASSERT_EQ(bool(bridged), row.type != nullptr);
        EXPECT_STREQ(bridged ? qf_type_get_name(qf_get_type_id(bridged.get())) : nullptr, row.type);
        const std::string back = description(vox::qf_to_vox(bridged.get()).get());
        EXPECT_EQ(back, row.back ? row.back : description(row.value));
    }
}

template <class Value>
Qf numberOf(QfNumberType type, Value value) {
    return adopt<const void>(qf_number_create(type, &value));
}

Qf dictionaryOf(const std::string& key, const Qf& value) {
    const auto name = adopt(qf_string_create_with_length(key.data(), key.size()));
    const QfStringRef keys[] = {name.get()};
    const QfTypeRef values[] = {value.get()};
    return adopt<const void>(qf_dictionary_create(keys, values, 1));
}

TEST(QfBridge, OtherQfTypesBecomeWhatTheTableSays) {
    const auto text = adopt(qf_string_create("sip:a@b.example"));
    const Qf url = adopt<const void>(qf_url_create(text.get()));
    const Qf locale = adopt<const void>(qf_locale_create("C"));
    const struct {
        const char* name;
        Qf value;
        const char* back;
    } rows[] = {
        {"int8", numberOf<std::int8_t>(kQfNumberSInt8Type, -8), "-8"},
        {"uint32", numberOf<std::uint32_t>(kQfNumberUInt32Type, 1U << 31), "2147483648u"},
        {"float", numberOf<float>(kQfNumberFloatType, 0.5F), "0.5"},
        {"url", url, "\"sip:a@b.example\""},
        {"error", adopt<const void>(qf_error_create(text.get(), 2, text.get())),
         "<error 2: \"sip:a@b.example\">"},
        {"locale", locale, "null"},
        {"locale in a dictionary", dictionaryOf("key", locale), "{}"},
        {"NUL in a key", dictionaryOf({"a\0b", 3}, url), "{}"},
        {"deeper than messages", dictionaryOf("k", vox::vox_to_qf(nested(64))), "null"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(description(vox::qf_to_vox(row.value.get()).get()), row.back) << row.name;
}

}  // namespace
