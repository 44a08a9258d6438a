#include <cstdint>
#include <cstdlib>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/vox/codec.h"
#include "plr/ipc/array.h"
#include "plr/log/log_server.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "plr/log/vox_log_server.h"

// What a client may say to a server of remote logging. The input is one encoded
// value: an array of messages of one client, the check-in first, or that alone.
// Whatever is logged is in the client's domain, and what it was to be.
namespace {

using plr::MemoryBufferedLogWriter;

void check(bool holds) {
    if (!holds)
        std::abort();
}

// Longer than any client's may be.
std::string ownDomain() {
    return std::string(257, 's');
}

class Target : public plr::VoxLogServer {
  public:
    static std::shared_ptr<Target> create(const std::shared_ptr<plr::LogServer>& log) {
        return make_shared_ptr(new Target(log));
    }
    // As if the messages had come from one connection.
    void take(const vox::array& messages) {
        const auto [ours, theirs] = vox::connection::create_pair();
        execute_wrapped_sync([this, &messages, &client = ours] {
            ownQueue_.assertCurrent();
            const MessageHandler handler = newClientHandlerImpl(client);
            for (std::size_t i = 0; i < messages.count(); ++i)
                if (const vox::dict message(messages[i]); message)
                    handler(client, message);
            handleClientErrorImpl(client, vox::object());
        });
        for (const vox::connection& end : {ours, theirs})
            end.cancel();
    }

  private:
    explicit Target(const std::shared_ptr<plr::LogServer>& log)
        : VoxLogServer(log, "fuzz", ownDomain()) {}
};

bool isFit(std::string_view name) {
    return !name.empty() && name.size() <= 256;
}

struct Logged {
    std::string domain;
    std::string text;
    friend bool operator==(const Logged&, const Logged&) = default;
};

std::vector<Logged> expected(const vox::array& messages) {
    std::vector<Logged> logged;
    std::string domain;
    bool first = true;
    for (std::size_t i = 0; i < messages.count(); ++i) {
        const vox::dict message(messages[i]);
        if (!message)
            continue;
        if (std::exchange(first, false)) {
            if (!isFit(message.text("kLoggerName")) || !isFit(message.text("kLoggerDomain")))
                return {};
            domain = message.text("kLoggerDomain");
        } else if (vox::object(message["kLogMessage"])) {
            logged.push_back({domain, std::string(message.text("kLogMessage"))});
        }
    }
    return logged;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const char* why = nullptr;
    const auto input = vox::object::adopt(
        vox_wire::decode(std::span(data, size), {}, vox_wire::codec_limits{}, why));
    vox::array messages(input);
    if (!messages) {
        messages = vox::array::create();
        messages.append(input);
    }
    const auto log = plr::LogServer::create("fuzz");
    const auto written = std::make_shared<MemoryBufferedLogWriter>(
        MemoryBufferedLogWriter::UNLIMITED, MemoryBufferedLogWriter::UNLIMITED);
    log->addWriter(written);
    const auto target = Target::create(log);
    target->take(messages);
    log->debugFlush();
    std::vector<Logged> logged;
    for (const auto& message : written->drain())
        if (message->getDomain() != ownDomain())
            logged.push_back({message->getDomain(), message->getText()});
    check(logged == expected(messages));
    return 0;
}
