#include "Pipeline/ContainerReader.h"

#include "Pipeline/ContainerFormat.h"
#include "Pipeline/FrameScanner.h"
#include "Platform/Json.h"
#include "Shared/Util.h"

#include <algorithm>
#include <array>
#include <stdexcept>
#include <utility>

namespace VexaTouch {

namespace {

using Frame = RecordedFrame;

/// How a member was given; of duplicates the last one.
enum class Given : std::uint8_t { No, Wrong, Right };

enum class TypeName : std::uint8_t { Unknown, InputReport, State };

/// A frame object as far as it is read. Which faults it has is decided at its end, since its
/// members come in any order.
struct FrameMembers {
    Given type = Given::No;
    Given timestamp = Given::No;
    Given key = Given::No;
    Given value = Given::No;
    Given report = Given::No;  // "Report", or "ReportData" in version 0
    TypeName typeName = TypeName::Unknown;
    bool invalidHexString = false;
    Frame frame;

    /// Ready for the next object. Whether a member was given decides what of the frame counts, so
    /// the frame itself may stay as it is.
    void restart() noexcept { type = timestamp = key = value = report = Given::No; }
};

/// What became of the array of one of the two versions.
struct FrameArray {
    Given given = Given::No;
    FrameList frames;
    std::uint64_t elements = 0;
    std::uint64_t refused = 0;
    const char* migrationFault = nullptr;  // first of its kind, with its position
    std::uint64_t migrationFaultAt = 0;
    const char* frameFault = nullptr;
    std::uint64_t frameFaultAt = 0;
};

template <typename Enum>
struct NamedMember {
    std::string_view name;
    Enum member;
};

/// The member of that name, or the table's last one.
template <typename Enum, std::size_t n>
Enum memberNamed(const std::array<NamedMember<Enum>, n>& table, std::string_view name) noexcept {
    for (const auto& entry : table) {
        if (entry.name == name) {
            return entry.member;
        }
    }
    return table.back().member;
}

enum class ContainerMember : std::uint8_t { Version, Frames, Reports, Unknown };
constexpr std::array<NamedMember<ContainerMember>, 4> kContainerMembers = {{
    {Container::Version, ContainerMember::Version},
    {Container::Frames, ContainerMember::Frames},
    {Container::Reports, ContainerMember::Reports},
    {"", ContainerMember::Unknown},
}};

enum class FrameMember : std::uint8_t { Type, Timestamp, Key, Value, Report, Unknown };
constexpr std::array<NamedMember<FrameMember>, 6> kFrameMembers = {{
    {Container::Type, FrameMember::Type},
    {Container::Timestamp, FrameMember::Timestamp},
    {Container::Report, FrameMember::Report},
    {Container::Key, FrameMember::Key},
    {Container::Value, FrameMember::Value},
    {"", FrameMember::Unknown},
}};
constexpr std::array<NamedMember<FrameMember>, 3> kReportMembers = {{
    {Container::Timestamp, FrameMember::Timestamp},
    {Container::ReportData, FrameMember::Report},
    {"", FrameMember::Unknown},
}};

/// What a frame of version 1 lacks, or null.
const char* frameFault(const FrameMembers& members) noexcept {
    if (members.type != Given::Right) {
        return Container::InvalidFrameType;
    }
    if (members.timestamp != Given::Right) {
        return Container::InvalidFrameTimestamp;
    }
    if (members.typeName == TypeName::State) {
        if (members.key != Given::Right) {
            return Container::InvalidStateKey;
        }
        return members.value == Given::Right ? nullptr : Container::InvalidStateValue;
    }
    if (members.typeName == TypeName::InputReport) {
        if (members.report != Given::Right) {
            return Container::InvalidReport;
        }
        return members.invalidHexString ? Container::InvalidHexString : nullptr;
    }
    return Container::InvalidFrameType;
}

/// What migration refuses in an element of version 0, or null.
const char* migrationFault(const FrameMembers& members) noexcept {
    if (members.timestamp == Given::No) {
        return Container::FrameLacksTimestamp;
    }
    return members.report == Given::No ? Container::FrameLacksReportData : nullptr;
}

}  // namespace

/// Follows the text and keeps, besides the frames, only the object that is being read.
class ContainerReader::Handler final : public Vexa::JsonHandler {
public:
    void onObjectBegin() override {
        if (passOn([](Vexa::JsonHandler& to) { to.onObjectBegin(); }, +1)) {
            return;
        }
        switch (place_) {
            case Place::Document:
                isObject_ = true;
                place_ = Place::Container;
                break;
            case Place::Array:
                members_.restart();
                place_ = Place::Frame;
                break;
            default:
                refuseValue();
                skipDepth_ = 1;
        }
    }

    void onObjectEnd() override {
        if (passOn([](Vexa::JsonHandler& to) { to.onObjectEnd(); }, -1)) {
            return;
        }
        if (place_ == Place::Frame) {
            place_ = Place::Array;
            endElement();
        } else {
            place_ = Place::Document;
        }
    }

    void onArrayBegin() override {
        if (passOn([](Vexa::JsonHandler& to) { to.onArrayBegin(); }, +1)) {
            return;
        }
        if (place_ == Place::Container && memberIsArray()) {
            array_ = containerMember_ == ContainerMember::Frames ? &frames_ : &reports_;
            *array_ = {};
            array_->given = Given::Right;
            place_ = Place::Array;
            return;
        }
        if (place_ == Place::Array) {
            members_.restart();  // an element that is no object: it ends with the array
        } else {
            refuseValue();
        }
        skipDepth_ = 1;
    }

    void onArrayEnd() override {
        if (!passOn([](Vexa::JsonHandler& to) { to.onArrayEnd(); }, -1)) {
            place_ = Place::Container;
        }
    }

    void onKey(std::string_view piece, bool last) override {
        if (passOn([&](Vexa::JsonHandler& to) { to.onKey(piece, last); }, 0)) {
            return;
        }
        const auto name = wholeText(piece, last);
        if (!name) {
            return;
        }
        if (place_ == Place::Container) {
            containerMember_ = memberNamed(kContainerMembers, *name);
        } else {
            frameMember_ = array_ == &frames_ ? memberNamed(kFrameMembers, *name)
                                              : memberNamed(kReportMembers, *name);
            if (frameMember_ == FrameMember::Value) {
                buildingValue_ = true;
            }
        }
    }

    void onString(std::string_view piece, bool last) override {
        inString_ = !last;
        if (passOn([&](Vexa::JsonHandler& to) { to.onString(piece, last); }, 0)) {
            return;
        }
        if (place_ != Place::Frame) {
            if (last) {
                refuseValue();
            }
            return;
        }
        if (const auto text = wholeText(piece, last)) {
            takeString(*text);
        }
    }

    void onNumber(const Vexa::JsonNumber& number) override {
        if (passOn([&](Vexa::JsonHandler& to) { to.onNumber(number); }, 0)) {
            return;
        }
        if (place_ == Place::Container && containerMember_ == ContainerMember::Version) {
            versionGiven_ = Given::Right;
            version_ = static_cast<std::uint32_t>(readUnsigned(number));
        } else if (place_ == Place::Frame && frameMember_ == FrameMember::Timestamp) {
            members_.timestamp = Given::Right;
            members_.frame.timestamp = readUnsigned(number);
        } else {
            refuseValue();
        }
    }

    void onBoolean(bool value) override {
        if (!passOn([&](Vexa::JsonHandler& to) { to.onBoolean(value); }, 0)) {
            refuseValue();
        }
    }

    void onNull() override {
        if (!passOn([](Vexa::JsonHandler& to) { to.onNull(); }, 0)) {
            refuseValue();
        }
    }

    /// True between two elements of "Frames", outside of any value.
    [[nodiscard]] bool isBetweenFrames() const noexcept {
        return place_ == Place::Array && array_ == &frames_ && skipDepth_ == 0 && !inString_;
    }

    /// Takes the plain frames at the front of the text; gives how many characters they were.
    std::size_t scanFrames(std::string_view text) {
        FrameScanner scanner(text);
        Frame frame;
        while (scanner.scan(frame)) {
            frames_.frames.push_back(std::move(frame));
            ++frames_.elements;
        }
        return scanner.position();
    }

    FrameList takeFrames() {
        if (!isObject_) {
            failMigration(Container::InvalidContainer);
        }
        if (versionGiven_ != Given::Right) {
            failMigration(Container::InvalidVersion);
        }
        if (version_ != Container::kVersion && version_ != 0) {
            failMigration(Container::InvalidContainerVersion + std::to_string(version_));
        }
        FrameArray& array = version_ == 0 ? reports_ : frames_;
        if (array.migrationFault != nullptr) {
            errorFrame_ = array.migrationFaultAt;
            failMigration(array.migrationFault);
        }
        // Version 0 without an array of reports is migrated to an empty list.
        if (version_ != 0 && array.given != Given::Right) {
            throw std::invalid_argument(Container::InvalidFrames);
        }
        if (array.frameFault != nullptr) {
            errorFrame_ = array.frameFaultAt;
            throw std::invalid_argument(array.frameFault);
        }
        return std::move(array.frames);
    }

    [[noreturn]] static void failMigration(const std::string& fault) {
        throw std::runtime_error(Container::MigrationFailed + fault);
    }

    FrameArray& arrayToRecover() noexcept {
        const bool isVersion0 =
            versionGiven_ == Given::Right ? version_ == 0 : frames_.elements == 0;
        return isVersion0 ? reports_ : frames_;
    }

    [[nodiscard]] std::optional<std::uint32_t> version() const noexcept {
        return versionGiven_ == Given::Right ? std::optional(version_) : std::nullopt;
    }
    [[nodiscard]] std::optional<std::uint64_t> errorFrame() const noexcept { return errorFrame_; }

private:
    enum class Place : std::uint8_t {
        Document,   // before and behind the container
        Container,  // between its members
        Array,      // between the elements of "Frames" or "Reports"
        Frame,      // between the members of an element
    };

    /// True if the token belongs to something that is skipped or built elsewhere; `nesting` is +1
    /// where it opens an array or object, -1 where it closes one.
    template <typename Forward>
    bool passOn(Forward forward, int nesting) {
        if (buildingValue_) {
            forward(valueBuilder_);
            if (valueBuilder_.isComplete()) {
                members_.frame.value = valueBuilder_.take();
                members_.value = Given::Right;
                buildingValue_ = false;
            }
            return true;
        }
        if (skipDepth_ == 0) {
            return false;
        }
        skipDepth_ += nesting;
        if (skipDepth_ == 0 && place_ == Place::Array) {
            endElement();
        }
        return true;
    }

    [[nodiscard]] bool memberIsArray() const noexcept {
        return containerMember_ == ContainerMember::Frames ||
               containerMember_ == ContainerMember::Reports;
    }

    /// A value stands where its kind is of no use: marks the member as given, but wrong.
    void refuseValue() {
        switch (place_) {
            case Place::Document:
                isObject_ = false;
                break;
            case Place::Container:
                refuseContainerMember();
                break;
            case Place::Array:
                members_.restart();
                endElement();
                break;
            case Place::Frame:
                refuseFrameMember();
                break;
        }
    }

    void refuseContainerMember() {
        switch (containerMember_) {
            case ContainerMember::Version:
                versionGiven_ = Given::Wrong;
                break;
            case ContainerMember::Frames:
                frames_ = {};
                frames_.given = Given::Wrong;
                break;
            case ContainerMember::Reports:
                reports_ = {};
                reports_.given = Given::Wrong;
                break;
            case ContainerMember::Unknown:
                break;
        }
    }

    void refuseFrameMember() noexcept {
        switch (frameMember_) {
            case FrameMember::Type:
                members_.type = Given::Wrong;
                break;
            case FrameMember::Timestamp:
                members_.timestamp = Given::Wrong;
                break;
            case FrameMember::Key:
                members_.key = Given::Wrong;
                break;
            case FrameMember::Report:
                members_.report = Given::Wrong;
                break;
            case FrameMember::Value:
            case FrameMember::Unknown:
                break;
        }
    }

    void takeString(std::string_view text) {
        switch (frameMember_) {
            case FrameMember::Type:
                members_.type = Given::Right;
                members_.typeName = text == Container::TypeInputReport ? TypeName::InputReport
                                    : text == Container::TypeState     ? TypeName::State
                                                                       : TypeName::Unknown;
                break;
            case FrameMember::Key:
                members_.key = Given::Right;
                members_.frame.key = text;
                break;
            case FrameMember::Report:
                members_.report = Given::Right;
                takeReport(text);
                break;
            default:
                refuseFrameMember();
        }
    }

    void takeReport(std::string_view text) {
        try {
            Util::readHexString(text, members_.frame.report);
            members_.invalidHexString = false;
        } catch (const std::invalid_argument&) {
            members_.invalidHexString = true;
        }
    }

    /// The text once its last piece is there; a text in one piece is not copied.
    std::optional<std::string_view> wholeText(std::string_view piece, bool last) {
        if (last && pending_.empty()) {
            return piece;
        }
        pending_ += piece;
        if (!last) {
            return std::nullopt;
        }
        text_.swap(pending_);
        pending_.clear();
        return text_;
    }

    void endElement() {
        FrameArray& array = *array_;
        const std::uint64_t position = array.elements++;
        if (array_ == &reports_) {
            if (const char* fault = migrationFault(members_)) {
                ++array.refused;
                if (array.migrationFault == nullptr) {
                    array.migrationFault = fault;
                    array.migrationFaultAt = position;
                }
                return;
            }
            members_.type = Given::Right;
            members_.typeName = TypeName::InputReport;
        }
        if (const char* fault = frameFault(members_)) {
            ++array.refused;
            if (array.frameFault == nullptr) {
                array.frameFault = fault;
                array.frameFaultAt = position;
            }
            return;
        }
        Frame& from = members_.frame;
        Frame frame;
        frame.timestamp = from.timestamp;
        if (members_.typeName == TypeName::State) {
            frame.type = Frame::Type::State;
            frame.key = std::move(from.key);
            frame.value = std::move(from.value);
        } else {
            frame.type = Frame::Type::InputReport;
            frame.report = std::move(from.report);
        }
        array.frames.push_back(std::move(frame));
    }

    static std::uint64_t readUnsigned(const Vexa::JsonNumber& number) {
        return number.kind == Vexa::JsonNumber::Kind::Signed
                   ? static_cast<std::uint64_t>(number.signedValue)
                   : number.toPropertyValue().toUnsigned64();
    }

    Place place_ = Place::Document;
    bool inString_ = false;       // pieces of a string are still to come
    int skipDepth_ = 0;           // open arrays and objects of a value that is skipped
    bool buildingValue_ = false;  // a state frame's value goes to valueBuilder_
    bool isObject_ = false;
    Given versionGiven_ = Given::No;
    std::uint32_t version_ = 0;
    ContainerMember containerMember_ = ContainerMember::Unknown;
    FrameMember frameMember_ = FrameMember::Unknown;
    FrameArray frames_;
    FrameArray reports_;
    FrameArray* array_ = nullptr;
    FrameMembers members_;
    Vexa::JsonValueBuilder valueBuilder_;
    std::string pending_;  // a text whose last piece is not there yet
    std::string text_;     // a whole text that came in pieces
    std::optional<std::uint64_t> errorFrame_;
};

struct ContainerReader::State {
    Handler handler;
    Vexa::JsonParser parser{handler};
    bool malformed = false;
    char lastCharacter = ' ';        // the last that was not white space and that the parser got
    std::uint64_t scannedBytes = 0;  // which the parser did not get

    bool parse(std::string_view piece);
};

bool ContainerReader::State::parse(std::string_view piece) {
    const std::size_t last = piece.find_last_not_of(" \n\r\t");
    if (last != std::string_view::npos) {
        lastCharacter = piece[last];
    }
    malformed = !parser.write(piece);
    return !malformed;
}

ContainerReader::ContainerReader() : state_(std::make_unique<State>()) {}
ContainerReader::~ContainerReader() = default;

bool ContainerReader::write(std::string_view piece) {
    // Behind a comma between two elements the parser can only take another element, so whole
    // elements together with their own commas may be kept from it. It gets the rest in pieces that
    // end where an element could begin; the more of them begin none, the longer they become.
    constexpr std::size_t kLongestStride = std::size_t{1} << 16U;
    std::size_t stride = 1;
    while (!piece.empty() && !state_->malformed) {
        if (piece.front() == '{' && state_->lastCharacter == ',' &&
            state_->handler.isBetweenFrames()) {
            const std::size_t scanned = state_->handler.scanFrames(piece);
            state_->scannedBytes += scanned;
            piece.remove_prefix(scanned);
            stride = scanned != 0 ? 1 : stride;
        }
        const std::size_t next = piece.find('{', stride);
        const std::string_view part = piece.substr(0, next);
        state_->parse(part);
        piece.remove_prefix(part.size());
        stride = std::min(2 * stride, kLongestStride);
    }
    return !state_->malformed;
}

FrameList ContainerReader::finish() {
    state_->malformed = state_->malformed || !state_->parser.finish();
    if (state_->malformed) {
        Handler::failMigration(Container::InvalidContainer);
    }
    return state_->handler.takeFrames();
}

std::optional<std::uint32_t> ContainerReader::version() const noexcept {
    return state_->handler.version();
}

std::optional<std::uint64_t> ContainerReader::errorOffset() const noexcept {
    return state_->malformed ? std::optional(state_->parser.errorOffset() + state_->scannedBytes)
                             : std::nullopt;
}

std::string ContainerReader::syntaxError() const {
    return state_->malformed ? state_->parser.errorMessage() : std::string();
}

std::optional<std::uint64_t> ContainerReader::errorFrame() const noexcept {
    return state_->handler.errorFrame();
}

FrameList ContainerReader::recover() {
    return std::move(state_->handler.arrayToRecover().frames);
}

std::uint64_t ContainerReader::wholeFrames() const noexcept {
    return state_->handler.arrayToRecover().frames.size();
}

std::uint64_t ContainerReader::refusedFrames() const noexcept {
    return state_->handler.arrayToRecover().refused;
}

}  // namespace VexaTouch
