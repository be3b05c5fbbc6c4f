// A process of its own, since it stands between the tools and the system when they see to the
// safety of files.

#include "Tests/Tools/CommandRun.h"
#include "Tools/AppendTarget.h"
#include "Tools/Failure.h"
#include "Tools/OutputFile.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

/// What was asked of the system, in its order.
std::vector<std::string> calls;
int syncFault = 0;
bool knowsNamelessFiles = true;

template <typename Function>
Function* original(const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

int answer(int fault) {
    errno = fault;
    return fault == 0 ? 0 : -1;
}

}  // namespace

extern "C" {

int fdatasync(int /*descriptor*/) {
    calls.emplace_back("sync file");
    return answer(syncFault);
}

int fsync(int descriptor) {
    struct stat status{};
    const bool isFolder = ::fstat(descriptor, &status) == 0 && S_ISDIR(status.st_mode);
    calls.emplace_back(isFolder ? "sync folder" : "sync file");
    return 0;
}

int rename(const char* from, const char* to) noexcept {
    static const auto call = original<int(const char*, const char*)>("rename");
    calls.emplace_back("rename");
    return call(from, to);
}

int access(const char* path, int mode) noexcept {
    static const auto call = original<int(const char*, int)>("access");
    const bool isOpenFile = std::string(path).starts_with("/proc/self/fd/");
    return isOpenFile && !knowsNamelessFiles ? answer(ENOENT) : call(path, mode);
}

}  // extern "C"

namespace VexaTouch::Tools {
namespace {

using Testing::contentOf;
using ::testing::ElementsAre;
using Testing::TemporaryFolder;

class DiskSyncTest : public ::testing::Test {
protected:
    DiskSyncTest() { calls.clear(); }
    ~DiskSyncTest() override {
        syncFault = 0;
        knowsNamelessFiles = true;
    }

    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
};

TEST_F(DiskSyncTest, AnOutputFileIsSafeBeforeItTakesItsName) {
    OutputFile file(folder.path("a.json"), streams);
    file.write("text");
    file.commit();
    EXPECT_THAT(calls, ElementsAre("sync file", "rename", "sync folder"));
}

// A folder of conversions would take twice as long.
TEST_F(DiskSyncTest, WhatCanBeMadeAgainWaitsForTheDiskOnlyWhereItReplacesAFile) {
    const std::string path = folder.path("a.json");
    for (int i = 0; i < 2; ++i) {
        OutputFile file(path, streams, OutputFile::Content::Derivable);
        file.write("text");
        file.commit();
    }
    EXPECT_THAT(calls, ElementsAre("rename", "sync file", "rename", "sync folder"));
}

TEST_F(DiskSyncTest, AnOutputFileThatIsNotConfirmedStaysBesideTheOldOne) {
    const std::string path = folder.file("a.json", "old");
    syncFault = EIO;
    std::string fault;
    {
        OutputFile file(path, streams);
        file.write("hours of work");
        try {
            file.commit();
        } catch (const Failure& failure) {
            fault = failure.what();
        }
    }
    EXPECT_EQ(contentOf(path), "old");
    ASSERT_EQ(folder.names().size(), 2U);
    const std::string beside = folder.path(folder.names().front());
    EXPECT_EQ(contentOf(beside), "hours of work");
    EXPECT_EQ(fault,
              path + ": the disk did not confirm what was written: Input/output error; it is in " +
                  beside);
}

TEST_F(DiskSyncTest, AFileSystemThatCannotSyncIsNoFault) {
    syncFault = EINVAL;
    OutputFile file(folder.path("a.json"), streams);
    file.write("text");
    file.commit();
    EXPECT_EQ(contentOf(folder.path("a.json")), "text");
}

TEST_F(DiskSyncTest, ARecordingIsSafeBeforeItReplacesTheOldOne) {
    const std::string path = folder.file("old", "precious");
    const auto target = openAppendTarget(path, true, streams);
    target->write(0, "new");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_THAT(calls, ElementsAre("sync file", "rename"));
    EXPECT_EQ(target->sync(), 0);
    // The name stays what it is.
    EXPECT_EQ(target->sync(), 0);
    EXPECT_THAT(calls, ElementsAre("sync file", "rename", "sync file", "sync folder", "sync file"));
}

TEST_F(DiskSyncTest, ARecordingThatIsNotConfirmedDoesNotReplaceTheOldOne) {
    const std::string path = folder.file("old", "precious");
    {
        const auto target = openAppendTarget(path, true, streams);
        target->write(0, "new");
        syncFault = EIO;
        EXPECT_EQ(target->keep(), EIO);
        EXPECT_EQ(target->beside(), "");
    }
    EXPECT_EQ(contentOf(path), "precious");
    EXPECT_THAT(folder.names(), ElementsAre("old"));
}

TEST_F(DiskSyncTest, TheNameOfANewRecordingIsSafeToo) {
    const auto target = openAppendTarget(folder.path("new"), false, streams);
    target->write(0, "new");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_EQ(target->sync(), 0);
    EXPECT_THAT(calls, ElementsAre("sync file", "sync folder"));
}

TEST_F(DiskSyncTest, WhereNoFileIsWithoutANameTheNewOneHasOneUntilItIsKept) {
    knowsNamelessFiles = false;
    const std::string path = folder.file("old", "precious");
    {
        const auto abandoned = openAppendTarget(path, true, streams);
        abandoned->write(0, "new");
        EXPECT_EQ(folder.names().size(), 2U);
    }
    EXPECT_EQ(contentOf(path), "precious");
    const auto target = openAppendTarget(path, true, streams);
    target->write(0, "new");
    EXPECT_EQ(target->keep(), 0);
    EXPECT_EQ(contentOf(path), "new");
    EXPECT_THAT(folder.names(), ElementsAre("old"));
}

}  // namespace
}  // namespace VexaTouch::Tools
