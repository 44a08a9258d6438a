// A REST service that is killed, and comes back. This program is also the
// service, when it is called with the argument "service".
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "plr/rest.h"
#include "support/service_process.h"
#include "support/vox_test.h"
#include "support/waiting.h"

namespace {

using plr::RestModule;
using plr::rest::PathView;
using plr::rest::RestResourceContext;
using plr::test::Event;
using plr::test::ServiceProcess;

constexpr const char* kName = "net.example.rest";

// What clients registered for, in order; GET answers it. Touched on the
// service's queue only.
class Log : public plr::rest::RestResource {
  public:
    std::vector<std::string> paths;
    bool handleRestMessage_GET(RestResourceContext& context, const PathView&) override {
        const vox::array list = vox::array::create();
        for (const std::string& path : paths)
            list.append(vox::string(std::string_view(path)));
        context.sendReplyWithValue(list);
        return true;
    }
};

// Logs each PUSH and then does what Base does.
template <class Base>
class Logged : public Base {
  public:
    template <class... Arguments>
    explicit Logged(std::shared_ptr<Log> log, Arguments... arguments)
        : Base(arguments...), log_(std::move(log)) {}
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override {
        log_->paths.emplace_back(path.full());
        return Base::handleRestMessage_PUSH(context, path);
    }

  private:
    const std::shared_ptr<Log> log_;
};

// Never answers.
class Silent : public plr::rest::RestResource {
  public:
    bool handleRestMessage_GET(RestResourceContext& context, const PathView&) override {
        kept_.push_back(context.takeAutoReplyValue());
        return true;
    }

  private:
    std::vector<std::shared_ptr<vox::object>> kept_;
};

[[noreturn]] void serviceMain() {
    using namespace plr::rest;  // NOLINT(google-build-using-namespace): five names of it
    const auto log = std::make_shared<Log>();
    const auto server = RestServerExample::create(dispatch::queue::create("service"), kName);
    server->registerResource("/connections", std::make_shared<Logged<ConnectionRestResource>>(log));
    server->registerResource("/kept", std::make_shared<Logged<PropertyRestResource>>(log, true));
    server->registerResource("/sinks", std::make_shared<Logged<RestResource>>(log));
    server->registerResource("/silent", std::make_shared<Silent>());
    server->registerResource("/log", log);
    server->connect(vox::connection::create_listener(kName));
    plr::test::serviceIsReady();
}

class KilledServer : public testing::Test {
  protected:
    KilledServer() {
        queue_.sync([this] {
            module_.setServerErrorHandler([this](const vox::object&) { serverGone_.signal(); });
        });
    }
    ~KilledServer() override {
        queue_.sync([this] { module_.disconnect(); });
    }

    template <class Callable>
    void on(Callable&& work) {
        queue_.sync(std::forward<Callable>(work));
    }
    void connect() {
        on([this] { module_.connect(vox::connection::create(kName)); });
    }
    // The answer to a GET.
    vox::object get(const char* path) {
        Event answered;
        vox::object answer;
        on([&] {
            module_.getPropertyOnce(path, [&](const vox::object& value) {
                answer = value;
                answered.signal();
            });
        });
        EXPECT_TRUE(answered.wait());
        return answer;
    }

    const plr::test::RuntimeDirectory directory_;
    const dispatch::queue queue_ = dispatch::queue::create("client");
    const RestModule module_{queue_, "me"};
    Event serverGone_;
};

TEST_F(KilledServer, AnswersEachRequestOnceAndGetsItsRegistrationsBack) {
    std::optional<ServiceProcess> service(std::in_place);
    const auto ignore = [](auto&&...) {};
    on([&] {
        module_.observeProperty("/kept/b", RestModule::Handler(ignore));
        module_.observeProperty("/kept/a", RestModule::Handler(ignore));
        module_.registerAsRequestSink("/sinks/2", RestModule::RequestHandler(ignore));
        module_.registerAsRequestSink("/sinks/1", RestModule::RequestHandler(ignore));
    });
    const vox::array inOrder =
        vox::array_creator()("/connections")("/sinks/1")("/sinks/2")("/kept/a")("/kept/b");
    connect();
    EXPECT_EQ(get("/log"), vox::object(inOrder));

    std::vector<int> answers(100);  // touched on the client's queue only
    on([&] {
        for (int& count : answers)
            module_.getPropertyOnce("/silent", [&count](const vox::object& value) {
                EXPECT_EQ(value, vox::object());
                ++count;
            });
    });
    EXPECT_EQ(get("/log"), vox::object(inOrder)) << "the requests have arrived";
    service.reset();
    ASSERT_TRUE(serverGone_.wait());
    on([&] {
        EXPECT_FALSE(module_.isConnected());
        EXPECT_EQ(answers, std::vector<int>(100, 1));
    });

    service.emplace();
    connect();
    EXPECT_EQ(get("/log"), vox::object(inOrder));
}

TEST_F(KilledServer, ConnectingToNobodyIsAnError) {
    connect();
    EXPECT_TRUE(serverGone_.wait());
    EXPECT_EQ(get("/log"), vox::object());
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        serviceMain();
    testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
