// Pelorin's Qf values.

#include "bench/values_cases.h"
#include "qf/collection.h"
#include "qf/scalar.h"
#include "qf/string.h"

namespace {

struct Peer {
    using Dictionary = QfMutableDictionaryRef;
    using Key = QfStringRef;
    using Number = QfNumberRef;

    static Dictionary build(const std::vector<std::string>& keys) {
        const Dictionary made = qf_dictionary_create_mutable();
        std::int64_t value = 0;
        for (const std::string& text : keys) {
            const Key key = makeKey(text);
            const Number number = makeNumber(value++);
            qf_dictionary_set_value(made, key, number);
            qf_release(key);
            qf_release(number);
        }
        return made;
    }
    static void free(QfTypeRef value) { qf_release(value); }
    static std::int64_t find(Dictionary dictionary, const std::string& key) {
        return read(static_cast<Number>(
            qf_dictionary_get_value_for_utf8(dictionary, key.data(), key.size())));
    }
    static std::int64_t find(Dictionary dictionary, Key key) {
        return read(static_cast<Number>(qf_dictionary_get_value(dictionary, key)));
    }
    static Key makeKey(const std::string& text) {
        return qf_string_create_with_length(text.data(), text.size());
    }
    static std::int64_t walk(Dictionary dictionary) {
        std::int64_t sum = 0;
        Key key = nullptr;
        std::size_t position = 0;
        while (const QfTypeRef value = qf_dictionary_get_entry(dictionary, position++, &key))
            sum += *qf_string_get_string_ptr(key) ? read(static_cast<Number>(value)) : 0;
        return sum;
    }
    static Number makeNumber(std::int64_t value) { return qf_number_create_int64(value); }
    static std::int64_t read(Number number) {
        std::int64_t value = 0;
        return qf_number_get_value(number, kQfNumberSInt64Type, &value) ? value : 0;
    }
};

}  // namespace

int main(int argc, char** argv) {
    return argc == 3 ? bench::values_cases::run<Peer>(argv[1], argv[2]) : 2;
}
