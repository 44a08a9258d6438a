#pragma once

#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

// Processes, processors and files of a benchmark. Failures end the program with
// a message and status 1: a benchmark that cannot run has no figure to give.
namespace bench {

// Prints `what`, and errno's text when it is not 0; exits with status 1.
[[noreturn]] void fail(const std::string& what);
// fail() when a system call's result is negative; else the result.
int check(int result, const char* what);

// A child process that runs `body` and exits; killed by its id and reaped when
// the owner goes, and by the kernel when the parent dies. Fork before making
// threads.
class Child {
  public:
    explicit Child(const std::function<void()>& body);
    // A program; its standard streams go to `logFile`.
    Child(const std::vector<std::string>& command, const std::string& logFile);
    Child(const Child&) = delete;
    Child& operator=(const Child&) = delete;
    ~Child();

    [[nodiscard]] pid_t pid() const noexcept { return pid_; }

  private:
    pid_t pid_;
};

// A folder of its own, removed with what is in it.
class TemporaryFolder {
  public:
    TemporaryFolder();
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;
    ~TemporaryFolder();

    [[nodiscard]] const std::string& path() const noexcept { return path_; }

  private:
    std::string path_;
};

// Memory that this process and children forked later share; `T` must be usable
// from several processes. Lives until the process ends.
void* mapShared(std::size_t bytes);
template <class T>
T& makeShared() {
    return *::new (mapShared(sizeof(T))) T();
}

// Restricts the calling process, and the threads it makes later, to the
// `index`-th of the processors it was started with (modulo their count).
void pinTo(unsigned index);

// Raises the limit of open files to at least `wanted`.
void allowOpenFiles(unsigned wanted);

// The line that the report reads: "key value".
void result(const char* key, double value);

}  // namespace bench
