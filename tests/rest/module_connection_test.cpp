#include <limits>
#include <optional>

#include "support/module_client.h"
#include "support/raw_rest_client.h"
#include "support/runtime.h"

// A module that connects by itself, requests with an honest result, and values as
// types.
namespace {

using namespace plr::test;
using namespace std::chrono_literals;
using plr::ReconnectPolicy;
using plr::RestModule;
using plr::rest::Operation;
using plr::rest::PathView;
using plr::rest::RestResourceContext;

constexpr const char* kName = "net.example.rest";
constexpr ReconnectPolicy kQuick{1ms, 2ms};

TEST(ReconnectPolicy, PausesDoubleUpToTheMaximumLessTheirShare) {
    const ReconnectPolicy policy{100ms, 1000ms, 0.5};
    const struct {
        unsigned failures;
        double random;
        std::chrono::nanoseconds pause;
    } rows[] = {{0, 0, 0ms},   {0, 0.25, 25ms}, {0, 1, 100ms},   {1, 0, 100ms},
                {1, 1, 50ms},  {2, 0, 200ms},   {4, 0, 800ms},   {5, 0, 1000ms},
                {5, 1, 500ms}, {6, 0, 1000ms},  {~0U, 0, 1000ms}};
    for (const auto& row : rows)
        EXPECT_EQ(plr::rest::pauseAfter(row.failures, policy, row.random), row.pause)
            << row.failures << " failures, " << row.random;
    EXPECT_EQ(plr::rest::pauseAfter(3, {1ms, 24h, 0}, 1), 4ms);
}

// A module that writes down what happens to it.
class Client : public ModuleClient {
  public:
    ~Client() {
        on([this] { module.disconnect(); });
    }
    void note(std::string text) {
        EXPECT_TRUE(queue.is_current());
        notes_.push_back(std::move(text));
        noted_.signal();
    }
    // The next `count` notes, waited for.
    Texts next(std::size_t count) {
        for (std::size_t i = 0; i < count; ++i)
            if (!noted_.wait())
                ADD_FAILURE() << "nothing came";
        return on([this] { return std::exchange(notes_, {}); });
    }
    RestModule::Handler noting(std::string label) {
        return [this, label = std::move(label)](const vox::object& value) {
            note(label + " " + oneLine(value));
        };
    }

  private:
    Event noted_;
    Texts notes_;  // touched on the queue only
};

// A service with one property, played by hand: it refuses every GET.
class Service {
  public:
    explicit Service(int x) : x_(vox::int64(x)) {
        listener_.set_target_queue(queue_);
        listener_.set_event_handler([this](const vox::object& event) {
            if (const vox::connection client(event); client)
                accept(client);
        });
        listener_.resume();
    }
    ~Service() {
        queue_.sync([this] {
            listener_.cancel();
            for (const vox::connection& client : clients_)
                client.cancel();
        });
        drain(queue_);
    }
    Service(const Service&) = delete;
    Service& operator=(const Service&) = delete;

  private:
    void accept(const vox::connection& client) {
        clients_.push_back(client);
        client.set_target_queue(queue_);
        client.set_event_handler([this, client](const vox::object& event) {
            const vox::dict message(event);
            if (const vox::dict reply = plr::rest::createReply(message)) {
                plr::rest::updateReplyValue(reply, vox::error(VOX_ERROR_APPLICATION, "no"));
                client.send_message(reply);
            } else if (message.text("r") == "/x") {
                client.send_message(plr::rest::createNotify({}, message["r"], x_));
            }
        });
        client.resume();
    }

    const vox::object x_;
    const dispatch::queue queue_ = dispatch::queue::create("service");
    const vox::listener listener_ = vox::listener::create(kName);
    std::vector<vox::connection> clients_;  // touched on the queue only
};

TEST(AutomaticReconnection, FollowsItsServiceUntilItIsToldNotTo) {
    const RuntimeDirectory directory;
    Client client;
    Event failed;
    client.on([&] {
        client.module.setServerErrorHandler([&](const vox::object&) { failed.signal(); });
        client.module.setConnectionHandler(
            [&](bool isReached) { client.note(isReached ? "reached" : "lost"); });
        client.module.watch<int>(
            "/x", [&](std::optional<int> x) { client.note(x ? std::to_string(*x) : "none"); });
        client.module.connectToService(kName, kQuick);
    });
    for (int attempts = 0; attempts < 5; ++attempts)
        ASSERT_TRUE(failed.wait());
    std::optional<Service> service(7);
    EXPECT_EQ(client.next(2), (Texts{"7", "reached"}));
    service.reset();
    EXPECT_EQ(client.next(1), (Texts{"lost"}));
    service.emplace(8);
    EXPECT_EQ(client.next(2), (Texts{"8", "reached"}));
    client.on([&] {
        client.module.disconnect();
        EXPECT_EQ(client.next(1), (Texts{"lost"})) << "before the return";
    });
}

TEST(AutomaticReconnection, EndsWithTheNextConnection) {
    const RuntimeDirectory directory;
    auto [mine, theirs] = vox::connection::create_pair();
    RawRestClient server(theirs, "server");
    Client client;
    Event waited;
    client.on([&, mine = mine] {
        client.module.setServerErrorHandler([&, mine](const vox::object&) {
            client.module.connect(mine);  // an attempt is due in 2 ms at most
            client.queue.after(dispatch::time::after(20ms),
                               dispatch::block<void()>([&] { waited.signal(); }));
        });
        client.module.connectToService(kName, kQuick);
    });
    ASSERT_TRUE(waited.wait());
    client.on([&] {
        EXPECT_TRUE(client.module.isConnected());
        client.module.setServerErrorHandler(RestModule::Handler());
    });
    EXPECT_EQ(server.takeMessagesBefore(plr::rest::createPingMessage()),
              (Texts{"push me /connections null"}));
}

TEST(AutomaticReconnection, FollowsOnlyTheServiceThatWasNamedLast) {
    const RuntimeDirectory directory;
    const Service service(7);
    Client client;
    Event waited;
    client.on([&] {
        client.module.setConnectionHandler(
            [&](bool isReached) { client.note(isReached ? "reached" : "lost"); });
        client.module.setServerErrorHandler([&](const vox::object&) {
            client.module.connectToService(kName, kQuick);  // an attempt at the other is due
            client.queue.after(dispatch::time::after(20ms),
                               dispatch::block<void()>([&] { waited.signal(); }));
        });
        client.module.connectToService("net.example.missing", kQuick);
    });
    ASSERT_TRUE(waited.wait());
    // Answered behind all that was asked before.
    client.on([&] { client.module.sendRawGet("", [&](auto&&) { client.note("answered"); }); });
    EXPECT_EQ(client.next(2), (Texts{"reached", "answered"}));
}

TEST(AutomaticReconnection, RefusesAPolicyThatMakesNoSense) {
    Client client;
    const ReconnectPolicy policies[] = {
        {0ms, 1ms},       {2ms, 1ms},        {1ms, 25h},
        {1ms, 1ms, -0.1}, {1ms, 1ms, 1.001}, {1ms, 1ms, std::numeric_limits<double>::quiet_NaN()}};
    for (const ReconnectPolicy& policy : policies)
        client.on([&] {
            EXPECT_THROW(client.module.connectToService(kName, policy), std::invalid_argument);
            EXPECT_FALSE(client.module.isConnected());
        });
}

TEST(AutomaticReconnection, TakesNoValueFromAConnectionThatWasReplaced) {
    Client client;
    auto [mine, theirs] = vox::connection::create_pair();
    RawRestClient before(theirs, "before");
    auto [next, nextTheirs] = vox::connection::create_pair();
    RawRestClient now(nextTheirs, "now");
    client.on([&, mine = mine, next = next] {
        client.module.observeProperty("/p", [&, next](const vox::object& value) {
            if (value == vox::int64(1))
                client.module.connect(next);  // while more of the first is at hand
            client.note(oneLine(value));
        });
        client.module.connect(mine);
        for (int value = 1; value <= 10; ++value)
            before.send(Operation::kNotify, "/p", vox::int64(value));
    });
    EXPECT_TRUE(before.waitForEnd());
    now.send(Operation::kNotify, "/p", vox::int64(11));
    EXPECT_EQ(client.next(2), (Texts{"1", "11"}));
}

// ---- Requests ---------------------------------------------------------------------------

// Answers with what it is sent or with nothing, refuses, or keeps the request.
class Answers : public plr::rest::RestResource {
  public:
    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override {
        if (path.current() == "echo")
            return context.sendReplyWithValue(context.getRestValue());
        if (path.current() == "refusal")
            return context.sendReplyWithValue(vox::error(VOX_ERROR_APPLICATION, "not now"));
        if (path.current() == "nothing") {
            context.takeAutoReplyValue().reset();
            return true;
        }
        unanswered_.push_back(context.takeAutoReplyValue());
        return true;
    }

  private:
    std::vector<std::shared_ptr<vox::object>> unanswered_;
};

std::string asText(const plr::Result<vox::object>& result) {
    if (result)
        return oneLine(result.value());
    const vox::object& error = result.error();
    return std::to_string(vox_error_get_code(error.get())) + " " +
           std::string(
               vox::object::retain(vox_error_get_value(error.get(), vox_error_key_description))
                   .text());
}

TEST(ModuleRequest, GivesAValueOrTellsWhyThereIsNone) {
    RestServerRig rig;
    rig.add("/a", std::make_shared<Answers>());
    rig.start();
    Client client;
    const auto ask = [&](const char* path, std::chrono::milliseconds limit) {
        return client.on([&] {
            return client.module.sendRequest(
                path, vox::int64(5), limit,
                [&](const plr::Result<vox::object>& result) { client.note(asText(result)); });
        });
    };
    EXPECT_FALSE(ask("/a/echo", kBound));
    EXPECT_EQ(client.on([&] { return client.next(1); }), (Texts{"1 not connected"}))
        << "before the return";
    client.on([&] { client.module.connect(rig.connect()); });
    ask("/a/echo", kBound);
    EXPECT_EQ(client.next(1), (Texts{"5"}));
    for (const char* path : {"/a/echo", "/a/nothing"}) {
        client.on([&] { client.module.sendRequest(path, vox::int64(5), client.noting("value")); });
    }
    EXPECT_EQ(client.next(2), (Texts{"value 5", "value null"}));
    ask("/a/refusal", kBound);
    EXPECT_EQ(client.next(1), (Texts{"1000 not now"}));
    ask("/a/silence", 1ms);
    EXPECT_EQ(client.next(1)[0].substr(0, 2), "4 ");
    EXPECT_TRUE(ask("/a/silence", kBound).cancel());
    EXPECT_EQ(client.next(1)[0].substr(0, 2), "5 ");
    auto [mine, theirs] = vox::connection::create_pair();
    RawRestClient server(theirs, "server");
    client.on([&, mine = mine] {
        using Block = RestModule::ResultHandlerBlock;
        client.module.connect(mine);
        client.module.sendRequest(
            "/a/silence", {}, kBound,
            Block([&](const plr::Result<vox::object>& result) { client.note(asText(result)); }));
        client.module.sendRequest("/a/silence", {}, kBound, RestModule::ResultHandler());
    });
    server.connection().cancel();
    EXPECT_EQ(client.next(1)[0].substr(0, 2), "1 ");
}

TEST(ModuleRequest, HandsTheWholeReplyToARawGet) {
    RestServerRig rig;
    rig.add("/a", std::make_shared<Answers>());
    rig.start();
    Client client;
    client.on([&] {
        client.module.connect(rig.connect());
        for (const char* path : {"/a/echo", "/a/refusal"})
            client.module.sendRawGet(path, client.noting("raw"));
    });
    EXPECT_EQ(client.next(2), (Texts{R"(raw {"o": "get","r": "/a/echo","v": null})",
                                     R"(raw {"o": "get","r": "/a/refusal","e": "not now"})"}));
    auto [mine, theirs] = vox::connection::create_pair();
    RawRestClient server(theirs, "server");
    client.on([&, mine = mine] {
        client.module.connect(mine);
        client.module.sendRawGet(
            "/", [&](const vox::object& reply) { client.note(vox_type_get_name(reply.type())); });
    });
    server.connection().cancel();
    EXPECT_EQ(client.next(1), (Texts{"error"}));
}

// ---- Typed values -----------------------------------------------------------------------

template <class T>
std::string read(const vox::object& value) {
    const std::optional<T> read = plr::rest::valueAs<T>(value);
    if (!read)
        return "-";
    if constexpr (std::is_same_v<T, std::string>)
        return *read;
    else if constexpr (std::is_arithmetic_v<T>)
        return std::to_string(*read);
    else
        return "some";
}

TEST(TypedValue, TakesWhatFitsOnly) {
    constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
    const std::uint8_t bytes[] = {1, 2};
    const struct {
        vox::object value;
        const char* as[7];  // bool, int8, uint16, int64, uint64, double, string
    } rows[] = {
        {vox::object(), {"-", "-", "-", "-", "-", "-", "-"}},
        {vox::boolean(true), {"1", "-", "-", "-", "-", "-", "-"}},
        {vox::int64(127), {"-", "127", "127", "127", "127", "127.000000", "-"}},
        {vox::int64(-128), {"-", "-128", "-", "-128", "-", "-128.000000", "-"}},
        {vox::int64(128), {"-", "-", "128", "128", "128", "128.000000", "-"}},
        {vox::int64(-129), {"-", "-", "-", "-129", "-", "-129.000000", "-"}},
        {vox::uint64(65536), {"-", "-", "-", "65536", "65536", "65536.000000", "-"}},
        {vox::uint64(1ULL << 63),
         {"-", "-", "-", "-", "9223372036854775808", "9223372036854775808.000000", "-"}},
        {vox::int64(kLeast),
         {"-", "-", "-", "-9223372036854775808", "-", "-9223372036854775808.000000", "-"}},
        {vox::real(0.5), {"-", "-", "-", "-", "-", "0.500000", "-"}},
        {vox::string("text"), {"-", "-", "-", "-", "-", "-", "text"}},
        {vox::data(bytes), {"-", "-", "-", "-", "-", "-", "-"}},
    };
    for (const auto& row : rows) {
        const std::string as[] = {read<bool>(row.value),          read<std::int8_t>(row.value),
                                  read<std::uint16_t>(row.value), read<std::int64_t>(row.value),
                                  read<std::uint64_t>(row.value), read<double>(row.value),
                                  read<std::string>(row.value)};
        EXPECT_TRUE(std::equal(std::begin(as), std::end(as), row.as))
            << oneLine(row.value) << ": " << testing::PrintToString(as);
        EXPECT_EQ(read<vox::object>(row.value), row.value ? "some" : "-");
    }
    EXPECT_EQ(plr::rest::valueAs<std::vector<std::uint8_t>>(vox::data(bytes)),
              (std::vector<std::uint8_t>{1, 2}));
    const plr::rest::AssertionAcquireState state{3, plr::rest::AssertionState::kGranted};
    EXPECT_EQ(plr::rest::valueAs<plr::rest::AssertionAcquireState>(write_rest_value(state)), state);
    EXPECT_FALSE(plr::rest::valueAs<plr::rest::AssertionAcquireState>(nullptr));
}

}  // namespace
