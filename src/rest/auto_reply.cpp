#include "plr/rest/auto_reply.h"

#include <utility>

#include "plr/ipc/connection.h"
#include "plr/rest/message.h"

namespace plr::rest {
namespace {

// Sends a reply when it goes.
class AutoReplyHelper {
  public:
    AutoReplyHelper(vox::connection connection, vox::dict reply)
        : connection_(std::move(connection)), reply_(std::move(reply)) {}
    AutoReplyHelper(const AutoReplyHelper&) = delete;
    AutoReplyHelper& operator=(const AutoReplyHelper&) = delete;
    ~AutoReplyHelper() {
        if (value)
            updateReplyValue(reply_, value);
        // Without a value too: that is an empty acknowledgement.
        connection_.send_message(reply_);
    }

    vox::object value;

  private:
    const vox::connection connection_;
    const vox::dict reply_;
};

// Calls an action when it goes.
class AutoReplier {
  public:
    explicit AutoReplier(std::function<void(vox::object)> action) : action_(std::move(action)) {}
    AutoReplier(const AutoReplier&) = delete;
    AutoReplier& operator=(const AutoReplier&) = delete;
    ~AutoReplier() {
        if (action_)
            action_(std::move(value));
    }

    vox::object value;

  private:
    const std::function<void(vox::object)> action_;
};

// The handle points at the slot and owns what it is part of.
template <class Owner>
std::shared_ptr<vox::object> slotOf(const std::shared_ptr<Owner>& owner) {
    return {owner, &owner->value};
}

}  // namespace

std::shared_ptr<vox::object> createAutoReplyValue(const vox::dict& request) {
    const vox::connection connection(
        vox::object::retain(vox_dictionary_get_remote_connection(request.get())));
    if (!connection)
        return nullptr;
    vox::dict reply = createReply(request);
    if (!reply)
        return nullptr;
    return slotOf(std::make_shared<AutoReplyHelper>(connection, std::move(reply)));
}

std::shared_ptr<vox::object> createAutoReplyValueInsideOuterReply(
    const std::shared_ptr<vox::object>& outer, const std::string& key) {
    return createAutoReplyWithAction([outer, key](const vox::object& value) {
        const vox::dict answers = outer ? vox::dict(*outer) : vox::dict();
        answers[key.c_str()] = value;
    });
}

std::shared_ptr<vox::object> createAutoReplyWithAction(std::function<void(vox::object)>&& action) {
    return slotOf(std::make_shared<AutoReplier>(std::move(action)));
}

}  // namespace plr::rest
