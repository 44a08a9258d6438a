#include "plr/log/vox_logger_proxy.h"

#include <utility>

#include "plr/log/log_server.h"
#include "src/log/remote_log_format.h"

namespace plr {
namespace {

constexpr std::size_t kMostBytesAhead = std::size_t{1} << 20;

template <class Work>
void whenWritten(const LogServer& server, Work&& work) {
    server.flush().notify(dispatch::queue::global(),
                          dispatch::block<void()>(std::forward<Work>(work)));
}

}  // namespace

std::shared_ptr<VoxLoggerProxy> VoxLoggerProxy::create(std::shared_ptr<LogServer> server,
                                                       vox::connection connection, std::string name,
                                                       std::string domain) {
    const std::shared_ptr<VoxLoggerProxy> proxy(
        new VoxLoggerProxy(server, std::move(connection), std::move(name), domain));
    registerLoggerToServer(server, domain, proxy);
    return proxy;
}

VoxLoggerProxy::VoxLoggerProxy(std::shared_ptr<LogServer> server, vox::connection connection,
                               std::string name, const std::string& domain)
    : LoggerBase(domain, std::move(server)),
      name_(std::move(name)),
      connection_(std::move(connection)) {}

VoxLoggerProxy::~VoxLoggerProxy() {
    if (getLogServer())
        getLogServer()->tidyUp(getLogDomain());
}

void VoxLoggerProxy::updateTrackedConfig(LogLevel level) {
    connection_.send_message(remote_log::levelMessage(level));
}

void VoxLoggerProxy::handleMessage(const vox::dict& message) {
    if (getLogServer() && vox::object(message[remote_log::kLogMessage]))
        log(message);
    else if (const vox::object level = message[remote_log::kLoggerLevel])
        setLogLevel(remote_log::asLevel(level));
    else if (message.contains(remote_log::kLoggerConfirm))
        confirm(message);
}

// Hot path: bench/log_remote.cpp.
void VoxLoggerProxy::log(const vox::dict& message) {
    getLogServer()->log(remote_log::decode(message, getLogDomain()));
    readNoFasterThanWritten(remote_log::costOf(message));
}

void VoxLoggerProxy::readNoFasterThanWritten(std::size_t bytes) {
    bytes_ += bytes;
    if (bytes_ < kMostBytesAhead)
        return;
    bytes_ = 0;
    connection_.suspend();
    whenWritten(*getLogServer(), [connection = connection_] { connection.resume(); });
}

void VoxLoggerProxy::confirm(const vox::dict& request) const {
    const vox::dict reply = remote_log::replyTo(request);
    if (reply && getLogServer())
        whenWritten(*getLogServer(),
                    [connection = connection_, reply] { connection.send_message(reply); });
}

}  // namespace plr
