#include "plr/log/console_log_writer.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <poll.h>
#include <pty.h>
#include <sys/socket.h>
#include <termios.h>
#include <unistd.h>

#include <cstdlib>
#include <numeric>

#include "plr/ipc/read.h"
#include "support/log_records.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

// Two connected descriptors: what is written to one, a reader gets at the other.
struct Ends {
    int reader = -1, writer = -1;

    ~Ends() {
        ::close(writer);
        hangUp();
    }
    void hangUp() { ::close(std::exchange(reader, -1)); }
    // Everything up to and including `last`.
    [[nodiscard]] std::string readTo(const std::string& last) const {
        std::string all;
        char bytes[4096];
        pollfd ready{reader, POLLIN, 0};
        const auto bound = std::chrono::milliseconds(kBound).count();
        while (!all.ends_with(last)) {
            if (::poll(&ready, 1, static_cast<int>(bound)) != 1) {
                ADD_FAILURE() << "nothing more came behind " << all.size() << " bytes";
                break;
            }
            const ssize_t length = ::read(reader, bytes, sizeof bytes);
            if (length <= 0)
                break;
            all.append(bytes, static_cast<std::size_t>(length));
        }
        return all;
    }
};

void makePipe(Ends& ends) {
    int fds[2];
    ASSERT_EQ(::pipe2(fds, O_CLOEXEC), 0);
    ends.reader = fds[0];
    ends.writer = fds[1];
}
void makeSocket(Ends& ends) {
    int fds[2];
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds), 0);
    ends.reader = fds[0];
    ends.writer = fds[1];
}
void makeTerminal(Ends& ends) {
    termios raw{};
    ::cfmakeraw(&raw);
    ASSERT_EQ(::openpty(&ends.reader, &ends.writer, nullptr, &raw, nullptr), 0);
}

struct Kind {
    const char* name;
    void (*make)(Ends&);
};
constexpr Kind kKinds[] = {{"pipe", makePipe}, {"socket", makeSocket}, {"terminal", makeTerminal}};

std::int64_t dropped(ConsoleLogWriter& writer) {
    const vox::dict config(writer.getFullConfig());
    return vox::dyn_cast_or_default(config["kDropped"], std::int64_t{-1});
}

TEST(ConsoleLogWriter, ColoursForTerminalsOnly) {
    struct Row {
        const char* name;
        void (*make)(Ends&);
        const char *term, *noColour, *force;
        const char* expected;
    };
    constexpr const char* kPlain = "E d: text\n";
    constexpr const char* kColoured = "\x1b[31mE d\x1b[0m: text\n";
    const Row rows[] = {{"terminal", makeTerminal, "xterm", "", "", kColoured},
                        {"dumb terminal", makeTerminal, "dumb", "", "", kPlain},
                        {"no TERM", makeTerminal, "", "", "", kPlain},
                        {"NO_COLOR and force", makeTerminal, "xterm", "1", "1", kPlain},
                        {"pipe", makePipe, "xterm", "", "0", kPlain},
                        {"forced pipe", makePipe, "", "", "1", kColoured}};
    for (const Row& row : rows) {
        ::setenv("TERM", row.term, 1);
        ::setenv("NO_COLOR", row.noColour, 1);
        ::setenv("CLICOLOR_FORCE", row.force, 1);
        Ends ends;
        row.make(ends);
        const auto writer = ConsoleLogWriter::create({.descriptor = ends.writer, .utc = true});
        writer->write(logMessage("text", LogLevel::Error));
        writer->endBatch();
        const char* time =
            row.make == makeTerminal ? "00:00:00.000000 " : "1970-01-01 00:00:00.000000+00:00 ";
        EXPECT_EQ(ends.readTo("text\n"), std::string(time) + row.expected) << row.name;
    }
    for (const char* name : {"TERM", "NO_COLOR", "CLICOLOR_FORCE"})
        ::unsetenv(name);
}

TEST(ConsoleLogWriter, DropsAndCountsForAReaderThatIsStalled) {
    for (const Kind& kind : kKinds) {
        SCOPED_TRACE(kind.name);
        Ends ends;
        kind.make(ends);
        const auto writer = ConsoleLogWriter::create({.descriptor = ends.writer});
        // Returns without a reader: nobody waits for ever.
        int written = 0;
        while (dropped(*writer) == 0) {
            for (int i = 0; i < 100; ++i)
                writer->write(logMessage(std::to_string(written++) + std::string(200, '.')));
            writer->endBatch();
        }
        EXPECT_EQ(::fcntl(ends.writer, F_GETFL) & O_NONBLOCK, 0);

        // A timer goes on by itself when there is room.
        const auto texts = textsOfRecords(ends.readTo("nobody read them\n"));
        const std::int64_t missing = dropped(*writer);
        EXPECT_EQ(texts.back(),
                  "Note: " + std::to_string(missing) + " log messages dropped, nobody read them");
        ASSERT_EQ(static_cast<std::int64_t>(texts.size()) - 1 + missing, written);
        for (std::size_t i = 0; i + 1 < texts.size(); ++i)
            ASSERT_THAT(texts[i], StartsWith(std::to_string(i) + "."));
        writer->write(logMessage("again"));
        writer->endBatch();
        EXPECT_THAT(ends.readTo("again\n"), Not(HasSubstr("Note")));
    }
}

TEST(ConsoleLogWriter, OutlivesItsReader) {
    for (const Kind& kind : kKinds) {
        SCOPED_TRACE(kind.name);
        Ends ends;
        kind.make(ends);
        const auto writer = ConsoleLogWriter::create({.descriptor = ends.writer});
        ends.hangUp();
        dispatch::group flushed;
        for (int i = 0; i < 3; ++i) {
            writer->write(logMessage("text"));
            writer->flush(dispatch::group_session(flushed));
        }
        EXPECT_EQ(flushed.wait(dispatch::time::after(kBound)), 0);
        EXPECT_EQ(dropped(*writer), 3);
    }
}

}  // namespace
