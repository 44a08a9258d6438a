// The timed serial transport: its queues, its threads, its end.

#include <array>
#include <atomic>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <functional>
#include <thread>

#include "io/serial_line.h"
#include "support/sanitized.h"

namespace {

namespace fs = std::filesystem;
using namespace plr::test;
using Got = OpenTransport::Got;

void create(OpenTransport& transport, const SerialLine& line, std::uint32_t queue = 4096) {
    PelorinUARTTimeoutConfig config{"", 115'200, 0, queue, 0};
    line.path().copy(config.node, sizeof config.node - 1);
    ASSERT_TRUE(PelorinTransportCreateWithUARTTimeout(&transport, &config));
}

std::size_t entries(const char* folder) {
    const fs::directory_iterator all(folder);
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

std::string fileText(const fs::path& path) {
    std::ifstream file(path);
    return {std::istreambuf_iterator<char>(file), {}};
}

// A thread of the test's that makes one call and tells when it sleeps in it.
class Caller {
  public:
    explicit Caller(std::function<void()> call)
        : thread_([this, call] {
              id_ = ::gettid();
              call();
              returned_ = true;
          }) {}
    Caller(const Caller&) = delete;
    Caller& operator=(const Caller&) = delete;
    ~Caller() {
        EXPECT_TRUE(eventually([&] { return returned_.load(); }));
        thread_.join();
    }
    bool sleeps() const {
        const auto stat = fileText("/proc/self/task/" + std::to_string(id_) + "/stat");
        return id_ != 0 && stat.find(") S ") != std::string::npos;
    }
    [[nodiscard]] bool awaitSleep() const {
        return eventually([&] { return sleeps(); });
    }
    bool returned() const { return returned_; }

  private:
    std::atomic<pid_t> id_{0};
    std::atomic<bool> returned_{false};
    std::thread thread_;
};

TEST(TimedUart, ReadsReachTheirTargetOrTellSo) {
    const SerialLine line;
    OpenTransport transport;
    create(transport, line);
    EXPECT_EQ(transport.get(4, false, 0), (Got{false, ""}));
    line.send("ABCD");
    EXPECT_EQ(transport.get(1), (Got{true, "A"}));
    EXPECT_EQ(transport.get(2, true), (Got{true, "BC"}));
    EXPECT_EQ(transport.get(4, false, 0), (Got{true, "D"}));
    line.send("EF");
    std::string got;
    while (got.size() < 2) {
        const Got more = transport.get(4, true, 1);
        EXPECT_FALSE(more.first);
        got += more.second;
    }
    EXPECT_EQ(got, "EF") << "a time-out keeps what came";
    EXPECT_EQ(transport.get(0), (Got{true, ""}));

    std::thread sender([&] {
        for (int i = 0; i < 100; ++i)
            line.send("0123456789");
    });
    std::string text;
    for (int i = 0; i < 100; ++i)
        text += "0123456789";
    EXPECT_EQ(transport.get(1000, true), (Got{true, text}));
    sender.join();
    line.send("late");
    EXPECT_EQ(transport.get(1), (Got{true, "l"}));
    ASSERT_TRUE(eventually([&] { return line.unread() == 0; }));
    EXPECT_TRUE(transport.flushRead(&transport));
    EXPECT_EQ(transport.get(4, false, 0), (Got{false, ""}));
}

TEST(TimedUart, FullQueueHoldsTheLine) {
    SerialLine line;
    OpenTransport transport;
    create(transport, line, 16);
    std::string sent;
    for (char c = ' '; c < 0x7f; ++c)
        sent += c;
    line.send(sent);
    // The rest stays with the driver until there is room.
    ASSERT_TRUE(eventually([&] { return line.unread() == std::ssize(sent) - 16; }));
    EXPECT_EQ(transport.get(16, true), (Got{true, sent.substr(0, 16)}));
    EXPECT_EQ(transport.get(static_cast<std::uint32_t>(sent.size() - 16), true),
              (Got{true, sent.substr(16)}));

    // Deliberate: the queue does not wrap within one chunk.
    // Each wait makes sure that what was read before is in the queue.
    sent.resize(43);
    const auto awaitUnread = [&](int left) {
        return eventually([&] { return line.unread() == left; });
    };
    line.send(sent);
    ASSERT_TRUE(awaitUnread(27));
    EXPECT_EQ(transport.get(12, true), (Got{true, sent.substr(0, 12)}));
    ASSERT_TRUE(awaitUnread(15));
    EXPECT_EQ(transport.get(1, true), (Got{true, sent.substr(12, 1)}));
    ASSERT_TRUE(awaitUnread(14));  // the queue is full and begins at 13 of its 16 bytes
    EXPECT_EQ(transport.get(8, true), (Got{true, sent.substr(13, 8)}));
    ASSERT_TRUE(awaitUnread(1));  // three of eight bytes were kept, then five more came
    EXPECT_EQ(transport.get(17, true), (Got{true, sent.substr(21, 11) + sent.substr(37, 6)}));

    line.send(sent.substr(0, 20));
    ASSERT_TRUE(awaitUnread(4));
    line.unplug();
    EXPECT_TRUE(eventually([&] { return !transport.isValid(&transport); }));
    EXPECT_EQ(transport.get(16, true), (Got{true, sent.substr(0, 16)}));
    EXPECT_EQ(transport.get(1), (Got{false, ""}));
}

TEST(TimedUart, UnblockEndsAllReadsThatWait) {
    const SerialLine line;
    OpenTransport transport;
    create(transport, line);
    {
        const auto read = [&] { EXPECT_EQ(transport.get(4, true), (Got{false, ""})); };
        const Caller readers[] = {Caller(read), Caller(read), Caller(read)};
        for (const Caller& reader : readers)
            EXPECT_TRUE(reader.awaitSleep());
        EXPECT_TRUE(transport.unblockRead(&transport));
    }
    const Caller reader([&] { EXPECT_EQ(transport.get(2, true), (Got{true, "OK"})); });
    EXPECT_TRUE(reader.awaitSleep());
    line.send("OK");
}

TEST(TimedUart, WritesKeepTheirOrder) {
    constexpr int kWriters = 4, kWrites = 100;
    constexpr std::size_t kLength = 300;
    const auto block = [](int writer, int number) {
        std::string text = std::to_string(writer) + " " + std::to_string(number) + " ";
        return text + std::string(kLength - text.size(), static_cast<char>('a' + writer));
    };
    const SerialLine line;
    OpenTransport transport;
    create(transport, line);
    const Threads writers(kWriters, [&](unsigned writer) {
        for (int i = 0; i < kWrites; ++i)
            EXPECT_TRUE(transport.put(block(static_cast<int>(writer), i)));
    });
    int next[kWriters] = {};
    for (int i = 0; i < kWriters * kWrites; ++i) {
        const std::string got = line.receive(kLength);
        const int writer = got[0] - '0';
        ASSERT_TRUE(writer >= 0 && writer < kWriters) << got;
        ASSERT_EQ(got, block(writer, next[writer]++));
    }
}

TEST(TimedUart, FullLineDelaysNobodyAndItsWritersFailAtTheEnd) {
    for (const bool flush : {false, true}) {
        SCOPED_TRACE(flush ? "flush" : "free");
        const SerialLine line;
        OpenTransport transport;
        create(transport, line);
        DebugRecords texts;
        {
            const auto write = [&] { EXPECT_FALSE(transport.put(std::string(1 << 20, 'w'))); };
            const Caller inMidWrite(write);
            EXPECT_TRUE(line.awaitOutput());
            const Caller second(write), third(write);
            line.send("OK");
            EXPECT_EQ(transport.get(2, true), (Got{true, "OK"}));
            EXPECT_EQ(transport.get(2, true, 0), (Got{false, ""}));
            {
                const Caller reader([&] { EXPECT_EQ(transport.get(2), (Got{false, ""})); });
                EXPECT_TRUE(reader.awaitSleep());
                EXPECT_TRUE(transport.unblockRead(&transport));
            }
            EXPECT_TRUE(transport.isValid(&transport));
            EXPECT_TRUE(second.awaitSleep() && third.awaitSleep());
            EXPECT_FALSE(inMidWrite.returned() || second.returned() || third.returned());
            EXPECT_TRUE(flush ? transport.flushRead(&transport) : PelorinTransportFree(&transport));
        }
        EXPECT_EQ(texts.takeText(), flush ? "Flushing\n" : "Freeing\n");
        if (!flush)
            continue;
        ASSERT_TRUE(PelorinTransportFree(&transport));
        create(transport, line);
        static_cast<void>(::tcflush(line.farEnd(), TCIFLUSH));
        line.send("again");
        EXPECT_EQ(transport.get(5, true), (Got{true, "again"}));
    }
}

TEST(TimedUart, EndsWithReadersInside) {
    const SerialLine line;
    OpenTransport transport;
    create(transport, line);
    const auto read = [&] { EXPECT_EQ(transport.get(4, true), (Got{false, ""})); };
    const Caller first(read), second(read);
    EXPECT_TRUE(first.awaitSleep() && second.awaitSleep());
    EXPECT_TRUE(PelorinTransportFree(&transport));
}

TEST(TimedUart, LeavesSignalsToTheProgram) {
    const SerialLine line;
    OpenTransport transport;
    create(transport, line);
    const auto count = [](bool termBlocked) {
        std::size_t workers = 0;
        for (const auto& task : fs::directory_iterator("/proc/self/task")) {
            const std::string status = fileText(task.path() / "status");
            const auto mask = std::stoull(status.substr(status.find("SigBlk:") + 7), nullptr, 16);
            workers += status.starts_with("Name:\tplr-uart-") &&
                       (mask >> (SIGTERM - 1) & 1) == termBlocked;
        }
        return workers;
    };
    EXPECT_TRUE(eventually([&] { return count(true) == 2; }));
    EXPECT_EQ(count(false), 0u);
}

// Bytes in both directions, as many as the line takes, until its scope ends.
class Traffic {
  public:
    explicit Traffic(const SerialLine& line)
        : thread_([this, fd = line.farEnd()] {
              std::array<char, 512> bytes{};
              pollfd state{fd, POLLIN, 0};
              while (!over_) {
                  static_cast<void>(!::write(fd, bytes.data(), bytes.size()));
                  static_cast<void>(!::read(fd, bytes.data(), bytes.size()));
                  ::poll(&state, 1, 1);
              }
          }) {}
    Traffic(const Traffic&) = delete;
    Traffic& operator=(const Traffic&) = delete;
    ~Traffic() {
        over_ = true;
        thread_.join();
    }

  private:
    std::atomic<bool> over_{false};
    std::thread thread_;
};

TEST(TimedUart, LeavesNothingBehind) {
    const int cycles = kSanitized ? 500 : 10'000;
    const SerialLine line;
    const Traffic traffic(line);
    DebugRecords texts;
    const std::size_t threads = entries("/proc/self/task");
    const std::size_t descriptors = entries("/proc/self/fd");
    for (int i = 0; i < cycles; ++i) {
        OpenTransport transport;
        create(transport, line, 1024);
        ASSERT_TRUE(transport.put("traffic"));
        static_cast<void>(transport.get(100, false, 0));
        ASSERT_TRUE(PelorinTransportFree(&transport));
        ASSERT_EQ(texts.takeText().find("ailed"), std::string::npos);
    }
    EXPECT_EQ(entries("/proc/self/fd"), descriptors);
    // A thread that was joined may be seen a moment longer.
    EXPECT_TRUE(eventually([&] { return entries("/proc/self/task") <= threads; }));
}

}  // namespace
