#include "src/log/level_table.h"

#include <algorithm>
#include <thread>

namespace plr {

void LevelTable::replace(std::shared_ptr<const List> list) {
    current_.store(list.get());
    const std::uint32_t turn = turn_.fetch_add(1);
    while (readers_[turn % 2].load() != 0)
        std::this_thread::yield();
    owned_ = std::move(list);
}

LogLevel LevelTable::lookUp(std::string_view domain) const {
    for (;;) {
        const std::uint32_t turn = turn_.load();
        std::atomic<std::uint32_t>& readers = readers_[turn % 2];
        readers.fetch_add(1);
        // Once it is seen that the turn did not pass, the list stays.
        const bool announced = turn_.load() == turn;
        LogLevel level = LogLevel::Unset;
        if (announced)
            if (const List* list = current_.load())
                level = find(*list, domain);
        readers.fetch_sub(1);
        if (announced)
            return level;
    }
}

// A domain sorts before those below it, so each step searches what is left of
// the place where the last one would have been.
LogLevel LevelTable::find(const List& list, std::string_view domain) {
    auto end = list.begin() + static_cast<std::ptrdiff_t>(list.size());
    while (!domain.empty()) {
        const auto place = std::lower_bound(
            list.begin(), end, domain,
            [](const auto& entry, std::string_view name) { return entry.first < name; });
        if (place != end && place->first == domain)
            return place->second;
        const std::size_t dot = domain.rfind('.');
        if (dot == std::string_view::npos)
            break;
        domain = domain.substr(0, dot);
        end = place;
    }
    return !list.empty() && list.front().first.empty() ? list.front().second : LogLevel::Unset;
}

}  // namespace plr
