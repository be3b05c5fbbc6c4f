#include "Pipeline/ContainerWriter.h"

#include "Pipeline/ContainerFormat.h"
#include "Shared/Util.h"

#include <utility>

namespace VexaTouch {

namespace {

/// How much text is gathered before the sink gets it.
constexpr std::size_t kPieceSize = std::size_t{1} << 16U;

}  // namespace

ContainerWriter::ContainerWriter(Sink sink)
    : sink_(std::move(sink)), text_(pending_), json_(text_) {
    pending_.reserve(kPieceSize + kPieceSize / 4);
    begin();
}

ContainerWriter::ContainerWriter(std::string& out) : text_(out), json_(text_) {
    begin();
}

void ContainerWriter::begin() {
    json_.beginObject();
    json_.key(Container::Version);
    json_.number(std::uint64_t{Container::kVersion});
    json_.key(Container::Frames);
    json_.beginArray();
}

void ContainerWriter::write(const RecordedFrame& frame) {
    using Type = RecordedFrame::Type;
    if (frame.type != Type::InputReport && frame.type != Type::State) {
        return;
    }
    json_.beginObject();
    json_.key(Container::Type);
    json_.plainString(frame.type == Type::State ? Container::TypeState
                                                : Container::TypeInputReport);
    json_.key(Container::Timestamp);
    json_.number(frame.timestamp);
    if (frame.type == Type::State) {
        json_.key(Container::Key);
        json_.string(frame.key);
        if (frame.value) {
            json_.key(Container::Value);
            json_.value(frame.value);
        }
    } else {
        json_.key(Container::Report);
        Util::appendHexString(json_.beginPlainString(), frame.report);
        json_.endPlainString();
    }
    json_.endObject();
    if (pending_.size() >= kPieceSize) {
        flush();
    }
}

void ContainerWriter::finish() {
    json_.endArray();
    json_.endObject();
    text_ += '\n';
    flush();
}

void ContainerWriter::flush() {
    if (sink_) {
        sink_(pending_);
        pending_.clear();
    }
}

}  // namespace VexaTouch
