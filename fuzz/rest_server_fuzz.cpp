#include <cstdint>
#include <cstdlib>
#include <memory>
#include <span>
#include <string>

#include "platform/linux/vox/codec.h"
#include "plr/rest.h"
#include "tests/support/fake_rest.h"

// Whole REST messages into a server in this process: nothing that decodes may
// end it, and nothing that decodes may make a resource throw. The input is one
// encoded value: a message, or an array of messages for the same server. Each is
// handled as one that came on no connection, and once more by the resources as
// one of two known clients that wants an answer.
namespace {

using plr::rest::ConnectionRestResource;
using plr::rest::PropertyRestResource;
using plr::rest::RestServerExample;
using plr::rest::TreeRestResource;
using plr::test::FakeRestConnection;
using plr::test::FakeRestContext;

vox::object decode(std::span<const std::uint8_t> bytes) {
    const char* why = nullptr;
    return vox::object::adopt(vox_wire::decode(bytes, {}, vox_wire::codec_limits{}, why));
}

// The same resources twice: inside a server, and in a tree of their own.
class Target {
  public:
    Target() {
        install("/connections", [] { return std::make_shared<ConnectionRestResource>(); });
        install("/kept", [] { return std::make_shared<PropertyRestResource>(true); });
        install("/tree", [] { return std::make_shared<TreeRestResource>(); });
        install("/tree/events", [] { return std::make_shared<PropertyRestResource>(false); });
    }

    void handle(const vox::dict& message) {
        queue_.sync([&] { server_->handleRestMessage(nullptr, message); });
        const auto& author = clients_[turn_++ % 2];
        FakeRestContext context(plr::rest::asOperation(message["o"]), message["v"], author);
        const vox::object resource = message["r"];
        tree_->handleMessage(context, plr::rest::PathView(resource.text()));
        for (const vox::object& reply : context.replies())
            static_cast<void>(plr::rest::createReplyWithValue(message, reply));
        static_cast<void>(message.to_string());
    }

  private:
    template <class Make>
    void install(const char* path, Make make) {
        if (!server_->registerResource(path, make()) ||
            !tree_->installSubResource(plr::rest::PathView(path), make()))
            std::abort();
    }

    const dispatch::queue queue_ = dispatch::queue::create("fuzz");
    const std::shared_ptr<RestServerExample> server_ = RestServerExample::create(queue_, "fuzz");
    const std::shared_ptr<TreeRestResource> tree_ = std::make_shared<TreeRestResource>();
    std::shared_ptr<FakeRestConnection> clients_[2] = {
        std::make_shared<FakeRestConnection>("first"),
        std::make_shared<FakeRestConnection>("second")};
    std::size_t turn_ = 0;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const vox::object input = decode({data, size});
    Target target;
    if (const vox::dict message(input); message) {
        target.handle(message);
    } else {
        const vox::array messages(input);
        for (std::size_t i = 0; i < messages.count(); ++i)
            target.handle(messages[i]);
    }
    return 0;
}
