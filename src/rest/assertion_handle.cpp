#include "plr/rest/assertion_handle.h"

#include <stdexcept>
#include <utility>
#include <vector>

#include "plr/base/assert.h"
#include "plr/rest/assertion_state.h"

namespace plr::rest {

// What one handle has of an assertion.
struct AssertionHandle::Share {
    const std::shared_ptr<Assertion> assertion;
    const Handler handler;
    bool wasToldGranted = false;
    bool isDropped = false;
};

// An assertion of a module, for all its handles. On the module's queue.
class AssertionHandle::Assertion : public RestModuleState::Follower {
  public:
    Assertion(std::shared_ptr<RestModuleState> module, std::string path)
        : module_(std::move(module)), path_(std::move(path)) {}

    // The one of this module and path: shared, or made and asserted.
    static std::shared_ptr<Assertion> at(const std::string& path,
                                         std::shared_ptr<RestModuleState> module);
    void add(const std::shared_ptr<Share>& share);
    void remove(const std::shared_ptr<Share>& share);
    void reassert();

    void handleNotify(const vox::object& value) override;
    void handleConnectionEnd() override;

    [[nodiscard]] const dispatch::queue& queue() const { return module_->queue(); }

  private:
    void setGranted(bool granted);
    void tell(Share& share) const;

    const std::shared_ptr<RestModuleState> module_;
    const std::string path_;
    std::vector<std::shared_ptr<Share>> shares_;
    bool isGranted_ = false;
    bool isRevoked_ = false;  // by the server, and not asserted since
};

std::shared_ptr<AssertionHandle::Assertion> AssertionHandle::Assertion::at(
    const std::string& path, std::shared_ptr<RestModuleState> module) {
    auto present = std::dynamic_pointer_cast<Assertion>(module->followerOf(path));
    if (present)
        return present;
    const auto made = std::make_shared<Assertion>(module, path);
    if (!module->follow(path, made))
        throw std::invalid_argument("the path of an AssertionHandle is observed already");
    return made;
}

void AssertionHandle::Assertion::add(const std::shared_ptr<Share>& share) {
    shares_.push_back(share);
    if (isGranted_)
        queue().async([share] { share->assertion->tell(*share); });
}

void AssertionHandle::Assertion::remove(const std::shared_ptr<Share>& share) {
    share->isDropped = true;
    std::erase(shares_, share);
    if (shares_.empty())
        module_->unfollow(path_);
}

void AssertionHandle::Assertion::reassert() {
    if (std::exchange(isRevoked_, false))
        module_->send(Operation::kPush, path_, nullptr);
}

void AssertionHandle::Assertion::handleNotify(const vox::object& value) {
    AssertionAcquireState told;
    read_rest_value(told, value);
    const bool granted = told.state == AssertionState::kGranted;
    isRevoked_ = !granted;
    setGranted(granted);
}

void AssertionHandle::Assertion::handleConnectionEnd() {
    isRevoked_ = false;  // the next connection asserts
    setGranted(false);
}

void AssertionHandle::Assertion::setGranted(bool granted) {
    isGranted_ = granted;
    // Handlers may make and drop handles, and change the state.
    for (const auto& share : std::vector(shares_))
        tell(*share);
}

void AssertionHandle::Assertion::tell(Share& share) const {
    if (share.isDropped || std::exchange(share.wasToldGranted, isGranted_) == isGranted_)
        return;
    if (share.handler)
        share.handler(isGranted_);
}

AssertionHandle::AssertionHandle(const RestModule& module, const std::string& path,
                                 Handler handler) {
    auto state = module.getWeakHandle().lock();
    PLR_ASSERT(state, "an AssertionHandle needs a RestModule with a queue");
    auto assertion = Assertion::at(path, std::move(state));
    share_ = std::make_shared<Share>(Share{std::move(assertion), std::move(handler)});
    share_->assertion->add(share_);
}

AssertionHandle::~AssertionHandle() {
    reset();
}

AssertionHandle::AssertionHandle(AssertionHandle&& other) noexcept = default;

AssertionHandle& AssertionHandle::operator=(AssertionHandle&& other) noexcept {
    if (this != &other) {
        reset();
        share_ = std::move(other.share_);
    }
    return *this;
}

bool AssertionHandle::isGranted() const {
    return share_ && share_->wasToldGranted;
}

void AssertionHandle::reassert() const {
    if (share_)
        share_->assertion->reassert();
}

void AssertionHandle::reset() {
    const auto share = std::exchange(share_, nullptr);
    if (!share)
        return;
    // A copy: the assertion may go, and the module with it.
    const dispatch::queue queue = share->assertion->queue();
    if (queue.is_current())
        share->assertion->remove(share);
    else
        queue.async([share] { share->assertion->remove(share); });
}

}  // namespace plr::rest
