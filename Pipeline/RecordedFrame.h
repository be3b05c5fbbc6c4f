#pragma once

#include "Platform/PropertyValue.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch {

/// One recorded input; PipelineRecording::Frame.
struct RecordedFrame {
    enum class Type : std::int32_t { State = 0, InputReport = 1 };

    Type type = Type::InputReport;
    std::uint64_t timestamp = 0;       ///< host time of the input in nanoseconds
    std::string key;                   ///< State only: the key as the pipeline received it
    Vexa::PropertyValue value;         ///< State only: the value as received
    std::vector<std::uint8_t> report;  ///< InputReport only: the raw report, id included

    friend bool operator==(const RecordedFrame&, const RecordedFrame&) = default;
};

}  // namespace VexaTouch
