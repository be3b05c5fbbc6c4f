#include "Pipeline/ContainerFormat.h"
#include "Pipeline/PipelineRecording.h"

#include <stdexcept>
#include <string>
#include <utility>

namespace VexaTouch {

namespace {

using Vexa::PropertyValue;

PropertyValue migratedFrame(const PropertyValue& report) {
    const PropertyValue timestamp = report.member(Container::Timestamp);
    if (!timestamp) {
        throw std::invalid_argument(Container::FrameLacksTimestamp);
    }
    const PropertyValue data = report.member(Container::ReportData);
    if (!data) {
        throw std::invalid_argument(Container::FrameLacksReportData);
    }
    return PropertyValue::Dictionary{
        {std::string(Container::Type), Container::TypeInputReport},
        {std::string(Container::Timestamp), timestamp},
        {std::string(Container::Report), data},
    };
}

}  // namespace

PropertyValue PipelineRecording::migrateSerializedContainer(const PropertyValue& container) {
    if (!container.asDictionary()) {
        throw std::invalid_argument(Container::InvalidContainer);
    }
    const PropertyValue number = container.member(Container::Version);
    if (!number.isNumber()) {
        throw std::invalid_argument(Container::InvalidVersion);
    }
    // Only the low half of the number counts.
    const auto version = static_cast<std::uint32_t>(number.toUnsigned64());
    if (version == Container::kVersion) {
        return container;
    }
    if (version != 0) {
        throw std::invalid_argument(Container::InvalidContainerVersion + std::to_string(version));
    }
    PropertyValue::Array frames;
    const PropertyValue reports = container.member(Container::Reports);
    if (const auto elements = reports.asArray()) {
        frames.reserve(elements->size());
        for (const PropertyValue& report : *elements) {
            frames.push_back(migratedFrame(report));
        }
    }
    return PropertyValue::Dictionary{
        {std::string(Container::Version), std::uint64_t{Container::kVersion}},
        {std::string(Container::Frames), std::move(frames)},
    };
}

}  // namespace VexaTouch
