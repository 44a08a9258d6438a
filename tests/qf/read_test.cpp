#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "plr/qf.h"
#include "qf/every_value.h"
#include "support/qf_balance.h"

namespace {

using namespace plr::qf;
using plr::_Created;
using plr::test::everyValue;
using plr::test::print;
using plr::test::ReadRow;

// What `read` does to an `out` of `before`, as ReadRow says it.
template <class T, class Read>
std::string outcome(T before, const Read& read) {
    T out = before;
    const bool written = read(out);
    return !written && out == before ? "-" : print(out) + (written ? "" : "!");
}

// An entry of a dictionary, or none, for adapters; it is "key".
dict_adapter dictionaryOf(QfTypeRef value) {
    QfMutableDictionaryRef dictionary = qf_dictionary_create_mutable();
    if (value)
        qf_dictionary_set_value(dictionary, MakeQfString("key"), value);
    return dict_adapter(dictionary, true);
}

TEST(AssignLoosely, TakesNumbersStringsAndBooleansForOneAnother) {
    for (const ReadRow& row : everyValue()) {
        SCOPED_TRACE(row.name);
        const auto read = [&](auto& out) { return assign_loosely(out, row.value.get()); };
        const bool truth = row.asBool == std::string("true");
        // Deliberate: a failure leaves a bool as it was, and 0 in the numbers.
        for (const bool before : {false, true})
            EXPECT_EQ(outcome(before, read), row.asBool);
        EXPECT_EQ(outcome(9, read), row.asInt);
        EXPECT_EQ(outcome(9.5, read), row.asDouble);

        const dict_adapter map = dictionaryOf(row.value.get());
        const MakeQfString key("key");
        const bool fails = row.asBool == std::string("-");
        EXPECT_EQ(map.getBoolLoosely(key, false), truth);
        EXPECT_EQ(map.getBoolLoosely(key, true), truth || fails);
        EXPECT_EQ(map.getIntLoosely(key), std::atoi(row.asInt));
        EXPECT_EQ(outcome(9.5,
                          [&](double& out) {
                              out = map.getDoubleLoosely(key);
                              return std::strchr(row.asDouble, '!') == nullptr;
                          }),
                  row.asDouble);
    }
}

TEST(MapAdapter, ReadsStrictlyByType) {
    for (const ReadRow& row : everyValue()) {
        SCOPED_TRACE(row.name);
        const dict_adapter map = dictionaryOf(row.value.get());
        const MakeQfString key("key");
        std::string text = "before";
        EXPECT_EQ(assign(text, row.value.get()), row.text != "-");
        EXPECT_EQ(text, row.text != "-" ? row.text : "before");
        EXPECT_EQ(map.getString(key, "before"), text);
        const auto get = [](auto read) {
            return [read](auto& out) {
                const auto before = out;
                out = read(before);
                // The fallback is what none of the rows has.
                return out != before;
            };
        };
        EXPECT_EQ(outcome(9, get([&](int by) { return map.getInt(key, by); })), row.strictInt);
        EXPECT_EQ(outcome(9.5, get([&](double by) { return map.getDouble(key, by); })),
                  row.strictDouble);
        const bool fails = row.strictBool == std::string("-");
        const bool truth = row.strictBool == std::string("true");
        EXPECT_EQ(map.getBool(key, true), truth || fails);
        EXPECT_EQ(map.getBool(key, false), truth);
    }
}

// Whether the holder of a T adopts exactly the rows of `type`, and counts right.
template <class T>
void checkAdoption(const char* type) {
    for (const ReadRow& row : everyValue()) {
        SCOPED_TRACE(std::string(type) + " of " + row.name);
        const QfTypeRef value = row.value.get();
        const long count = value ? qf_get_retain_count(value) : 0;
        {
            const QfSharedRef<T> holder(_Created<const void>(value ? qf_retain(value) : nullptr));
            EXPECT_EQ(holder.get(), std::strcmp(row.type, type) == 0 ? value : nullptr);
        }
        EXPECT_EQ(value ? qf_get_retain_count(value) : 0, count);
    }
}

TEST(QfSharedRef, AdoptsCreatedValuesOfItsTypeOnly) {
    checkAdoption<Boolean>("QfBoolean");
    checkAdoption<Number>("QfNumber");
    checkAdoption<String>("QfString");
    checkAdoption<Data>("QfData");
    checkAdoption<Date>("QfDate");
    checkAdoption<URL>("QfURL");
    checkAdoption<Error>("QfError");
    checkAdoption<Locale>("QfLocale");
    checkAdoption<DateFormatter>("QfDateFormatter");
    checkAdoption<Array>("QfArray");
    checkAdoption<MutableArray>("QfArray");
    checkAdoption<Dictionary>("QfDictionary");
    checkAdoption<MutableDictionary>("QfDictionary");
}

TEST(MapAdapter, CopiesValuesOfTheTypeAskedForOnly) {
    for (const ReadRow& row : everyValue()) {
        const dict_adapter map = dictionaryOf(row.value.get());
        const MakeQfString key("key");
        const struct {
            const char* type;
            QfTypeRef copied;
        } copies[] = {{"QfString", map.copyQfStringRef(key)},
                      {"QfBoolean", map.copyQfBooleanRef(key)},
                      {"QfNumber", map.copyQfNumberRef(key)},
                      {"QfArray", map.copyQfArrayRef(key)},
                      {"QfDictionary", map.copyQfDictionaryRef(key)},
                      {"QfData", map.copyQfDataRef(key)}};
        for (const auto& copy : copies) {
            EXPECT_EQ(copy.copied,
                      std::strcmp(row.type, copy.type) == 0 ? row.value.get() : nullptr)
                << copy.type << " of " << row.name;
            const auto release = adopt(copy.copied);
        }
    }
}

// The names of the targets that `number` fits, which then hold `value`.
std::string targetsOf(QfNumberRef number, long double value) {
    std::string fitting;
    const auto read = [&](const char* name, auto before) {
        auto out = before;
        const bool written = assign(out, number);
        const auto got = static_cast<long double>(out);
        if (written ? got != value && value == value : out != before)
            fitting += "wrong ";
        if (written)
            fitting += name;
    };
    read("i8 ", static_cast<signed char>(99));
    read("i16 ", static_cast<short>(99));
    read("i32 ", 99);
    read("i64 ", 99L);
    read("ll ", 99LL);
    read("u8 ", static_cast<unsigned char>(99));
    read("u16 ", static_cast<unsigned short>(99));
    read("u32 ", 99U);
    read("u64 ", 99UL);
    read("f ", 99.0F);
    read("d ", 99.0);
    return fitting;
}

TEST(Assign, WritesNumbersThatFitWithoutLoss) {
    const struct {
        long double value;
        const char* targets;
    } rows[] = {
        {0, "i8 i16 i32 i64 ll u8 u16 u32 u64 f d "},
        {-1, "i8 i16 i32 i64 ll f d "},
        {-128, "i8 i16 i32 i64 ll f d "},
        {-129, "i16 i32 i64 ll f d "},
        {127, "i8 i16 i32 i64 ll u8 u16 u32 u64 f d "},
        {128, "i16 i32 i64 ll u8 u16 u32 u64 f d "},
        {256, "i16 i32 i64 ll u16 u32 u64 f d "},
        {32768, "i32 i64 ll u16 u32 u64 f d "},
        {65536, "i32 i64 ll u32 u64 f d "},
        {16777217, "i32 i64 ll u32 u64 d "},
        {2147483648.L, "i64 ll u32 u64 f d "},
        {4294967296.L, "i64 ll u64 f d "},
        {9007199254740993.L, "i64 ll u64 "},
        {-9223372036854775808.L, "i64 ll f d "},
        {9223372036854775808.L, "u64 f d "},
        {18446744073709551615.L, "u64 "},
        {2.5, "f d "},
        {0.1, "d "},
        {1e300, "d "},
        {std::numeric_limits<double>::infinity(), "f d "},
        {std::numeric_limits<double>::quiet_NaN(), "f d "},
    };
    const auto check = [](QfNumberRef created, const auto& row) {
        EXPECT_EQ(targetsOf(adopt(created).get(), row.value), row.targets)
            << print(static_cast<double>(row.value)) << " of type " << qf_number_get_type(created);
    };
    for (const auto& row : rows) {
        // From each way of storing that holds the number.
        if (const auto real = static_cast<double>(row.value); real == row.value || real != real)
            check(qf_number_create_double(real), row);
        if (row.value >= -0x1p63L && row.value < 0x1p63L &&
            row.value == static_cast<long double>(static_cast<std::int64_t>(row.value)))
            check(qf_number_create_int64(static_cast<std::int64_t>(row.value)), row);
        if (row.value >= 0 && row.value < 0x1p64L &&
            row.value == static_cast<long double>(static_cast<std::uint64_t>(row.value)))
            check(qf_number_create_uint64(static_cast<std::uint64_t>(row.value)), row);
    }
    EXPECT_EQ(targetsOf(nullptr, 0), "");
}

TEST(Assign, WritesBooleansBytesAndTexts) {
    for (const bool before : {false, true}) {
        bool out = before;
        EXPECT_FALSE(assign(out, QfBooleanRef()));
        EXPECT_EQ(out, before);
        EXPECT_TRUE(assign(out, kQfBooleanTrue) && out);
        EXPECT_TRUE(assign(out, kQfBooleanFalse) && !out);
    }
    std::vector<std::uint8_t> bytes{9};
    EXPECT_FALSE(assign(bytes, QfDataRef()));
    EXPECT_EQ(bytes, std::vector<std::uint8_t>{9});
    EXPECT_TRUE(assign(bytes, adopt(qf_data_create("\0\xff", 2)).get()));
    EXPECT_EQ(bytes, (std::vector<std::uint8_t>{0, 255}));
    EXPECT_TRUE(assign(bytes, adopt(qf_data_create(nullptr, 0)).get()) && bytes.empty());

    std::string text = "before";
    EXPECT_FALSE(assign(text, QfStringRef()) || assign(text, QfErrorRef()) ||
                 assign(text, QfURLRef(), true));
    EXPECT_EQ(text, "before");
    const auto url = adopt(qf_url_create(MakeQfString("tel:+123")));
    for (const bool flag : {false, true}) {
        text.clear();
        EXPECT_TRUE(assign(text, url.get(), flag));
        EXPECT_EQ(text, "tel:+123");
    }
}

TEST(Assign, WritesTimesAsTheFormatterRendersThem) {
    const auto locale = adopt(qf_locale_create("C"));
    for (const auto style : {kQfDateFormatterNoStyle, kQfDateFormatterShortStyle,
                             kQfDateFormatterMediumStyle, kQfDateFormatterFullStyle}) {
        const auto formatter =
            adopt(qf_date_formatter_create(locale.get(), style, kQfDateFormatterLongStyle));
        const auto rendered = adopt(qf_date_formatter_copy_string(formatter.get(), 1e9));
        std::string text = "before";
        EXPECT_FALSE(assign(text, std::numeric_limits<double>::quiet_NaN(), locale.get(), style,
                            kQfDateFormatterLongStyle));
        EXPECT_EQ(text, "before");
        EXPECT_TRUE(assign(text, 1e9, locale.get(), style, kQfDateFormatterLongStyle));
        EXPECT_EQ(text, show(rendered.get()));
    }
}

TEST(DictAdapter, RetainsOrAdoptsAndSharesItsDictionary) {
    const auto dictionary = adopt(qf_dictionary_create(nullptr, nullptr, 0));
    const auto count = [&] { return qf_get_retain_count(dictionary.get()); };
    {
        const dict_adapter retaining(dictionary.get());
        EXPECT_EQ(count(), 2);
        qf_retain(dictionary.get());
        dict_adapter adopting(dictionary.get(), true);
        EXPECT_EQ(count(), 3);
        const dict_adapter copy(adopting);
        EXPECT_EQ(count(), 4);
        adopting = dict_adapter(nullptr);
        EXPECT_EQ(count(), 3);
        EXPECT_EQ(adopting.copyQfTypeRef(MakeQfString("key")), nullptr);
    }
    EXPECT_EQ(count(), 1);
}

TEST(MapAdapter, VirtualFunctionsKeepTheirOrder) {
    // Itanium C++ ABI: a pointer to a virtual member is its offset in the table.
    const auto member = &map_adapter::copyQfTypeRef;
    std::ptrdiff_t offset = 0;
    std::memcpy(&offset, &member, sizeof offset);
    EXPECT_EQ(offset & ~std::ptrdiff_t{1}, 0);
}

TEST(MakeQfString, SharesItsString) {
    const MakeQfString string("text");
    const MakeQfString copy(string);  // NOLINT(performance-unnecessary-copy-initialization)
    EXPECT_EQ(copy.get(), string.get());
    EXPECT_EQ(qf_get_retain_count(string), 2);
    EXPECT_EQ(show(string), "text");
    EXPECT_EQ(MakeQfString(nullptr).get(), nullptr);
}

}  // namespace
