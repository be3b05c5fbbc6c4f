#include "Tools/OutputFile.h"

#include "Tests/Tools/CommandRun.h"
#include "Tools/Failure.h"

#include <gmock/gmock.h>

#include <sys/stat.h>

#include <filesystem>
#include <sstream>
#include <string>

namespace VexaTouch::Tools {
namespace {

using Testing::contentOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using Testing::TemporaryFolder;

class OutputFileTest : public ::testing::Test {
protected:
    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
};

TEST_F(OutputFileTest, NothingIsThereUntilItIsCommitted) {
    const std::string path = folder.path("a.json");
    OutputFile file(path, streams);
    file.write("one ");
    file.write("two");
    EXPECT_FALSE(std::filesystem::exists(path));
    file.commit();
    EXPECT_EQ(contentOf(path), "one two");
    EXPECT_THAT(folder.names(), ElementsAre("a.json"));
}

TEST_F(OutputFileTest, WhatIsNotCommittedLeavesTheOldFileAndNoRubbish) {
    const std::string path = folder.file("a.json", "old");
    {
        OutputFile file(path, streams);
        file.write(std::string(1'000'000, 'x'));
    }
    EXPECT_EQ(contentOf(path), "old");
    EXPECT_THAT(folder.names(), ElementsAre("a.json"));
}

TEST_F(OutputFileTest, LongTextsKeepTheirOrder) {
    const std::string path = folder.path("a.json");
    OutputFile file(path, streams);
    const std::string longText(300'000, 'y');
    file.write("before ");
    file.write(longText);
    file.write(" after");
    file.commit();
    EXPECT_EQ(contentOf(path), "before " + longText + " after");
}

TEST_F(OutputFileTest, AReplacedFileKeepsItsMode) {
    const std::string path = folder.file("a.json", "old");
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    OutputFile file(path, streams);
    file.write("new");
    file.commit();
    struct stat status{};
    ASSERT_EQ(stat(path.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
}

TEST_F(OutputFileTest, ALinkStaysALink) {
    const std::string target = folder.file("target.json", "old");
    const std::string link = folder.path("link.json");
    std::filesystem::create_symlink("target.json", link);
    OutputFile file(link, streams);
    file.write("new");
    file.commit();
    EXPECT_EQ(contentOf(target), "new");
    EXPECT_TRUE(std::filesystem::is_symlink(link));
}

TEST_F(OutputFileTest, ADeviceIsWrittenAndNotReplaced) {
    OutputFile file("/dev/null", streams);
    file.write("gone");
    file.commit();
    EXPECT_TRUE(std::filesystem::is_character_file("/dev/null"));
}

TEST_F(OutputFileTest, AFullDeviceIsAFailure) {
    OutputFile file("/dev/full", streams);
    file.write("text");
    try {
        file.commit();
        FAIL();
    } catch (const Failure& failure) {
        EXPECT_STREQ(failure.what(), "/dev/full: cannot write: No space left on device");
    }
}

TEST_F(OutputFileTest, AFileThatCannotTakeItsNameStaysBesideIt) {
    const std::string path = folder.file("a.json", "old");
    std::string fault;
    {
        OutputFile file(path, streams);
        file.write("hours of work");
        // A folder's name is taken by no file.
        std::filesystem::remove(path);
        std::filesystem::create_directory(path);
        try {
            file.commit();
        } catch (const Failure& failure) {
            fault = failure.what();
        }
    }
    ASSERT_THAT(folder.names(), SizeIs(2));
    const std::string beside = folder.path(folder.names().front());
    EXPECT_EQ(contentOf(beside), "hours of work");
    EXPECT_EQ(fault, path +
                         ": the new file cannot take its place: Is a directory; what was "
                         "written is in " +
                         beside);
}

TEST_F(OutputFileTest, AMinusIsTheResultStream) {
    OutputFile file("-", streams);
    EXPECT_EQ(file.name(), "standard output");
    file.write("text");
    file.commit();
    EXPECT_EQ(out.str(), "text");
    EXPECT_THAT(folder.names(), IsEmpty());
}

TEST_F(OutputFileTest, AFolderAndAFolderThatIsNotThereAreFailures) {
    const auto fault = [&](const std::string& path) -> std::string {
        try {
            const OutputFile file(path, streams);
        } catch (const Failure& failure) {
            return failure.what();
        }
        return "none";
    };
    EXPECT_EQ(fault(folder.path("")), folder.path("") + ": cannot write: Is a directory");
    EXPECT_EQ(fault(folder.path("no/a.json")),
              folder.path("no/a.json") + ": cannot write: No such file or directory");
}

}  // namespace
}  // namespace VexaTouch::Tools
