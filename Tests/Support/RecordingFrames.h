#pragma once

#include "Pipeline/PipelineRecording.h"
#include "Platform/PropertyValue.h"
#include "Tests/Support/PrintPropertyValue.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch {

/// What a failed test shows of a frame.
inline void PrintTo(const PipelineRecording::Frame& frame, std::ostream* out) {
    *out << "{type " << static_cast<int>(frame.type) << " @" << frame.timestamp;
    if (frame.type != PipelineRecording::Frame::Type::InputReport) {
        *out << " " << ::testing::PrintToString(frame.key) << " = "
             << (frame.value ? frame.value.description() : "(none)");
    }
    if (!frame.report.empty()) {
        *out << " " << Vexa::PropertyValue(frame.report).description();
    }
    *out << "}";
}

}  // namespace VexaTouch

namespace VexaTouch::Testing {

inline PipelineRecording::Frame reportFrame(std::uint64_t timestampNs,
                                            std::vector<std::uint8_t> report) {
    PipelineRecording::Frame frame;
    frame.timestamp = timestampNs;
    frame.report = std::move(report);
    return frame;
}

inline PipelineRecording::Frame stateFrame(std::uint64_t timestampNs, std::string key,
                                           Vexa::PropertyValue value) {
    PipelineRecording::Frame frame;
    frame.type = PipelineRecording::Frame::Type::State;
    frame.timestamp = timestampNs;
    frame.key = std::move(key);
    frame.value = std::move(value);
    return frame;
}

}  // namespace VexaTouch::Testing
