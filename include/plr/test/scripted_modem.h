#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "plr/test/modem_script.h"

// A modem behind a pseudo terminal that speaks AT from a script, for tests of what
// talks to one. Clients open, close and open path() as they like.
//
// Protocol: ITU-T V.250. A command ends with CR, or Ctrl-Z; one that the script does not know
//           gets ERROR, but AT, ATE0 and ATE1 get OK. Lines go out as CR LF text
//           CR LF. What comes is echoed until ATE0 (section 6.2.4). Neither several
//           commands in one line nor "A/".
// Owner:    whoever makes it. One thread, which ends in the destructor.
// Threads:  all members on any, but for the destructor. None waits for a client.
// Memory:   bounded. A command has at most kLongestCommand bytes, a longer one gets
//           ERROR; once kMostUnsent bytes wait for the client, nothing more is read.
// Line:     raw mode, which a client may change. What the modem says while nobody
//           has the terminal open waits for the next client.
namespace plr::test {

class ScriptedModem {
  public:
    static constexpr std::size_t kLongestCommand = 1024;              // bytes, without CR
    static constexpr std::size_t kMostUnsent = std::size_t{1} << 16;  // bytes
    static constexpr std::size_t kMostReceived = 1024;                // commands remembered

    // Throws std::system_error when there is no terminal or thread to be had.
    explicit ScriptedModem(ModemScript script);
    ScriptedModem(const ScriptedModem&) = delete;
    ScriptedModem& operator=(const ScriptedModem&) = delete;
    ~ScriptedModem();

    // The device that a client opens.
    [[nodiscard]] const std::string& path() const noexcept { return path_; }

    // Sends `text` as a line of its own, between answers; bytes as they are in the
    // second form, for noise. False after hangUp(), and when too much is waiting.
    bool say(std::string_view text);
    bool sayBytes(std::string_view bytes);

    // The last commands that came, without their CR, oldest first; a cut one where
    // it was too long.
    [[nodiscard]] std::vector<std::string> received() const;
    // Whether `count` commands came, since the start; waits for them that long.
    [[nodiscard]] bool waitForCommands(
        std::size_t count, std::chrono::milliseconds bound = std::chrono::minutes(1)) const;

    // ---- Faults ----

    // Pulls the plug: the terminal is gone for its clients when this returns.
    void hangUp();
    // Takes nothing from the line, so that a client's writes get stuck once the
    // terminal is full; and again.
    void pauseReading();
    void resumeReading();
    // From now on sends at most `bytes` at once, and more only when the client
    // has read that; 0: all that there is.
    void sendInPieces(std::size_t bytes);

  private:
    class Descriptor {
      public:
        explicit Descriptor(int number) : number_(number) {}
        Descriptor(const Descriptor&) = delete;
        Descriptor& operator=(const Descriptor&) = delete;
        ~Descriptor() { close(); }
        void close();
        [[nodiscard]] int number() const { return number_; }

      private:
        int number_;
    };

    void run();
    bool await();
    void receive();
    void send();
    [[nodiscard]] bool isPieceUnread() const;
    void take(char byte);
    void finishCommand();
    void answer(const std::string& command);
    void queueLine(std::string_view text);
    void wake() const;

    const ModemScript script_;
    Descriptor master_;
    const std::string path_;
    Descriptor client_;  // ours, so that the terminal outlives its clients
    Descriptor wake_;    // readable: look again

    mutable std::mutex mutex_;
    mutable std::condition_variable commandCame_;
    bool isEnding_ = false;
    bool isPaused_ = false;
    bool echo_ = true;
    std::size_t pieceBytes_ = 0;  // 0: no limit
    std::string command_;         // so far
    bool isTooLong_ = false;      // more of it came than command_ holds
    std::string unsent_;
    std::deque<std::string> received_;
    std::size_t commands_ = 0;  // since the start

    std::mutex endMutex_;
    std::thread thread_;
};

}  // namespace plr::test
