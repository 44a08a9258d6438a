#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <functional>

#include "preferences_support.h"
#include "support/qf_balance.h"

namespace plr::test {
namespace {

// Runs `work` in a process of its own, which ends with its result.
pid_t fork_for(const std::function<int()>& work) {
    const pid_t child = ::fork();
    if (child == 0) {
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        ::_exit(work());
    }
    return child;
}

int status_of(pid_t child) {
    int status = -1;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// Lets `child`, which has asked to be traced and stopped itself, make `stops`
// entries to system calls and returns from them, and kills it then. Whether it
// ended before that.
bool kill_after(pid_t child, int stops) {
    int status = 0;
    ::waitpid(child, &status, 0);
    ::ptrace(PTRACE_SETOPTIONS, child, nullptr, PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD);
    for (int i = 0; i < stops; ++i) {
        ::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr);
        ::waitpid(child, &status, 0);
        if (WIFEXITED(status)) {
            EXPECT_EQ(WEXITSTATUS(status), 0);
            return true;
        }
        EXPECT_EQ(WSTOPSIG(status), SIGTRAP | 0x80);
    }
    ::kill(child, SIGKILL);
    ::waitpid(child, &status, 0);
    return false;
}

int stop_for_tracer() {
    return static_cast<int>(::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr)) + ::raise(SIGSTOP);
}

using PreferencesSave = Preferences;

TEST_F(PreferencesSave, KilledAtAnySystemCallLeavesTheOldFileOrTheNewOne) {
    const std::string old = "# settings\na = 1\n";
    const std::string changed = "# settings\na = 2\n";
    const owned_value two = toml("= 2");
    int olds = 0;
    int news = 0;
    for (bool ended = false; !ended;) {
        write("USER/app.toml", old);
        const pid_t child =
            fork_for([&two] { return stop_for_tracer() != 0 || set("a", two) ? 1 : 0; });
        ended = kill_after(child, olds + news);
        const std::string now = read("USER/app.toml");
        EXPECT_TRUE(now == old || now == changed) << now;
        ++(now == old ? olds : news);
        ASSERT_EQ(text_of(set("b", two)), "");  // the next one gets through
        EXPECT_EQ(read("USER/app.toml"), now + "b = 2\n");
        EXPECT_EQ(std::distance(std::filesystem::directory_iterator(at("USER")), {}), 2)
            << "more than the file and its lock";
    }
    EXPECT_GT(olds, 10);
    EXPECT_GT(news, 3);
    RecordProperty("stops", olds + news);
}

TEST_F(PreferencesSave, TwoWritersLoseNothing) {
    constexpr int kKeys = 200;
    const auto write_keys = [](const std::string& prefix) {
        for (int i = 0; i < kKeys; ++i) {
            if (set((prefix + std::to_string(i)).c_str(), toml("= true")))
                return 1;
        }
        return 0;
    };
    const pid_t first = fork_for([&write_keys] { return write_keys("first"); });
    const pid_t second = fork_for([&write_keys] { return write_keys("second"); });
    EXPECT_EQ(status_of(first), 0);
    EXPECT_EQ(status_of(second), 0);
    const parsed all = parse(read("USER/app.toml"), "all");
    EXPECT_EQ(qf_dictionary_get_count(all.values.get()), 2U * kKeys);
}

// A tiny file system of this process's own, with no room left; or, where that
// is not allowed, no file may become longer than `old`.
bool fill_disk(const std::string& folder, const std::string& old) {
    if (::unshare(CLONE_NEWNS | (::geteuid() == 0 ? 0 : CLONE_NEWUSER)) == 0 &&
        ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
        ::mount("none", folder.c_str(), "tmpfs", 0, "size=64k") == 0) {
        std::ofstream(folder + "/app.toml") << old;
        std::ofstream(folder + "/filler") << std::string(std::size_t{1} << 17, 'x');
        return true;
    }
    const rlimit longest{old.size(), old.size()};
    (void)::signal(SIGXFSZ, SIG_IGN);
    return ::setrlimit(RLIMIT_FSIZE, &longest) == 0;
}

TEST_F(PreferencesSave, FullDiskIsAnErrorAndKeepsTheOldFile) {
    const std::string old = "a = 1\n";
    write("USER/app.toml", old);
    const std::string file = at("USER/app.toml");
    const pid_t child = fork_for([this, &old, &file] {
        if (!fill_disk(at("USER"), old))
            return 1;
        const owned_error error = set("b", toml("= '" + std::string(5000, 'x') + "'"));
        const std::int64_t code = error ? qf_error_get_code(error.get()) : 0;
        if ((code != ENOSPC && code != EFBIG) || !text_of(error).starts_with(file + ": "))
            return 2;
        return read("USER/app.toml") == old && !std::filesystem::exists(at("USER/.app.toml.new"))
                   ? 0
                   : 3;
    });
    EXPECT_EQ(status_of(child), 0);
}

TEST_F(PreferencesSave, KeepsModeAndLinksAndMakesFolders) {
    const auto mode_of = [this](const char* file) {
        return std::filesystem::status(at(file)).permissions();
    };
    using std::filesystem::perms;
    EXPECT_EQ(text_of(set("a", toml("= 1"))), "");
    EXPECT_EQ(mode_of("USER/app.toml"), perms(0600));
    EXPECT_EQ(mode_of("USER"), perms(0700));
    const mode_t usual = ::umask(077);
    EXPECT_EQ(text_of(set("a", toml("= 1"), kQfPreferencesAnyUser, make_string("h").get())), "");
    ::umask(usual);
    EXPECT_EQ(mode_of("SYSTEM/app@h.toml"), perms(0644));
    EXPECT_EQ(mode_of("SYSTEM"), perms(0755));

    write("elsewhere/real.toml", "a = 1\n");
    std::filesystem::permissions(at("elsewhere/real.toml"), perms(0640));
    std::filesystem::remove(at("USER/app.toml"));
    std::filesystem::create_symlink(at("elsewhere/real.toml"), at("USER/app.toml"));
    EXPECT_EQ(text_of(set("a", toml("= 2"))), "");
    EXPECT_EQ(read("elsewhere/real.toml"), "a = 2\n");
    EXPECT_EQ(mode_of("elsewhere/real.toml"), perms(0640));
    std::filesystem::remove(at("elsewhere/real.toml"));
    EXPECT_EQ(text_of(set("a", toml("= 2"))), "");
    EXPECT_EQ(read("elsewhere/real.toml"), "a = 2\n");
    EXPECT_TRUE(std::filesystem::is_symlink(at("USER/app.toml")));
    EXPECT_TRUE(qf_equal(value_of("a").get(), toml("= 2").get()));
}

TEST_F(PreferencesSave, SetsAndRemovesInOneWrite) {
    EXPECT_EQ(text_of(set("a", toml("= 1"))), "");
    EXPECT_TRUE(value_of("a"));
    const struct stat before = stamp_of(at("USER/app.toml")).state;
    EXPECT_EQ(text_of(set("a", toml("= 1"))), "");
    EXPECT_EQ(stamp_of(at("USER/app.toml")).state.st_ino, before.st_ino) << "nothing to write";
    const owned_string a = make_string("a");
    QfTypeRef removed = a.get();
    const parsed values = parse("b = 2\nc = 3", "");
    EXPECT_FALSE(owned_error::adopt(qf_preferences_set_multiple(
        values.values.get(), owned_array::adopt(qf_array_create(&removed, 1)).get(),
        make_string("app").get(), kQfPreferencesCurrentUser, kQfPreferencesAnyHost)));
    EXPECT_EQ(read("USER/app.toml"), "b = 2\nc = 3\n");
    EXPECT_FALSE(value_of("a"));
    EXPECT_EQ(text_of(set("b", {})), "");
    EXPECT_EQ(read("USER/app.toml"), "c = 3\n");
    EXPECT_EQ(text_of(set("b", owned_value::retain(kQfNull))),
              "b is of a type that preferences do not have");
}

TEST_F(PreferencesSave, ReadingAgainMakesNoSystemCall) {
    write("USER/app.toml", "a = 1\n");
    const pid_t child = fork_for([] {
        const bool read_before = static_cast<bool>(value_of("a"));
        int failures = stop_for_tracer();
        for (int i = 0; i < 1000; ++i)
            failures += read_before && value_of("a") ? 0 : 1;
        return failures;
    });
    // raise() restores the signal mask and returns; the process ends.
    EXPECT_TRUE(kill_after(child, 8));
}

}  // namespace
}  // namespace plr::test
