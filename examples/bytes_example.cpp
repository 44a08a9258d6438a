#include <unistd.h>

#include <Pelorin>
#include <array>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include "plr/format.h"

// Bytes as text, and text as bytes.
void showHex() {
    const std::vector<unsigned char> bytes = plr::parse_hex("41 54 0d", plr::kHexWhitespaceSkip);
    std::cout << plr::hex(bytes) << ' ' << plr::hex_sp(bytes) << '\n';  // 41540d 41 54 0d
    std::cout << plr::hex0(std::uint16_t{0xAB}) << '\n';                // 00ab
    std::cout << plr::to_rle(std::string(9, '\0').data(), 9) << '\n';   // <18>0

    std::array<char, 7> text{};  // 2 * 3 + 1
    PelorinBinToHex(text.data(), text.size(), bytes.data(), 3);
    std::cout << text.data() << '\n';  // 41540D
}

// The fields of a byte that a modem sent, and the flags of a word.
void showFields() {
    const unsigned char coding = 0xB4;
    const plr::BitRange group{4, 7};                                         // bits 4 to 7
    std::cout << unsigned{plr::bitfield(coding, group)} << ' '               // 11
              << plr::bitfieldPrettyPrint(coding, group, '-') << '\n';       // 1011----
    std::cout << plr::getBytePrettyPrint(3, coding, "data coding") << '\n';  // 0003    b4 …

    std::string names;
    unsigned long lines = 0x45;
    plr::appendLabelIfBitSet(names, lines, "|", 0x1, "DTR");
    plr::appendLabelIfBitSet(names, lines, "|", 0x4, "RTS");
    plr::appendLeftoverBits(names, lines, "|");
    std::cout << names << '\n';  // DTR|RTS|0x40
}

// Bytes in their order, in storage of one's own: nothing is allocated.
void showRingBuffer() {
    std::array<std::uint8_t, 8> storage{};
    PelorinRingBuffer ring;
    if (!PelorinRingBufferInitialize(&ring, storage.data(), storage.size()))
        return;  // the capacity is no power of two
    PelorinRingBufferInsertRaw(&ring, "AT+CSQ", 6);
    std::array<char, 8> taken{};
    const auto count = PelorinRingBufferExtractRaw(&ring, taken.data(), 2);
    std::cout << std::string(taken.data(), count) << ", " << PelorinRingBufferGetSize(&ring)
              << " left\n";  // AT, 4 left
}

// A tap in front of a line shows what passes, but no PIN.
void showTap(PelorinTransport& line) {
    PelorinTransportTapConfig config{};  // the patterns that it brings hide PINs and IMSIs
    config.sink = [](void*, const char* text) {
        const std::string exchange(text);
        std::cout << exchange.substr(exchange.find('\n') + 1);  // without the time
    };
    PelorinTransport tap;
    if (!PelorinTransportCreateTap(&tap, &line, &config))
        return;
    std::uint32_t count = 0;
    tap.write(&tap, "AT+CPIN=\"1234\"\r", 15, &count, true, PELORIN_FOREVER, nullptr);
    PelorinTransportFree(&tap);
}

// One thread waits for bytes; another ends the wait.
void readUntilUnblocked(PelorinTransport& line) {
    std::thread reader([&line] {
        std::array<char, 64> bytes{};
        std::uint32_t count = 0;
        while (line.read(&line, bytes.data(), bytes.size(), &count, false, PELORIN_FOREVER,
                         nullptr) &&
               count > 0)  // 0: unblocked, or the input is at its end
            std::cout.write(bytes.data(), count);
        std::cout << "unblocked\n";
    });
    line.unblockRead(&line);
    reader.join();
}

int main() {
    showHex();
    showFields();
    showRingBuffer();
    // A file, and a pipe; a serial port has the same operations.
    PelorinTransport file, input;
    std::array<int, 2> ends{};
    if (!PelorinTransportCreateWithFile(&file, nullptr, "/dev/null") || ::pipe(ends.data()) != 0 ||
        !PelorinTransportCreateWithFD(&input, ends[0]))
        return 1;
    showTap(file);
    readUntilUnblocked(input);
    PelorinTransportFree(&file);
    PelorinTransportFree(&input);
}
