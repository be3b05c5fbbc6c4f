#include "Tools/HidRecorderWriter.h"

#include "Platform/Json.h"
#include "Shared/Util.h"
#include "Tools/HidRecorderFormat.h"
#include "Tools/HidReportDescriptor.h"

#include <array>
#include <charconv>
#include <utility>

namespace VexaTouch::Tools {
namespace {

using namespace HidRecorderFormat;
using Frame = PipelineRecording::Frame;

constexpr std::size_t kFlushSize = std::size_t{64} * 1024;

void appendNumber(std::string& text, std::uint64_t value, std::size_t minimumDigits = 1,
                  int base = 10) {
    std::array<char, 20> digits{};
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), value, base).ptr;
    const auto count = static_cast<std::size_t>(end - digits.data());
    if (count < minimumDigits) {
        text.append(minimumDigits - count, '0');
    }
    text.append(digits.data(), count);
}

// Without the space that ends our hexadecimal text: the HID tools take it for a further byte.
void appendBytes(std::string& text, std::span<const std::uint8_t> bytes) {
    Util::appendHexString(text, bytes);
    if (!bytes.empty()) {
        text.pop_back();
    }
}

void appendComment(std::string& text, std::string_view word, std::uint64_t number) {
    text.append(kCommentPrefix).append(word).push_back(' ');
    appendNumber(text, number);
}

}  // namespace

HidRecorderWriter::HidRecorderWriter(Sink sink) : sink_(std::move(sink)) {
    writeHeader();
}

void HidRecorderWriter::write(const Frame& frame) {
    if (frame.type == Frame::Type::State) {
        writeState(frame);
    } else if (frame.type == Frame::Type::InputReport) {
        writeReport(frame);
    }
    if (text_.size() >= kFlushSize) {
        flush();
    }
}

void HidRecorderWriter::finish() {
    flush();
}

void HidRecorderWriter::writeHeader() {
    text_.append("# ").append(kHidDeviceName).append("\nR: ");
    appendNumber(text_, kHidReportDescriptor.size());
    text_.push_back(' ');
    appendBytes(text_, kHidReportDescriptor);
    text_.append("\nN: ").append(kHidDeviceName).append("\nP: vexatouch/recording\nI: ");
    appendNumber(text_, kHidBusVirtual, 1, 16);
    text_.push_back(' ');
    appendNumber(text_, kHidVendorId, 4, 16);
    text_.push_back(' ');
    appendNumber(text_, kHidProductId, 4, 16);
    text_.push_back('\n');
}

void HidRecorderWriter::writeState(const Frame& frame) {
    appendComment(text_, kState, frame.timestamp);
    text_.push_back(' ');
    Vexa::JsonWriter(text_, Vexa::JsonWriter::Style::Compact).string(frame.key);
    if (frame.value) {
        text_.push_back(' ');
        Vexa::JsonWriter(text_, Vexa::JsonWriter::Style::Compact).value(frame.value);
    }
    text_.push_back('\n');
}

void HidRecorderWriter::writeReport(const Frame& frame) {
    if (frame.report.empty()) {
        appendComment(text_, kEmptyReport, frame.timestamp);
        text_.push_back('\n');
        return;
    }
    // An event's time has no sign, so a clock that stepped back before the start moves the start.
    if (!start_ || frame.timestamp < *start_) {
        start_ = frame.timestamp;
        appendComment(text_, kStart, *start_);
        text_.push_back('\n');
    }
    const std::uint64_t time = frame.timestamp - *start_;
    if (time % 1000 != 0) {
        appendComment(text_, kNanoseconds, time % 1000);
        text_.push_back('\n');
    }
    text_.append("E: ");
    appendNumber(text_, time / kNanosecondsPerSecond, 6);
    text_.push_back('.');
    appendNumber(text_, time % kNanosecondsPerSecond / 1000, 6);
    text_.push_back(' ');
    appendNumber(text_, frame.report.size());
    text_.push_back(' ');
    appendBytes(text_, frame.report);
    text_.push_back('\n');
}

void HidRecorderWriter::flush() {
    if (!text_.empty()) {
        sink_(text_);
        text_.clear();
    }
}

}  // namespace VexaTouch::Tools
