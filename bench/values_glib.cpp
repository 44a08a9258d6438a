// GLib: numbers are GVariants; dictionaries of them are hash tables ("table") or GVariants
// themselves, of the type a{sv} ("variant").

#include <glib.h>

#include "bench/values_cases.h"

namespace {

struct Numbers {
    using Number = GVariant*;
    static Number makeNumber(std::int64_t value) {
        return g_variant_ref_sink(g_variant_new_int64(value));
    }
    static std::int64_t read(Number number) { return g_variant_get_int64(number); }
    static void free(Number number) { g_variant_unref(number); }
};

struct Table : Numbers {
    using Dictionary = GHashTable*;
    using Key = const char*;
    using Numbers::free;

    static Dictionary build(const std::vector<std::string>& keys) {
        const Dictionary made =
            g_hash_table_new_full(g_str_hash, g_str_equal, g_free,
                                  [](void* value) { g_variant_unref(static_cast<Number>(value)); });
        std::int64_t value = 0;
        for (const std::string& text : keys)
            g_hash_table_insert(made, g_strdup(text.c_str()), makeNumber(value++));
        return made;
    }
    static void free(Dictionary dictionary) { g_hash_table_unref(dictionary); }
    static std::int64_t find(Dictionary dictionary, Key key) {
        return read(static_cast<Number>(g_hash_table_lookup(dictionary, key)));
    }
    static std::int64_t find(Dictionary dictionary, const std::string& key) {
        return find(dictionary, key.c_str());
    }
    static Key makeKey(const std::string& text) { return g_strdup(text.c_str()); }
    static std::int64_t walk(Dictionary dictionary) {
        std::int64_t sum = 0;
        GHashTableIter at;
        g_hash_table_iter_init(&at, dictionary);
        void* key = nullptr;
        void* value = nullptr;
        while (g_hash_table_iter_next(&at, &key, &value))
            sum += *static_cast<Key>(key) ? read(static_cast<Number>(value)) : 0;
        return sum;
    }
};

struct Variant : Numbers {
    using Dictionary = GVariant*;
    using Key = const char*;

    static Dictionary build(const std::vector<std::string>& keys) {
        GVariantBuilder builder;
        g_variant_builder_init(&builder, G_VARIANT_TYPE_VARDICT);
        std::int64_t value = 0;
        for (const std::string& text : keys)
            g_variant_builder_add(&builder, "{sv}", text.c_str(), g_variant_new_int64(value++));
        return g_variant_ref_sink(g_variant_builder_end(&builder));
    }
    static std::int64_t find(Dictionary dictionary, Key key) {
        std::int64_t value = 0;
        g_variant_lookup(dictionary, key, "x", &value);
        return value;
    }
    static std::int64_t find(Dictionary dictionary, const std::string& key) {
        return find(dictionary, key.c_str());
    }
    static Key makeKey(const std::string& text) { return g_strdup(text.c_str()); }
    static std::int64_t walk(Dictionary dictionary) {
        std::int64_t sum = 0;
        GVariantIter at;
        g_variant_iter_init(&at, dictionary);
        Key key = nullptr;
        Number value = nullptr;
        while (g_variant_iter_next(&at, "{&sv}", &key, &value)) {
            sum += *key ? read(value) : 0;
            free(value);
        }
        return sum;
    }
};

}  // namespace

int main(int argc, char** argv) {
    if (argc != 4)
        return 2;
    return argv[1] == std::string_view("table")
               ? bench::values_cases::run<Table>(argv[2], argv[3])
               : bench::values_cases::run<Variant>(argv[2], argv[3]);
}
