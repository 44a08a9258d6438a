#include "plr/rest/assertion_provider.h"

#include <stdexcept>
#include <utility>

#include "plr/base/assert.h"
#include "plr/ipc/values.h"

namespace plr::rest {

class AssertionProvider::Registration : public RestModuleState::Follower {
  public:
    Registration(std::shared_ptr<RestModuleState> module, std::string path, Handler handler)
        : module_(std::move(module)), path_(std::move(path)), handler_(std::move(handler)) {}

    void start(const std::shared_ptr<Registration>& self) {
        if (!module_->follow(providerPath(), self))
            throw std::invalid_argument("the path of an AssertionProvider is observed already");
    }
    void stop() {
        isDropped_ = true;
        module_->unfollow(providerPath());
    }
    [[nodiscard]] const AssertionAcquireState& state() const noexcept { return state_; }
    void answer(const char* what) const {
        if (wasNotified_)
            module_->send(Operation::kSet, path_ + what, vox::int64(state_.generation));
    }

    void handleNotify(const vox::object& value) override {
        state_ = {};
        read_rest_value(state_, value);
        wasNotified_ = true;
        tell();
    }
    void handleConnectionEnd() override {
        state_ = {};
        if (std::exchange(wasNotified_, false))
            tell();
    }

  private:
    [[nodiscard]] std::string providerPath() const { return path_ + "/provider"; }
    // Copies, since the handler may drop the provider, or bring the next state.
    void tell() const {
        const AssertionAcquireState state = state_;
        if (handler_ && !isDropped_)
            handler_(state);
    }

    const std::shared_ptr<RestModuleState> module_;
    const std::string path_;  // of the assertion
    const Handler handler_;
    AssertionAcquireState state_;
    bool wasNotified_ = false;  // on this connection
    bool isDropped_ = false;
};

AssertionProvider::AssertionProvider(const RestModule& module, const std::string& path,
                                     Handler handler) {
    auto state = module.getWeakHandle().lock();
    PLR_ASSERT(state, "an AssertionProvider needs a RestModule with a queue");
    registration_ = std::make_shared<Registration>(std::move(state), path, std::move(handler));
    registration_->start(registration_);
}

AssertionProvider::~AssertionProvider() {
    registration_->stop();
}

const AssertionAcquireState& AssertionProvider::state() const noexcept {
    return registration_->state();
}

void AssertionProvider::grant() const {
    registration_->answer("/granted");
}

void AssertionProvider::revoke() const {
    registration_->answer("/revoked");
}

}  // namespace plr::rest
