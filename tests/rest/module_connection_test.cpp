#include <limits>

#include "support/module_client.h"
#include "support/raw_rest_client.h"
#include "support/runtime.h"
#include "support/scripted_resource.h"

// A module that connects by itself, requests with an honest result, and values as
// types.
namespace {

using namespace plr;
using namespace plr::rest;
using namespace plr::test;
using namespace std::chrono_literals;

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
        EXPECT_EQ(pauseAfter(row.failures, policy, row.random), row.pause)
            << row.failures << " failures, " << row.random;
    EXPECT_EQ(pauseAfter(3, {1ms, 24h, 0}, 1), 4ms);
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
    void noteConnections() {
        module.setConnectionHandler(
            [this](bool isReached) { note(isReached ? "reached" : "lost"); });
    }

  private:
    Event noted_;
    Texts notes_;  // touched on the queue only
};

// A service with one property. It refuses every GET, and ends with its last client.
class Service {
  public:
    explicit Service(int x) {
        const auto push = [this, x](auto& context, auto&&) {
            client_ = context.getRawAuthorConnection();
            return context.sendNotify(*context.getAuthorResource(), {}, vox::string("/x"),
                                      vox::int64(x));
        };
        rig_.add("/x", std::make_shared<ScriptedResource>(nullptr, push));
        rig_.server().setAccessRules({{.path = "/", .operations = {Operation::kGet}}});
        rig_.start();
    }
    ~Service() {
        rig_.listener().cancel();
        rig_.queue().sync([this] { client_.cancel(); });
        rig_.stop();
    }
    Service(const Service&) = delete;
    Service& operator=(const Service&) = delete;

  private:
    RestServerRig rig_{vox::listener::create(kName)};
    vox::connection client_;  // touched on the server's queue only
};

TEST(AutomaticReconnection, FollowsItsServiceUntilItIsToldNotTo) {
    const RuntimeDirectory directory;
    Client client;
    Event failed;
    client.on([&] {
        client.module.setServerErrorHandler([&](const vox::object&) { failed.signal(); });
        client.noteConnections();
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

TEST(AutomaticReconnection, EndsWithTheNextConnectionOrName) {
    const RuntimeDirectory directory;
    const Service service(7);
    for (const bool isByName : {true, false}) {
        Event waited;
        Client client;
        client.on([&] {
            client.noteConnections();
            client.module.setServerErrorHandler([&](const vox::object&) {
                client.note("failed");  // and an attempt at the other is due
                if (isByName)
                    client.module.connectToService(kName, kQuick);
                else
                    client.module.connect(vox::connection::create(kName));
                client.queue.after(dispatch::time::after(20ms),
                                   dispatch::block<void()>([&] { waited.signal(); }));
            });
            client.module.connectToService("net.example.missing", kQuick);
        });
        ASSERT_TRUE(waited.wait());
        // Answered behind all that was asked before.
        client.on([&] { client.module.sendRawGet("", [&](auto&&) { client.note("answered"); }); });
        EXPECT_EQ(client.next(isByName ? 3 : 2), isByName ? (Texts{"failed", "reached", "answered"})
                                                          : (Texts{"failed", "answered"}));
    }
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
std::shared_ptr<plr::rest::RestResource> answers() {
    using Kept = std::vector<std::shared_ptr<vox::object>>;
    const auto kept = std::make_shared<Kept>();
    return std::make_shared<ScriptedResource>([kept](auto& context, const PathView& path) {
        if (path.current() == "echo")
            return context.sendReplyWithValue(context.getRestValue());
        if (path.current() == "refusal")
            return context.sendReplyWithValue(vox::error(VOX_ERROR_APPLICATION, "not now"));
        const auto reply = context.takeAutoReplyValue();
        if (path.current() != "nothing")
            kept->push_back(reply);
        return true;
    });
}

std::string asText(const Result<vox::object>& result) {
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
    rig.add("/a", answers());
    rig.start();
    Client client;
    const auto ask = [&](const char* path, std::chrono::milliseconds limit) {
        return client.on([&] {
            return client.module.sendRequest(
                path, vox::int64(5), limit,
                [&](const Result<vox::object>& result) { client.note(asText(result)); });
        });
    };
    EXPECT_FALSE(ask("/a/echo", kBound));
    EXPECT_EQ(client.on([&] { return client.next(1); }), (Texts{"1 not connected"}))
        << "before the return";
    client.on([&] { client.module.connect(rig.connect()); });
    ask("/a/echo", kBound);
    EXPECT_EQ(client.next(1), (Texts{"5"}));
    client.on([&] {
        for (const char* path : {"/a/echo", "/a/nothing"})
            client.module.sendRequest(path, vox::int64(5), client.noting("value"));
        for (const char* path : {"/a/echo", "/a/refusal"})
            client.module.sendRawGet(path, client.noting("raw"));
    });
    EXPECT_EQ(client.next(4),
              (Texts{"value 5", "value null", R"(raw {"o": "get","r": "/a/echo","v": null})",
                     R"(raw {"o": "get","r": "/a/refusal","e": "not now"})"}));
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
            Block([&](const Result<vox::object>& result) { client.note(asText(result)); }));
        client.module.sendRequest("/a/silence", {}, kBound, RestModule::ResultHandler());
        client.module.sendRawGet(
            "/", [&](const vox::object& reply) { client.note(vox_type_get_name(reply.type())); });
    });
    server.connection().cancel();
    const Texts ends = client.next(2);
    EXPECT_EQ(ends[0].substr(0, 2) + ends[1], "1 error");
}

// ---- Typed values -----------------------------------------------------------------------

template <class T>
std::string read(const vox::object& value) {
    const std::optional<T> read = valueAs<T>(value);
    if constexpr (std::is_arithmetic_v<T>)
        return read ? std::to_string(*read) : "-";
    else
        return read.value_or("-");
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
        EXPECT_EQ(valueAs<vox::object>(row.value).has_value(), bool(row.value));
    }
    EXPECT_EQ(valueAs<std::vector<std::uint8_t>>(vox::data(bytes)),
              (std::vector<std::uint8_t>{1, 2}));
    const AssertionAcquireState state{3, AssertionState::kGranted};
    EXPECT_EQ(valueAs<plr::rest::AssertionAcquireState>(write_rest_value(state)), state);
    EXPECT_FALSE(valueAs<plr::rest::AssertionAcquireState>(nullptr));
}

}  // namespace
