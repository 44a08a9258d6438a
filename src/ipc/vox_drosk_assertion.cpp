#include "plr/ipc/vox_drosk_assertion.h"

#include <utility>

#include "vox/service.h"

namespace plr {
namespace {

// One open transaction.
class Transaction {
  public:
    Transaction() noexcept { vox_transaction_begin(); }
    ~Transaction() {
        if (open_)
            vox_transaction_end();
    }
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    // Leaves the ending to another.
    void handOver() noexcept { open_ = false; }

  private:
    bool open_ = true;
};

// Ends an activity. Exceptions from queueing end the process here.
struct EndOfActivity {
    std::weak_ptr<VoxDroskAssertion> assertion;

    void operator()(std::string* name) const noexcept {
        if (const auto alive = assertion.lock())
            alive->tidyUp();
        delete name;
        vox_transaction_end();
    }
};

}  // namespace

VoxDroskAssertion::VoxDroskAssertion() : SharedSynchronizable("VoxDroskAssertion") {}
VoxDroskAssertion::~VoxDroskAssertion() = default;

std::shared_ptr<VoxDroskAssertion> VoxDroskAssertion::create_default_global() {
    return make_shared_ptr(new VoxDroskAssertion());
}

std::shared_ptr<std::string> VoxDroskAssertion::createActivity(std::string name) {
    Transaction transaction;
    EndOfActivity end{weak_from_this()};
    auto owned = std::make_unique<std::string>(std::move(name));
    // From here on it is the deleter that ends the transaction, also when the
    // handle cannot be built.
    transaction.handOver();
    std::shared_ptr<std::string> activity(owned.release(), std::move(end));
    addActivity(activity);
    return activity;
}

void VoxDroskAssertion::addActivity(std::weak_ptr<std::string> activity) {
    execute_wrapped([this, activity = std::move(activity)]() mutable {
        ownQueue_.assertCurrent();
        activities_.push_back(std::move(activity));
    });
}

void VoxDroskAssertion::tidyUp() {
    execute_wrapped([this] {
        ownQueue_.assertCurrent();
        std::erase_if(activities_, [](const auto& activity) { return activity.expired(); });
    });
}

unsigned long VoxDroskAssertion::getAssertionCount() const {
    return execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        return static_cast<unsigned long>(activities_.size());
    });
}

std::string VoxDroskAssertion::dumpState() const {
    return execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        return dumpState_sync();
    });
}

std::string VoxDroskAssertion::dumpState_sync() const {
    std::string names;
    bool anyLeft = false;
    const char* separator = "";
    for (const auto& each : activities_) {
        const auto activity = each.lock();
        anyLeft = anyLeft || activity;
        names += separator;
        names += activity ? *activity : "<expired>";
        separator = ",";
    }
    return anyLeft ? "Assertions remaining: " + names : "No Assertions";
}

}  // namespace plr
