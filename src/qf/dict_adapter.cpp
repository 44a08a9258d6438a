#include "plr/qf/dict_adapter.h"

namespace plr::qf {

dict_adapter::dict_adapter(QfDictionaryRef dictionary, bool adopt)
    : dictionary_(adopt ? qf::adopt(dictionary) : QfSharedRef<Dictionary>(dictionary)) {}

QfTypeRef dict_adapter::copyQfTypeRef(QfStringRef key) const {
    const QfTypeRef value = dictionary_ ? qf_dictionary_get_value(dictionary_.get(), key) : nullptr;
    return value ? qf_retain(value) : nullptr;
}

}  // namespace plr::qf
