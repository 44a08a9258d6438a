// Both serial transports, and the service of the platform beneath them.

#include <atomic>
#include <csignal>
#include <thread>

#include "io/serial_line.h"
#include "io/uart_device.h"

namespace {

using namespace plr::test;
using Got = OpenTransport::Got;

PelorinUARTTimeoutConfig timedConfig(const std::string& path, std::uint32_t queue = 4096) {
    PelorinUARTTimeoutConfig config{"", 123'456, 4096, queue, 0};
    path.copy(config.node, sizeof config.node - 1);
    return config;
}

bool createSerial(PelorinTransport* transport, const SerialLine& line) {
    device::path = line.path();
    return PelorinTransportCreateWithUART(transport, "modem", 123'456, 1, 4096);
}
bool createTimed(PelorinTransport* transport, const SerialLine& line) {
    const auto config = timedConfig(line.path());
    return PelorinTransportCreateWithUARTTimeout(transport, &config);
}
struct Kind {
    const char* name;
    bool (*create)(PelorinTransport*, const SerialLine&);
};
constexpr Kind kKinds[] = {{"serial", createSerial}, {"timed", createTimed}};

// Every flag that is touched is the other way round at first.
void upset(const SerialLine& line) {
    termios attributes = line.settings();
    attributes.c_iflag |= IXANY | IXOFF | IXON | ICRNL | ISTRIP | INPCK | BRKINT;
    attributes.c_iflag &= ~tcflag_t{IGNBRK};
    attributes.c_oflag |= OPOST;
    attributes.c_cflag &= ~tcflag_t{HUPCL | CLOCAL | CRTSCTS};
    attributes.c_cflag |= CSTOPB;
    attributes.c_lflag |= ECHO | ICANON | ISIG | IEXTEN;
    ASSERT_EQ(::tcsetattr(line.farEnd(), TCSANOW, &attributes), 0);
}

// The kernel's struct termios2, which shares no file with <termios.h>.
struct Speeds {
    std::uint32_t flags[4];
    std::uint8_t characters[20];
    std::uint32_t input, output;
};

TEST(Uart, SetsTheLineAsItShallBe) {
    struct Row {
        const char* name;
        bool timed;
        bool flowControl;
        cc_t minimum;
    };
    const Row rows[] = {{"serial", false, true, 7},
                        {"timed", true, true, 1},
                        {"timed without flow control", true, false, 1}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        const SerialLine line;
        upset(line);
        const termios before = line.settings();
        OpenTransport transport;
        device::path = line.path();
        auto config = timedConfig(line.path());
        config.disableFlowControl = !row.flowControl;
        ASSERT_TRUE(row.timed ? PelorinTransportCreateWithUARTTimeout(&transport, &config)
                              : PelorinTransportCreateWithUART(&transport, "modem", 123'456, 7, 0));
        const termios after = line.settings();
        EXPECT_EQ(after.c_iflag, (before.c_iflag & ~tcflag_t{IXANY | IXOFF | IXON | ICRNL | ISTRIP |
                                                             INPCK | BRKINT}) |
                                     IGNBRK);
        EXPECT_EQ(after.c_oflag, before.c_oflag & ~tcflag_t{OPOST});
        const tcflag_t speed = CBAUD | CBAUDEX;
        const tcflag_t flow = row.flowControl ? tcflag_t{CRTSCTS} : 0;
        EXPECT_EQ(after.c_cflag & ~speed,
                  ((before.c_cflag & ~(speed | CSTOPB)) | CS8 | CREAD | HUPCL | CLOCAL | flow));
        EXPECT_EQ(after.c_lflag, before.c_lflag & ~tcflag_t{ECHO | ICANON | ISIG | IEXTEN});
        EXPECT_EQ(after.c_cc[VMIN], row.minimum);
        Speeds speeds{};
        ASSERT_EQ(::ioctl(line.farEnd(), _IOR('T', 0x2A, Speeds), &speeds), 0);
        EXPECT_EQ(speeds.output, 123'456u);
        EXPECT_EQ(speeds.input, 123'456u);
    }
}

TEST(Uart, SaysWhyItCannotBeCreated) {
    struct Row {
        const char* name;
        bool timed;
        const char* path;  // null for a line
        std::uint32_t baud, minimumOrQueue;
        unsigned baudPercent;
        int threads;
        const char* text;
    };
    constexpr const char* kNoTerminal =
        "Failed to get termios options, ret = Inappropriate ioctl for device (25)\n";
    const Row rows[] = {
        {"no device", false, "/nowhere", 9600, 1, 100, -1,
         "failed to open node (/dev/uart.modem), ret = No such file or directory(2)\n"},
        {"no terminal", false, "/dev/null", 9600, 1, 100, -1, kNoTerminal},
        {"no rate", false, nullptr, 0, 1, 100, -1,
         "Failed to configure baud of 0, err = Invalid argument (22)\n"},
        {"other rate", false, nullptr, 9600, 1, 96, -1,
         "Failed to configure baud of 9600, err = Invalid argument (22)\n"},
        {"minimum", false, nullptr, 9600, 256, 100, -1,
         "Failed to configure VMIN of 256, err = Invalid argument (22)\n"},
        {"timed, no device", true, "/nowhere", 9600, 4096, 100, -1,
         "failed to open node (/nowhere), ret = No such file or directory(2)\n"},
        {"timed, no terminal", true, "/dev/null", 9600, 4096, 100, -1, kNoTerminal},
        {"timed, no rate", true, nullptr, 0, 4096, 100, -1,
         "Failed to configure baud of 0, err = Invalid argument (22)\n"},
        {"queue too large", true, nullptr, 9600, 0x40000, 100, -1,
         "Receive queue size 262144 exceeds max 131072\n"},
        {"queue odd", true, nullptr, 9600, 3000, 100, -1, "Capacity 3000 is not a power of two\n"},
        {"no thread", true, nullptr, 9600, 4096, 100, 0,
         "Failed to launch read worker, ret = Resource temporarily unavailable(11)\n"},
        {"one thread", true, nullptr, 9600, 4096, 100, 1,
         "Failed to launch write worker, ret = Resource temporarily unavailable(11)\n"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        const SerialLine line;
        DebugRecords texts;
        device::path = row.path ? row.path : line.path();
        device::baudPercent = row.baudPercent;
        device::threadsLeft = row.threads;
        OpenTransport transport;
        std::string first = "Creating with baud " + std::to_string(row.baud) + ", Rx Queue size 64";
        if (row.timed) {
            PelorinUARTTimeoutConfig config = timedConfig(device::path, row.minimumOrQueue);
            config.baud = row.baud;
            config.rxQueueSize = 64;
            EXPECT_FALSE(PelorinTransportCreateWithUARTTimeout(&transport, &config));
            first += ", local queue size " + std::to_string(row.minimumOrQueue);
        } else {
            EXPECT_FALSE(PelorinTransportCreateWithUART(&transport, "modem", row.baud,
                                                        row.minimumOrQueue, 64));
        }
        device::baudPercent = 100;
        device::threadsLeft = -1;
        EXPECT_EQ(texts.takeText(), first + "\n" + row.text);
        EXPECT_EQ(transport.free, nullptr);
    }
    OpenTransport transport;
    EXPECT_FALSE(
        PelorinTransportCreateWithUART(&transport, std::string(256, 'n').c_str(), 9600, 1, 0));
    for (const char* node : {"", "debug"}) {
        const auto config = timedConfig(node);
        device::path = "/nowhere";
        EXPECT_FALSE(PelorinTransportCreateWithUARTTimeout(&transport, &config));
        EXPECT_EQ(std::exchange(device::asked, ""), "/dev/uart.debug") << node;
    }
}

// Whatever is being done on it, and from whatever moment on.
TEST(Uart, EveryCallReturnsWhenTheLineIsUnplugged) {
    struct Call {
        const char* name;
        bool writes;
        void (*make)(OpenTransport&);
    };
    const Call calls[] = {
        {"read", false, [](OpenTransport& t) { EXPECT_FALSE(t.get(4).first); }},
        {"write", true, [](OpenTransport& t) { EXPECT_FALSE(t.put(std::string(1 << 20, 'w'))); }},
        // Until it finds the line gone.
        {"flush", false,
         [](OpenTransport& t) { EXPECT_TRUE(eventually([&] { return !t.flushRead(&t); })); }},
        {"teardown", false, [](OpenTransport& t) { EXPECT_TRUE(PelorinTransportFree(&t)); }}};
    DebugRecords texts;
    for (const Kind& kind : kKinds) {
        for (const Call& call : calls) {
            SCOPED_TRACE(std::string(kind.name) + ", " + call.name);
            SerialLine line;
            OpenTransport transport;
            ASSERT_TRUE(kind.create(&transport, line));
            Event returned;
            std::thread caller([&] {
                call.make(transport);
                returned.signal();
            });
            if (call.writes) {
                EXPECT_TRUE(line.awaitOutput());
            }
            line.unplug();
            EXPECT_TRUE(returned.wait());
            caller.join();
            if (transport.state) {
                EXPECT_EQ(transport.get(1), (Got{false, ""}));
                EXPECT_FALSE(transport.put("AT"));
                // The serial transport tells whether it has a port, the timed one
                // whether it has a line.
                EXPECT_EQ(transport.isValid(&transport), kind.create == createSerial);
            }
        }
    }
}

TEST(Uart, ReadsAndWritesGoOnAfterSignals) {
    static std::atomic<int> came;
    struct sigaction count {};
    count.sa_handler = [](int) { ++came; };  // without SA_RESTART
    ::sigaction(SIGUSR1, &count, nullptr);
    const SerialLine line;
    OpenTransport transport;
    ASSERT_TRUE(createSerial(&transport, line));
    std::thread user([&] {
        EXPECT_EQ(transport.get(1), (Got{true, "x"}));
        EXPECT_TRUE(transport.put(std::string(1 << 16, 'w')));
    });
    const auto interrupt = [&] {
        const int before = came;
        EXPECT_TRUE(eventually([&] {
            ::pthread_kill(user.native_handle(), SIGUSR1);
            return came > before;
        }));
    };
    for (int i = 0; i < 5; ++i)
        interrupt();
    line.send("x");
    EXPECT_TRUE(line.awaitOutput());
    for (int i = 0; i < 5; ++i)
        interrupt();
    EXPECT_EQ(line.receive(1 << 16), std::string(1 << 16, 'w'));
    user.join();
}

TEST(Uart, ReadMinimumIsThatOfTheCaller) {
    const SerialLine line;
    device::path = line.path();
    OpenTransport transport;
    ASSERT_TRUE(PelorinTransportCreateWithUART(&transport, "modem", 9600, 10, 0));
    line.send("AB");
    EXPECT_EQ(transport.get(2), (Got{true, "AB"})) << "less than the minimum was asked for";
    EXPECT_EQ(line.settings().c_cc[VMIN], 10);
    line.send("ABCDEF");
    ASSERT_TRUE(eventually([&] { return line.unread() == 6; }));
    std::thread sender([&] { line.send("GHIJ"); });
    EXPECT_EQ(transport.get(100), (Got{true, "ABCDEFGHIJ"}));
    sender.join();
    EXPECT_FALSE(transport.get(1, true).first) << "reads to completion are none of it";

    line.send(std::string(2000, 'x'));
    ASSERT_TRUE(eventually([&] { return line.unread() == 2000; }));
    EXPECT_TRUE(transport.flushRead(&transport));
    EXPECT_EQ(line.unread(), 0);
    EXPECT_EQ(line.settings().c_cc[VMIN], 10);

    OpenTransport eager;
    ASSERT_TRUE(PelorinTransportCreateWithUART(&eager, "modem", 9600, 0, 0));
    EXPECT_EQ(eager.get(4), (Got{true, ""}));
}

TEST(Uart, DiscardsTheQueuesOfTheDriver) {
    SerialLine line;
    OpenTransport transport;
    ASSERT_TRUE(createSerial(&transport, line));
    line.send("input");
    ASSERT_TRUE(eventually([&] { return line.unread() == 5; }));
    EXPECT_TRUE(PelorinTransportUARTFlushInput(&transport));
    EXPECT_EQ(line.unread(), 0);
    const int before = device::discarded;
    EXPECT_TRUE(PelorinTransportUARTFlushOutput(&transport));
    EXPECT_EQ(device::discarded, before + 1);
    line.unplug();
    DebugRecords texts;
    EXPECT_FALSE(PelorinTransportUARTFlushInput(&transport));
    EXPECT_FALSE(PelorinTransportUARTFlushOutput(&transport));
    EXPECT_EQ(texts.takeText(),
              "Failed to read flush, err = Input/output error (5)\n"
              "Failed to write flush, err = Input/output error (5)\n");
}

TEST(Uart, ClosingGivesUpOnALineThatTakesNothing) {
    struct Row {
        const char* name;
        int (*unsent)();
        bool discards;
    };
    static int left;
    const Row rows[] = {{"stuck", [] { return 4000; }, true},
                        {"slow", [] { return --left; }, false}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        const SerialLine line;
        OpenTransport transport;
        ASSERT_TRUE(createSerial(&transport, line));
        left = 40;
        device::unsent = row.unsent;
        const int before = device::discarded;
        EXPECT_TRUE(PelorinTransportFree(&transport));
        device::unsent = nullptr;
        EXPECT_EQ(device::discarded > before, row.discards);
    }
}

TEST(Uart, DescriptorZeroIsNoPortAndStaysOpen) {
    const int standardInput = ::dup(0);
    for (const Kind& kind : kKinds) {
        SCOPED_TRACE(kind.name);
        const SerialLine line;
        OpenTransport transport;
        ::close(0);
        EXPECT_FALSE(kind.create(&transport, line));
        EXPECT_EQ(::fcntl(0, F_GETFD), FD_CLOEXEC);
    }
    ::dup2(standardInput, 0);
    ::close(standardInput);
}

}  // namespace
