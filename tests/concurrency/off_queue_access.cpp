#include "plr/concurrency.h"

// Compiled by a test that expects exactly two warnings: the two members that
// touch state off the queue. The two that do it rightly are silent.
class Confined : public plr::SharedSynchronizable<Confined> {
  public:
    Confined() : SharedSynchronizable("confined") {}

    int readsOffTheQueue() const { return state_; }
    void callsOffTheQueue() { touch_sync(); }
    void queuesRightly() {
        execute_wrapped([this] {
            ownQueue_.assertCurrent();
            touch_sync();
        });
    }
    void isHeldWeaklyRightly() {
        auto callback = plr::whileAlive(weak_from_this(), [](Confined& self) {
            self.ownQueue_.assertCurrent();
            self.touch_sync();
        });
        callback();
    }

  private:
    void touch_sync() PLR_ON(ownQueue_)
    { ++state_; }
    int state_ PLR_CONFINED_TO(ownQueue_)
    = 0;
};
