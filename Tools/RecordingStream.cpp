#include "Tools/RecordingStream.h"

#include "Platform/PropertyValue.h"

#include <string_view>
#include <system_error>
#include <utility>

namespace VexaTouch::Tools {
namespace {

// How ContainerWriter ends a document, without and with frames.
constexpr std::string_view kClosingEmpty = "]\n}\n";
constexpr std::string_view kClosing = "\n  ]\n}\n";

}  // namespace

RecordingStream::RecordingStream(std::unique_ptr<AppendTarget> target, std::string name,
                                 std::optional<std::chrono::nanoseconds> syncEvery)
    : target_(std::move(target)),
      name_(std::move(name)),
      syncEvery_(syncEvery),
      writer_(text_),
      nextSync_(Clock::now()) {
    write(target_->isRewritable());
}

RecordingStream::~RecordingStream() = default;

void RecordingStream::add(const RecordedFrame& frame) {
    if (frame.type == RecordedFrame::Type::State && !frame.value) {
        // Such a frame would make the whole file one that nobody reads; a pipeline takes null
        // alike.
        RecordedFrame readable = frame;
        readable.value = Vexa::PropertyValue::null();
        return add(readable);
    }
    const std::size_t before = text_.size();
    writer_.write(frame);
    if (text_.size() > before) {
        if (!firstReport_ && frame.type == RecordedFrame::Type::InputReport) {
            firstReport_ = frames_ + ends_.size();
        }
        ends_.push_back(text_.size());
    }
}

void RecordingStream::flush() {
    if (!ends_.empty()) {
        write(target_->isRewritable());
        if (holdsReport()) {
            keepTarget();
        }
    }
    syncIfDue();
}

void RecordingStream::finish() {
    if (!ends_.empty() || !target_->isRewritable()) {
        write(true);
    }
    keepTarget();
    isDead_ = true;
    const int unsafe = target_->sync();
    const int unclosed = target_->close();
    if (const int error = unsafe != 0 ? unsafe : unclosed; error != 0) {
        failUnconfirmed(error);
    }
    isFinished_ = true;
}

Failure RecordingStream::finishAfter(const std::string& fault) {
    if (!ends_.empty()) {
        write(target_->isRewritable());
    }
    if (holdsReport() || !target_->isRewritable()) {
        finish();
        return Failure(fault);
    }
    isDead_ = true;
    return Failure(fault + nothingKeptText());
}

bool RecordingStream::holdsReport() const noexcept {
    return firstReport_ && frames_ > *firstReport_;
}

std::optional<RecordingStream::Clock::time_point> RecordingStream::syncDue() const noexcept {
    return syncEvery_ && isNew_ && !isDead_ ? std::optional(nextSync_) : std::nullopt;
}

std::string_view RecordingStream::closing() const noexcept {
    return frames_ + ends_.size() == 0 ? kClosingEmpty : kClosing;
}

std::uint64_t RecordingStream::closingBytes() const noexcept {
    return frames_ == 0 ? kClosingEmpty.size() : kClosing.size();
}

void RecordingStream::write(bool withClosing) {
    if (isDead_) {
        return;
    }
    const std::size_t length = text_.size();
    if (withClosing) {
        text_ += closing();
    }
    const AppendTarget::Result result = target_->write(end_, text_);
    text_.resize(length);
    if (result.error != 0) {
        isDead_ = true;
        saveWhatFits(result.written);
        if (holdsReport()) {
            keepTarget();
        }
        fail(result.error);
    }
    end_ += length;
    frames_ += ends_.size();
    isNew_ = true;
    text_.clear();
    ends_.clear();
}

void RecordingStream::keepTarget() {
    if (isKept_) {
        return;
    }
    if (const int error = target_->keep(); error != 0) {
        isDead_ = true;
        const std::string beside = target_->beside();
        if (beside.empty()) {
            fail(error);
        }
        throw Failure(name_ + ": the new recording cannot take its place: " +
                      std::generic_category().message(error) + "; " + framesText() + " safe in " +
                      beside + ", and " + name_ + " is as it was");
    }
    isKept_ = true;
}

// Cuts the file behind the last frame that was written whole and has room for the brackets. Where
// not even these can be written, what is left can be recovered.
void RecordingStream::saveWhatFits(std::size_t written) noexcept {
    while (!ends_.empty() && ends_.back() > written) {
        ends_.pop_back();
    }
    if (!target_->isRewritable()) {
        frames_ += ends_.size();
        return;
    }
    if (end_ == 0) {
        // Not even the beginning: a file with nothing in it.
        static_cast<void>(target_->cut(0));
        return;
    }
    for (;;) {
        const std::uint64_t end = end_ + (ends_.empty() ? 0 : ends_.back());
        const std::string_view brackets = closing();
        const bool fits = target_->cut(end) == 0 && target_->write(end, brackets).error == 0;
        if (fits || ends_.empty()) {
            end_ = end;
            frames_ += ends_.size();
            return;
        }
        ends_.pop_back();
    }
}

void RecordingStream::syncIfDue() {
    const std::optional<Clock::time_point> due = syncDue();
    const Clock::time_point now = Clock::now();
    if (!due || now < *due) {
        return;
    }
    nextSync_ = now + *syncEvery_;
    isNew_ = false;
    if (const int error = target_->sync(); error != 0) {
        isDead_ = true;
        failUnconfirmed(error);
    }
}

void RecordingStream::fail(int error) {
    const std::string fault = name_ + ": cannot write: " + std::generic_category().message(error);
    if (!isKept()) {
        throw Failure(fault + nothingKeptText());
    }
    if (!target_->isRewritable()) {
        // How much of that has been read nobody knows.
        throw Failure(fault + "; " + framesText() + " written to it");
    }
    throw Failure(fault + "; " + framesText() +
                  (target_->sync() == 0 ? " safe in it"
                                        : " in it, but the disk did not confirm " + themText()));
}

void RecordingStream::failUnconfirmed(int error) {
    if (!isKept()) {
        fail(error);
    }
    throw Failure(name_ + ": " + framesText() + " written, but the disk did not confirm " +
                  themText() + ": " + std::generic_category().message(error));
}

std::string RecordingStream::whereItIs() const {
    if (!target_->isRewritable()) {
        return framesText() + " written to " + name_ + "; it is whole at the end";
    }
    if (!isKept()) {
        return "no report is recorded yet" +
               (target_->wasThere() ? ", and " + name_ + " is as it was" : std::string());
    }
    return framesText() + " in " + name_ + "; what is written there is whole without SIGUSR1";
}

std::string RecordingStream::themText() const {
    return frames_ == 1 ? "it" : "them";
}

std::string RecordingStream::framesText() const {
    return std::to_string(frames_) + (frames_ == 1 ? " frame is" : " frames are");
}

std::string RecordingStream::nothingKeptText() const {
    return "; no report was recorded" +
           (target_->wasThere() ? ", " + name_ + " is as it was" : std::string());
}

}  // namespace VexaTouch::Tools
