#include "plr/rest/assertion_handle.h"

#include "plr/rest/assertion_provider.h"
#include "plr/rest/assertion_resource.h"
#include "support/module_client.h"
#include "support/raw_rest_client.h"

namespace {

using namespace plr::rest;
using namespace plr::test;

constexpr const char* kPath = "/assertions/radio";

// A server with assertions, a module whose handles write down what they are told,
// and a client that grants, by hand.
class Handle : public testing::Test, protected ModuleClient {
  protected:
    Handle() {
        rig_.add("/assertions", std::make_shared<plr::rest::AssertionRestResource>());
        rig_.start();
        granter_ = rig_.registeredClient("granter");
        on([this] { module.connect(rig_.connect()); });
    }
    ~Handle() override {
        on([this] { module.disconnect(); });
    }

    AssertionHandle make(std::string label) {
        return {module, kPath, [this, label = std::move(label)](bool granted) {
                    told_.push_back(label + (granted ? " granted" : " lost"));
                }};
    }
    void answer(const char* what, int generation) {
        granter_->send(Operation::kSet, std::string(kPath) + what, vox::int64(generation));
        static_cast<void>(granter_->takeMessages());
    }
    // The module's messages have arrived, and what answers them has been handled.
    void settle() {
        Event answered;
        on([&] { module.sendRawGet("", [&](const vox::object&) { answered.signal(); }); });
        EXPECT_TRUE(answered.wait());
    }
    // What the handles were told since the last call, everything so far included.
    Texts told() {
        settle();
        Texts told;
        on([&] { told = std::exchange(told_, {}); });
        return told;
    }
    // Those in a list, once what the module sent has been handled.
    std::string clients(const char* list) {
        settle();
        return granter_->textAt(std::string(kPath) + list);
    }

    RestServerRig rig_;
    std::unique_ptr<RawRestClient> granter_;
    Texts told_;  // touched on the queue only
};

TEST_F(Handle, AssertsUntilItIsDroppedAndTellsEachChange) {
    std::optional<AssertionHandle> handle;
    on([&] { handle = make("a"); });
    EXPECT_EQ(clients("/waiting"), "[0: \"me\"]");
    answer("/granted", 1);
    EXPECT_EQ(told(), (Texts{"a granted"}));
    on([&] {
        EXPECT_TRUE(handle->isGranted());
        handle->reassert();  // nothing to ask for
    });
    answer("/revoked", 1);
    EXPECT_EQ(told(), (Texts{"a lost"}));
    EXPECT_EQ(clients("/waiting"), "[]");
    on([&] { handle->reassert(); });
    EXPECT_EQ(clients("/waiting"), "[0: \"me\"]");
    answer("/granted", 2);
    EXPECT_EQ(told(), (Texts{"a granted"}));
    // A new connection, then none.
    on([&] {
        module.connect(rig_.connect());
        EXPECT_EQ(std::exchange(told_, {}), (Texts{"a lost"})) << "before the return";
    });
    ASSERT_TRUE(rig_.waitForDrop());
    settle();
    answer("/granted", 3);
    EXPECT_EQ(told(), (Texts{"a granted"}));
    std::thread([&] { handle.reset(); }).join();
    EXPECT_EQ(clients("/granted"), "[]");
    EXPECT_EQ(told(), Texts());
}

TEST_F(Handle, SharesItsAssertionWithTheOthersOfItsModule) {
    AssertionHandle first, second, late;
    on([&] {
        first = make("first");
        second = make("second");
    });
    settle();
    answer("/granted", 1);
    EXPECT_EQ(told(), (Texts{"first granted", "second granted"}));
    on([&] {
        late = make("late");
        EXPECT_FALSE(late.isGranted());
    });
    EXPECT_EQ(told(), (Texts{"late granted"}));
    on([&] { second.reset(); });
    first.reset();
    EXPECT_EQ(clients("/granted"), "[0: \"me\"]");
    on([&] {
        const AssertionHandle moved = std::move(late);
        EXPECT_TRUE(moved.isGranted());
    });
    EXPECT_EQ(clients("/granted"), "[]");
    EXPECT_EQ(told(), Texts());
}

TEST_F(Handle, IsNotTakenInByAGrantThatWasMeantForTheOneBefore) {
    AssertionHandle handle;
    on([&] { handle = make("before"); });
    settle();
    on([&] {
        answer("/granted", 1);  // sent to the module, which is busy here
        handle.reset();
        handle = make("now");
    });
    ASSERT_TRUE(eventually([&] { return clients("/waiting") == "[0: \"me\"]"; }));
    EXPECT_EQ(told(), Texts());
    answer("/granted", 2);
    EXPECT_EQ(told(), (Texts{"now granted"}));
    on([&] { handle.reset(); });
}

TEST_F(Handle, MayBeDroppedByAHandler) {
    AssertionHandle own, other;
    on([&] {
        own = {module, kPath, [&](bool granted) {
                   told_.push_back(granted ? "granted" : "lost");
                   own.reset();
                   other.reset();
               }};
        other = make("other");
    });
    settle();
    answer("/granted", 1);
    EXPECT_EQ(told(), (Texts{"granted"}));
    EXPECT_EQ(clients("/granted"), "[]");
}

TEST_F(Handle, SharesItsPathWithNoOtherObserver) {
    on([&] {
        module.observeProperty(kPath, [](const vox::object&) {});
        EXPECT_THROW(make("a"), std::invalid_argument);
        module.unobserveProperty(kPath);
        const AssertionHandle handle = make("a");
        const AssertionProvider provider(module, kPath, {});
        EXPECT_THROW(AssertionProvider(module, kPath, {}), std::invalid_argument);
    });
}

TEST_F(Handle, IsGrantedByAProvider) {
    std::optional<AssertionProvider> provider;
    AssertionHandle handle;
    on([&] {
        provider.emplace(module, kPath, [&](const AssertionAcquireState& wanted) {
            told_.push_back(asString(wanted.state) + (" " + std::to_string(wanted.generation)));
            EXPECT_EQ(provider->state(), wanted);
            if (wanted.state == AssertionState::kPending)
                provider->grant();
        });
        provider->grant();  // nothing is known yet
    });
    EXPECT_EQ(told(), (Texts{"kIdle 1"}));
    on([&] { handle = make("a"); });
    EXPECT_TRUE(eventually([&] { return clients("/granted") == "[0: \"me\"]"; }));
    EXPECT_EQ(told(), (Texts{"kPending 1", "a granted", "kGranted 1"}));
    on([&] { provider->revoke(); });
    EXPECT_EQ(told(), (Texts{"a lost", "kIdle 2"}));
    on([&] {
        module.disconnect();
        EXPECT_EQ(std::exchange(told_, {}), (Texts{"kIdle 0"}));
        provider->grant();
        module.connect(rig_.connect());
    });
    EXPECT_TRUE(rig_.waitForDrop());
    EXPECT_TRUE(eventually([&] { return clients("/granted") == "[0: \"me\"]"; }));
    on([&] {
        provider.reset();
        handle.reset();
    });
    EXPECT_EQ(clients("/provider"), "null");
}

}  // namespace
