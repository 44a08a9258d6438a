#include <dlfcn.h>
#include <sys/inotify.h>
#include <sys/prctl.h>
#include <sys/wait.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <functional>
#include <thread>
#include <vector>

#include "preferences_support.h"
#include "support/waiting.h"

namespace {
std::atomic<int> refusal{0};
}

// In place of the C library's: refuses with this error number.
extern "C" int inotify_add_watch(int fd, const char* path, std::uint32_t mask) noexcept {
    static auto* const next =
        reinterpret_cast<decltype(&::inotify_add_watch)>(::dlsym(RTLD_NEXT, "inotify_add_watch"));
    if (refusal == 0)
        return next(fd, path, mask);
    errno = refusal;
    return -1;
}

namespace plr::test {
namespace {

class PreferencesWatch : public Preferences {
  protected:
    // Whether readers see `a` with this value, once its change was told.
    bool becomes(const owned_value& wanted) {
        while (!is(wanted)) {
            if (!told_.wait())
                return false;
        }
        return true;
    }
    static bool is(const owned_value& wanted) {
        const owned_value now = value_of("a");
        return wanted ? now && qf_equal(now.get(), wanted.get()) : !now;
    }
    void put_in_place(const std::string& file, const std::string& text) const {
        write(file + "~", text);
        std::filesystem::rename(at(file + "~"), at(file));
    }
    void start() {
        observer_ = qf::preferences_observer(make_string("app").get(), queue_,
                                             dispatch::block<void()>([this] {
                                                 queue_.assert_current();
                                                 told_.signal();
                                             }));
    }
    ~PreferencesWatch() override {
        observer_.cancel();
        drain(queue_);
    }

    const dispatch::queue queue_ = dispatch::queue::create("observer");
    Event told_;
    qf::preferences_observer observer_;
};

TEST_F(PreferencesWatch, NoticesEveryWayInWhichAFileChanges) {
    namespace fs = std::filesystem;
    start();
    const auto steps =
        std::vector<std::pair<const char*, std::pair<std::function<void()>, owned_value>>>{
            {"folder and file come", {[this] { write("USER/app.toml", "a = 1"); }, toml("= 1")}},
            {"written in place", {[this] { write("USER/app.toml", "a = 2"); }, toml("= 2")}},
            {"replaced as editors do",
             {[this] { put_in_place("USER/app.toml", "a = 3"); }, toml("= 3")}},
            {"removed", {[this] { fs::remove(at("USER/app.toml")); }, {}}},
            {"a link comes",
             {[this] {
                  write("x/y/real.toml", "a = 4");
                  fs::create_symlink(at("x/y/real.toml"), at("USER/app.toml"));
              },
              toml("= 4")}},
            {"its target changes",
             {[this] { put_in_place("x/y/real.toml", "a = 5"); }, toml("= 5")}},
            {"the link's target goes", {[this] { fs::remove(at("x/y/real.toml")); }, {}}},
            {"and comes", {[this] { write("x/y/real.toml", "a = 5"); }, toml("= 5")}},
            {"the folder goes", {[this] { fs::remove_all(at("USER")); }, {}}},
            {"and comes by renaming",
             {[this] {
                  write("new/app.toml", "a = 6");
                  fs::rename(at("new"), at("USER"));
              },
              toml("= 6")}},
            {"another layer",
             {[this] {
                  write("SYSTEM/app.toml", "a = 0");
                  fs::remove(at("USER/app.toml"));
              },
              toml("= 0")}},
            {"this program", {[] { EXPECT_FALSE(set("a", toml("= 7"))); }, toml("= 7")}},
        };
    for (const auto& [name, step] : steps) {
        SCOPED_TRACE(name);
        step.first();
        ASSERT_TRUE(becomes(step.second));
    }
}

TEST_F(PreferencesWatch, MistakesAreToldAndTheLastValuesStay) {
    write("USER/app.toml", "a = 1");
    start();
    EXPECT_TRUE(is(toml("= 1")));
    put_in_place("USER/app.toml", "a = ");
    while (errors().empty())
        ASSERT_TRUE(told_.wait());
    EXPECT_TRUE(is(toml("= 1")));
    put_in_place("USER/app.toml", "a = 2");
    EXPECT_TRUE(becomes(toml("= 2")));
    EXPECT_TRUE(errors().empty());
}

TEST_F(PreferencesWatch, WithoutWatchesFilesAreLookedAt) {
    start();
    for (const int why : {ENOSPC, EACCES}) {
        refusal = why;
        write("USER/app.toml", "a = 1");  // for which watches are set anew
        while (errors().empty())
            ASSERT_TRUE(told_.wait());
        EXPECT_NE(errors()[0].find("changes are looked for once a second"), std::string::npos);
        put_in_place("USER/app.toml", "a = 2");
        EXPECT_TRUE(becomes(toml("= 2")));
        refusal = 0;
        while (!errors().empty())
            ASSERT_TRUE(told_.wait());
        put_in_place("USER/app.toml", "a = 3");
        EXPECT_TRUE(becomes(toml("= 3")));
    }
}

TEST_F(PreferencesWatch, NobodyIsToldAfterCancel) {
    start();
    bool called = false;
    queue_.sync([this, &called] {
        qf::preferences_observer doomed(make_string("app").get(), queue_,
                                        dispatch::block<void()>([&called] { called = true; }));
        EXPECT_FALSE(set("a", toml("= 1")));  // its call waits behind this
    });
    EXPECT_TRUE(becomes(toml("= 1")));
    drain(queue_);
    EXPECT_FALSE(called);
}

TEST_F(PreferencesWatch, ReadersOnThreadsSeeWholeWrites) {
    write("USER/app.toml", "a = 0\nb = 0");
    std::atomic<bool> done{false};
    std::vector<std::thread> readers;
    for (int i = 0; i < 3; ++i) {
        readers.emplace_back([&done] {
            while (!done) {
                const auto all = owned_dictionary::adopt(qf_preferences_copy_all(
                    make_string("app").get(), kQfPreferencesCurrentUser, kQfPreferencesAnyHost));
                EXPECT_TRUE(qf_equal(qf_dictionary_get_value_for_utf8(all.get(), "a", 1),
                                     qf_dictionary_get_value_for_utf8(all.get(), "b", 1)));
            }
        });
    }
    for (int i = 1; i <= 50; ++i)
        put_in_place("USER/app.toml", "a = " + std::to_string(i) + "\nb = " + std::to_string(i));
    start();
    EXPECT_TRUE(becomes(toml("= 50")));
    done = true;
    for (std::thread& each : readers)
        each.join();
}

TEST_F(PreferencesWatch, ChildAfterForkReadsAndWrites) {
    write("USER/app.toml", "a = 1");
    EXPECT_TRUE(is(toml("= 1")));
    const pid_t child = ::fork();
    if (child == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        bool good = is(toml("= 1"));
        write("USER/other.toml", "b = 1");
        good = good && value_of("b", kQfPreferencesCurrentUser, kQfPreferencesAnyHost, "other");
        good = good && !set("a", toml("= 2")) && is(toml("= 2"));
        ::_exit(good ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    start();
    EXPECT_TRUE(becomes(toml("= 2")));
}

TEST(PreferencesFolderWatch, TooMuchNewsIsNewsOfEverything) {
    const ScratchFolder folder;
    folder_watch watch;
    ASSERT_EQ(watch.open(), 0);
    ASSERT_EQ(watch.watch({folder.at("app.toml")}), 0);
    std::ofstream(folder.at("other.toml")) << "";
    EXPECT_TRUE(watch.read().files.empty());
    int limit = 0;
    std::ifstream("/proc/sys/fs/inotify/max_queued_events") >> limit;
    for (int i = 0; i <= limit; ++i) {  // in turns: the kernel drops what repeats the last one
        ::chmod(folder.at("other.toml").c_str(), 0600);
        ::chmod(folder.at("").c_str(), 0700);
    }
    EXPECT_TRUE(watch.read().lost);
}

}  // namespace
}  // namespace plr::test
