#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <functional>
#include <mutex>
#include <unordered_map>
#include <vector>

#include "dispatch/diagnostics.h"
#include "platform/linux/dispatch/fork.h"
#include "platform/linux/dispatch/poller.h"
#include "platform/linux/dispatch/pool.h"
#include "platform/linux/dispatch/queue_cells.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch {
namespace {

using detail::pool;
using detail::queue_core;

[[gnu::format(printf, 2, 3)]] void append(std::string& to, const char* format, ...) {
    char line[512];  // a longer label is cut
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(line, sizeof line, format, arguments);
    va_end(arguments);
    to += line;
}

// "12.3 ms"
std::string duration(std::int64_t nanoseconds) {
    struct unit {
        double nanoseconds;
        const char* name;
    };
    const auto value = static_cast<double>(std::max<std::int64_t>(nanoseconds, 0));
    for (const unit each : {unit{1e9, "s"}, unit{1e6, "ms"}, unit{1e3, "us"}})
        if (value >= each.nanoseconds) {
            std::string text;
            append(text, "%.1f %s", value / each.nanoseconds, each.name);
            return text;
        }
    return std::to_string(nanoseconds) + " ns";
}

struct queue_view {
    std::string label;
    std::string target;
    queue_core::waiting waiting;
    std::uint32_t suspensions;
    bool busy;
    bool running;
    std::string statistics;
};

class picture {
  public:
    picture() {
        threads_.reserve(pool::kMostSeen);
        pool::shared().look_at_threads(threads_);
        detail::queue_cells::for_each([this](queue_core& each) { add(each); });
        now_ = time::now().nanoseconds();
    }

    [[nodiscard]] std::string text() {
        std::string result;
        append_threads(result);
        append_queues(result);
        append_timers(result);
        append_descriptors(result);
        return result;
    }

  private:
    void add(queue_core& each) {
        labels_.emplace(&each, each.label());
        const bool running = std::any_of(threads_.begin(), threads_.end(),
                                         [&](const auto& one) { return one.queue == &each; });
        if (each.is_global() && !each.keeps_statistics())
            return;
        queue_view& added = queues_.emplace_back();
        added.label = each.label();
        if (each.target())
            added.target = each.target()->label();
        added.suspensions = each.suspensions();
        added.busy = each.is_busy();
        added.running = running;
        added.waiting = each.count_waiting();
        if (each.keeps_statistics())
            add_statistics(detail::read(each.statistics(), false), added);
    }

    static void add_statistics(const queue_statistics& counted, queue_view& added) {
        const auto append_one = [&](const char* name, const histogram& one) {
            added.statistics += std::string(", ") + name;
            for (const double percent : {50.0, 99.0, 100.0})
                added.statistics +=
                    (percent == 50.0 ? " " : " / ") + duration(one.percentile(percent).count());
        };
        append_one("waited (median / 99 % / longest)", counted.wait);
        append_one("ran", counted.run);
    }

    void append_threads(std::string& result) {
        using role = pool::view::role;
        const auto is_server = [](const pool::view& each) { return each.as == role::server; };
        append(result, "dispatch: %td workers, %u processors%s\n",
               std::ranges::count_if(threads_, std::not_fn(is_server)), pool::shared().processors(),
               pool::shared().has_waiting_work() ? ", work waits for a worker" : "");
        for (const pool::view& each : threads_) {
            append(result, "  %s %d: ", is_server(each) ? "pump's thread" : "worker", each.thread);
            if (const auto found = labels_.find(each.queue); found != labels_.end())
                append(result, "runs \"%.400s\" for up to %s\n", found->second.c_str(),
                       duration(now_ - each.since).c_str());
            else
                append(result, "%s\n",
                       each.queue                ? "runs"
                       : is_server(each)         ? "is elsewhere"
                       : each.as == role::poller ? "polls"
                                                 : "sleeps");
        }
    }

    void append_queues(std::string& result) {
        const auto idle = [](const queue_view& each) {
            return !each.busy && each.suspensions == 0 && each.statistics.empty();
        };
        const auto idles = std::count_if(queues_.begin(), queues_.end(), idle);
        append(result, "queues: %zu, of which %zu are idle\n", queues_.size(),
               static_cast<std::size_t>(idles));
        for (const queue_view& each : queues_)
            if (!idle(each))
                append_queue(result, each);
    }

    void append_queue(std::string& result, const queue_view& each) {
        append(result, "  \"%.400s\": %s", each.label.c_str(),
               !each.busy                ? "idle"
               : each.running            ? "running"
               : each.waiting.count == 0 ? "held by sync() or a target"
                                         : "not running");
        if (!each.waiting.is_known)
            result += ", an unknown number waits";
        else if (each.waiting.count > 0)
            append(result, ", %zu wait%s", each.waiting.count, each.waiting.count == 1 ? "s" : "");
        if (each.waiting.oldest > 0)
            result += ", oldest " + duration(now_ - each.waiting.oldest);
        if (each.suspensions > 0)
            append(result, ", suspended %u", each.suspensions);
        if (!each.target.empty())
            append(result, ", for \"%.400s\"", each.target.c_str());
        result += each.statistics + "\n";
    }

    static void append_timers(std::string& result) {
        constexpr const char* kNames[] = {"monotonic", "boot", "wall"};
        result += "timers:";
        for (const clock each : {clock::monotonic, clock::boot, clock::wall}) {
            const auto seen = detail::poller::shared().timers().look(each);
            const char* name = kNames[static_cast<unsigned>(each)];
            append(result, "%s %zu %s", each == clock::monotonic ? "" : ",", seen.pending, name);
            if (seen.pending > 0)
                result += ", first in " + duration(seen.earliest - time::now(each).nanoseconds());
        }
        result += "\n";
    }

    static void append_descriptors(std::string& result) {
        const auto watched = detail::poller::shared().look();
        append(result, "descriptors: %zu\n", watched.size());
        for (const auto& each : watched)
            append(result, "  fd %d: for \"%.400s\"\n", each.fd, each.label.c_str());
    }

    std::vector<pool::view> threads_;
    std::unordered_map<const queue_core*, std::string> labels_;
    std::vector<queue_view> queues_;
    std::int64_t now_ = 0;
};

std::mutex& one_at_a_time() {
    static std::mutex& lock = *new std::mutex;
    return lock;
}

}  // namespace

void detail::forks::lock_dump(moment when) noexcept {
    hold(one_at_a_time(), when);
}

std::string dump() {
    const std::lock_guard guard(one_at_a_time());
    return picture().text();
}

}  // namespace dispatch
