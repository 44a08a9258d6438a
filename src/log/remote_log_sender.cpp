#include "src/log/remote_log_sender.h"

#include <cerrno>
#include <chrono>
#include <utility>

#include "plr/concurrency/while_alive.h"
#include "plr/ipc/values.h"
#include "src/log/remote_log_format.h"

namespace plr {
namespace {

// Messages that follow within this time are sent together.
constexpr std::chrono::microseconds kLinger(100);

}  // namespace

// Runs `work` with this sender, and whether the server replied.
template <class Work>
dispatch::block<void(vox::object)> RemoteLogSender::onReply(Work work) {
    return dispatch::block<void(vox::object)>(
        whileAlive(weak_from_this(), [work](RemoteLogSender& self, const vox::object& reply) {
            work(self, bool(vox::dict(reply)));
        }));
}

void RemoteLogSender::start(const vox::connection& server, const vox::dict& checkIn) {
    stop();
    server_ = server;
    server_.send_message_with_reply(
        checkIn, queue_.queue(),
        onReply([connection = connection_](RemoteLogSender& self, bool replied) {
            self.assertCurrent();
            if (replied && connection == self.connection_)
                self.confirms_ = Confirms::Yes;
        }));
}

void RemoteLogSender::stop() {
    server_ = nullptr;
    ++connection_;
    confirms_ = Confirms::Unknown;
    isAsking_ = false;
    buffer_.rewind();
    flushes_.clear();
}

void RemoteLogSender::levelCame() {
    if (confirms_ != Confirms::Unknown)
        return;
    confirms_ = Confirms::No;
    isAsking_ = false;  // it will never reply
    ask();
}

void RemoteLogSender::collect() {
    if (!buffer_.collect(willLookAgain_) || std::exchange(willLookAgain_, true))
        return;
    queue_.queue().after(
        dispatch::time::after(kLinger),
        dispatch::block<void()>(whileAlive(weak_from_this(), [](RemoteLogSender& self) {
            self.assertCurrent();
            self.willLookAgain_ = false;
            self.send();
        })));
}

void RemoteLogSender::send() {
    collect();
    while (server_ && buffer_.hasUnsent() && !buffer_.enoughSent())
        if (!sendNext())
            return;
    ask();
}

void RemoteLogSender::sendTheRest() {
    collect();
    while (server_ && buffer_.hasUnsent())
        if (!sendNext())
            return;
}

// False when the connection takes nothing any more; its error is to come.
bool RemoteLogSender::sendNext() {
    int error = server_.send_message(buffer_.unsent());
    if (error == EILSEQ)
        error = server_.send_message(remote_log::repaired(buffer_.unsent()));
    if (error == 0) {
        buffer_.advance();
        return true;
    }
    if (error == EPIPE || error == ENOBUFS)
        return false;
    const vox::dict note = remote_log::noteOf(1, "the server does not take them");
    buffer_.refuse(note);
    return server_.send_message(note) != EPIPE;
}

void RemoteLogSender::ask() {
    if (isAsking_ || !buffer_.hasSent())
        return;
    isAsking_ = true;
    if (confirms_ == Confirms::No)
        askKernel();
    else
        askServer();
}

void RemoteLogSender::askServer() {
    vox::dict request = vox::dict::create();
    request[remote_log::kLoggerConfirm] =
        vox::int64(static_cast<std::int64_t>(buffer_.firstUnsent()));
    server_.send_message_with_reply(request, queue_.queue(),
                                    onReply([connection = connection_, end = buffer_.firstUnsent()](
                                                RemoteLogSender& self, bool replied) {
                                        self.assertCurrent();
                                        if (connection == self.connection_)
                                            self.isAsking_ = false;
                                        // A connection that was replaced may still tell. One that
                                        // goes on, but refuses to ask, is asked again behind the
                                        // next message.
                                        if (replied)
                                            self.confirmed(end);
                                    }));
}

void RemoteLogSender::askKernel() {
    server_.send_barrier(dispatch::block<void()>(
        whileAlive(weak_from_this(),
                   [connection = connection_, end = buffer_.firstUnsent()](RemoteLogSender& self) {
                       self.assertCurrent();
                       if (connection != self.connection_)
                           return;  // it ended, perhaps before they were handed over
                       self.isAsking_ = false;
                       self.confirmed(end);
                   })));
}

void RemoteLogSender::confirmed(std::uint64_t end) {
    buffer_.forgetUntil(end);
    while (!flushes_.empty() && flushes_.front().end <= buffer_.firstHeld())
        flushes_.pop_front();
    send();
}

void RemoteLogSender::flush(const dispatch::group_session& session) {
    send();
    if (server_ && buffer_.firstHeld() != buffer_.end())
        flushes_.push_back({buffer_.end(), session});
}

}  // namespace plr
