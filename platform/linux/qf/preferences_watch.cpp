#include "platform/linux/qf/preferences_watch.h"

#include <sys/inotify.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <utility>

namespace qf::preferences {
namespace {

// Not IN_MODIFY: half of what is being written is nothing to read.
constexpr std::uint32_t kEvents = IN_CLOSE_WRITE | IN_CREATE | IN_DELETE | IN_MOVED_FROM |
                                  IN_MOVED_TO | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF |
                                  IN_ONLYDIR;
// A folder may come while the one above it is being watched.
constexpr int kAttempts = 8;

// Whether a folder that could not be watched is one whose files may be read all
// the same; else the one above it will do.
bool is_final(int error, const std::string& folder) noexcept {
    if (error != EACCES)
        return error == ENOSPC || error == ENOMEM;
    return ::faccessat(AT_FDCWD, folder.c_str(), X_OK, AT_EACCESS) == 0;
}

}  // namespace

int folder_watch::open() {
    inotify_ = descriptor(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
    folders_.clear();
    return inotify_ ? 0 : errno;
}

int folder_watch::watch(const std::set<std::string>& files) {
    const std::map<int, std::vector<interest>> before = std::exchange(folders_, {});
    int result = 0;
    for (const std::string& file : files) {
        int error = 0;
        std::string place = file;
        for (int links = 0; links <= kMaximumLinks && error == 0 && !place.empty(); ++links) {
            error = add(place, file);
            place = link_target(place);
        }
        result = result != 0 ? result : error;
    }
    for (const auto& [number, interests] : before) {
        if (!folders_.contains(number))
            ::inotify_rm_watch(inotify_.get(), number);
    }
    return result;
}

// Watches the way to `place` on behalf of `file`.
int folder_watch::add(const std::string& place, const std::string& file) {
    std::string entry = place;
    bool is_missing = false;
    for (int attempt = 0; attempt < kAttempts;) {
        const std::string folder = folder_of(entry);
        const int number = ::inotify_add_watch(inotify_.get(), folder.c_str(), kEvents);
        const int error = number < 0 ? errno : 0;
        if (is_final(error, folder) || (error != 0 && entry == "/"))
            return error;
        if (number >= 0) {
            folders_[number].push_back({base_of(entry), file});
            if (!is_missing || !stamp_of(entry).exists)
                return 0;
            ++attempt;
        } else {
            is_missing = error == ENOENT;
        }
        entry = number >= 0 ? place : folder;
    }
    return 0;
}

folder_watch::news folder_watch::read() {
    news found;
    alignas(inotify_event) std::array<char, 8192> memory;
    for (;;) {
        const ssize_t size = ::read(inotify_.get(), memory.data(), memory.size());
        if (size <= 0)
            return found;
        for (std::size_t at = 0; at < static_cast<std::size_t>(size);) {
            inotify_event event{};
            std::memcpy(&event, memory.data() + at, sizeof event);
            if ((event.mask & IN_Q_OVERFLOW) != 0)
                found.lost = true;
            // The name is padded with NULs.
            collect(event.wd, event.len > 0 ? memory.data() + at + sizeof event : "", found);
            at += sizeof event + event.len;
        }
    }
}

// An event without a name is about the folder itself.
void folder_watch::collect(int number, const std::string& name, news& found) const {
    const auto place = folders_.find(number);
    if (place == folders_.end())
        return;
    for (const interest& each : place->second) {
        if (name.empty() || name == each.name)
            found.files.insert(each.file);
    }
}

}  // namespace qf::preferences
