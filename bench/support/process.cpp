#include "bench/support/process.h"

#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>

namespace bench {
namespace {

// The parent's death must not leave a child under load behind.
void dieWithParent(pid_t parent) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (::getppid() != parent)
        ::_exit(1);
}

pid_t forkOrFail() {
    std::fflush(stdout);
    return check(::fork(), "fork");
}

[[noreturn]] void execute(const std::vector<std::string>& command, const std::string& logFile) {
    const int log = ::open(logFile.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    ::dup2(log, STDOUT_FILENO);
    ::dup2(log, STDERR_FILENO);
    std::vector<char*> arguments;
    for (const std::string& word : command)
        arguments.push_back(const_cast<char*>(word.c_str()));
    arguments.push_back(nullptr);
    ::execvp(arguments[0], arguments.data());
    ::_exit(127);
}

}  // namespace

void fail(const std::string& what) {
    const int error = errno;
    std::fprintf(stderr, "bench: %s%s%s\n", what.c_str(), error ? ": " : "",
                 error ? std::strerror(error) : "");
    std::exit(1);
}

int check(int result, const char* what) {
    if (result < 0)
        fail(what);
    return result;
}

Child::Child(const std::function<void()>& body) {
    const pid_t parent = ::getpid();
    pid_ = forkOrFail();
    if (pid_ == 0) {
        dieWithParent(parent);
        body();
        std::fflush(stdout);
        ::_exit(0);
    }
}

Child::Child(const std::vector<std::string>& command, const std::string& logFile) {
    const pid_t parent = ::getpid();
    pid_ = forkOrFail();
    if (pid_ == 0) {
        dieWithParent(parent);
        execute(command, logFile);
    }
}

Child::~Child() {
    ::kill(pid_, SIGKILL);
    while (::waitpid(pid_, nullptr, 0) < 0 && errno == EINTR) {
    }
}

TemporaryFolder::TemporaryFolder() {
    std::string name = std::filesystem::temp_directory_path() / "pelorin-bench-XXXXXX";
    if (!::mkdtemp(name.data()))
        fail("mkdtemp");
    path_ = name;
}

TemporaryFolder::~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

void* mapShared(std::size_t bytes) {
    void* memory =
        ::mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED)
        fail("mmap");
    return memory;
}

void pinTo(unsigned index) {
    static const cpu_set_t allowed = [] {
        cpu_set_t set;
        check(::sched_getaffinity(0, sizeof set, &set), "sched_getaffinity");
        return set;
    }();
    unsigned left = index % static_cast<unsigned>(CPU_COUNT(&allowed));
    int chosen = 0;
    while (!CPU_ISSET(chosen, &allowed) || left-- > 0)
        ++chosen;
    cpu_set_t one;
    CPU_ZERO(&one);
    CPU_SET(chosen, &one);
    check(::sched_setaffinity(0, sizeof one, &one), "sched_setaffinity");
}

void allowOpenFiles(unsigned wanted) {
    rlimit limit{};
    check(::getrlimit(RLIMIT_NOFILE, &limit), "getrlimit");
    if (limit.rlim_cur >= wanted)
        return;
    limit.rlim_cur = wanted;
    if (limit.rlim_max < wanted)
        limit.rlim_max = wanted;
    check(::setrlimit(RLIMIT_NOFILE, &limit), "raising the limit of open files");
}

void result(const char* key, double value) {
    std::printf("%s %.6g\n", key, value);
}

}  // namespace bench
