#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <vector>

#include "dispatch/queue.h"
#include "plr/base/export.h"

// Logging tags trace work that crosses serial queues back to the queue that
// started it. Each queue carries a number; a thread keeps a stack of the
// numbers of the queues whose work it is in, which a label shows: "3,7+".
//
// Threads: each thread has its own stack; numbers are handed out process-wide.
// Cost:    a guard is a look-up of the queue's number and of the thread's stack.
namespace plr {

// The key under which a queue has its number: the value itself is the number, a
// 32-bit one; 0 and none at all mean that there is no tag. Reads "plr:log".
PLR_EXPORT extern const char kLoggingTagKey[8];

// The last number handed out. Wraps around and skips 0.
PLR_EXPORT extern std::atomic<std::uint32_t> last_tag;

// Gives the queue the next number: 1, 2, 3 … in the order of the calls.
PLR_EXPORT void add_logging_tag(dispatch::queue queue);
// The same unless the queue has one.
PLR_EXPORT void maybe_add_logging_tag(dispatch::queue queue);
// Numbering starts at 1 again. Queues keep theirs, so numbers may repeat.
PLR_EXPORT void reset_last_tag() noexcept;

// The label of the calling thread's stack, see TagVector::getTagLabel(); empty
// when it never had a guard.
[[nodiscard]] PLR_EXPORT std::string get_current_logging_tag();

// Makes the key of thread-specific storage, once in a process. The functions
// above call it; LogTag does not.
PLR_EXPORT void initThreadId();
// The key's destructor: deletes a thread's TagVector.
PLR_EXPORT void destr_function(void* tagVector);

// A thread's stack of tags, oldest first.
class PLR_EXPORT TagVector {
  public:
    void push_back(std::uint32_t tag);
    // Not on an empty stack.
    void pop_back() noexcept;
    // The numbers, oldest first, joined by ",". Those that no label has shown yet
    // have a "+" behind them, this once.
    [[nodiscard]] std::string getTagLabel();

  private:
    std::vector<std::uint32_t> tags_;
    std::uint32_t newCount_ = 0;  // the newest tags that were not in a label yet
};

// Keeps the number of the queue whose work is running on the thread's stack for
// the length of a scope; 0 outside of queues. Needs the key: some queue was
// tagged before. Without it the guard does nothing. Lives and ends on one thread.
class PLR_EXPORT LogTag {
  public:
    LogTag();
    LogTag(LogTag&& other) noexcept;
    // Deliberate: the tag that the target held is not popped here; it stays on
    // the stack until some later guard pops it.
    LogTag& operator=(LogTag&& other) noexcept;
    ~LogTag();

  private:
    TagVector* thread_;  // null once moved from
};

}  // namespace plr
