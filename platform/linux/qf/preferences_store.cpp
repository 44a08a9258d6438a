#include "platform/linux/qf/preferences_store.h"

#include <pthread.h>

#include <algorithm>
#include <chrono>
#include <system_error>
#include <utility>

#include "platform/linux/qf/preferences_names.h"

namespace qf::preferences {
namespace {

constexpr std::chrono::seconds kPollInterval{1};

bool is_equal(const snapshot& left, const snapshot& right) noexcept {
    return qf_equal(left.values.get(), right.values.get()) &&
           qf_equal(left.errors.get(), right.errors.get());
}

}  // namespace

std::atomic<std::uint64_t> store::version_{1};

void observation::tell(const std::shared_ptr<observation>& self) {
    if (self->told_.exchange(true, std::memory_order_acq_rel))
        return;
    self->queue_.async([self] {
        self->told_.store(false, std::memory_order_release);
        if (!self->cancelled_.load(std::memory_order_acquire))
            self->handler_();
    });
}

// ---- What there is -----------------------------------------------------------

store& store::instance() {
    static auto* const all = new store;
    return *all;
}

snapshot store::get(QfStringRef application, QfStringRef user, QfStringRef host) {
    const selection what{std::string(view(application)), std::string(view(user)),
                         std::string(view(host))};
    const lock_guard guard(lock_);
    return find(what).now;
}

store::domain& store::find(const selection& what) {
    const auto [place, is_new] = domains_.try_emplace(what);
    domain& found = place->second;
    if (!is_new)
        return found;
    file_list names = files_of(make_string(what.application).get(), make_string(what.user).get(),
                               make_string(what.host).get());
    found.error = std::move(names.error);
    for (std::string& path : names.paths)
        found.files.push_back({std::move(path), {}, {}, {}});
    watch_all();  // before reading, so that no change falls between
    for (layer_file& file : found.files)
        file.reload();
    found.now = combine(found);
    return found;
}

snapshot store::combine(const domain& of) const {
    snapshot result;
    const auto errors = owned<QfMutableArrayRef>::adopt(qf_array_create_mutable());
    result.values = owned_dictionary::adopt(qf_dictionary_create(nullptr, nullptr, 0));
    for (const layer_file& file : of.files) {
        if (file.values)
            result.values = merge(result.values.get(), file.values.get());
        if (file.error)
            qf_array_append_value(errors.get(), file.error.get());
    }
    for (const owned_error& error : {of.error, watch_error_}) {
        if (error)
            qf_array_append_value(errors.get(), error.get());
    }
    result.errors = owned_array::retain(errors.get());
    return result;
}

void store::publish(domain& of) {
    if (!of.now.values)
        return;
    snapshot next = combine(of);
    if (is_equal(of.now, next))
        return;
    of.now = std::move(next);
    version_.fetch_add(1, std::memory_order_acq_rel);
    if (is_child_)
        return;
    for (const std::shared_ptr<observation>& each : of.observers)
        observation::tell(each);
}

template <class Condition>
void store::reload(const Condition& is_changed) {
    for (auto& [what, each] : domains_) {
        bool any = false;
        for (layer_file& file : each.files) {
            if (!is_changed(file))
                continue;
            file.reload();
            any = true;
        }
        if (any)
            publish(each);
    }
}

void store::reread(const std::string& path) {
    const lock_guard guard(lock_);
    reload([&path](const layer_file& file) { return file.path == path; });
}

void store::add(const selection& what, const std::shared_ptr<observation>& observer) {
    const lock_guard guard(lock_);
    find(what).observers.push_back(observer);
}

void store::remove(const selection& what, const observation* observer) noexcept {
    const lock_guard guard(lock_);
    if (const auto found = domains_.find(what); found != domains_.end()) {
        std::erase_if(found->second.observers,
                      [observer](const auto& each) { return each.get() == observer; });
    }
}

void store::forget() {
    const lock_guard guard(lock_);
    std::erase_if(domains_, [](const auto& each) { return each.second.observers.empty(); });
    version_.fetch_add(1, std::memory_order_acq_rel);
}

// ---- What changes ------------------------------------------------------------

void store::watch_all() {
    if (is_child_)
        return;
    std::set<std::string> files;
    for (const auto& [what, each] : domains_) {
        for (const layer_file& file : each.files)
            files.insert(file.path);
    }
    int error = events_ ? 0 : listen();
    if (error == 0)
        error = watch_.watch(files);
    set_watch_error(error);
}

// 0, or an error number.
int store::listen() {
    if (const int error = watch_.open(); error != 0)
        return error;
    try {
        dispatch::source made = dispatch::source::readable(watch_.fd(), queue_);
        made.set_event_handler(dispatch::block<void()>([this] { read_news(); }));
        made.resume();
        events_ = std::move(made);
        return 0;
    } catch (const std::system_error& failure) {
        watch_.close();
        return failure.code().value();
    }
}

void store::set_watch_error(int error) {
    if ((error != 0) == static_cast<bool>(watch_error_))
        return;
    if (error == 0) {
        watch_error_ = {};
        timer_.cancel();
        timer_ = {};
    } else {
        watch_error_ = system_error(error, "changes are looked for once a second, not watched");
        timer_ = dispatch::source::timer(queue_);
        timer_.set_event_handler(dispatch::block<void()>([this] { poll(); }));
        timer_.set_timer(dispatch::time::after(kPollInterval), kPollInterval);
        timer_.resume();
    }
    for (auto& [what, each] : domains_)
        publish(each);
}

void store::read_news() {
    const lock_guard guard(lock_);
    const folder_watch::news found = watch_.read();
    if (!found.lost && found.files.empty())
        return;
    watch_all();  // folders may have come or gone
    reload(
        [&found](const layer_file& file) { return found.lost || found.files.contains(file.path); });
}

void store::poll() {
    const lock_guard guard(lock_);
    if (!watch_error_)
        return;
    watch_all();
    reload([](const layer_file& file) { return !file.seen.is_same(stamp_of(file.path)); });
}

// ---- fork() ------------------------------------------------------------------

store::store() : queue_(dispatch::queue::create("qf.preferences")) {
    // After the queues' own, so that at a fork() this lock is taken before theirs.
    ::pthread_atfork(before_fork, in_parent, in_child);
}

void store::before_fork() PLR_NO_THREAD_SAFETY_ANALYSIS {
    instance().lock_.lock();
}

void store::in_parent() PLR_NO_THREAD_SAFETY_ANALYSIS {
    instance().lock_.unlock();
}

void store::in_child() PLR_NO_THREAD_SAFETY_ANALYSIS {
    instance().is_child_ = true;
    instance().lock_.unlock();
}

}  // namespace qf::preferences
