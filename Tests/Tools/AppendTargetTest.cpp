#include "Tools/AppendTarget.h"

#include "Tests/Tools/CommandRun.h"
#include "Tools/Failure.h"

#include <gmock/gmock.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <sstream>
#include <string>

namespace VexaTouch::Tools {
namespace {

using Testing::contentOf;
using ::testing::ElementsAre;
using Testing::TemporaryFolder;

class AppendTargetTest : public ::testing::Test {
protected:
    std::unique_ptr<AppendTarget> open(const std::string& path, bool replace = false) {
        return openAppendTarget(path, replace, streams_);
    }
    std::string failure(const std::string& path, bool replace = false) {
        try {
            open(path, replace);
        } catch (const Failure& refused) {
            return refused.what();
        }
        return "opened";
    }

    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;

private:
    Streams streams_{.in = in, .out = out, .error = error};
};

TEST_F(AppendTargetTest, NewFileIsWrittenOverAndCut) {
    const std::string path = folder.path("new");
    const auto target = open(path);
    EXPECT_TRUE(target->isRewritable());
    EXPECT_EQ(target->write(0, "beginning]").written, 10U);
    EXPECT_EQ(target->write(9, ", more]").error, 0);
    EXPECT_EQ(contentOf(path), "beginning, more]");
    EXPECT_EQ(target->cut(9), 0);
    EXPECT_EQ(target->sync(), 0);
    EXPECT_EQ(target->close(), 0);
    EXPECT_EQ(contentOf(path), "beginning");
}

TEST_F(AppendTargetTest, FileThatIsThereIsKeptUnlessToBeReplaced) {
    const std::string path = folder.file("old", "precious");
    chmod(path.c_str(), 0640);
    EXPECT_EQ(failure(path), path +
                                 ": is there already and would be lost (--force replaces it, "
                                 "another name keeps it)");
    EXPECT_EQ(contentOf(path), "precious");
    const std::string other = folder.path("other name");
    std::filesystem::create_hard_link(path, other);
    const auto target = open(path, true);
    target->write(0, "new");
    EXPECT_EQ(contentOf(path), "precious");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_EQ(target->keep(), 0);
    EXPECT_EQ(contentOf(path), "new");
    EXPECT_EQ(contentOf(other), "precious");
    struct stat status{};
    stat(path.c_str(), &status);
    EXPECT_EQ(status.st_mode & 07777U, 0640U);
    EXPECT_THAT(folder.names(), ElementsAre("old", "other name"));
}

// So that nothing is left behind when the program is killed.
TEST_F(AppendTargetTest, ReplacingFileHasNoNameUntilItIsKept) {
    const std::string path = folder.file("old", "precious");
    const auto target = open(path, true);
    target->write(0, "new");
    EXPECT_THAT(folder.names(), ElementsAre("old"));
    EXPECT_EQ(target->keep(), 0);
    EXPECT_THAT(folder.names(), ElementsAre("old"));
    EXPECT_EQ(contentOf(path), "new");
}

TEST_F(AppendTargetTest, TellsWhetherSomethingWasThere) {
    EXPECT_FALSE(open(folder.path("new"))->wasThere());
    EXPECT_TRUE(open(folder.file("empty", ""))->wasThere());
    EXPECT_TRUE(open(folder.file("old", "precious"), true)->wasThere());
}

TEST_F(AppendTargetTest, LinkKeepsPointingWhereItPoints) {
    const std::string path = folder.file("old", "precious");
    const std::string link = folder.path("link");
    std::filesystem::create_symlink("old", link);
    const auto target = open(link, true);
    target->write(0, "new");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_TRUE(std::filesystem::is_symlink(link));
    EXPECT_EQ(contentOf(path), "new");
}

TEST_F(AppendTargetTest, EmptyFileIsTaken) {
    const std::string path = folder.file("empty", "");
    const auto target = open(path);
    target->write(0, "new");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_EQ(contentOf(path), "new");
}

TEST_F(AppendTargetTest, WhatIsNotKeptLeavesEverythingAsItWas) {
    const std::string old = folder.file("old", "precious");
    const std::string empty = folder.file("empty", "");
    for (const std::string& path : {old, empty, folder.path("none")}) {
        open(path, true)->write(0, "new");
    }
    EXPECT_EQ(contentOf(old), "precious");
    EXPECT_EQ(contentOf(empty), "");
    EXPECT_THAT(folder.names(), ElementsAre("empty", "old"));
}

// Another program that records into the same file ends first.
TEST_F(AppendTargetTest, WhatIsNotKeptLeavesTheFileOfAnother) {
    for (const std::string& path : {folder.path("none"), folder.file("empty", "")}) {
        const auto target = open(path);
        target->write(0, "new");
        std::filesystem::rename(folder.file("other", "precious"), path);
    }
    EXPECT_EQ(contentOf(folder.path("none")), "precious");
    EXPECT_EQ(contentOf(folder.path("empty")), "precious");
}

TEST_F(AppendTargetTest, FileWhoseNameCannotBeTakenStaysBesideIt) {
    const std::string path = folder.file("old", "precious");
    std::string beside;
    {
        const auto target = open(path, true);
        target->write(0, "new");
        EXPECT_EQ(target->beside(), "");
        // A folder's name is taken by no file.
        std::filesystem::remove(path);
        std::filesystem::create_directory(path);
        EXPECT_EQ(target->keep(), EISDIR);
        beside = target->beside();
    }
    EXPECT_EQ(contentOf(beside), "new");
    EXPECT_EQ(std::filesystem::path(beside).parent_path(),
              std::filesystem::path(path).parent_path());
    EXPECT_THAT(folder.names(),
                ElementsAre(std::filesystem::path(beside).filename().string(), "old"));
}

TEST_F(AppendTargetTest, NewFileStaysWhenItIsKept) {
    const std::string path = folder.path("new");
    {
        const auto target = open(path);
        target->write(0, "new");
        EXPECT_EQ(target->keep(), 0);
    }
    EXPECT_EQ(contentOf(path), "new");
}

TEST_F(AppendTargetTest, WhatCannotBeWrittenIsNamed) {
    EXPECT_EQ(failure(folder.path("none/file")),
              folder.path("none/file") + ": cannot write: No such file or directory");
    EXPECT_EQ(failure(folder.path("")), folder.path("") + ": cannot write: Is a directory");
    std::filesystem::create_symlink("nowhere", folder.path("dangling"));
    EXPECT_EQ(failure(folder.path("dangling")),
              folder.path("dangling") + ": cannot write: No such file or directory");
}

TEST_F(AppendTargetTest, DeviceIsWrittenInSequence) {
    const auto target = open("/dev/full");
    EXPECT_FALSE(target->isRewritable());
    const AppendTarget::Result result = target->write(7, "text");
    EXPECT_EQ(result.written, 0U);
    EXPECT_EQ(result.error, ENOSPC);
    EXPECT_EQ(target->sync(), 0);
}

TEST_F(AppendTargetTest, DashIsTheResultStream) {
    const auto target = open("-");
    EXPECT_FALSE(target->isRewritable());
    EXPECT_EQ(target->write(0, "a").written, 1U);
    EXPECT_EQ(target->write(17, "b").error, 0);
    EXPECT_EQ(out.str(), "ab");
    out.setstate(std::ios::badbit);
    EXPECT_NE(target->write(2, "c").error, 0);
}

}  // namespace
}  // namespace VexaTouch::Tools
