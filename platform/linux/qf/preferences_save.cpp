#include "platform/linux/qf/preferences_save.h"

#include <sys/file.h>

#include <cerrno>
#include <cstdio>
#include <utility>

#include "platform/linux/qf/preferences_edit.h"
#include "platform/linux/qf/preferences_file.h"
#include "platform/linux/qf/preferences_parse.h"
#include "platform/linux/qf/preferences_write.h"

namespace qf::preferences {
namespace {

constexpr int kFolder = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
constexpr unsigned kOwnerOnly = 0600;

// The functions here return 0 or an error number.

int sync_folder(const std::string& path) {
    const descriptor folder(::open(path.c_str(), kFolder));
    if (!folder)
        return errno;
    // Not every file system has it for folders.
    return ::fsync(folder.get()) == 0 || errno == EINVAL ? 0 : errno;
}

// Of at least that mode, whatever the process's umask: other users read the system's.
int make_folder(const std::string& path, unsigned mode) {
    if (::mkdir(path.c_str(), mode) != 0)
        return errno == EEXIST ? 0 : errno;
    struct stat made {};
    if (::stat(path.c_str(), &made) != 0)
        return errno;
    if ((made.st_mode & mode) != mode && ::chmod(path.c_str(), (made.st_mode | mode) & 07777) != 0)
        return errno;
    return sync_folder(folder_of(path));
}

int make_folders(const std::string& path, unsigned mode) {
    int error = make_folder(path, mode);
    if (error == ENOENT && path != "/") {
        error = make_folders(folder_of(path), mode);
        return error != 0 ? error : make_folder(path, mode);
    }
    return error;
}

int write_all(int fd, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = ::write(fd, text.data(), text.size());
        if (written >= 0)
            text.remove_prefix(static_cast<std::size_t>(written));
        else if (errno != EINTR)
            return errno;
    }
    return 0;
}

// Held until it goes, by whoever forked meanwhile, too: hence LOCK_UN.
class folder_lock {
  public:
    explicit folder_lock(const std::string& folder)
        : file_(::open((folder + "/.lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW,
                       kOwnerOnly)) {
        error_ = file_ ? 0 : errno;
        while (file_ && ::flock(file_.get(), LOCK_EX) != 0) {
            error_ = errno;
            if (error_ != EINTR)
                return;
            error_ = 0;
        }
    }
    ~folder_lock() {
        if (file_)
            ::flock(file_.get(), LOCK_UN);
    }
    folder_lock(const folder_lock&) = delete;
    folder_lock& operator=(const folder_lock&) = delete;
    [[nodiscard]] int error() const noexcept { return error_; }

  private:
    descriptor file_;
    int error_ = 0;
};

// Writes `text` to a new file at `path`, to the disk.
int write_new(const std::string& path, std::string_view text, const struct stat* like,
              unsigned mode) {
    if (::unlink(path.c_str()) != 0 && errno != ENOENT)
        return errno;
    const descriptor file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, kOwnerOnly));
    if (!file)
        return errno;
    if (const int error = write_all(file.get(), text); error != 0)
        return error;
    // Only root can give files away; another one's becomes the writer's.
    if (like && (like->st_uid != ::geteuid() || like->st_gid != ::getegid()))
        (void)!::fchown(file.get(), like->st_uid, like->st_gid);
    if (::fchmod(file.get(), like ? like->st_mode & 0777 : mode) != 0 || ::fsync(file.get()) != 0)
        return errno;
    return 0;
}

int replace(const std::string& path, std::string_view text, const struct stat* like,
            unsigned mode) {
    const std::string folder = folder_of(path);
    const std::string made = folder + "/." + base_of(path) + ".new";
    int error = write_new(made, text, like, mode);
    if (error == 0 && ::rename(made.c_str(), path.c_str()) != 0)
        error = errno;
    if (error != 0)
        ::unlink(made.c_str());
    return error != 0 ? error : sync_folder(folder);
}

// The file that `path` leads to, there or not.
std::string behind_links(std::string path) {
    for (int links = 0; links < kMaximumLinks; ++links) {
        std::string target = link_target(path);
        if (target.empty())
            break;
        path = std::move(target);
    }
    return path;
}

owned_dictionary changed(QfDictionaryRef old, QfDictionaryRef values, QfArrayRef removed) {
    const auto result = owned<QfMutableDictionaryRef>::adopt(qf_dictionary_create_mutable());
    const auto set = [&result](QfStringRef key, QfTypeRef value) {
        qf_dictionary_set_value(result.get(), key, value);
    };
    for_each_entry(old, set);
    for (std::size_t i = 0; removed && i < qf_array_get_count(removed); ++i) {
        qf_dictionary_remove_value(result.get(),
                                   static_cast<QfStringRef>(qf_array_get_value(removed, i)));
    }
    if (values)
        for_each_entry(values, set);
    return owned_dictionary::retain(result.get());
}

owned_error check(QfDictionaryRef values) {
    owned_error wrong;
    if (values) {
        for_each_entry(values, [&wrong](QfStringRef key, QfTypeRef value) {
            if (!wrong)
                wrong = why_unwritable(view(key), value);
        });
    }
    return wrong;
}

owned_error save_locked(const std::string& path, unsigned mode, QfDictionaryRef values,
                        QfArrayRef removed) {
    const file_text file = read_file(path);
    if (file.error)
        return file.error;
    const std::string old_text = file.text.value_or(std::string());
    // What cannot be read cannot be changed without loss.
    const parsed old = parse(old_text, path);
    if (old.error)
        return old.error;
    const owned_dictionary wanted = changed(old.values.get(), values, removed);
    const std::string text = edit(old_text, old.values.get(), wanted.get());
    if (text == old_text)
        return {};
    if (text.size() > kMaximumFileSize)
        return system_error(EFBIG, path);
    const int error = replace(path, text, file.text ? &file.state : nullptr, mode);
    return error != 0 ? system_error(error, path) : owned_error();
}

}  // namespace

owned_error save(const target_file& target, QfDictionaryRef values, QfArrayRef removed) {
    if (owned_error wrong = check(values))
        return wrong;
    const std::string folder = folder_of(target.path);
    if (const int error = make_folders(folder, target.folder_mode); error != 0)
        return system_error(error, folder);
    const folder_lock lock(folder);
    if (lock.error() != 0)
        return system_error(lock.error(), folder + "/.lock");
    return save_locked(behind_links(target.path), target.file_mode, values, removed);
}

}  // namespace qf::preferences
