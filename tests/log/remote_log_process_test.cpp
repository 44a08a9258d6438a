// A log server that is killed again and again while other processes log into
// it: nothing is lost uncounted, nothing out of order.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/wait.h>

#include <charconv>
#include <csignal>
#include <random>

#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/vox_log_server.h"
#include "plr/log/vox_logger.h"
#include "support/function_log_writer.h"
#include "support/runtime.h"
#include "support/sanitized.h"
#include "support/scratch_folder.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;

constexpr const char* kName = "net.example.log";
constexpr int kClients = 4;
constexpr int kServers = 21;  // one after the other; all but the last are killed at work
constexpr int kPortion = kSanitized ? 240 : 2'400;  // messages of a client that a server begins
constexpr int kSent = kServers * kPortion;          // by each client: 50,400
constexpr std::size_t kBuffer = kPortion / 3;

// What the processes tell each other.
struct Shared {
    std::atomic<int> written = 0;  // by the present server, of the clients' messages
    struct Client {
        std::atomic<int> level = 0;      // that it was told last
        std::atomic<long> dropped = -1;  // -1 until it is done
    };
    std::array<Client, kClients> clients;
};

class Process {
  public:
    // Only this thread may exist. `body` never returns.
    explicit Process(const std::function<void()>& body) : pid_(::fork()) {
        if (pid_ == 0) {
            body();
            ::_exit(3);
        }
    }
    ~Process() {
        ::kill(pid_, SIGKILL);
        EXPECT_EQ(::waitpid(pid_, nullptr, 0), pid_);
    }
    Process(const Process&) = delete;
    Process& operator=(const Process&) = delete;

  private:
    const pid_t pid_;
};

// Hands `level` down to the clients.
[[noreturn]] void serve(const std::string& file, int level, Shared& shared) {
    const auto log = LogServer::create("server");
    const int fd = ::open(file.c_str(), O_CREAT | O_WRONLY | O_APPEND | O_CLOEXEC, 0600);
    log->addWriter(std::make_shared<FunctionLogWriter>([fd, &shared](const LogMessage& message) {
        const std::string line = message.getDomain() + " " + message.getText() + "\n";
        if (::write(fd, line.data(), line.size()) != static_cast<ssize_t>(line.size()))
            std::abort();
        if (message.getDomain().starts_with("client."))
            ++shared.written;
    }));
    log->start();
    const vox::dict levels = vox::dict::create(), config = vox::dict::create();
    levels["client"] = vox::int64(level);
    config["kDomainLogLevels"] = levels;
    log->updateConfig(config);
    const auto remote = VoxLogServer::create(log, "remote", "remote");
    remote->startListeningOn(vox::listener::create(kName));
    for (;;)
        ::pause();
}

class Client {
  public:
    Client(int number, Shared::Client& told)
        : told_(told),
          logger_(VoxLogger::create(queue_, "client", "client." + std::to_string(number),
                                    vox::connection::create(kName))) {
        logger_->limitBuffer(kBuffer, 1 << 20);
        logger_->setInvalidationCallback(dispatch::block<void()>([this] {
            queue_.after(dispatch::time::after(std::chrono::milliseconds(1)),
                         dispatch::block<void()>(
                             [this] { logger_->reconnect(vox::connection::create(kName)); }));
        }));
    }

    // Each portion begins when its server has handed its level down.
    [[noreturn]] void run(bool pauses) {
        for (int i = 0; i < kSent; ++i) {
            if (i % kPortion == 0)
                lookUntil([&] { return told_.level > i / kPortion; });
            if (pauses)
                lookUntil([this] { return logger_->getHeldMessageCount() <= kBuffer / 2; });
            look();
            logger_->forceLog(LogLevel::Info, LogMessageBuffer() << i);
        }
        lookUntil([this] { return logger_->getHeldMessageCount() == 0; });
        told_.dropped = static_cast<long>(logger_->getDroppedMessageCount());
        for (;;)
            ::pause();
    }

  private:
    void look() { told_.level = static_cast<int>(logger_->getInheritedLogLevel()); }
    template <class Condition>
    void lookUntil(Condition condition) {
        if (!eventually([&] {
                look();
                return condition();
            }))
            std::abort();
    }

    Shared::Client& told_;
    const dispatch::queue queue_ = dispatch::queue::create("client");
    const std::shared_ptr<plr::VoxLogger> logger_;
};

// One client's messages, through the files of all servers. In each file they
// begin at or before the first that was never seen, and then go on without a gap
// that no note tells.
class Reader {
  public:
    void beginFile() {
        // A file without a message of this client's decides nothing.
        if (!isFirst_)
            carried_ = {0};
        for (std::size_t i = carried_.size(); i-- > 0;)
            carried_.push_back(carried_[i] + noted_);
        noted_ = 0;
        isFirst_ = true;
    }
    void read(const std::string& text) {
        int value = 0;
        const std::string note = "Note: ";
        const char* begin = text.data() + (text.starts_with(note) ? note.size() : 0);
        const auto [end, error] = std::from_chars(begin, text.data() + text.size(), value);
        ASSERT_EQ(error, std::errc()) << text;
        if (begin == text.data())
            return readMessage(value);
        EXPECT_STREQ(end, " log messages dropped, too many were waiting");
        noted_ += value;
    }
    void end() {
        ASSERT_TRUE(isNoted(kSent - next_));
        dropped += kSent - next_;
    }

    int delivered = 0, repeated = 0, dropped = 0;

  private:
    void readMessage(int number) {
        const bool follows =
            isFirst_ ? number <= next_ || isNoted(number - next_) : number == at_ + noted_;
        ASSERT_TRUE(follows) << number << " after " << (isFirst_ ? next_ : at_);
        isFirst_ = false;
        noted_ = 0;
        at_ = number + 1;
        if (number < next_) {
            ++repeated;
            return;
        }
        dropped += number - next_;
        ++delivered;
        next_ = number + 1;
    }
    // By the notes behind the last message. Those of an earlier file come again,
    // unless they were confirmed.
    bool isNoted(int gap) const {
        return std::ranges::any_of(carried_, [this, gap](int carried) {
            return gap == carried || gap == carried + noted_;
        });
    }

    int next_ = 0;                 // the first that was never seen
    int at_ = 0;                   // behind the last of this file
    int noted_ = 0;                // by notes since then
    std::vector<int> carried_{0};  // what it may have been at the end of the file before
    bool isFirst_ = true;
};

void read(const std::string& file, std::array<Reader, kClients>& readers) {
    for (Reader& reader : readers)
        reader.beginFile();
    const std::string prefix = "client.";
    std::ifstream lines(file);
    for (std::string line; std::getline(lines, line);)
        if (line.starts_with(prefix))
            readers.at(static_cast<std::size_t>(line[prefix.size()] - '0'))
                .read(line.substr(prefix.size() + 2));
}

TEST(RemoteLogProcess, KilledServersLoseNothingUncounted) {
    const RuntimeDirectory runtime;
    const ScratchFolder folder;
    void* const memory =
        ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(memory, MAP_FAILED);
    Shared& shared = *new (memory) Shared;
    const auto file = [&folder](int server) { return folder.at(std::to_string(server)); };
    std::array<std::unique_ptr<Process>, kClients> clients;
    for (int i = 0; i < kClients; ++i) {
        auto& told = shared.clients.at(static_cast<std::size_t>(i));
        clients.at(static_cast<std::size_t>(i)) =
            std::make_unique<Process>([&] { Client(i, told).run(i % 2 == 0); });
    }

    std::mt19937 random(2026);
    for (int i = 0; i < kServers; ++i) {
        shared.written = 0;
        const Process server([&] { serve(file(i), i + 1, shared); });
        for (const Shared::Client& client : shared.clients)
            ASSERT_TRUE(eventually([&] { return client.level == i + 1; })) << "server " << i;
        // At any time while the two clients that pause deliver their portions.
        const int when = static_cast<int>(random() % (2 * kPortion));
        ASSERT_TRUE(eventually([&] { return shared.written >= when; })) << "server " << i;
        for (const Shared::Client& client : shared.clients) {
            const auto isDone = [&] { return i + 1 < kServers || client.dropped >= 0; };
            ASSERT_TRUE(eventually(isDone));
        }
    }

    std::array<Reader, kClients> readers;
    for (int i = 0; i < kServers; ++i)
        read(file(i), readers);
    for (std::size_t i = 0; i < kClients; ++i) {
        Reader& reader = readers.at(i);
        reader.end();
        EXPECT_EQ(reader.delivered + reader.dropped, kSent);
        EXPECT_EQ(reader.dropped, shared.clients.at(i).dropped);
        EXPECT_TRUE(i % 2 == 1 || reader.dropped == 0) << "who pauses loses nothing";
        std::printf("client %zu: sent %d, delivered %d, dropped %d, repeated %d\n", i, kSent,
                    reader.delivered, reader.dropped, reader.repeated);
    }
    clients = {};
    ::munmap(memory, sizeof(Shared));
}

}  // namespace
