#include "Tools/RecordingStream.h"

#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/Failure.h"
#include "Tools/RecordingRecovery.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <limits>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Testing::CommandResult;
using Testing::containerText;
using Testing::contentOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using Testing::RecordedSession;
using Testing::runCommand;
using Testing::TemporaryFolder;

using Frames = std::vector<RecordedFrame>;

/// A disk in memory that does as it is told.
struct Disk {
    std::string content = {};
    std::size_t room = std::numeric_limits<std::size_t>::max();  ///< in bytes
    bool isRewritable = true;
    int writesUntilFailure = -1;  ///< that one fails at once; none if negative
    bool closingFails = false;    ///< whatever comes after the failure fails, too
    int failWith = ENOSPC;
    int syncError = 0;
    int closeError = 0;
    bool wasThere = true;
    bool isKept = false;
    int keepError = 0;
    int syncs = 0;
    int writes = 0;
};

class DiskTarget final : public AppendTarget {
public:
    explicit DiskTarget(Disk& disk) : disk_(disk) {}

    [[nodiscard]] bool isRewritable() const noexcept override { return disk_.isRewritable; }
    Result write(std::uint64_t offset, std::string_view text) noexcept override {
        ++disk_.writes;
        if (hasFailed_ && disk_.closingFails) {
            return {.written = 0, .error = disk_.failWith};
        }
        if (disk_.writesUntilFailure >= 0 && disk_.writesUntilFailure-- == 0) {
            hasFailed_ = true;
            return {.written = 0, .error = disk_.failWith};
        }
        EXPECT_LE(offset, disk_.content.size());
        const std::size_t at = disk_.isRewritable ? offset : disk_.content.size();
        const std::size_t fits = std::min(text.size(), disk_.room - std::min(disk_.room, at));
        disk_.content.resize(std::max(disk_.content.size(), at + fits));
        disk_.content.replace(at, fits, text.substr(0, fits));
        hasFailed_ = fits < text.size();
        return {.written = fits, .error = hasFailed_ ? disk_.failWith : 0};
    }
    int cut(std::uint64_t offset) noexcept override {
        if (disk_.closingFails) {
            return EIO;
        }
        disk_.content.resize(offset);
        return 0;
    }
    int keep() noexcept override {
        disk_.isKept = disk_.keepError == 0;
        return disk_.keepError;
    }
    [[nodiscard]] std::string beside() const override {
        return disk_.keepError != 0 ? ".session.json.abc" : "";
    }
    int sync() noexcept override {
        ++disk_.syncs;
        return disk_.syncError;
    }
    int close() noexcept override { return disk_.closeError; }
    [[nodiscard]] bool wasThere() const noexcept override { return disk_.wasThere; }

private:
    Disk& disk_;
    bool hasFailed_ = false;
};

std::unique_ptr<RecordingStream> streamTo(
    Disk& disk, std::optional<std::chrono::nanoseconds> syncEvery = std::nullopt) {
    return std::make_unique<RecordingStream>(std::make_unique<DiskTarget>(disk), "session.json",
                                             syncEvery);
}

/// Frames of both types, no report longer than a line.
Frames someFrames() {
    RecordedSession session;
    session.set("Algs.ActivationThreshold", 250.0)
        .report({})
        .set("Algs.Odd \"key\" \xC3\xA9", Vexa::PropertyValue::Dictionary{{"a", 1}, {"b", "}"}})
        .report({1, 2, 3, 0xFF})
        .report({2, 0, 1, 2, 3, 4, 5, 6, 7, 8})
        .set("Algs.EnableTapSuppression", false)
        .report(std::vector<std::uint8_t>(20, 0xAB));
    return {session.frames().begin(), session.frames().end()};
}

FrameList firstOf(const Frames& frames, std::size_t count) {
    FrameList list;
    for (std::size_t i = 0; i < count; ++i) {
        list.push_back(frames[i]);
    }
    return list;
}

std::string textOf(const Frames& frames, std::size_t count) {
    return containerText(firstOf(frames, count));
}

/// What a stream says when it fails.
std::string record(RecordingStream& stream, const Frames& frames, std::size_t atOnce = 1) {
    try {
        std::size_t added = 0;
        for (const RecordedFrame& frame : frames) {
            stream.add(frame);
            if (++added % atOnce == 0) {
                stream.flush();
            }
        }
        stream.finish();
    } catch (const Failure& failure) {
        return failure.what();
    }
    return {};
}

TEST(RecordingStreamTest, FileIsAWholeRecordingAfterEachFrameInOneWriteEach) {
    Disk disk;
    const Frames frames = someFrames();
    const auto stream = streamTo(disk);
    EXPECT_EQ(disk.content, textOf(frames, 0));
    for (std::size_t i = 0; i < frames.size(); ++i) {
        stream->add(frames[i]);
        EXPECT_EQ(disk.content, textOf(frames, i));
        stream->flush();
        stream->flush();
        EXPECT_EQ(disk.content, textOf(frames, i + 1));
        EXPECT_EQ(stream->frames(), i + 1);
        EXPECT_EQ(stream->bytes(), disk.content.size());
        EXPECT_EQ(disk.writes, static_cast<int>(i) + 2);
    }
    stream->finish();
    EXPECT_EQ(disk.content, textOf(frames, frames.size()));
}

TEST(RecordingStreamTest, FramesThatWaitedAreWrittenTogether) {
    Disk disk;
    const Frames frames = someFrames();
    EXPECT_EQ(record(*streamTo(disk), frames, 3), "");
    EXPECT_EQ(disk.content, textOf(frames, frames.size()));
    EXPECT_EQ(disk.writes, 1 + 2 + 1);
}

TEST(RecordingStreamTest, WhatCannotBeWrittenOverGetsItsBracketsAtTheEnd) {
    Disk disk{.isRewritable = false};
    const Frames frames = someFrames();
    const auto stream = streamTo(disk);
    stream->add(frames[0]);
    stream->flush();
    const std::string whole = textOf(frames, 1);
    EXPECT_EQ(disk.content, whole.substr(0, disk.content.size()));
    EXPECT_LT(disk.content.size(), whole.size());
    stream->finish();
    EXPECT_EQ(disk.content, whole);
    Disk empty{.isRewritable = false};
    streamTo(empty)->finish();
    EXPECT_EQ(empty.content, textOf(frames, 0));
}

/// What cannot be written over is as good as kept from the beginning.
std::string failureText(const std::string& fault, std::size_t frames, bool isKept) {
    const std::string begin = "session.json: cannot write: " + fault + "; ";
    return !isKept ? begin + "no report was recorded, session.json is as it was"
                   : begin + std::to_string(frames) + (frames == 1 ? " frame is" : " frames are") +
                         " safe in it";
}

TEST(RecordingStreamTest, SettingsAloneReplaceNothingButInARecordingThatEndedWell) {
    RecordedSession session;
    session.set("Algs.ActivationThreshold", 250.0).set("Algs.EnableTapSuppression", false);
    const Frames settings(session.frames().begin(), session.frames().end());
    Disk disk;
    const auto stream = streamTo(disk);
    stream->add(settings[0]);
    stream->flush();
    EXPECT_FALSE(disk.isKept);
    stream->add(settings[1]);
    EXPECT_STREQ(stream->finishAfter("the device was unplugged").what(),
                 "the device was unplugged; no report was recorded, session.json is as it was");
    EXPECT_FALSE(disk.isKept);
    EXPECT_FALSE(stream->isFinished());
    Disk ended;
    EXPECT_EQ(record(*streamTo(ended), settings), "");
    EXPECT_TRUE(ended.isKept);
}

TEST(RecordingStreamTest, TheFirstReportIsWorthAFileEvenIfItsSourceFails) {
    RecordedSession session;
    session.set("Algs.ActivationThreshold", 250.0).report({1});
    Disk disk;
    const auto stream = streamTo(disk);
    stream->add(session.frames().front());
    stream->flush();
    stream->add(session.frames().back());
    EXPECT_STREQ(stream->finishAfter("the device was unplugged").what(),
                 "the device was unplugged");
    EXPECT_TRUE(disk.isKept);
    EXPECT_TRUE(stream->isFinished());
    EXPECT_EQ(disk.content, containerText(session.frames()));
}

TEST(RecordingStreamTest, PipeGetsItsBracketsAlsoWhenTheSourceFailsWithoutAReport) {
    Disk disk{.isRewritable = false};
    EXPECT_STREQ(streamTo(disk)->finishAfter("the device was unplugged").what(),
                 "the device was unplugged");
    EXPECT_EQ(disk.content, containerText({}));
}

TEST(RecordingStreamTest, RecordingThatCannotTakeItsPlaceSaysWhereItIs) {
    const Frames frames = someFrames();
    Disk disk{.keepError = EBUSY};
    EXPECT_EQ(record(*streamTo(disk), frames),
              "session.json: the new recording cannot take its place: Device or resource busy; 2 "
              "frames are safe in .session.json.abc, and session.json is as it was");
    EXPECT_EQ(disk.content, textOf(frames, 2));
}

TEST(RecordingStreamTest, StateWithoutAValueDoesNotSpoilTheFile) {
    Disk disk;
    RecordedFrame frame;
    frame.type = RecordedFrame::Type::State;
    frame.key = "Algs.ActivationThreshold";
    EXPECT_EQ(record(*streamTo(disk), {frame}), "");
    frame.value = Vexa::PropertyValue::null();
    EXPECT_EQ(disk.content, containerText(firstOf({frame}, 1)));
}

/// How many of the frames stand whole in the first `length` bytes of their recording.
std::size_t wholeFrames(const Frames& frames, std::size_t length) {
    std::size_t count = 0;
    const std::size_t brackets = std::string_view("\n  ]\n}\n").size();
    while (count < frames.size() && textOf(frames, count + 1).size() - brackets <= length) {
        ++count;
    }
    return count;
}

TEST(RecordingStreamTest, CutAtAnyByteEveryWholeFrameIsRestored) {
    const TemporaryFolder folder;
    Disk disk;
    const Frames frames = someFrames();
    ASSERT_EQ(record(*streamTo(disk), frames), "");
    const std::string restored = folder.path("restored.json");
    for (std::size_t length = 0; length < disk.content.size(); ++length) {
        SCOPED_TRACE("cut after " + std::to_string(length) + " bytes");
        const std::string cut = folder.file("cut.json", disk.content.substr(0, length));
        std::filesystem::remove(restored);  // else each waits for the disk
        const std::size_t whole = wholeFrames(frames, length);
        const CommandResult result = runCommand({"convert", "--recover", cut, "-o", restored});
        if (whole == 0) {
            // Only the last line feed behind an empty recording is not missed.
            ASSERT_EQ(result.exitCode, 1) << result;
            ASSERT_THAT(result.error, HasSubstr("no whole frame to recover"));
            continue;
        }
        ASSERT_EQ(result.exitCode, 0) << result;
        ASSERT_EQ(contentOf(restored), textOf(frames, whole));
    }
}

// A write of a frame that the machine's end cut: the brackets are overwritten, the rest is not
// there yet, or the bytes of the old end stand behind it still.
TEST(RecordingStreamTest, CutInTheMiddleOfAWriteLosesThatFrameAlone) {
    const Frames frames = someFrames();
    for (std::size_t before = 1; before < frames.size(); ++before) {
        const std::string old = textOf(frames, before);
        const std::string next = textOf(frames, before + 1);
        for (std::size_t length = old.size() - 8; length < next.size(); ++length) {
            SCOPED_TRACE(std::to_string(before) + " frames, cut after " + std::to_string(length));
            std::string torn = next.substr(0, length);
            if (length < old.size()) {
                torn += old.substr(length);
            }
            const RecordingRecovery recovery = recoverContainer(torn);
            ASSERT_EQ(containerText(recovery.frames),
                      textOf(frames, std::max(before, wholeFrames(frames, length))));
        }
    }
}

TEST(RecordingStreamTest, FullDiskKeepsAWholeRecordingOfAllThatHasRoom) {
    const Frames frames = someFrames();
    const std::size_t most = textOf(frames, frames.size()).size();
    for (const unsigned atOnce : {1U, 3U, 100U}) {
        for (std::size_t room = textOf(frames, 0).size(); room < most; ++room) {
            SCOPED_TRACE(std::to_string(room) + " bytes, " + std::to_string(atOnce) + " at once");
            Disk disk{.room = room};
            const auto stream = streamTo(disk);
            const std::string failure = record(*stream, frames, atOnce);
            std::size_t fitting = 0;
            while (textOf(frames, fitting + 1).size() <= room) {
                ++fitting;
            }
            ASSERT_EQ(disk.content, textOf(frames, fitting));
            ASSERT_EQ(stream->frames(), fitting);
            ASSERT_EQ(stream->bytes(), disk.content.size());
            // The second frame is the first report.
            ASSERT_EQ(disk.isKept, fitting >= 2);
            ASSERT_EQ(failure, failureText("No space left on device", fitting, disk.isKept));
            // Nothing is written any more.
            stream->add(frames[0]);
            stream->flush();
            ASSERT_EQ(disk.content, textOf(frames, fitting));
        }
    }
}

TEST(RecordingStreamTest, NoRoomForTheBeginningLeavesNothing) {
    for (std::size_t room = 0; room < textOf({}, 0).size(); ++room) {
        Disk disk{.room = room};
        EXPECT_THROW(streamTo(disk), Failure);
        EXPECT_EQ(disk.content, "");
    }
}

TEST(RecordingStreamTest, FailureOfAnyWriteKeepsTheFramesBeforeIt) {
    const Frames frames = someFrames();
    for (int good = 1; good <= static_cast<int>(frames.size()); ++good) {
        const auto whole = static_cast<std::size_t>(good - 1);
        for (const bool closingFails : {false, true}) {
            Disk disk{.writesUntilFailure = good, .closingFails = closingFails, .failWith = EIO};
            const std::string failure = record(*streamTo(disk), frames);
            EXPECT_EQ(failure, failureText("Input/output error", whole, whole >= 2));
            // Where not even the brackets could be written, the old ones may still stand.
            EXPECT_EQ(containerText(recoverContainer(disk.content).frames), textOf(frames, whole));
        }
    }
}

TEST(RecordingStreamTest, PipeWithoutReaderSaysHowMuchItGot) {
    Disk disk{.isRewritable = false, .writesUntilFailure = 3, .failWith = EPIPE};
    EXPECT_EQ(record(*streamTo(disk), someFrames()),
              "session.json: cannot write: Broken pipe; 2 frames are written to it");
}

TEST(RecordingStreamTest, SyncsWhenItIsDueAndThereIsSomethingNew) {
    const Frames frames = someFrames();
    {
        Disk disk;
        EXPECT_EQ(record(*streamTo(disk), frames), "");
        EXPECT_EQ(disk.syncs, 1);
    }
    {
        Disk disk;
        const auto stream = streamTo(disk, std::chrono::nanoseconds(0));
        EXPECT_TRUE(stream->syncDue());
        stream->flush();
        EXPECT_FALSE(stream->syncDue());
        stream->flush();
        EXPECT_EQ(disk.syncs, 1);
        stream->add(frames[0]);
        stream->flush();
        EXPECT_EQ(disk.syncs, 2);
    }
    {
        Disk disk;
        const auto stream = streamTo(disk, std::chrono::hours(1));
        stream->flush();
        EXPECT_EQ(disk.syncs, 1);
        stream->add(frames[0]);
        stream->flush();
        EXPECT_EQ(disk.syncs, 1);
        EXPECT_GT(stream->syncDue(), std::chrono::steady_clock::now());
    }
}

TEST(RecordingStreamTest, WhatTheDiskDoesNotConfirmIsNotCalledSafe) {
    const Frames frames = someFrames();
    const std::string unconfirmed =
        "session.json: 7 frames are written, but the disk did not confirm them: ";
    Disk broken{.syncError = EIO};
    EXPECT_EQ(record(*streamTo(broken), frames), unconfirmed + "Input/output error");
    EXPECT_EQ(broken.content, textOf(frames, frames.size()));
    Disk full{.closeError = EDQUOT};
    EXPECT_EQ(record(*streamTo(full), frames), unconfirmed + "Disk quota exceeded");
    // While it goes on, at the first report.
    Disk early{.syncError = EIO};
    const auto stream = streamTo(early, std::chrono::hours(1));
    EXPECT_EQ(record(*stream, {frames[1]}),
              "session.json: 1 frame is written, but the disk did not confirm it: Input/output "
              "error");
    EXPECT_FALSE(stream->isFinished());
}

TEST(RecordingStreamTest, WhatAFullDiskKeptIsSafeBeforeItIsCalledSo) {
    const Frames frames = someFrames();
    Disk disk{.room = textOf(frames, 3).size()};
    EXPECT_EQ(record(*streamTo(disk), frames), failureText("No space left on device", 3, true));
    EXPECT_EQ(disk.syncs, 1);
    Disk broken{.room = disk.room, .syncError = EIO};
    EXPECT_EQ(record(*streamTo(broken), frames),
              "session.json: cannot write: No space left on device; 3 frames are in it, but the "
              "disk did not confirm them");
}

TEST(RecordingStreamTest, SaysWhatIsWhere) {
    const Frames frames = someFrames();
    Disk disk;
    const auto stream = streamTo(disk);
    stream->add(frames[0]);
    stream->flush();
    EXPECT_EQ(stream->whereItIs(), "no report is recorded yet, and session.json is as it was");
    stream->add(frames[1]);
    stream->flush();
    EXPECT_EQ(stream->whereItIs(),
              "2 frames are in session.json; what is written there is whole without SIGUSR1");
    Disk made{.wasThere = false};
    EXPECT_EQ(streamTo(made)->whereItIs(), "no report is recorded yet");
    Disk pipe{.isRewritable = false};
    EXPECT_EQ(streamTo(pipe)->whereItIs(),
              "0 frames are written to session.json; it is whole at the end");
}

TEST(RecordingStreamTest, NothingIsAsItWasWhereThereWasNothing) {
    Disk disk{.writesUntilFailure = 1, .failWith = EIO, .wasThere = false};
    EXPECT_EQ(record(*streamTo(disk), someFrames()),
              "session.json: cannot write: Input/output error; no report was recorded");
    Disk unplugged{.wasThere = false};
    EXPECT_STREQ(streamTo(unplugged)->finishAfter("the device was unplugged").what(),
                 "the device was unplugged; no report was recorded");
}

}  // namespace
}  // namespace VexaTouch::Tools
