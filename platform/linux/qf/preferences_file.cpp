#include "platform/linux/qf/preferences_file.h"

#include <array>
#include <cerrno>
#include <climits>
#include <ctime>

#include "platform/linux/qf/preferences_parse.h"

namespace qf::preferences {
namespace {

bool is_same_time(const timespec& left, const timespec& right) noexcept {
    return left.tv_sec == right.tv_sec && left.tv_nsec == right.tv_nsec;
}

// 0, or an error number.
int read_all(int fd, std::string& text) {
    std::array<char, 16384> part;
    while (text.size() <= kMaximumFileSize) {
        const ssize_t got = ::read(fd, part.data(), part.size());
        if (got == 0)
            return 0;
        if (got > 0)
            text.append(part.data(), static_cast<std::size_t>(got));
        else if (errno != EINTR)
            return errno;
    }
    return EFBIG;
}

}  // namespace

std::string folder_of(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

std::string base_of(const std::string& path) {
    return path.substr(path.rfind('/') + 1);  // npos + 1 is 0
}

std::string link_target(const std::string& path) {
    std::array<char, PATH_MAX> memory;
    const ssize_t length = ::readlink(path.c_str(), memory.data(), memory.size());
    if (length <= 0)
        return {};
    const std::string target(memory.data(), static_cast<std::size_t>(length));
    return target.front() == '/' ? target : folder_of(path) + '/' + target;
}

bool stamp::is_same(const stamp& other) const noexcept {
    if (!exists || !other.exists)
        return exists == other.exists;
    return is_settled && other.is_settled && state.st_dev == other.state.st_dev &&
           state.st_ino == other.state.st_ino && state.st_size == other.state.st_size &&
           state.st_mode == other.state.st_mode &&
           is_same_time(state.st_mtim, other.state.st_mtim) &&
           is_same_time(state.st_ctim, other.state.st_ctim);
}

stamp stamp_of(const std::string& path) noexcept {
    constexpr std::time_t kMuchLongerThanATick = 2;
    stamp result;
    result.exists = ::stat(path.c_str(), &result.state) == 0;
    result.is_settled = std::time(nullptr) - result.state.st_mtim.tv_sec > kMuchLongerThanATick;
    return result;
}

file_text read_file(const std::string& path) {
    file_text result;
    const descriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    int error = file && ::fstat(file.get(), &result.state) == 0 ? 0 : errno;
    if (error == ENOENT)
        return result;
    std::string text;
    if (error == 0)
        error = S_ISREG(result.state.st_mode) ? read_all(file.get(), text) : EINVAL;
    if (error == 0)
        result.text = std::move(text);
    else
        result.error = system_error(error, path);
    return result;
}

void layer_file::reload() {
    seen = stamp_of(path);  // before reading: what changes meanwhile shows later
    const file_text file = read_file(path);
    error = file.error;
    if (error)
        return;
    if (!file.text) {
        values = {};
        return;
    }
    parsed result = parse(*file.text, path);
    error = std::move(result.error);
    if (result.values)
        values = std::move(result.values);
}

owned_dictionary merge(QfDictionaryRef weaker, QfDictionaryRef stronger) {
    const auto result = owned<QfMutableDictionaryRef>::adopt(qf_dictionary_create_mutable());
    for_each_entry(weaker, [&result](QfStringRef key, QfTypeRef value) {
        qf_dictionary_set_value(result.get(), key, value);
    });
    for_each_entry(stronger, [weaker, &result](QfStringRef key, QfTypeRef value) {
        QfDictionaryRef below = as_dictionary(qf_dictionary_get_value(weaker, key));
        QfDictionaryRef above = as_dictionary(value);
        if (below && above)
            qf_dictionary_set_value(result.get(), key, merge(below, above).get());
        else
            qf_dictionary_set_value(result.get(), key, value);
    });
    return owned_dictionary::retain(result.get());
}

}  // namespace qf::preferences
