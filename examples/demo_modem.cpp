// modem: a modem behind a pseudo terminal, for radiod and for whoever has none at hand.
// It speaks AT from a script (plr/test/modem_script.h).
//
//   modem --script FILE --link PATH [--lines FIFO]
//
//   --script FILE   what it answers to which command
//   --link PATH     a symbolic link to its terminal, which is there while the modem is
//   --lines FIFO    what it says on its own, line by line; without it standard input

#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <string>
#include <thread>

#include "examples/end_signals.h"
#include "plr/test/scripted_modem.h"

namespace {

using Options = std::map<std::string, std::string>;

Options parse(int argc, char** argv) {
    Options options = {{"--script", {}}, {"--link", {}}, {"--lines", {}}};
    for (int i = 1; i + 1 < argc; i += 2)
        options[argv[i]] = argv[i + 1];
    const bool known = options.size() == 3 && argc % 2 == 1;
    return known && !options["--script"].empty() && !options["--link"].empty() ? options
                                                                               : Options();
}

// In one step, so that nobody finds no link, or one to a terminal of somebody else.
void makeLink(const std::string& terminal, const std::string& link) {
    const std::string made = link + ".new";
    std::filesystem::remove(made);
    std::filesystem::create_symlink(terminal, made);
    std::filesystem::rename(made, link);
}

// To the end of the input, which a FIFO that this process has open for writing, too,
// does not have.
void sayLines(plr::test::ScriptedModem& modem, const std::string& fifo) {
    std::fstream opened;
    if (!fifo.empty())
        opened.open(fifo, std::ios::in | std::ios::out);
    std::istream& lines = fifo.empty() ? std::cin : opened;
    for (std::string line; std::getline(lines, line);)
        if (!line.empty() && !modem.say(line))
            std::cerr << "modem: nobody listens, dropped: " << line << '\n';
}

int run(Options options, radio::EndSignals& end) {
    plr::test::ScriptedModem modem(plr::test::ModemScript::fromFile(options["--script"]));
    std::thread([&modem, fifo = options["--lines"]] { sayLines(modem, fifo); }).detach();
    makeLink(modem.path(), options["--link"]);
    std::cout << "the modem is at " << options["--link"] << std::endl;
    const int status = end.wait();
    std::filesystem::remove(options["--link"]);
    std::_Exit(status);  // the thread waits for lines
}

}  // namespace

int main(int argc, char** argv) {
    const Options options = parse(argc, argv);
    if (options.empty()) {
        std::cerr << "usage: modem --script FILE --link PATH [--lines FIFO]\n";
        return 2;
    }
    radio::EndSignals end;
    try {
        return run(options, end);
    } catch (const std::exception& error) {
        std::cerr << "modem: " << error.what() << '\n';
        return 1;
    }
}
