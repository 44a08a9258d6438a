// A program that logs, for kel_journald_test.py.
//
//   kel_writer text IDENT FILE...          one message a file: its bytes
//   kel_writer count IDENT COUNT PAUSE_US BACKLOG
//
// "count" logs "seq 0", "seq 1" …, says "halfway" and "written" on its standard
// output, then waits for the end of its standard input and for its backlog, and
// prints how many messages were sent and dropped.
#include <unistd.h>

#include <charconv>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>

#include "kel/kel.h"
#include "plr/log/kel_log_writer.h"

namespace {

constexpr unsigned kBound = 120'000;  // ms

unsigned long numberOf(const char* text) {
    unsigned long number = 0;
    std::from_chars(text, text + std::strlen(text), number);
    return number;
}

int logFiles(const char* ident, char** files) {
    const auto writer = plr::KelLogWriter::create(ident, nullptr, 0);
    writer->setMsgParams({{"any bytes", std::string("a\n\0\xff", 4)}});
    for (; *files; files++) {
        std::ifstream file(*files, std::ios::binary);
        std::string text{std::istreambuf_iterator<char>(file), {}};
        writer->write(
            plr::LogMessage(1'500'000'000, plr::LogLevel::Warn, "radio.sms", std::move(text), {}));
    }
    return 0;
}

void say(const char* word) {
    std::puts(word);
    std::fflush(stdout);
}

int logCount(const char* ident, unsigned long count, unsigned long pause, unsigned long backlog) {
    const kel_client_t client = kel_open(ident, "daemon", 0);
    kel_set_limits(client, {backlog, KEL_DEFAULT_BYTES, KEL_DEFAULT_PATIENCE_MS});
    const kel_message_t message = kel_new(0);
    for (unsigned long i = 0; i < count; i++) {
        kel_set(message, "Message", ("seq " + std::to_string(i)).c_str());
        kel_send(client, message);
        if (i == count / 2)
            say("halfway");
        if (pause > 0)
            ::usleep(static_cast<useconds_t>(pause));
    }
    kel_free(message);
    say("written");
    while (std::getchar() != EOF) {
    }
    const bool empty = kel_flush(client, kBound) != 0;
    const kel_statistics result = kel_get_statistics(client);
    std::printf("%lu %lu\n", static_cast<unsigned long>(result.sent),
                static_cast<unsigned long>(result.dropped));
    return kel_close(client) == 0 && empty ? 0 : 1;
}

}  // namespace

int main(int count, char** arguments) {
    const std::string mode = count > 2 ? arguments[1] : "";
    if (mode == "text")
        return logFiles(arguments[2], arguments + 3);
    if (mode == "count" && count == 6)
        return logCount(arguments[2], numberOf(arguments[3]), numberOf(arguments[4]),
                        numberOf(arguments[5]));
    return 2;
}
