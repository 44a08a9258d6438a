#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <string>
#include <utility>
#include <vector>

#include "plr/qf.h"
#include "support/scratch_folder.h"

namespace {

using namespace plr::qf;
using plr::MemoryMappedFile;

// Counts what is taken and given back; may have nothing to give.
struct CountingAllocator {
    static void* allocate(std::size_t size, void* context) {
        auto& self = *static_cast<CountingAllocator*>(context);
        if (self.empty)
            return nullptr;
        ++self.allocations;
        return std::malloc(size);
    }
    static void deallocate(void* memory, std::size_t size, void* context) {
        auto& self = *static_cast<CountingAllocator*>(context);
        ++self.deallocations;
        self.lastMemory = memory;
        self.lastSize = size;
        if (self.owns)
            std::free(memory);
    }

    bool empty = false;
    bool owns = true;  // what it is given is its own
    int allocations = 0;
    int deallocations = 0;
    const void* lastMemory = nullptr;
    std::size_t lastSize = 0;
    QfAllocator allocator{&allocate, &deallocate, this};
};

std::vector<std::uint8_t> bytesOf(QfDataRef data) {
    std::vector<std::uint8_t> bytes;
    EXPECT_TRUE(assign(bytes, data));
    return bytes;
}

TEST(Show, DescribesInFullOrBySize) {
    const auto array = plr::qf::adopt(qf_array_create_mutable());
    const auto dictionary = adopt(qf_dictionary_create_mutable());
    const auto data = adopt(qf_data_create("abc", 3));
    const auto shortly = [&](const void* value) { return show(false, value); };
    EXPECT_EQ(shortly(nullptr), "NULL");
    EXPECT_EQ(show(nullptr), "NULL");
    EXPECT_EQ(shortly(dictionary.get()), "QfDictionary(0 keys)");
    EXPECT_EQ(shortly(array.get()), "QfArray(0 elements)");
    EXPECT_EQ(shortly(data.get()), "QfData(3 bytes)");
    qf_array_append_value(array.get(), data.get());
    qf_array_append_value(array.get(), kQfBooleanTrue);
    qf_dictionary_set_value(dictionary.get(), MakeQfString("key"), array.get());
    EXPECT_EQ(shortly(dictionary.get()), "QfDictionary(1 keys)");
    EXPECT_EQ(shortly(array.get()), "QfArray(2 elements)");
    for (const QfTypeRef value : {static_cast<QfTypeRef>(array.get()), QfTypeRef(dictionary.get()),
                                  QfTypeRef(data.get()), QfTypeRef(kQfNull)}) {
        std::string description;
        EXPECT_TRUE(assign(description, adopt(qf_copy_description(value)).get()));
        EXPECT_EQ(show(true, value), description);
        EXPECT_EQ(show(value), description);
    }
    EXPECT_EQ(shortly(MakeQfString("text")), "text");
}

TEST(ConvertCopy, MakesStringsOfEachEncoding) {
    const struct {
        const char* name;
        std::string bytes;
        QfStringEncoding encoding;
        const char* text;  // null: fails
    } rows[] = {
        {"UTF-8", "\xC3\xA9", kQfStringEncodingUTF8, "\xC3\xA9"},
        {"UTF-8, cut", "\xC3", kQfStringEncodingUTF8, nullptr},
        {"ASCII", "e", kQfStringEncodingASCII, "e"},
        {"ASCII, 8 bits", "\xE9", kQfStringEncodingASCII, nullptr},
        {"Latin 1", "\xE9", kQfStringEncodingISOLatin1, "\xC3\xA9"},
        {"UTF-16, high byte first", "\x20\xAC", kQfStringEncodingUTF16BE, "\xE2\x82\xAC"},
        {"UTF-16, low byte first", "\xAC\x20", kQfStringEncodingUTF16LE, "\xE2\x82\xAC"},
        {"UTF-16, half a unit", "\xAC", kQfStringEncodingUTF16LE, nullptr},
        {"nothing", "", kQfStringEncodingUTF8, ""},
    };
    const auto check = [](const auto& convert, const char* expected) {
        const MakeQfString before("before");
        QfStringRef out = before;
        const bool made = convert(out);
        EXPECT_EQ(made, expected != nullptr);
        EXPECT_EQ(show(out), expected ? expected : "before");
        if (made)
            qf_release(out);
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        CountingAllocator memory;
        check([&](QfStringRef& out) { return convert_copy(out, row.bytes, row.encoding); },
              row.text);
        check(
            [&](QfStringRef& out) {
                return convert_copy(out, row.bytes.c_str(), row.encoding, &memory.allocator);
            },
            row.text);
        EXPECT_EQ(memory.allocations, memory.deallocations);
        EXPECT_EQ(memory.allocations, row.text ? 1 : 0);
    }
    check([](QfStringRef& out) { return convert_copy(out, std::string("a\0b", 3)); }, "a\\x00b");
    check([](QfStringRef& out) { return convert_copy(out, static_cast<const char*>(nullptr)); },
          nullptr);
    CountingAllocator none;
    none.empty = true;
    check(
        [&](QfStringRef& out) {
            return convert_copy(out, std::string(100, 'x'), kQfStringEncodingUTF8, &none.allocator);
        },
        nullptr);
}

TEST(ConvertCopy, MakesDataOfBytes) {
    const std::vector<std::uint8_t> bytes{0, 255, 7};
    CountingAllocator memory;
    QfDataRef out = nullptr;
    ASSERT_TRUE(convert_copy(out, bytes, &memory.allocator));
    EXPECT_EQ(bytesOf(out), bytes);
    EXPECT_EQ(memory.allocations, 1);
    qf_release(out);
    EXPECT_EQ(memory.deallocations, 1);
    ASSERT_TRUE(convert_copy(out, std::vector<std::uint8_t>()));
    EXPECT_EQ(bytesOf(out), std::vector<std::uint8_t>());
    const QfDataRef before = out;
    memory.empty = true;
    EXPECT_FALSE(convert_copy(out, bytes, &memory.allocator));
    EXPECT_EQ(out, before);
    qf_release(out);
}

TEST(Copy, MakesTheDescriptionOfAnError) {
    const MakeQfString text("broken");
    const auto error = adopt(qf_error_create(MakeQfString("test"), 1, text));
    QfStringRef out = nullptr;
    EXPECT_FALSE(plr::qf::copy(nullptr, out));
    ASSERT_TRUE(plr::qf::copy(error.get(), out));
    EXPECT_EQ(show(out), "broken");
    qf_release(out);
}

class MappedFile : public testing::Test {
  protected:
    MemoryMappedFile map(const std::string& content) {
        std::ofstream(path_, std::ios::binary) << content;
        std::error_code error = std::make_error_code(std::errc::io_error);
        MemoryMappedFile file = MemoryMappedFile::create(path_.c_str(), error);
        EXPECT_TRUE(file && !error) << error;
        return file;
    }
    // Whether this process has the file in memory.
    [[nodiscard]] bool isMapped() const {
        std::ifstream maps("/proc/self/maps");
        return std::string(std::istreambuf_iterator<char>(maps), {}).find(path_) !=
               std::string::npos;
    }

    plr::test::ScratchFolder folder_;
    std::string path_ = folder_.at("file");
    std::vector<std::uint8_t> abc_{'a', 'b', 'c'};
};

TEST_F(MappedFile, OwnsItsMapping) {
    {
        MemoryMappedFile file = map("abc");
        MemoryMappedFile moved(std::move(file));
        EXPECT_FALSE(file);  // NOLINT(bugprone-use-after-move): without a mapping then
        EXPECT_EQ(moved.size(), 3U);
        EXPECT_EQ(std::string(static_cast<const char*>(moved.bytes()), moved.size()), "abc");
        file = std::move(moved);
        EXPECT_TRUE(isMapped());
        file = MemoryMappedFile();
        EXPECT_FALSE(isMapped());
        file = map("abc");
    }
    EXPECT_FALSE(isMapped());
}

TEST_F(MappedFile, IsOfRegularFilesOnly) {
    const std::string fifo = folder_.at("fifo");
    ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
    const std::pair<std::string, std::errc> rows[] = {{path_, std::errc::no_such_file_or_directory},
                                                      {fifo, std::errc::invalid_argument},
                                                      {folder_.at(""), std::errc::invalid_argument},
                                                      {"/dev/null", std::errc::invalid_argument}};
    for (const auto& [path, expected] : rows) {
        std::error_code error;
        EXPECT_FALSE(MemoryMappedFile::create(path.c_str(), error)) << path;
        EXPECT_EQ(error, expected) << path;
    }
}

TEST_F(MappedFile, IsCopiedIntoTheFirstAllocatorsMemory) {
    CountingAllocator memory;
    CountingAllocator unused;
    QfDataRef data = nullptr;
    {
        const MemoryMappedFile file = map("abc");
        ASSERT_TRUE(convert_copy(data, file, true, &memory.allocator, &unused.allocator));
        memory.empty = true;
        QfDataRef none = data;
        EXPECT_FALSE(convert_copy(none, file, true, &memory.allocator, nullptr));
        EXPECT_EQ(none, data);
    }
    EXPECT_FALSE(isMapped());
    EXPECT_EQ(bytesOf(data), abc_);
    qf_release(data);
    EXPECT_EQ(memory.allocations, 1);
    EXPECT_EQ(memory.deallocations, 1);
    EXPECT_EQ(unused.deallocations, 0);
}

TEST_F(MappedFile, IsReferredToUntilTheSecondAllocatorIsTold) {
    CountingAllocator unused;
    CountingAllocator told;
    told.owns = false;
    const MemoryMappedFile file = map("abc");
    QfDataRef data = nullptr;
    ASSERT_TRUE(convert_copy(data, file, false, &unused.allocator, &told.allocator));
    EXPECT_EQ(qf_data_get_bytes_ptr(data), file.bytes());
    EXPECT_EQ(told.deallocations, 0);
    qf_release(data);
    EXPECT_EQ(told.deallocations, 1);
    EXPECT_EQ(told.lastMemory, file.bytes());
    EXPECT_EQ(told.lastSize, 3U);
    EXPECT_EQ(unused.allocations, 0);
    EXPECT_FALSE(convert_copy(data, MemoryMappedFile(), false));
}

TEST_F(MappedFile, GoesWithTheDataThatTookItOver) {
    for (const bool isEmpty : {false, true}) {
        MemoryMappedFile file = map(isEmpty ? "" : "abc");
        QfDataRef data = nullptr;
        ASSERT_TRUE(convert_copy(data, std::move(file)));
        EXPECT_FALSE(file);  // NOLINT(bugprone-use-after-move): without a mapping then
        EXPECT_EQ(isMapped(), !isEmpty);
        EXPECT_EQ(bytesOf(data), isEmpty ? std::vector<std::uint8_t>() : abc_);
        qf_release(data);
        EXPECT_FALSE(isMapped());
        EXPECT_FALSE(convert_copy(data, std::move(file)));
    }
}

}  // namespace
