#pragma once

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"

// A completion callback that takes one value.
template <class T>
class PelorinAsyncCallback {
  public:
    PelorinAsyncCallback() = default;
    PelorinAsyncCallback(const PelorinAsyncCallback&) = delete;
    PelorinAsyncCallback& operator=(const PelorinAsyncCallback&) = delete;
    virtual ~PelorinAsyncCallback() = default;

    // Reports the outcome. Any thread.
    virtual void invoke(T value) = 0;
};

// A boolean completion callback that is delivered on a given queue, in the
// order of the invoke() calls.
//
// Owner: nobody but the caller. Deliberate: the queue is not retained and the
//        block is not copied; both, and the callback object itself, must
//        outlive every delivery.
class PLR_EXPORT PelorinAsyncDispatchCallback : public PelorinAsyncCallback<bool> {
  public:
    PelorinAsyncDispatchCallback(const dispatch::queue& queue,
                                 const dispatch::block<void(bool)>& block) noexcept;
    ~PelorinAsyncDispatchCallback() override;

    // Queues a call of the block with `value`. The block is read through this
    // object when the call runs.
    void invoke(bool value) override;

  private:
    dispatch::detail::queue_core* queue_;       // lent
    dispatch::block<void(bool)>::body* block_;  // lent
};
