// A REST service that is killed, and comes back. This program is also the
// service, when it is called with the argument "service".

#include <memory>
#include <optional>

#include "plr/rest.h"
#include "support/module_client.h"
#include "support/runtime.h"
#include "support/service_process.h"
#include "support/waiting.h"

namespace {

using namespace plr::test;
using plr::RestModule;
using plr::rest::PathView;
using plr::rest::RestResourceContext;

constexpr const char* kName = "net.example.rest";

// Logs what is pushed. GET answers the log, or never where the path says so.
// Everything is touched on the service's queue only.
class Log : public plr::rest::RestResource {
  public:
    bool handleRestMessage_PUSH(RestResourceContext&, const PathView& path) override {
        pushed_.append(vox::string(path.full()));
        return true;
    }
    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override {
        if (path.current() != "silent")
            return context.sendReplyWithValue(pushed_);
        unanswered_.push_back(context.takeAutoReplyValue());
        return true;
    }

  private:
    const vox::array pushed_ = vox::array::create();
    std::vector<std::shared_ptr<vox::object>> unanswered_;
};

[[noreturn]] void serviceMain() {
    const auto log = std::make_shared<Log>();
    const auto server =
        plr::rest::RestServerExample::create(dispatch::queue::create("service"), kName);
    for (const char* path : {"/connections", "/kept", "/sinks", "/log"})
        server->registerResource(path, log);
    server->connect(vox::listener::create(kName));
    serviceIsReady();
}

class KilledServer : public testing::Test, protected ModuleClient {
  protected:
    KilledServer() {
        on([this] {
            module.setServerErrorHandler([this](const vox::object&) { serverGone_.signal(); });
        });
    }
    ~KilledServer() override {
        on([this] { module.disconnect(); });
    }
    void connect() {
        on([this] { module.connect(vox::connection::create(kName)); });
    }
    // What was pushed so far.
    vox::object log() {
        Event answered;
        vox::object answer;
        on([&] {
            module.getPropertyOnce("/log", [&](const vox::object& value) {
                answer = value;
                answered.signal();
            });
        });
        EXPECT_TRUE(answered.wait());
        return answer;
    }

    const RuntimeDirectory directory_;
    Event serverGone_;
};

TEST_F(KilledServer, AnswersEachRequestOnceAndGetsItsRegistrationsBack) {
    std::optional<ServiceProcess> service(std::in_place);
    const auto ignore = [](auto&&...) {};
    on([&] {
        module.observeProperty("/kept/b", RestModule::Handler(ignore));
        module.observeProperty("/kept/a", RestModule::Handler(ignore));
        module.registerAsRequestSink("/sinks/2", RestModule::RequestHandler(ignore));
        module.registerAsRequestSink("/sinks/1", RestModule::RequestHandler(ignore));
    });
    const vox::object inOrder = vox::array(
        vox::array_creator()("/connections")("/sinks/1")("/sinks/2")("/kept/a")("/kept/b"));
    connect();
    EXPECT_EQ(log(), inOrder);

    std::vector<int> answers(100);  // touched on the client's queue only
    on([&] {
        for (int& count : answers)
            module.getPropertyOnce("/log/silent", [&count](const vox::object& value) {
                EXPECT_EQ(value, vox::object());
                ++count;
            });
    });
    EXPECT_EQ(log(), inOrder) << "the requests have arrived";
    service.reset();
    ASSERT_TRUE(serverGone_.wait());
    on([&] {
        EXPECT_FALSE(module.isConnected());
        EXPECT_EQ(answers, std::vector<int>(100, 1));
    });
    connect();  // to nobody
    ASSERT_TRUE(serverGone_.wait());

    service.emplace();
    connect();
    EXPECT_EQ(log(), inOrder);
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        serviceMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
