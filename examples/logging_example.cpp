#include <iostream>
#include <memory>

#include "plr/ipc.h"
#include "plr/log.h"

using plr::LogLevel;

// A writer of one's own: each message that was logged arrives here, in order, on
// the log server's writers queue.
class PlainWriter : public plr::LogWriter {
  public:
    using LogWriter::write;
    void write(const plr::LogMessage& message) override {
        std::cout << message.getLevel() << ' ' << message.getDomain() << ": " << message.getText()
                  << '\n';
    }
    void close() override {}
};

// An object with a queue and a logger; "radio.modem" is the logger's domain.
class Modem : public plr::SharedLoggable<Modem> {
  public:
    static std::shared_ptr<Modem> create(std::shared_ptr<plr::LogServer> server) {
        return make_shared_ptr(new Modem(std::move(server)));
    }
    void setVolume(int volume) {
        execute_wrapped_sync([this, volume] {
            if (enabled(LogLevel::Debug))
                forceLog(LogLevel::Debug, plr::LogMessageBuffer() << "volume " << volume);
        });
    }

  private:
    explicit Modem(std::shared_ptr<plr::LogServer> server)
        : SharedLoggable("modem", "radio.modem", std::move(server)) {}
};

void setLevel(plr::LogServer& server, const char* domain, LogLevel level) {
    const auto levels = vox::dict::create(), config = vox::dict::create();
    levels[domain] = vox::int64(static_cast<int>(level));
    config["kDomainLogLevels"] = levels;
    server.updateConfig(config);
    server.debugFlush();  // it is in force now
}

int main() {
    const auto server = plr::LogServer::create("example");
    server->addWriter(std::make_shared<PlainWriter>());
    server->start();
    const plr::ScopedLogFlusher flusher(server);  // what is logged is out before main() ends

    const auto modem = Modem::create(server);
    modem->setVolume(1);  // not logged: Info is the level where nothing is configured
    setLevel(*server, "radio", LogLevel::Debug);
    modem->setVolume(2);  // "Debug radio.modem: volume 2"
}
