#include "Tools/RecordingFile.h"

#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <sstream>
#include <stdexcept>
#include <streambuf>
#include <string>

namespace VexaTouch::Tools {
namespace {

using Testing::contentOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Testing::mixedSession;
using Testing::TemporaryFolder;

class RecordingFileTest : public ::testing::Test {
protected:
    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};

    std::string fault(const std::string& path) {
        try {
            readRecording(path, streams);
        } catch (const Failure& failure) {
            return failure.what();
        }
        return "none";
    }
};

TEST_F(RecordingFileTest, AFileGivesItsFramesVersionAndSize) {
    const std::string text = mixedSession().text();
    const std::string path = folder.file("session.json", text);
    const RecordingFile file = readRecording(path, streams);
    EXPECT_EQ(file.name, path);
    EXPECT_EQ(file.frames, mixedSession().frames());
    EXPECT_EQ(file.version, 1U);
    EXPECT_EQ(file.textBytes, text.size());
    EXPECT_EQ(error.str(), "");
}

TEST_F(RecordingFileTest, TheOldVersionIsReadToo) {
    const std::string path = folder.file(
        "old.json", R"({"Reports": [{"Timestamp": 7, "ReportData": "01 02"}], "Version": 0})");
    const RecordingFile file = readRecording(path, streams);
    ASSERT_EQ(file.frames.size(), 1U);
    EXPECT_EQ(file.frames.front().timestamp, 7U);
    EXPECT_THAT(file.frames.front().report, ElementsAre(1, 2));
    EXPECT_EQ(file.version, 0U);
}

TEST_F(RecordingFileTest, AFileLongerThanOnePieceIsReadWhole) {
    Testing::RecordedSession recorded;
    recorded.feel(Testing::touch("H").at(300).forMs(50'000));  // 5000 frames, 1.5 MB of text
    const std::string path = folder.file("long.json", recorded.text());
    EXPECT_EQ(readRecording(path, streams).frames, recorded.frames());
}

TEST_F(RecordingFileTest, StandardInputIsReadWhole) {
    in.str(mixedSession().text());
    const RecordingFile file = readRecording("-", streams);
    EXPECT_EQ(file.name, "standard input");
    EXPECT_EQ(file.frames, mixedSession().frames());
}

TEST_F(RecordingFileTest, EveryCutOfARecordingIsNamedByItsLength) {
    const std::string text = mixedSession().text();
    for (const std::size_t length :
         {std::size_t{1}, std::size_t{40}, std::size_t{700}, text.size() / 2, text.size() - 3}) {
        const std::string path = folder.file("cut.json", text.substr(0, length));
        EXPECT_EQ(fault(path), path + ": cut off after " + std::to_string(length) +
                                   " bytes: migrateSerializedContainer failed: invalid container "
                                   "(incomplete JSON)");
    }
}

TEST_F(RecordingFileTest, ADamagedPlaceIsNamedByItsByte) {
    std::string text = mixedSession().text();
    const std::size_t place = text.find("Timestamp", text.size() / 2) + 11;
    text[place] = '@';
    const std::string path = folder.file("damaged.json", text);
    EXPECT_EQ(fault(path), path + ": no JSON at byte " + std::to_string(place) +
                               ": migrateSerializedContainer failed: invalid container (syntax "
                               "error)");
}

TEST_F(RecordingFileTest, AFileThatCannotBeOpenedIsNamedWithTheReason) {
    const std::string path = folder.path("circle.json");
    std::filesystem::create_symlink("circle.json", path);
    EXPECT_EQ(fault(path), path + ": cannot open: Too many levels of symbolic links");
}

TEST_F(RecordingFileTest, AnOldFrameWithoutItsReportIsNamedByItsPlace) {
    const std::string path =
        folder.file("old.json", R"({"Version": 0, "Reports": [{"Timestamp": 1, "ReportData": "01"},
                                                  {"Timestamp": 2}]})");
    EXPECT_EQ(fault(path),
              path + ": frame 1: migrateSerializedContainer failed: frame lacks ReportData");
}

TEST_F(RecordingFileTest, ABrokenInputStreamIsAFailure) {
    struct Broken : std::streambuf {
        int_type underflow() override { throw std::runtime_error("broken"); }
    } broken;
    std::istream bad(&broken);
    Streams withBad{.in = bad, .out = out, .error = error};
    try {
        readRecording("-", withBad);
        FAIL();
    } catch (const Failure& failure) {
        EXPECT_STREQ(failure.what(), "standard input: cannot read: Input/output error");
    }
}

TEST_F(RecordingFileTest, WhatIsWrittenReadsBack) {
    const std::string path = folder.path("written.json");
    writeRecording(mixedSession().frames(), path, streams);
    EXPECT_EQ(contentOf(path), mixedSession().text());
    EXPECT_EQ(readRecording(path, streams).frames, mixedSession().frames());
    EXPECT_THAT(folder.names(), ElementsAre("written.json"));
    writeRecording(mixedSession().frames(), "-", streams);
    EXPECT_EQ(out.str(), mixedSession().text());
}

TEST_F(RecordingFileTest, AnEmptyRecordingIsWrittenAndReadToo) {
    const std::string path = folder.path("empty.json");
    writeRecording({}, path, streams);
    EXPECT_THAT(readRecording(path, streams).frames, IsEmpty());
}

}  // namespace
}  // namespace VexaTouch::Tools
