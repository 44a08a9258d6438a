#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <fstream>
#include <utility>

#include "platform/linux/vox/frame.h"
#include "tests/platform/vox_values.h"

// The examples of docs/wire-protocol.md, held against our codec.
// tests/platform/vox_client_test.py holds them against another.
namespace {

using namespace vox_test;

struct vector {
    bytes data;
    std::string description;
};

// The lines of the blocks of `kind`; an empty line ends a block.
std::vector<std::string> lines_of(const std::string& kind) {
    std::ifstream file(WIRE_PROTOCOL);
    std::vector<std::string> lines;
    bool inside = false;
    for (std::string line; std::getline(file, line);) {
        if (line.starts_with("```")) {
            if (inside)
                lines.emplace_back();
            inside = line == "```" + kind;
        } else if (inside) {
            lines.push_back(line);
        }
    }
    return lines;
}

// "18 ff   255"; one space stands inside the bytes, two or more behind them.
vector split(const std::string& line) {
    const std::size_t end = line.find("  ");
    const std::size_t text = line.find_first_not_of(' ', end);
    return {from_hex(line.substr(0, end)), text == std::string::npos ? "" : line.substr(text)};
}

std::vector<vector> values(const std::string& kind) {
    std::vector<vector> result;
    for (const std::string& line : lines_of(kind))
        if (!line.empty())
            result.push_back(split(line));
    return result;
}

std::vector<vector> frames() {
    std::vector<vector> result;
    vector frame;
    for (const std::string& line : lines_of("vox-frame")) {
        if (line.empty())
            result.push_back(std::exchange(frame, {}));
        else if (line.starts_with("= "))
            frame.description = line.substr(2);
        else  // what the bytes mean stands three spaces or more behind them
            for (const std::uint8_t byte : from_hex(line.substr(0, line.find("   "))))
                frame.data.push_back(byte);
    }
    return result;
}

std::size_t count(std::string_view text, std::string_view part) {
    std::size_t result = 0;
    for (std::size_t at = 0; (at = text.find(part, at)) != std::string_view::npos; at++)
        result++;
    return result;
}

// The page writes "<fd>" where a description has its number.
std::string without_numbers(std::string text) {
    for (const std::string_view kind : {"<fd ", "<endpoint "})
        for (std::size_t at; (at = text.find(kind)) != std::string::npos;)
            text.erase(at + kind.size() - 1, text.find('>', at) - at - kind.size() + 1);
    return text;
}

// Decodes `body`, checks what it is, and that it encodes to the same bytes.
void check(const vector& expected, std::span<const std::uint8_t> body) {
    std::vector<int> descriptors;
    const std::string& text = expected.description;
    for (std::size_t left = count(text, "<fd>") + count(text, "<endpoint>"); left > 0; left--)
        descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const char* why = nullptr;
    const owned value = own(vox_wire::decode(body, descriptors, {}, why));
    ASSERT_NE(value, nullptr) << expected.description << ": " << why;
    EXPECT_EQ(without_numbers(description(value.get())), text);
    vox_wire::encoded again;
    ASSERT_EQ(vox_wire::encode(value.get(), {}, again), 0);
    EXPECT_EQ(to_hex(again.bytes.view()), to_hex(body)) << expected.description;
    EXPECT_EQ(again.descriptors.size(), descriptors.size());
    for (const int descriptor : again.descriptors)
        close(descriptor);
}

TEST(WireProtocolPage, ValuesAreAsItShows) {
    const std::vector<vector> all = values("vox-values");
    ASSERT_GT(all.size(), 40u);
    for (const vector& one : all)
        check(one, one.data);
}

TEST(WireProtocolPage, RefusesWhatItSays) {
    const std::vector<vector> all = values("vox-refused");
    ASSERT_GT(all.size(), 10u);
    for (const vector& one : all)
        EXPECT_NE(refusal(one.data), "") << one.description;
}

TEST(WireProtocolPage, FramesAreAsItShows) {
    const std::vector<vector> all = frames();
    ASSERT_GT(all.size(), 7u);
    for (const vector& one : all) {
        vox_link::frame_header header;
        std::string why;
        ASSERT_TRUE(vox_link::read_header(one.data, {}, header, why)) << why;
        const auto body = std::span(one.data).subspan(vox_link::kHeaderBytes);
        EXPECT_EQ(header.length, body.size()) << one.description;
        EXPECT_EQ(header.descriptors, one.description.find("<fd>") != std::string::npos ? 1 : 0);
        check(one, body);
        std::uint8_t again[vox_link::kHeaderBytes];
        vox_link::write_header(header, again);
        EXPECT_EQ(to_hex(again), to_hex(std::span(one.data).first(vox_link::kHeaderBytes)));
    }
}

}  // namespace
