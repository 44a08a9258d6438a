#include "plr/rest/reply_dict_context.h"

#include <utility>

#include "plr/rest/auto_reply.h"

namespace plr::rest {

ReplyDictRestResourceContextDecorator::ReplyDictRestResourceContextDecorator(
    RestResourceContext& inner)
    : inner_(inner), reply_(inner.takeAutoReplyValue()) {
    if (reply_ && !*reply_)
        *reply_ = vox::dict::create();
}

ReplyDictRestResourceContextDecorator::~ReplyDictRestResourceContextDecorator() = default;

bool ReplyDictRestResourceContextDecorator::sendReplyWithValue(const vox::object& value) {
    if (scope_.empty())
        return false;
    const vox::dict answers = reply_ ? vox::dict(*reply_) : vox::dict();
    answers[scope_.c_str()] = value;
    return true;
}

std::shared_ptr<vox::object> ReplyDictRestResourceContextDecorator::takeAutoReplyValue() {
    return createAutoReplyValueInsideOuterReply(reply_, scope_);
}

std::shared_ptr<RestResourceConnection> ReplyDictRestResourceContextDecorator::getAuthorResource() {
    return inner_.getAuthorResource();
}

vox::connection ReplyDictRestResourceContextDecorator::getRawAuthorConnection() const {
    return inner_.getRawAuthorConnection();
}

vox::object ReplyDictRestResourceContextDecorator::getRestAuthor() const {
    return inner_.getRestAuthor();
}

vox::object ReplyDictRestResourceContextDecorator::getRestOperation() const {
    return inner_.getRestOperation();
}

vox::object ReplyDictRestResourceContextDecorator::getRestValue() const {
    return inner_.getRestValue();
}

bool ReplyDictRestResourceContextDecorator::sendNotify(const RestResourceConnection& to,
                                                       const vox::object& author,
                                                       const vox::object& resource,
                                                       const vox::object& value) {
    return inner_.sendNotify(to, author, resource, value);
}

bool ReplyDictRestResourceContextDecorator::sendGet(const RestResourceConnection& to,
                                                    const vox::object& author,
                                                    const vox::object& resource,
                                                    const vox::object& value,
                                                    std::shared_ptr<vox::object> autoReply) {
    return inner_.sendGet(to, author, resource, value, std::move(autoReply));
}

bool ReplyDictRestResourceContextDecorator::redirect(const std::string& path) {
    return inner_.redirect(path);
}

}  // namespace plr::rest
