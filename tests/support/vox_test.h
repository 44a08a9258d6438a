#pragma once

#include <condition_variable>
#include <functional>
#include <numeric>

#include "support/runtime.h"
#include "support/vox_values.h"
#include "support/waiting.h"
#include "vox/vox.h"

// What the tests of Vox connections share.
namespace plr::test {

using Numbers = std::vector<std::int64_t>;

// {"n": n}, and with "data" of `bytes` bytes when that is not 0.
inline Ref message(std::int64_t n, std::size_t bytes = 0) {
    const Ref data(vox_data_create(std::string(bytes, 'x').data(), bytes));
    return dictionary({{"n", number(n)}, {"data", bytes > 0 ? vox_object_t(data) : nullptr}});
}
inline std::int64_t numberIn(vox_object_t message) {
    return vox_int64_get_value(vox_dictionary_get_value(message, "n"));
}
// 0, 1, … count - 1
inline Numbers upTo(std::int64_t count) {
    Numbers numbers(static_cast<std::size_t>(count));
    std::iota(numbers.begin(), numbers.end(), 0);
    return numbers;
}

template <class Handler>
void resumeOn(const dispatch::queue& queue, vox_connection_t connection, Handler handler) {
    const dispatch::block<void(vox_object_t)> block(std::move(handler));
    vox_connection_set_event_handler(connection, &block);
    vox_connection_set_target_queue(connection, &queue);
    vox_connection_resume(connection);
}

// The events of one connection, in order.
class Inbox {
  public:
    void add(vox_object_t event) {
        const std::lock_guard guard(lock_);
        events_.push_back(Ref::retain(event));
        changed_.notify_all();
    }
    // Whether `count` events came in time.
    [[nodiscard]] bool wait(std::size_t count) {
        std::unique_lock guard(lock_);
        return changed_.wait_for(guard, kBound, [&] { return events_.size() >= count; });
    }
    // The error that came last, waited for; null when none came in time.
    [[nodiscard]] Ref waitForError() {
        std::unique_lock guard(lock_);
        const auto failed = [this] {
            return !events_.empty() && vox_get_type(events_.back()) == VOX_TYPE_ERROR;
        };
        return changed_.wait_for(guard, kBound, failed) ? events_.back() : Ref();
    }
    // Of that error.
    [[nodiscard]] std::int64_t errorCode() { return vox_error_get_code(waitForError()); }
    [[nodiscard]] std::string errorText() {
        return description(vox_error_get_value(waitForError(), vox_error_key_description));
    }
    // That error is of this code, and says `why`.
    void expectError(vox_error_code_t code, const std::string& why = "") {
        EXPECT_EQ(errorCode(), code);
        EXPECT_NE(errorText().find(why), std::string::npos) << errorText();
    }
    [[nodiscard]] std::vector<Ref> all() const {
        const std::lock_guard guard(lock_);
        return events_;
    }
    [[nodiscard]] vox_object_t operator[](std::size_t i) const { return all().at(i); }
    // The "n" of every message so far.
    [[nodiscard]] Numbers numbers() const {
        Numbers found;
        for (const Ref& event : all())
            if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                found.push_back(numberIn(event));
        return found;
    }
    void clear() {
        const std::lock_guard guard(lock_);
        events_.clear();
    }

  private:
    mutable std::mutex lock_;
    std::condition_variable changed_;
    std::vector<Ref> events_;
};

// One end of a connection, with its events. Cancelled at the end.
class End {
  public:
    // True: the event is dealt with, and goes to no inbox.
    using Handler = std::function<bool(vox_object_t)>;

    // Not resumed yet.
    explicit End(vox_connection_t adopted) : connection_(adopted) {}
    ~End() {
        vox_connection_cancel(connection_);
        if (resumed_) {
            EXPECT_TRUE(ended_.wait());
        }
        drain(queue);
    }
    operator vox_connection_t() const { return connection_; }

    void resume(const Handler& first = {}) {
        resumeOn(queue, connection_, [this, first](vox_object_t event) {
            if (!first || !first(event))
                inbox.add(event);
            if (vox_get_type(event) == VOX_TYPE_ERROR)
                ended_.signal();
        });
        resumed_ = true;
    }
    // Requests are answered with their number.
    void resumeEcho() {
        resume([this](vox_object_t event) { return answer(event) == 0; });
    }
    // Answers a request with its number and `bytes` bytes. EINVAL: it is none.
    int answer(vox_object_t request, std::size_t bytes = 0) {
        const Ref reply(vox_dictionary_create_reply(request));
        if (!vox_object_t(reply))
            return EINVAL;
        const Ref contents = message(numberIn(request), bytes);
        for (const char* key : {"n", "data"})
            vox_dictionary_set_value(reply, key, vox_dictionary_get_value(contents, key));
        return send(reply);
    }
    int send(vox_object_t message) { return vox_connection_send_message(connection_, message); }
    // The answer, or an error, arrives in `replies`.
    void request(vox_object_t message, Inbox& replies, const dispatch::queue& on) {
        const dispatch::block<void(vox_object_t)> handler(
            [&replies](vox_object_t reply) { replies.add(reply); });
        vox_connection_send_message_with_reply(connection_, message, &on, &handler);
    }
    void request(vox_object_t message, Inbox& replies) { request(message, replies, queue); }
    // Whether a request is answered.
    [[nodiscard]] bool works() {
        Inbox replies;
        request(message(42), replies);
        return replies.wait(1) && replies.numbers() == Numbers{42};
    }
    [[nodiscard]] vox_statistics_t counts() const {
        vox_statistics_t counts;
        vox_connection_get_statistics(connection_, &counts);
        return counts;
    }

    dispatch::queue queue = dispatch::queue::create("end");
    Inbox inbox;

  private:
    const Ref connection_;
    bool resumed_ = false;
    Event ended_;
};

}  // namespace plr::test
