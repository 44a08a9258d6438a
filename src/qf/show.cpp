#include "plr/qf/show.h"

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/assign.h"

namespace plr::qf {
namespace {

std::string describe(const void* value) {
    std::string text;
    static_cast<void>(assign(text, adopt(qf_copy_description(value)).get()));
    return text;
}

}  // namespace

std::string show(bool full, const void* value) {
    if (!value)
        return "NULL";
    if (full)
        return describe(value);
    if (const QfDictionaryRef dictionary = typed<Dictionary>(value))
        return "QfDictionary(" + std::to_string(qf_dictionary_get_count(dictionary)) + " keys)";
    if (const QfArrayRef array = typed<Array>(value))
        return "QfArray(" + std::to_string(qf_array_get_count(array)) + " elements)";
    if (const QfDataRef data = typed<Data>(value))
        return "QfData(" + std::to_string(qf_data_get_length(data)) + " bytes)";
    return describe(value);
}

std::string show(const void* value) {
    return show(true, value);
}

}  // namespace plr::qf
