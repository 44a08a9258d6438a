#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include "platform/linux/qf/preferences_file.h"

namespace qf::preferences {

// Tells which files came, changed or went, by inotify(7) on their folders:
// editors put new files in the place of old ones. Of a folder that is not there
// the nearest one above it is watched. Where a file is a symbolic link, what it
// leads to is watched too, there or not. (Not noticed: a folder further up that is
// replaced as a whole.)
//
// Threads: whoever holds the store's lock.
class folder_watch {
  public:
    // 0, or an error number when no inotify instance can be had.
    [[nodiscard]] int open();
    void close() { inotify_ = descriptor(); }
    // Readable when there is news; negative when not open.
    [[nodiscard]] int fd() const noexcept { return inotify_.get(); }

    // Watches these files and no others. 0, or the error number of what could
    // not be watched.
    [[nodiscard]] int watch(const std::set<std::string>& files);

    // Reads the news there is.
    struct news {
        bool lost = false;  // any file may have changed
        std::set<std::string> files;
    };
    [[nodiscard]] news read();

  private:
    struct interest {
        std::string name;  // an entry of the folder
        std::string file;  // that it concerns
    };

    int add(const std::string& place, const std::string& file);
    void collect(int number, const std::string& name, news& found) const;

    descriptor inotify_;
    std::map<int, std::vector<interest>> folders_;  // by watch number
};

}  // namespace qf::preferences
