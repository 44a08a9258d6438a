#include "plr/log/file_log_writer.h"

#include <gmock/gmock.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <system_error>

#include "plr/ipc/read.h"
#include "support/log_records.h"
#include "support/runtime.h"
#include "support/scratch_folder.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;
using testing::ElementsAre;
using testing::HasSubstr;

constexpr std::size_t kRecord = 32 + 6 + 10 + 1;  // bytes, of a text of ten

std::string ten(int number) {
    const std::string digits = std::to_string(number);
    return std::string(10 - digits.size(), '0') + digits;
}

class FileWriter : public testing::Test {
  protected:
    void open(FileLogWriter::Options options = {}) {
        if (options.path.empty())
            options.path = folder_.at("log");
        writer_ = FileLogWriter::create(std::move(options));
    }
    void write(int first, int last) {
        for (; first <= last; ++first)
            writer_->write(logMessage(ten(first)));
        writer_->endBatch();
    }
    std::int64_t config(const char* key) const {
        const vox::dict dictionary(writer_->getFullConfig());
        return vox::dyn_cast_or_default(dictionary[key], std::int64_t{-1});
    }
    std::vector<std::string> texts(const std::string& name) const {
        return textsOfRecords(folder_.read(name));
    }
    bool exists(const char* name) const { return ::access(folder_.at(name).c_str(), F_OK) == 0; }

    const Reports reports_;
    ScratchFolder folder_;
    std::shared_ptr<FileLogWriter> writer_;
};

TEST_F(FileWriter, WritesRecordsByLocalTime) {
    struct Row {
        const char* zone;
        bool utc;
        TimeStamp time;
        const char* shown;
    };
    constexpr TimeStamp kSecond = 1'000'000'000;
    const Row rows[] = {
        {"UTC0", false, -1, "1969-12-31 23:59:59.999999+00:00"},
        {"CET-1CEST,M3.5.0,M10.5.0/3", false, 1'711'846'799 * kSecond + 999'999'999,
         "2024-03-31 01:59:59.999999+01:00"},
        {"CET-1CEST,M3.5.0,M10.5.0/3", false, 1'711'846'800 * kSecond,
         "2024-03-31 03:00:00.000000+02:00"},
        {"NST3:30", false, 951'782'400 * kSecond + 1000, "2000-02-28 20:30:00.000001-03:30"},
        {"NST3:30", true, 951'782'400 * kSecond, "2000-02-29 00:00:00.000000+00:00"}};
    for (const Row& row : rows) {
        ::setenv("TZ", row.zone, 1);
        ::tzset();
        ::unlink(folder_.at("log").c_str());
        open({.path = "", .utc = row.utc});
        writer_->write(logMessage("text", LogLevel::Error, {"band=3", "two\nlines"}, row.time));
        writer_->endBatch();
        EXPECT_EQ(folder_.read("log"),
                  std::string(row.shown) + " E d: text {band=3} {two\\x0alines}\n");
    }
    ::unsetenv("TZ");
}

TEST_F(FileWriter, RotatesBetweenRecords) {
    open({.path = "", .maxBytes = 3 * kRecord + 1, .oldFiles = 2, .mode = 0600});
    write(1, 11);
    EXPECT_THAT(texts("log"), ElementsAre(ten(10), ten(11)));
    EXPECT_THAT(texts("log.1"), ElementsAre(ten(7), ten(8), ten(9)));
    EXPECT_THAT(texts("log.2"), ElementsAre(ten(4), ten(5), ten(6)));
    EXPECT_FALSE(exists("log.3"));
    EXPECT_EQ(config("kRotations"), 3);
    struct stat status {};
    ASSERT_EQ(::stat(folder_.at("log").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777u, 0600u);

    writer_->write(logMessage(std::string(1000, 'x')));
    write(12, 12);
    EXPECT_THAT(texts("log"), ElementsAre(ten(12)));
    EXPECT_THAT(texts("log.1"), ElementsAre(std::string(1000, 'x')));
}

TEST_F(FileWriter, GoesOnWhereAnEarlierProcessStopped) {
    std::ofstream(folder_.at("log")) << "1970-01-01 00:00:00.000000+00:00 I d: cut sho";
    open({.path = "", .maxBytes = 2 * kRecord, .oldFiles = 0});
    write(1, 1);
    EXPECT_THAT(texts("log"), ElementsAre("cut sho", ten(1)));
    write(2, 2);
    EXPECT_THAT(texts("log"), ElementsAre(ten(2)));
    EXPECT_FALSE(exists("log.1"));
}

TEST_F(FileWriter, KeepsWritingToTheOldFileWhenRotationFails) {
    std::filesystem::create_directories(folder_.at("log.1/full"));
    open({.path = "", .maxBytes = kRecord, .oldFiles = 1});
    write(1, 2);
    write(3, 3);
    EXPECT_THAT(texts("log"), ElementsAre(ten(1), ten(2), ten(3)));
    EXPECT_GT(reports_.count(""), 0U);
    std::filesystem::remove_all(folder_.at("log.1"));
    write(4, 4);
    EXPECT_THAT(texts("log.1"), ElementsAre(ten(1), ten(2), ten(3)));
    EXPECT_THAT(texts("log"), ElementsAre(ten(4)));
}

TEST_F(FileWriter, ReopensBeforeTheNextRecord) {
    open();
    writer_->write(logMessage("1"));
    std::filesystem::rename(folder_.at("log"), folder_.at("away"));
    std::thread([this] { writer_->reopen(); }).join();
    writer_->write(logMessage("2"));
    writer_->endBatch();
    EXPECT_THAT(texts("away"), ElementsAre("1"));
    EXPECT_THAT(texts("log"), ElementsAre("2"));

    // A file that cannot be opened: the old one stays until there is another.
    std::filesystem::rename(folder_.at("log"), folder_.at("away"));
    std::filesystem::create_directory(folder_.at("log"));
    writer_->reopen();
    write(3, 3);
    std::filesystem::remove(folder_.at("log"));
    write(4, 4);
    EXPECT_THAT(texts("away"), ElementsAre("2", ten(3)));
    EXPECT_THAT(texts("log"), ElementsAre(ten(4)));
}

TEST_F(FileWriter, CannotBeMadeForAPathThatCannotBeOpened) {
    try {
        open({.path = folder_.at("none/log")});
        FAIL() << "opened";
    } catch (const std::system_error& error) {
        EXPECT_EQ(error.code(), std::errc::no_such_file_or_directory);
        EXPECT_THAT(error.what(), HasSubstr("none/log"));
    }
}

// Files that may not grow over some bytes: writes are short at first, then fail.
class FileLimit {
  public:
    explicit FileLimit(rlim_t bytes) {
        ::getrlimit(RLIMIT_FSIZE, &before_);
        const rlimit limit{bytes, before_.rlim_max};
        ::setrlimit(RLIMIT_FSIZE, &limit);
    }
    ~FileLimit() { lift(); }
    void lift() const { ::setrlimit(RLIMIT_FSIZE, &before_); }

  private:
    rlimit before_{};
};

TEST_F(FileWriter, LosesNothingWhileWhatItCannotWriteFitsIntoMemory) {
    open();
    dispatch::group flushed;
    {
        const FileLimit limit(2 * kRecord + 7);
        write(1, 4);
        write(5, 5);
        writer_->flush(dispatch::group_session(flushed));
        EXPECT_EQ(folder_.read("log").size(), 2 * kRecord + 7);
        EXPECT_NE(flushed.wait(dispatch::time()), 0);
        EXPECT_EQ(vox::dict(writer_->getFullConfig()).text("kLastError"), "File too large");
    }
    // A timer tries again.
    EXPECT_EQ(flushed.wait(dispatch::time::after(kBound)), 0);
    write(6, 6);
    EXPECT_THAT(texts("log"), ElementsAre(ten(1), ten(2), ten(3), ten(4), ten(5), ten(6)));
    EXPECT_EQ(config("kDropped"), 0);
}

TEST_F(FileWriter, CountsWhatItDropsAndSaysSoAtTheGap) {
    open({.path = "", .maxKeptBytes = 3 * kRecord});
    const FileLimit limit(kRecord + 7);
    write(1, 3);   // one and a bit in the file, the rest is kept
    write(4, 10);  // two of them are kept
    write(11, 20);
    limit.lift();
    write(21, 21);
    EXPECT_THAT(
        texts("log"),
        ElementsAre(ten(1), ten(2), ten(3), ten(4), ten(5),
                    "Note: 15 log messages dropped, the file could not be written", ten(21)));
    EXPECT_EQ(config("kDropped"), 15);
}

TEST_F(FileWriter, TakesARecordsBeginningOffTheFileItLeaves) {
    open();
    {
        const FileLimit limit(kRecord + 7);
        write(1, 2);
    }
    std::filesystem::rename(folder_.at("log"), folder_.at("away"));
    {
        // The old file stays full until it is left.
        const FileLimit limit(kRecord + 7);
        writer_->reopen();
        writer_->write(logMessage("x"));
    }
    writer_->endBatch();
    EXPECT_THAT(texts("away"), ElementsAre(ten(1)));
    EXPECT_THAT(texts("log"), ElementsAre(ten(2), "x"));
}

TEST_F(FileWriter, ReportsWhatItHasToLeaveUnwritten) {
    std::filesystem::create_symlink("/dev/full", folder_.at("log"));
    open();
    write(1, 3);
    EXPECT_GT(reports_.count("No space left on device"), 0U);
    writer_->close();
    EXPECT_EQ(reports_.count("closed without the last 3 log messages"), 1U);
}

}  // namespace
