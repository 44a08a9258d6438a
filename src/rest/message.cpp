#include "plr/rest/message.h"

#include "vox/connection.h"

namespace plr::rest {

vox::dict createRestMessage(const vox::object& operation, const vox::object& author,
                            const vox::object& resource, const vox::object& value) {
    const vox::dict message = vox::dict::create();
    message[key::kOperation] = operation;
    message[key::kAuthor] = author;
    message[key::kResource] = resource;
    message[key::kValue] = value;
    return message;
}

vox::dict createNotify(const vox::object& author, const vox::object& resource,
                       const vox::object& value) {
    return createRestMessage(asObject(Operation::kNotify), author, resource, value);
}

vox::dict createPingMessage() {
    const vox::dict message = vox::dict::create();
    message[key::kOperation] = asObject(Operation::kPing);
    return message;
}

vox::dict createReply(const vox::dict& request) {
    if (!request)
        return nullptr;
    const vox::dict reply(vox::object::adopt(vox_dictionary_create_reply(request.get())));
    if (!reply)
        return nullptr;
    for (const char* copied : {key::kOperation, key::kResource})
        if (request.contains(copied))
            reply[copied] = request[copied];
    return reply;
}

void updateReplyValue(const vox::dict& reply, const vox::object& value) {
    if (value.type() == VOX_TYPE_ERROR)
        reply[key::kError] =
            vox::object::retain(vox_error_get_value(value.get(), vox_error_key_description));
    else
        reply[key::kValue] = value;
}

vox::dict createReplyWithValue(const vox::dict& request, const vox::object& value) {
    const vox::dict reply = createReply(request);
    if (reply)
        updateReplyValue(reply, value);
    return reply;
}

vox::object getReplyValue(const vox::dict& reply) {
    return reply[key::kValue];
}

}  // namespace plr::rest
