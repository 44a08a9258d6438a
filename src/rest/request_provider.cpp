#include "src/rest/request_provider.h"

#include <string>
#include <utility>

#include "plr/ipc/values.h"
#include "plr/rest/message.h"

namespace plr::rest {
namespace {

vox::dict replyWithValue(const vox::object& value) {
    const vox::dict reply = vox::dict::create();
    reply[key::kValue] = value;
    return reply;
}

// What the provider sent, or why nothing came: a reply with a value, or an error
// that says that the provider is gone.
vox::object asAnswer(const vox::object& answer) {
    const vox::dict reply(answer);
    if (const vox::object error = reply[key::kError])
        return replyWithValue(vox::error(VOX_ERROR_APPLICATION, std::string(error.text()).c_str()));
    // Only this request was refused; the provider is there.
    if (vox_error_get_code(answer.get()) == VOX_ERROR_MESSAGE_REFUSED)
        return replyWithValue(answer);
    return answer;
}

}  // namespace

RequestProvider::RequestProvider(const std::shared_ptr<RestResourceConnection>& client,
                                 std::string_view path)
    : RestResourceConnection(client->name()), client_(client), path_(vox::string(path)) {}

RequestProvider::~RequestProvider() = default;

void RequestProvider::send(vox::dict message) const {
    if (const auto client = client_.lock())
        client->send(std::move(message));
}

void RequestProvider::sendWithReply(vox::dict message, dispatch::queue queue,
                                    ReplyHandler handler) const {
    if (const auto client = client_.lock())
        client->sendWithReply(
            std::move(message), std::move(queue),
            ReplyHandler([handler = std::move(handler)](const vox::object& answer) {
                handler(asAnswer(answer));
            }));
}

}  // namespace plr::rest
