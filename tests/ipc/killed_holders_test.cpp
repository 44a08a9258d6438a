// Activities whose holders die: this program is also the holder, when it is
// called with arguments.

#include <random>

#include "plr/ipc/vox_drosk_assertion.h"
#include "support/service_process.h"
#include "support/vox_test.h"
#include "vox/service.h"

namespace {

using namespace plr::test;

constexpr const char* kName = "net.example.holders";
constexpr std::int64_t kRequests = 5;  // of each holder

// Holds an activity for every client, and for every request, none of which it answers.
class Service {
  public:
    Service() {
        listener_.resume([this](vox_object_t event) { return take(event); });
    }

  private:
    // A client, or a request.
    struct Held {
        Ref what;
        std::shared_ptr<std::string> activity;
    };

    bool take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return false;
        const auto client =
            std::make_shared<Held>(Held{Ref::retain(event), assertion_->createActivity("client")});
        resumeOn(listener_.queue, event, [this, client](vox_object_t happened) {
            if (vox_get_type(happened) == VOX_TYPE_DICTIONARY)
                keep(happened);
            else
                client->activity.reset();
        });
        return true;
    }
    // Until the asker is gone.
    void keep(vox_object_t message) {
        const auto kept = std::make_shared<Held>(
            Held{Ref::retain(message), assertion_->createActivity("request")});
        const dispatch::block<void()> gone([kept] { kept->activity.reset(); });
        EXPECT_EQ(vox_dictionary_set_cancel_handler(message, &gone), 0);
    }

    const std::shared_ptr<plr::VoxDroskAssertion> assertion_ =
        plr::VoxDroskAssertion::create_default_global();
    End listener_{vox_connection_create_listener(kName, nullptr)};
};

[[noreturn]] void holderMain() {
    const Ref connection(vox_connection_create(kName));
    const dispatch::queue queue = dispatch::queue::create("holder");
    const dispatch::block<void(vox_object_t)> ignore([](vox_object_t) {});
    resumeOn(queue, connection, [](vox_object_t) {});
    for (std::int64_t n = 0; n < kRequests; ++n)
        vox_connection_send_message_with_reply(connection, message(n), &queue, &ignore);
    serviceIsReady();
}

// Some are killed before the service has heard of all their requests.
TEST(KilledHolders, LeaveNoTransactionOpen) {
    const RuntimeDirectory directory;
    Service service;
    std::minstd_rand random(1);
    for (int round = 0; round < 12; ++round) {
        std::vector<std::unique_ptr<ServiceProcess>> holders;
        for (int i = 0; i < 4; ++i)
            holders.push_back(std::make_unique<ServiceProcess>());
        if (round % 2 == 1) {
            const std::uint64_t all = holders.size() * (kRequests + 1);
            EXPECT_TRUE(eventually([all] { return vox_transaction_count() == all; }));
        }
        std::shuffle(holders.begin(), holders.end(), random);
        for (const auto& each : holders)
            each->kill();
        EXPECT_TRUE(eventually([] { return vox_transaction_count() == 0; }));
    }
}

}  // namespace

int main(int count, char** arguments) {
    if (count == 2 && std::string(arguments[1]) == "service")
        holderMain();
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
