#include "plr/rest/resource_context.h"

#include <utility>

#include "plr/rest/message.h"

namespace plr::rest {

DictRestResourceContext::DictRestResourceContext(vox::dict message) noexcept
    : message_(std::move(message)) {}

DictRestResourceContext::~DictRestResourceContext() = default;

vox::connection DictRestResourceContext::getRawAuthorConnection() const {
    return vox::object::retain(vox_dictionary_get_remote_connection(message_.get()));
}

vox::object DictRestResourceContext::getRestAuthor() const {
    return message_[key::kAuthor];
}
vox::object DictRestResourceContext::getRestOperation() const {
    return message_[key::kOperation];
}
vox::object DictRestResourceContext::getRestValue() const {
    return message_[key::kValue];
}

}  // namespace plr::rest
