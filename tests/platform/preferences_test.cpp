#include <unistd.h>

#include <array>
#include <cmath>
#include <vector>

#include "platform/linux/qf/preferences_edit.h"
#include "platform/linux/qf/preferences_names.h"
#include "platform/linux/qf/preferences_write.h"
#include "preferences_support.h"
#include "support/qf_balance.h"

namespace plr::test {
namespace {

owned_value number(double value) {
    return owned_value::adopt(qf_number_create_double(value));
}
owned_value date(std::int64_t nanoseconds) {
    return owned_value::adopt(qf_date_create(nanoseconds));
}
owned_value text(const char* utf8) {
    return owned_value::adopt(qf_string_create(utf8));
}
owned_value data(std::string_view bytes) {
    return owned_value::adopt(qf_data_create(bytes.data(), bytes.size()));
}
owned_value dictionary(const char* key, const owned_value& value) {
    const owned_string name = make_string(key);
    QfStringRef keys = name.get();
    QfTypeRef values = value.get();
    return owned_value::adopt(qf_dictionary_create(&keys, &values, 1));
}
owned_value array(const owned_value& value) {
    QfTypeRef values = value.get();
    return owned_value::adopt(qf_array_create(&values, 1));
}

TEST(PreferencesText, IsReadAndWrittenByType) {
    ::setenv("TZ", "XXX-2", 1);  // two hours east
    ::tzset();
    constexpr std::int64_t kSecond = 1'000'000'000;
    const struct {
        const char* toml;
        owned_value value;
    } rows[] = {
        {R"("a\u0000\t\"")", owned_value::adopt(qf_string_create_with_length("a\0\t\"", 4))},
        {"'''\n'quoted' '''", text("'quoted' ")},
        {"-9223372036854775808", owned_value::adopt(qf_number_create_int64(INT64_MIN))},
        {"0x7fff_ffff_ffff_ffff", owned_value::adopt(qf_number_create_int64(INT64_MAX))},
        {"1e22", number(1e22)},
        {"0.1", number(0.1)},
        {"-inf", number(-INFINITY)},
        {"nan", number(NAN)},
        {"true", owned_value::retain(kQfBooleanTrue)},
        {"1970-01-01T01:00:00.000000001+01:00", date(1)},
        {"1969-12-31 23:59:59.999999999Z", date(-1)},
        {"1677-09-21T00:12:43.145224192Z", date(INT64_MIN)},
        {"1970-01-01T02:00:01", date(kSecond)},  // local
        {"2024-02-29", text("2024-02-29")},
        {"07:05:00.25", text("07:05:00.25")},
        {R"({ base64 = "AP8=" })", data(std::string_view("\0\xFF", 2))},
        {R"({ base64 = "" })", data("")},
        {R"({ base64 = 3 })", dictionary("base64", number(3))},
        {R"([{ "odd key" = [] }])",
         array(dictionary("odd key", owned_value::adopt(qf_array_create(nullptr, 0))))},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.toml);
        const owned_value read = toml(std::string("= ") + row.toml);
        EXPECT_TRUE(qf_equal(read.get(), row.value.get())) << describe(read.get());
        EXPECT_FALSE(why_unwritable("key", row.value.get()));
        std::string written = "= ";
        append_value(written, row.value.get());
        EXPECT_TRUE(qf_equal(toml(written).get(), row.value.get())) << written;
    }
    const owned_value table = toml("= 0\n[other]\nbase64 = 'AP8='");
    EXPECT_TRUE(table) << "a table under a header is no data";
}

TEST(PreferencesText, IsRefusedWithItsPlace) {
    const std::string deep = "[a" + [] {
        std::string parts;
        for (int i = 0; i < 100'000; ++i)
            parts += ".a";
        return parts;
    }() + "]";
    const struct {
        const char* name;
        std::string toml, error;
    } rows[] = {
        {"no value", "a = 1\nb =\n", "f:2:4: "},
        {"no UTF-8", "a = \"\xFF\"", "f:1:5: "},
        {"twice", "a = 1\na = 2\n", "f:2:"},
        {"no base64", "a = 1\nb = [{ base64 = \"A\" }]", "f:2:17: not base64"},
        {"base64 of bits left over", "b = { base64 = \"AB==\" }", "f:1:16: not base64"},
        {"date beyond nanoseconds", "b = 2300-01-01T00:00:00Z", "f:1:5: a date out of range"},
        {"brackets", "é = " + std::string(100'000, '['), "f:1:69: nested too deeply"},
        {"dotted header", deep, "f:1:131: nested too deeply"},
        {"headers and braces",
         "[a.a.a.a]\nb = " + std::string(60, '[') + "{c.c.c = 1}" + std::string(60, ']'), "f:2:"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const parsed result = parse(row.toml, "f");
        EXPECT_FALSE(result.values);
        EXPECT_TRUE(text_of(result.error).starts_with(row.error)) << text_of(result.error);
    }
}

TEST(PreferencesText, IsEditedInPlace) {
    const struct {
        const char* name;
        std::string before, wanted, after;
    } rows[] = {
        {"a value", "# top\na  =  1 # one\nb = 2\n", "a = 'x'\nb = 2",
         "# top\na  =  \"x\" # one\nb = 2\n"},
        {"a value over lines", "a = [ # x\n 1, # ]\n ]  # end\n", "a = 1", "a = 1  # end\n"},
        {"a removed key", "a = 1\n# of b\nb = '''\n]''' # x\nc = 3", "a = 1\nc = 3",
         "a = 1\n# of b\nc = 3"},
        {"a new key at the root", "# top\n\na = 1\n\n# of t\n[t]\nb = 2\n",
         "a = 1\nc = 3\n[t]\nb = 2", "# top\n\na = 1\nc = 3\n\n# of t\n[t]\nb = 2\n"},
        {"a first key at the root", "# top\n\n# of t\n[t]\n", "c = 3\n[t]",
         "# top\n\nc = 3\n# of t\n[t]\n"},
        {"a new key without line feed", "a = 1", "a = 1\n'b c' = 2", "a = 1\n\"b c\" = 2\n"},
        {"a new file", "", "a = 1\n[t]\nb = 2\n[t.u]", "a = 1\n\n[t]\nb = 2\n\n[t.u]\n"},
        {"keys of a table", "[t] # t\na = 1 # a\n\"\\u0062\" = 2\n[u]\n", "[t]\na = 5\nc = 3\n[u]",
         "[t] # t\na = 5 # a\nc = 3\n[u]\n"},
        {"a new table in a table", "[t]\na = 1\n# end\n", "[t]\na = 1\n[t.u]\nb = 2",
         "[t]\na = 1\n# end\n\n[t.u]\nb = 2\n"},
        {"a table before a key", "[t]\na = 1 # a\n", "[t]\na = 1\nn = 3\n[t.b]\n[t.c]",
         "[t]\na = 1 # a\nn = 3\n\n[t.b]\n\n[t.c]\n"},
        {"a removed table", "[t]\na = 1\n[[t.l]]\nb = 1\n[u]\n", "[u]", "[u]\n"},
        {"a dotted key", "t.a.b = 1 # b\nt.a.c = 2\n", "t = {a = {b = 5, c = 2}}",
         "t.a.b = 5 # b\nt.a.c = 2\n"},
        {"a key in braces", "t = { a = 1, b = 2 } # t\n", "t = {a = 1}", "t = { a = 1 } # t\n"},
        {"a new dotted key", "t.a = 1\nk = 2 # k\n", "t = {a = 1, b = 2}\nk = 2",
         "k = 2 # k\n\n[t]\na = 1\nb = 2\n"},
        {"an array of tables", "[[l]]\na = 1\n[[l]]\na = 2\n[k] # k\n", "l = [{a = 1}]\n[k]",
         "l = [{ a = 1 }]\n[k] # k\n"},
        {"a table in place of a value", "t = 1 # t\nk = 1\n", "t = {a = 1}\nk = 1",
         "t = { a = 1 } # t\nk = 1\n"},
        {"a value in place of a table", "[t]\na = 1\n", "t = 1", "t = 1\n"},
        {"a mark at the begin", "\xEF\xBB\xBF[t]\n", "a = 1\n[t]",
         "\xEF\xBB\xBF"
         "a = 1\n[t]\n"},
        {"an equal value", "a = 0x10 # hex\nb = 1", "a = 16\nb = 2", "a = 0x10 # hex\nb = 2"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        const parsed before = parse(row.before, "before");
        const parsed wanted = parse(row.wanted, "wanted");
        ASSERT_TRUE(before.values && wanted.values)
            << text_of(before.error) << text_of(wanted.error);
        EXPECT_EQ(edit(row.before, before.values.get(), wanted.values.get()), row.after);
    }
}

TEST(PreferencesText, CannotHoldEverything) {
    owned_value deep = text("x");
    for (unsigned i = 0; i < kMaximumDepth; ++i)
        deep = array(deep);
    const struct {
        owned_value value;
        const char* error;
    } rows[] = {
        {owned_value::retain(kQfNull), "key is of a type that preferences do not have"},
        {array(owned_value::adopt(qf_url_create(make_string("tel:1").get()))),
         "key[0] is of a type that preferences do not have"},
        {owned_value::adopt(qf_number_create_uint64(UINT64_MAX)), "key is a number past 2^63 - 1"},
        {dictionary("a", text("\xFF")), "key.a is not UTF-8"},
        {dictionary("\xFF", text("")), "key has a key that is not UTF-8"},
        {array(dictionary("base64", text(""))),
         "key[0] would be read as data: its only key is base64"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(text_of(why_unwritable("key", row.value.get())), row.error);
    EXPECT_TRUE(text_of(why_unwritable("key", deep.get())).ends_with("is nested too deeply"));
}

TEST_F(Preferences, LaterLayersAndHostsWin) {
    std::array<char, 256> name{};
    ASSERT_EQ(::gethostname(name.data(), name.size() - 1), 0);
    const std::string host = name.data();
    write("VENDOR/app.toml", "a = 1\nb = 1\nc = 1\nd = 1\ne = 1\nt = {x = 1, y = {p = 1}}");
    write("VENDOR/app@" + host + ".toml", "b = 2");
    write("SYSTEM/app.toml", "c = 3\nt.y.q = 3");
    write("SYSTEM/app@other.toml", "c = 4");
    write("USER/app.toml", "d = 5\nt.x = [5]");
    write("USER/app@" + host + ".toml", "e = 6");
    const owned_string other = make_string("other");
    const struct {
        QfStringRef user, host;
        const char* all;
    } rows[] = {
        {kQfPreferencesCurrentUser, kQfPreferencesCurrentHost,
         "a = 1\nb = 2\nc = 3\nd = 5\ne = 6\nt = {x = [5], y = {p = 1, q = 3}}"},
        {kQfPreferencesCurrentUser, kQfPreferencesAnyHost,
         "a = 1\nb = 1\nc = 3\nd = 5\ne = 1\nt = {x = [5], y = {p = 1, q = 3}}"},
        {kQfPreferencesAnyUser, kQfPreferencesCurrentHost,
         "a = 1\nb = 2\nc = 3\nd = 1\ne = 1\nt = {x = 1, y = {p = 1, q = 3}}"},
        {kQfPreferencesAnyUser, other.get(),
         "a = 1\nb = 1\nc = 4\nd = 1\ne = 1\nt = {x = 1, y = {p = 1, q = 3}}"},
    };
    for (const auto& row : rows) {
        const auto all = owned_dictionary::adopt(
            qf_preferences_copy_all(make_string("app").get(), row.user, row.host));
        EXPECT_TRUE(qf_equal(all.get(), parse(row.all, "").values.get())) << describe(all.get());
    }
    EXPECT_FALSE(value_of("z"));
}

TEST_F(Preferences, NamesThatAreNoneHaveNoPreferences) {
    write("USER/app.toml", "a = 1");
    const std::string long_name(129, 'a');
    for (const char* name : {"", ".app", "../app", "a/b", "a@b", "\xC3\xA4", long_name.c_str()}) {
        SCOPED_TRACE(name);
        const owned_string none = make_string(name);
        for (const auto& [application, user, host] :
             {std::array{name, "*current user*", "*any host*"},
              {"app", name, "*any host*"},
              {"app", "*current user*", name}}) {
            const owned_string who = make_string(user);
            const owned_string where = make_string(host);
            EXPECT_FALSE(value_of("a", who.get(), where.get(), application));
            EXPECT_NE(text_of(set("a", toml("= 2"), who.get(), where.get(), application))
                          .find("is no name of"),
                      std::string::npos);
        }
    }
    EXPECT_FALSE(value_of("a", make_string("no-such-user").get()));
    const file_list files =
        files_of(make_string("app").get(), make_string("root").get(), kQfPreferencesAnyHost);
    ASSERT_EQ(files.paths.size(), 3U);
    EXPECT_EQ(files.paths.back(), "/root/.config/pelorin/preferences/app.toml");
}

TEST_F(Preferences, FilesThatCannotBeReadAreNamedAndOthersGoOn) {
    write("VENDOR/app.toml", "a = 1\n");
    write("SYSTEM/app.toml", "b = 1\n c == 2\n");
    write("USER/app.toml", "d = '" + std::string(kMaximumFileSize, 'x') + "'");
    EXPECT_TRUE(value_of("a"));
    EXPECT_FALSE(value_of("b"));
    const std::vector<std::string> found = errors();
    ASSERT_EQ(found.size(), 2U);
    EXPECT_TRUE(found[0].starts_with(at("SYSTEM/app.toml") + ":2:5: ")) << found[0];
    EXPECT_EQ(found[1], at("USER/app.toml") + ": File too large");
    // Nobody's mistakes are written over.
    EXPECT_EQ(text_of(set("b", toml("= 2"), kQfPreferencesAnyUser)), found[0]);
    EXPECT_EQ(read("SYSTEM/app.toml"), "b = 1\n c == 2\n");
}

}  // namespace
}  // namespace plr::test
