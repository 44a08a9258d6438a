#include "kel/kel.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <utility>

#include "platform/linux/kel/client.h"

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kCloseBound(100);

// The process's own, never closed.
kel_client_t ownClient() {
    static const kel_client_t client = kel_open(nullptr, nullptr, 0);
    return client;
}

[[gnu::format(printf, 2, 0)]] void sendFormatted(int priority, const char* format,
                                                 va_list arguments) {
    static constexpr const char* kLevels[] = {"Emergency", "Alert",  "Critical", "Error",
                                              "Warning",   "Notice", "Info",     "Debug"};
    char* text = nullptr;
    const int length = ::vasprintf(&text, format, arguments);
    if (length < 0)
        return;
    const kel_message_t message = kel_new(0);
    kel_set(message, "Level", kLevels[std::clamp(priority, 0, 7)]);
    kel_set_bytes(message, "Message", text, static_cast<size_t>(length));
    kel_send(ownClient(), message);
    kel_free(message);
    std::free(text);
}

}  // namespace

extern "C" {

kel_client_t kel_open(const char* ident, const char* facility, uint32_t /*options*/) {
    try {
        return kel::make_client(kel::identity(ident, facility));
    } catch (const std::exception&) {
        return nullptr;
    }
}

int kel_set_filter(kel_client_t client, int mask) {
    return client ? client->sender->set_filter(mask) : 0;
}

void kel_send(kel_client_t client, kel_message_t message) {
    if (client && message)
        client->sender->send(*message);
}

size_t kel_close(kel_client_t client) {
    if (!client)
        return 0;
    static_cast<void>(client->sender->flush(kCloseBound));
    const size_t left = client->sender->close();
    kel::destroy_client(client);
    return left;
}

int kel_flush(kel_client_t client, unsigned bound) {
    return !client || client->sender->flush(milliseconds(bound));
}

struct kel_statistics kel_get_statistics(kel_client_t client) {
    return client ? client->sender->statistics() : kel_statistics{};
}

void kel_set_limits(kel_client_t client, struct kel_limits limits) {
    if (client)
        client->sender->set_limits(limits);
}

void kel_log(int priority, const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    kel_vlog(priority, format, arguments);
    va_end(arguments);
}

void kel_vlog(int priority, const char* format, va_list arguments) {
    const int kept = errno;
    sendFormatted(priority, format, arguments);
    errno = kept;
}

int kel_send_now(kel_client_t client, int priority, const char* domain, const char* text,
                 size_t length) {
    return client && client->sender->send_now(std::clamp(priority, 0, 7), domain, {text, length});
}

int kel_flush_now(kel_client_t client) {
    return !client || client->sender->flush_now();
}

void kel_set_places(const char* journal, const char* syslog, int console) {
    try {
        kel::places where;
        if (journal)
            where.journal = journal;
        if (syslog)
            where.syslog = syslog;
        if (console >= 0)
            where.console = console;
        kel::set_places(std::move(where));
    } catch (const std::exception&) {  // no memory: as it was
    }
}

}  // extern "C"
