#include <limits>

#include "support/raw_rest_client.h"
#include "support/vox_values.h"

// What no client can do to a service: end it, stop it answering others, or
// leave something behind in it.
namespace {

using namespace plr::test;
using plr::rest::Operation;
using enum plr::rest::Operation;

constexpr std::size_t kMebibyte = 1U << 20;

std::string repeated(std::string_view part, std::size_t bytes) {
    std::string text;
    while (text.size() < bytes)
        text += part;
    return text;
}

// Values of every type, and of extreme size.
std::vector<std::pair<std::string, vox::object>> oddValues() {
    const std::uint8_t uuid[16] = {};
    const vox::dict wide = vox::dict::create();
    for (int i = 0; i < 1000; ++i)
        wide[std::to_string(i).c_str()] = vox::int64(i);
    return {
        {"null", nullptr},
        {"true", vox::boolean(true)},
        {"int64 minimum", vox::int64(std::numeric_limits<std::int64_t>::min())},
        {"uint64 maximum", vox::uint64(std::numeric_limits<std::uint64_t>::max())},
        {"NaN", vox::real(std::numeric_limits<double>::quiet_NaN())},
        {"date", vox::date(std::chrono::nanoseconds::min())},
        {"data", vox::data(std::vector<std::uint8_t>(kMebibyte))},
        {"empty string", vox::string(std::string_view())},
        {"set", vox::string("set")},
        {"string with a NUL", vox::string(std::string_view("get\0x", 5))},
        {"1 MiB path", vox::string(repeated("/a", kMebibyte))},
        {"1 MiB of slashes", vox::string(repeated("/", kMebibyte))},
        {"1 MiB property name", vox::string("/kept/" + repeated("n", kMebibyte))},
        {"1 MiB sub-path", vox::string("/kept/x@" + repeated("k.", kMebibyte))},
        {"1 MiB of numbers", vox::string("/kept/x@" + repeated("0.", kMebibyte))},
        {"a word as index", vox::string("/kept/x@0.word")},
        {"a huge index", vox::string("/kept/x@0.99999999999999999999999999")},
        {"many at signs", vox::string("/kept/" + repeated("@", 1000))},
        {"the dump below itself", vox::string(repeated("/*", 1000))},
        {"meta of meta", vox::string("/kept" + repeated("/_", 1000))},
        {"uuid", vox::uuid(uuid)},
        {"deep array", vox::object::adopt(vox_retain(nested(60)))},
        {"wide dictionary", wide},
        {"error", vox::error(-1, nullptr)},
        {"descriptor", vox::object::adopt(vox_fd_create(0))},
    };
}

class OddClients : public testing::Test {
  protected:
    OddClients() {
        rig_.add("/kept", std::make_shared<plr::rest::PropertyRestResource>(true));
        rig_.add("/events", std::make_shared<plr::rest::PropertyRestResource>(false));
        rig_.start();
        good_ = rig_.registeredClient("good");
        good_->send(kSet, "/kept/x", vox::array_creator()("x"));
        EXPECT_EQ(good_->get("/kept/x@0"), vox::string("x"));
    }
    // Sends a message both ways and sees that the service still answers: this
    // client, unless it is the one to blame, and the others.
    void send(const vox::dict& message) {
        odd_->send(message);
        odd_->ask(message);
        EXPECT_TRUE(vox::array(odd_->get("")));
        EXPECT_TRUE(vox::array(good_->get("/kept")));
    }

    RestServerRig rig_;
    std::unique_ptr<RawRestClient> good_;
    std::unique_ptr<RawRestClient> odd_ = rig_.registeredClient("odd");
};

TEST_F(OddClients, EveryKeyMayHoldAnythingAndNoneNeedBeThere) {
    for (const char* key : {"o", "a", "r", "v", "e"}) {
        for (const auto& [name, value] : oddValues()) {
            SCOPED_TRACE(key + (": " + name));
            for (const Operation operation : {kSet, kGet, kPush, kPop, kNotify}) {
                const vox::dict message = odd_->message(operation, "/kept/x");
                message[key] = value;
                send(message);
            }
            if (HasFailure())
                return;
        }
    }
    for (int present = 0; present < 16; ++present) {
        const vox::dict message = odd_->message(kGet, "/kept/x");
        const char* const keys[] = {"o", "a", "r", "v"};
        for (int i = 0; i < 4; ++i)
            if (present >> i & 1)
                vox_dictionary_set_value(message.get(), keys[i], nullptr);
        send(message);
    }
}

TEST_F(OddClients, ThatComeAndGoLeaveNoDescriptorBehind) {
    const auto visit = [this](int round) {
        auto client = rig_.registeredClient("visitor" + std::to_string(round));
        client->send(kPush, "/kept/fd");
        client->send(kSet, "/kept/fd", vox::object::adopt(vox_fd_create(0)));
        if (round % 2 == 0) {
            EXPECT_TRUE(vox::array(client->get("")));
        }
        client->ask(client->message(kGet, "*"));  // under way when it leaves
    };
    const auto settled = [this] {
        static_cast<void>(good_->get("/connections"));
        good_->send(kSet, "/kept/fd", nullptr);
        static_cast<void>(good_->get(""));
        return openDescriptors();
    };
    for (int round = 0; round < 10; ++round)
        visit(round);
    const std::size_t before = settled();
    for (int round = 10; round < 110; ++round)
        visit(round);
    // The server learns of the last ends when it gets to them.
    EXPECT_TRUE(eventually([&] { return settled() <= before + 2; })) << before;
}

}  // namespace
