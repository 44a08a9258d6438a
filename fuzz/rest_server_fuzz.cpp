#include <cstdint>
#include <cstdlib>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "platform/linux/vox/codec.h"
#include "plr/rest.h"
#include "plr/test/fake_rest.h"

// Whole REST messages into a server in this process: nothing that decodes may
// end it, and nothing that decodes may make a resource throw. The input is one
// encoded value: a message, or an array of messages for the same server. Each is
// handled as one that came on no connection, and once more by the resources as
// one of two known clients, by turns, that wants an answer and may not see two
// secrets: those reach no client, however a path is spelled. In an array
//
//   null    the next client drops, and another comes in its place
//   string  the next client answers the oldest request that it was sent with it
namespace {

using plr::rest::AccessRule;
using plr::rest::AccessRules;
using plr::rest::asOperation;
using plr::rest::AssertionRestResource;
using plr::rest::ConnectionRestResource;
using plr::rest::DescriptionRestResource;
using plr::rest::MapRestResource;
using plr::rest::Operation;
using plr::rest::PathView;
using plr::rest::PropertyRestResource;
using plr::rest::RequestRestResource;
using plr::rest::RestServerExample;
using plr::rest::TreeRestResource;
using plr::test::FakeRestConnection;
using plr::test::FakeRestContext;

constexpr std::string_view kSecret = "classified";

vox::object decode(std::span<const std::uint8_t> bytes) {
    const char* why = nullptr;
    return vox::object::adopt(vox_wire::decode(bytes, {}, vox_wire::codec_limits{}, why));
}

std::shared_ptr<DescriptionRestResource> createDescriptions() {
    auto descriptions = std::make_shared<DescriptionRestResource>();
    descriptions->describe("/kept", {"properties", ""});
    descriptions->describe("/kept/x", {"int64", "a property"});
    return descriptions;
}

// The same resources twice: inside a server, and in a tree of their own.
class Target {
  public:
    Target() {
        install("/connections", [] { return std::make_shared<ConnectionRestResource>(); });
        install("/kept", [] { return std::make_shared<PropertyRestResource>(true); });
        install("/tree", [] { return std::make_shared<TreeRestResource>(); });
        install("/tree/events", [] { return std::make_shared<PropertyRestResource>(false); });
        install("/asserted", [] { return std::make_shared<AssertionRestResource>(); });
        install("/strict", [] {
            return std::make_shared<AssertionRestResource>(plr::rest::hold_off,
                                                           plr::rest::provider_only);
        });
        install("/requests", [] { return std::make_shared<RequestRestResource>(); });
        install("/queued",
                [] { return std::make_shared<RequestRestResource>(plr::rest::queue_requests{2}); });
        install("/map", [] { return std::make_shared<MapRestResource>(3); });
        install("/owned",
                [] { return std::make_shared<MapRestResource>(plr::rest::owned_entries); });
        install("/descriptions", createDescriptions);
        for (const char* path : {"/kept/secret", "/map/secret"}) {
            FakeRestContext context(Operation::kSet, vox::string(kSecret));
            if (!tree_->handleMessage(context, PathView(path)))
                std::abort();
        }
    }

    void handle(const vox::object& input) {
        guessed_ = guessed_ || input.to_string().find(kSecret) != std::string::npos;
        if (const vox::dict message(input); message)
            handleMessage(message);
        else if (!input)
            drop(turn_++ % 2);
        else if (input.type() == VOX_TYPE_STRING)
            answer(*clients_[turn_++ % 2], input);
    }

  private:
    template <class Make>
    void install(const char* path, Make make) {
        if (!server_->registerResource(path, make()) ||
            !tree_->installSubResource(PathView(path), make()))
            std::abort();
    }

    void handleMessage(const vox::dict& message) {
        queue_.sync([&] { server_->handleRestMessage(nullptr, message); });
        const Operation operation = asOperation(message["o"]);
        const PathView path(message.text("r"));
        const std::size_t author = turn_++ % 2;
        if (!rules_.allows(operation, plr::rest::reachedBy(*tree_, operation, path), nullptr))
            return;
        FakeRestContext context(operation, message["v"], clients_[author]);
        tree_->handleMessage(context, path);
        for (const vox::object& reply : context.replies())
            check(plr::rest::createReplyWithValue(message, reply), reply);
        for (const auto& client : clients_)
            for (const vox::dict& sent : std::exchange(client->sent, {}))
                check(sent, sent["v"]);
    }

    // Secrets that a client has set are its own.
    void check(const vox::dict& message, const vox::object& value) {
        static_cast<void>(message.to_string());
        if (!guessed_ && value.to_string().find(kSecret) != std::string::npos)
            std::abort();
    }

    // As a server does: every resource is told, then may tidy up.
    void drop(std::size_t client) {
        FakeRestContext context(Operation::kNone);
        tree_->handleDroppedConnection(context, PathView("/"), clients_[client]);
        clients_[client] = std::make_shared<FakeRestConnection>("another");
        tree_->cleanupWatchers(context, PathView("/"));
    }

    static void answer(const FakeRestConnection& client, const vox::object& value) {
        if (client.replyHandlers.empty())
            return;
        const auto handler = std::move(client.replyHandlers.front());
        client.replyHandlers.erase(client.replyHandlers.begin());
        const vox::dict reply = vox::dict::create();
        reply["v"] = value;
        handler(reply);
    }

    const dispatch::queue queue_ = dispatch::queue::create("fuzz");
    const std::shared_ptr<RestServerExample> server_ = RestServerExample::create(queue_, "fuzz");
    const std::shared_ptr<TreeRestResource> tree_ = std::make_shared<TreeRestResource>();
    const AccessRules rules_{
        AccessRule{.path = "/kept/secret", .operations = {Operation::kGet, Operation::kPush}},
        AccessRule{.path = "/map/secret", .operations = {Operation::kGet, Operation::kPush}}};
    std::shared_ptr<FakeRestConnection> clients_[2] = {
        std::make_shared<FakeRestConnection>("first"),
        std::make_shared<FakeRestConnection>("second")};
    std::size_t turn_ = 0;
    bool guessed_ = false;  // by the input
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const vox::object input = decode({data, size});
    Target target;
    if (const vox::array messages(input); messages) {
        for (std::size_t i = 0; i < messages.count(); ++i)
            target.handle(messages[i]);
    } else {
        target.handle(input);
    }
    return 0;
}
