#include <gtest/gtest.h>
#include <langinfo.h>

#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/linux/qf/value.h"
#include "plr/concurrency/qf_shared_ref.h"

namespace {

using namespace std::string_view_literals;
using plr::qf::adopt;
using Value = plr::qf::QfSharedRef<const void>;

Value value(QfTypeRef created) {
    return Value(plr::_Created<const void>(created));
}
auto text(std::string_view of) {
    return adopt(qf_string_create_with_length(of.data(), of.size()));
}
std::string toString(QfStringRef string) {
    return {qf_string_get_string_ptr(string), qf_string_get_length(string)};
}
Value error(const char* domain, std::int64_t code, const char* description) {
    const auto what = description ? text(description) : plr::qf::QfSharedRef<plr::qf::String>();
    return value(qf_error_create(text(domain).get(), code, what.get()));
}
Value dictionaryOf(const char* key, const Value& content) {
    const auto name = text(key);
    const QfStringRef rawKey = name.get();
    const QfTypeRef rawValue = content.get();
    return value(qf_dictionary_create(&rawKey, &rawValue, 1));
}
Value arrayOf(const std::vector<Value>& content) {
    std::vector<QfTypeRef> raw;
    for (const Value& each : content)
        raw.push_back(each.get());
    return value(qf_array_create(raw.data(), raw.size()));
}

// ---- Every type ------------------------------------------------------------------

struct Kind {
    const char* name;
    Value one;
    Value same;   // another value of equal content; null for singletons
    Value other;  // of the same type
    std::string described;
};

std::vector<Kind> kinds() {
    const auto c = adopt(qf_locale_create("C"));
    const auto formatter = [&c](QfDateFormatterStyle date) {
        return value(qf_date_formatter_create(c.get(), date, kQfDateFormatterNoStyle));
    };
    const auto url = [](const char* of) { return value(qf_url_create(text(of).get())); };
    const auto data = [](std::string_view of) {
        return value(qf_data_create(of.data(), of.size()));
    };
    const auto date = [](std::int64_t of) { return value(qf_date_create(of)); };
    const auto string = [](std::string_view of) { return Value(text(of).get()); };
    const auto real = [](double of) { return value(qf_number_create_double(of)); };
    std::vector<Kind> all{
        {"QfNull", Value(kQfNull), Value(kQfNull), {}, "null"},
        {"QfBoolean", Value(kQfBooleanTrue), Value(kQfBooleanTrue), Value(kQfBooleanFalse), "true"},
        {"QfNumber", real(-2.5), real(-2.5), real(2), "-2.5"},
        {"QfString", string("say \"a\n\""), string("say \"a\n\""), string("say"), "say \"a\\x0a\""},
        {"QfData", data("\x01\xff"), data("\x01\xff"), data("\x01"), "<2 bytes 01 ff>"},
        {"QfDate", date(-1), date(-1), date(0), "1969-12-31T23:59:59.999999999Z"},
        {"QfURL", url("a:b"), url("a:b"), url("a:c"), "<url a:b>"},
        {"QfError", error("errno", 2, nullptr), error("errno", 2, nullptr),
         error("errno", 3, nullptr), "<error errno 2: \"errno error 2\">"},
        {"QfLocale", Value(c.get()), value(qf_locale_create("C")), value(qf_locale_create("POSIX")),
         "<locale C>"},
        {"QfDateFormatter", formatter(kQfDateFormatterShortStyle),
         formatter(kQfDateFormatterShortStyle), formatter(kQfDateFormatterLongStyle),
         "<date formatter %x>"},
        {"QfArray", arrayOf({string("a\xff\""), real(2)}), arrayOf({string("a\xff\""), real(2)}),
         arrayOf({real(2)}), R"(["a\xff\"", 2])"},
        {"QfDictionary", dictionaryOf("k", string("v")), dictionaryOf("k", string("v")),
         dictionaryOf("l", string("v")), R"({"k": "v"})"},
    };
    return all;
}

TEST(QfValue, HasATypeAnIdentityAndADescription) {
    const std::vector<Kind> all = kinds();
    for (std::size_t i = 0; i < all.size(); i++) {
        SCOPED_TRACE(all[i].name);
        EXPECT_STREQ(qf_type_get_name(qf_get_type_id(all[i].one.get())), all[i].name);
        EXPECT_TRUE(qf_equal(all[i].one.get(), all[i].same.get()));
        EXPECT_EQ(qf_hash(all[i].one.get()), qf_hash(all[i].same.get()));
        if (all[i].other) {
            EXPECT_FALSE(qf_equal(all[i].one.get(), all[i].other.get()));
            EXPECT_NE(qf_hash(all[i].one.get()), qf_hash(all[i].other.get()));
        }
        for (std::size_t k = 0; k < i; k++)
            EXPECT_FALSE(qf_equal(all[i].one.get(), all[k].one.get())) << all[k].name;
        EXPECT_EQ(toString(adopt(qf_copy_description(all[i].one.get())).get()), all[i].described);
    }
    EXPECT_STREQ(qf_type_get_name(0), "?");
    EXPECT_STREQ(qf_type_get_name(1000), "?");
}

TEST(QfValue, CountsReferencesOfAllButConstants) {
    static constinit const qf_string literal(qf::constant, "literal");
    for (const QfTypeRef constant :
         {QfTypeRef{kQfNull}, QfTypeRef{kQfBooleanFalse}, QfTypeRef{&literal}}) {
        const long count = qf_get_retain_count(constant);
        EXPECT_EQ(qf_retain(constant), constant);
        EXPECT_EQ(qf_get_retain_count(constant), count);
        qf_release(constant);
        qf_release(constant);
        EXPECT_EQ(qf_get_retain_count(constant), count);
    }
    EXPECT_TRUE(qf_equal(&literal, text("literal").get()));

    const auto shared = text("shared");
    const auto useIt = [&shared] {
        for (int i = 0; i < 10'000; i++) {
            qf_retain(shared.get());
            EXPECT_NE(qf_hash(shared.get()), 0u);
            qf_release(shared.get());
        }
    };
    std::thread beside(useIt);
    useIt();
    beside.join();
    EXPECT_EQ(qf_get_retain_count(shared.get()), 1);
}

TEST(QfValueDeathTest, MisuseEndsTheProcess) {
    const QfAllocator releasing{
        nullptr, [](void* memory, size_t, void*) { qf_release(*static_cast<QfTypeRef*>(memory)); },
        nullptr};
    const auto releaseTwice = [&releasing] {
        QfTypeRef data = nullptr;
        data = qf_data_create_no_copy(static_cast<const void*>(&data), sizeof data, &releasing);
        qf_release(data);
    };
    EXPECT_DEATH(releaseTwice(), "released too often");
    EXPECT_DEATH(qf_retain(nullptr), "null");
    const Value string(text("no number").get());
    EXPECT_DEATH(qf_number_get_type(static_cast<QfNumberRef>(string.get())), "type asked for");
    const auto array = adopt(qf_array_create_mutable());
    EXPECT_DEATH(qf_array_append_value(array.get(), nullptr), "null");
}

// ---- Strings ---------------------------------------------------------------------

TEST(QfString, ReadsThePlainNumberItBeginsWith) {
    struct Row {
        std::string_view text;
        int whole;
        double real;
    };
    for (const Row& row : {Row{"", 0, 0},
                           {"  \t\n\v\f\r42 apples", 42, 42},
                           {"-7", -7, -7},
                           {"+7.25", 7, 7.25},
                           {"+-7", 0, 0},
                           {"-+7", 0, 0},
                           {"- 7", 0, 0},
                           {"+", 0, 0},
                           {"x7", 0, 0},
                           {"007", 7, 7},
                           {"-1.5e3", -1, -1500},
                           {".5", 0, 0.5},
                           {"-.5e1x", 0, -5},
                           {".", 0, 0},
                           {"5.", 5, 5},
                           {"2e", 2, 2},
                           {"0x10", 0, 0},
                           {"inf", 0, 0},
                           {"-nan", 0, 0},
                           {"1,5", 1, 1},
                           {"2147483648", INT32_MAX, 2147483648.0},
                           {"-2147483649", INT32_MIN, -2147483649.0},
                           {"99999999999999999999", INT32_MAX, 1e20},
                           {"1e999", 1, DBL_MAX},
                           {"-1e999", -1, -DBL_MAX},
                           {"1e-999", 1, 0},
                           {"1\0002"sv, 1, 1},
                           {"0.1", 0, 0.1},
                           {"\xc2\xa0"
                            "1",
                            0, 0}}) {
        EXPECT_EQ(qf_string_get_int_value(text(row.text).get()), row.whole) << row.text;
        EXPECT_EQ(qf_string_get_double_value(text(row.text).get()), row.real) << row.text;
    }
}

TEST(QfString, ComparesByBytesAndWithoutTheCaseOfASCIILetters) {
    const auto sign = [](int of) { return (of > 0) - (of < 0); };
    struct Row {
        std::string_view left, right;
        int bytes, folded;
    };
    for (const Row& row : {Row{"yes", "YES", 1, 0},
                           {"a", "ab", -1, -1},
                           {"a\0b"sv, "a\0c"sv, -1, -1},
                           {"[", "a", -1, -1},
                           {"_", "A", 1, -1},
                           {"\xc3\xa4", "\xc3\x84", 1, 1},
                           {"", "", 0, 0},
                           {"z", "\x80", -1, -1}}) {
        const auto left = text(row.left);
        const auto right = text(row.right);
        EXPECT_EQ(sign(qf_string_compare(left.get(), right.get())), row.bytes) << row.left;
        EXPECT_EQ(sign(qf_string_compare_case_insensitive(left.get(), right.get())), row.folded)
            << row.left;
        EXPECT_EQ(sign(qf_string_compare_case_insensitive(right.get(), left.get())), -row.folded);
    }
    EXPECT_EQ(toString(adopt(qf_string_create_with_format("%s %d", "a", 5)).get()), "a 5");
}

// Memory of the tests' own that knows what is out.
class Memory {
  public:
    explicit Memory(bool empty = false) : empty_(empty) {}
    Memory(const Memory&) = delete;
    Memory& operator=(const Memory&) = delete;
    ~Memory() { EXPECT_EQ(out_, 0u) << "bytes not given back"; }
    [[nodiscard]] QfAllocatorRef allocator() const { return &allocator_; }
    [[nodiscard]] std::size_t out() const { return out_; }
    void take(std::size_t size) { out_ += size; }

  private:
    static void* allocate(size_t size, void* context) {
        auto* const self = static_cast<Memory*>(context);
        if (self->empty_)
            return nullptr;
        self->take(size);
        return std::malloc(size);
    }
    static void deallocate(void* memory, size_t size, void* context) {
        static_cast<Memory*>(context)->out_ -= size;
        std::free(memory);
    }
    bool empty_;
    std::size_t out_ = 0;
    QfAllocator allocator_{allocate, deallocate, this};
};

TEST(QfString, IsMadeOfValidBytesOfItsEncoding) {
    Memory memory;
    const Memory empty(true);
    struct Row {
        std::string_view bytes;
        QfStringEncoding encoding;
        std::string_view utf8;  // no data: not valid
    };
    const std::string_view bad;
    for (const Row& row :
         {Row{"gr\xc3\xbc\xc3\x9f", kQfStringEncodingUTF8, "gr\xc3\xbc\xc3\x9f"},
          {"", kQfStringEncodingUTF8, ""},
          {"\xc3", kQfStringEncodingUTF8, bad},
          {"\x7f", kQfStringEncodingASCII, "\x7f"},
          {"\x80", kQfStringEncodingASCII, bad},
          {"a\x80\xff", kQfStringEncodingISOLatin1, "a\xc2\x80\xc3\xbf"},
          {"\0a\x07\xff\x08\0\xff\xff\xd8\0\xdc\0\xdb\xff\xdf\xff"sv, kQfStringEncodingUTF16BE,
           "a\xdf\xbf\xe0\xa0\x80\xef\xbf\xbf\xf0\x90\x80\x80\xf4\x8f\xbf\xbf"},
          {"a\0\0\xd8\0\xdc"sv, kQfStringEncodingUTF16LE, "a\xf0\x90\x80\x80"},
          {"\xd8\0"sv, kQfStringEncodingUTF16BE, bad},
          {"\xdc\0\0a"sv, kQfStringEncodingUTF16BE, bad},
          {"\xd8\0\0a"sv, kQfStringEncodingUTF16BE, bad},
          {"a\0b"sv, kQfStringEncodingUTF16LE, bad}}) {
        for (const QfAllocatorRef from : {QfAllocatorRef{nullptr}, memory.allocator()}) {
            const auto made = adopt(qf_string_create_with_bytes(from, row.bytes.data(),
                                                                row.bytes.size(), row.encoding));
            ASSERT_EQ(made.get() != nullptr, row.utf8.data() != nullptr) << row.bytes;
            if (made) {
                EXPECT_EQ(toString(made.get()), row.utf8);
                EXPECT_EQ(qf_string_get_string_ptr(made.get())[row.utf8.size()], '\0');
                EXPECT_EQ(memory.out(), from ? row.utf8.size() + 1 : 0);
            }
        }
        EXPECT_FALSE(adopt(qf_string_create_with_bytes(empty.allocator(), row.bytes.data(),
                                                       row.bytes.size(), row.encoding)));
    }
}

TEST(QfData, CopiesOrRefersToItsBytesAndGivesThemBack) {
    Memory memory;
    const Memory empty(true);
    const std::string bytes = "some bytes";
    const auto copied =
        adopt(qf_data_create_with_allocator(memory.allocator(), bytes.data(), bytes.size()));
    EXPECT_EQ(memory.out(), bytes.size());
    EXPECT_TRUE(qf_equal(copied.get(), value(qf_data_create(bytes.data(), bytes.size())).get()));
    EXPECT_FALSE(
        adopt(qf_data_create_with_allocator(empty.allocator(), bytes.data(), bytes.size())));

    const auto lent = adopt(qf_data_create_no_copy(bytes.data(), bytes.size(), nullptr));
    EXPECT_EQ(qf_data_get_bytes_ptr(lent.get()), bytes.data());
    EXPECT_EQ(qf_data_get_length(lent.get()), bytes.size());
    memory.take(5);
    const auto given = adopt(qf_data_create_no_copy(std::malloc(5), 5, memory.allocator()));
    EXPECT_EQ(memory.out(), bytes.size() + 5);
    for (const Value& none :
         {value(qf_data_create(nullptr, 0)), value(qf_data_create_no_copy(nullptr, 0, nullptr)),
          value(qf_data_create_with_allocator(memory.allocator(), nullptr, 0))})
        EXPECT_NE(qf_data_get_bytes_ptr(static_cast<QfDataRef>(none.get())), nullptr);
}

// ---- Errors, URLs, dates -----------------------------------------------------------

TEST(QfError, TellsItsTextOrDomainAndCode) {
    const Value plain = error("preferences", -3, "not there");
    const auto* const ref = static_cast<QfErrorRef>(plain.get());
    EXPECT_EQ(toString(qf_error_get_domain(ref)), "preferences");
    EXPECT_EQ(qf_error_get_code(ref), -3);
    EXPECT_EQ(toString(adopt(qf_error_copy_description(ref)).get()), "not there");
    const Value bare = error("errno", 2, nullptr);
    EXPECT_EQ(toString(adopt(qf_error_copy_description(static_cast<QfErrorRef>(bare.get()))).get()),
              "errno error 2");
    EXPECT_FALSE(qf_equal(bare.get(), error("errno", 2, "text").get()));
}

TEST(QfURL, IsAnyURIOfTheRFCKeptAsGiven) {
    for (const std::string_view good :
         {"ftp://ftp.is.co.za/rfc/rfc1808.txt", "http://www.ietf.org/rfc/rfc2396.txt",
          "ldap://[2001:db8::7]/c=GB?objectClass?one", "mailto:John.Doe@example.com",
          "news:comp.infosystems.www.servers.unix", "tel:+1-816-555-1212",
          "telnet://192.0.2.16:80/", "urn:oasis:names:specification:docbook:dtd:xml:4.1.2",
          "a:", "a+-.1:/", "a://", "file:///etc", "http://u:p%20w@h:/p;x=1?q=a/b?c#f/?",
          "x://[v1f.a:b]:1/", "a:%C3%bc"}) {
        const auto made = adopt(qf_url_create(text(good).get()));
        ASSERT_TRUE(made) << good;
        EXPECT_EQ(toString(qf_url_get_string(made.get())), good);
    }
    for (const std::string_view bad :
         {""sv,           "path/only"sv, "1a:b"sv,     ":b"sv,         "a_b:c"sv,     "a:b c"sv,
          "a:%4"sv,       "a:%g0"sv,     "a:b#c#d"sv,  "a:\xc3\xbc"sv, "a://[::1"sv,  "a://[::g]"sv,
          "a://[::1]x"sv, "a://h:8o"sv,  "a://h[1]"sv, "a://[v.x]"sv,  "a://x@y@z"sv, "a:b[c]"sv,
          "a:b?["sv,      "a:b\""sv,     "a:\0"sv,     "a:b\\c"sv})
        EXPECT_FALSE(adopt(qf_url_create(text(bad).get()))) << bad;
}

TEST(QfDate, KeepsNanoseconds) {
    for (const std::int64_t time : {INT64_MIN, std::int64_t{-1}, std::int64_t{0}, INT64_MAX})
        EXPECT_EQ(qf_date_get_nanoseconds(adopt(qf_date_create(time)).get()), time);
}

std::string rendered(const char* locale, QfDateFormatterStyle date, QfDateFormatterStyle time,
                     double seconds) {
    const auto where =
        locale ? adopt(qf_locale_create(locale)) : plr::qf::QfSharedRef<plr::qf::Locale>();
    const auto formatter = adopt(qf_date_formatter_create(where.get(), date, time));
    const auto made = adopt(qf_date_formatter_copy_string(formatter.get(), seconds));
    return made ? toString(made.get()) : "(null)";
}

class LocalTime : public testing::Test {
  protected:
    LocalTime() { setenv("TZ", "XYZ-2", 1); }  // NOLINT(concurrency-mt-unsafe): no other thread
    ~LocalTime() override { unsetenv("TZ"); }  // NOLINT(concurrency-mt-unsafe)
};

TEST_F(LocalTime, IsRenderedInEachStyle) {
    constexpr auto kNone = kQfDateFormatterNoStyle;
    constexpr double kTime = 1'700'000'000.9;  // 2023-11-14, 22:13:20 UTC
    struct Row {
        QfDateFormatterStyle style;
        const char* date;
        const char* time;
    };
    for (const char* const locale : {"C", "C.UTF-8", static_cast<const char*>(nullptr)})
        for (const Row& row :
             {Row{kNone, "", ""},
              {kQfDateFormatterShortStyle, "11/15/23", "00:13"},
              {kQfDateFormatterMediumStyle, "Nov 15, 2023", "00:13:20"},
              {kQfDateFormatterLongStyle, "November 15, 2023", "00:13:20 XYZ"},
              {kQfDateFormatterFullStyle, "Wednesday, November 15, 2023", "00:13:20 XYZ"}}) {
            EXPECT_EQ(rendered(locale, row.style, kNone, kTime), row.date);
            EXPECT_EQ(rendered(locale, kNone, row.style, kTime), row.time);
        }
    EXPECT_EQ(rendered("C", kQfDateFormatterShortStyle, kQfDateFormatterShortStyle, -0.5),
              "01/01/70 01:59");
    for (const double never : {1e17, -1e300, double{INFINITY}, double{NAN}})
        EXPECT_EQ(rendered("C", kNone, kNone, never), "(null)");
}

TEST(QfLocale, IsOneThatTheSystemHas) {
    EXPECT_STREQ(qf_locale_get_name(adopt(qf_locale_create("C.UTF-8")).get()), "C.UTF-8");
    EXPECT_STRNE(qf_locale_get_name(adopt(qf_locale_create("")).get()), "");
    EXPECT_FALSE(adopt(qf_locale_create("tlh_QX.UTF-8")));
}

}  // namespace
