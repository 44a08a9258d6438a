#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

#include "support/descriptors.h"

// A test program that is its own service: started with the argument "service", or
// others, it serves, says so by serviceIsReady() and runs until it is killed.
namespace plr::test {

// In the service: it can be reached now. Never returns.
[[noreturn]] inline void serviceIsReady() {
    std::puts("ready");
    std::fflush(stdout);
    for (;;)
        ::pause();
}

// A running service process of this program; killed at the end.
class ServiceProcess {
  public:
    // Returns when the service is ready. `passed` is its descriptor 3 unless negative.
    explicit ServiceProcess(std::vector<std::string> words = {"service"}, int passed = -1) {
        std::string program = std::filesystem::read_symlink("/proc/self/exe").string();
        std::vector<char*> arguments{program.data()};
        for (std::string& word : words)
            arguments.push_back(word.data());
        arguments.push_back(nullptr);
        Ends pipe;
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_adddup2(&actions, pipe.in(), STDOUT_FILENO);
        if (passed >= 0)
            posix_spawn_file_actions_adddup2(&actions, passed, 3);
        EXPECT_EQ(
            ::posix_spawn(&pid_, program.c_str(), &actions, nullptr, arguments.data(), environ), 0);
        posix_spawn_file_actions_destroy(&actions);
        pipe.closeIn();
        char byte = 0;
        EXPECT_EQ(::read(pipe.out(), &byte, 1), 1) << "the service did not start";
    }
    ~ServiceProcess() { kill(); }
    ServiceProcess(const ServiceProcess&) = delete;
    ServiceProcess& operator=(const ServiceProcess&) = delete;

    // Ends it at once, without a chance to say anything.
    void kill() {
        if (pid_ > 0)
            ::kill(pid_, SIGKILL);
        wait();
    }
    // Until it has ended by itself. Returns its status, see wait(2); 0 after the first time.
    int wait() {
        int status = 0;
        EXPECT_TRUE(pid_ < 0 || ::waitpid(pid_, &status, 0) == pid_);
        pid_ = -1;
        return status;
    }
    [[nodiscard]] pid_t pid() const { return pid_; }

  private:
    pid_t pid_ = -1;
};

}  // namespace plr::test
