#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

// What a ScriptedModem answers. The text of a script:
//
//   # Blank lines do nothing, nor do lines that start with "#".
//   AT+CSQ
//       +CSQ: 20,99
//       OK
//   ATD*
//       OK
//       RING
//
// A line that starts at the margin is a command, in either case; one with "*" at its
// end stands for all commands that start so. The indented lines below are sent when
// that command comes: the information text, the final result, and what the modem
// says on its own afterwards. A command without any stays unanswered. The line ">" is sent
// as a prompt; what the client then says up to Ctrl-Z is a command, too.
//
// Plain data; any thread.
namespace plr::test {

class ModemScript {
  public:
    static constexpr std::size_t kMostBytes = std::size_t{1} << 20;  // of a script

    ModemScript() = default;  // knows no command
    // Throws std::invalid_argument that names the line: lines of an answer before
    // any command, a command that stands there twice; or a script that is too long.
    [[nodiscard]] static ModemScript fromText(std::string_view text);
    // Throws std::system_error as well, when `path` cannot be read.
    [[nodiscard]] static ModemScript fromFile(const std::string& path);

    using Answer = std::vector<std::string>;
    // The answer to `command`: that of the command itself, else that of the longest
    // start. Null when there is none. Lent.
    [[nodiscard]] const Answer* find(std::string_view command) const;

  private:
    struct Rule {
        std::string command;  // without its "*"
        bool isStart = false;
        Answer answer;
    };

    void add(Rule&& rule, std::size_t line);

    std::vector<Rule> rules_;
};

}  // namespace plr::test
