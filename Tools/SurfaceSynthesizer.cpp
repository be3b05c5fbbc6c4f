#include "Tools/SurfaceSynthesizer.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace VexaTouch::Tools {

namespace {

constexpr std::uint64_t kNsPerMs = 1'000'000;
constexpr std::uint64_t kNsPerSecond = 1'000'000'000;
constexpr std::uint64_t kStartNs = kNsPerSecond;  // host time of a recording's begin
constexpr std::uint32_t kStartDeviceMs = 1000;
constexpr std::uint64_t kLargestJitterNs = 250'000;
constexpr std::uint64_t kBetweenReportsNs = 1000;

constexpr std::uint32_t kPalmRadius = 26;
// Small and weak enough that no two pads add up to a touch anywhere on the surface.
constexpr std::uint32_t kHoverRadius = 8;
constexpr std::uint32_t kHoverStrength = 95;

// What the unsigned values show of a pixel that nothing touches.
constexpr std::int32_t kRawBaseline = 4000;
constexpr std::int32_t kRawBaselineStep = 100;
constexpr std::uint32_t kWanderMs = 100;

// Gains as exact decimals: they have four places.
constexpr std::int64_t kGainScale = 10'000;
constexpr std::array<std::int64_t, kPixelCount> kDecimalGains = [] {
    std::array<std::int64_t, kPixelCount> gains{};
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        // One place more, to be rounded off.
        gains[i] =
            (static_cast<std::int64_t>(static_cast<double>(kPixelGains[i]) * 100'000.0) + 5) / 10;
    }
    return gains;
}();

/// t*t*(3 - 2t) of `elapsed` / `whole`, in parts of kFullContact: slow at both ends.
std::uint32_t eased(std::uint64_t elapsed, std::uint64_t whole) {
    if (elapsed >= whole) {
        return kFullContact;
    }
    const std::uint64_t t = elapsed * kFullContact / whole;
    const std::uint64_t square = t * t >> 16U;
    constexpr std::uint64_t kThree = std::uint64_t{3} << 16U;
    return static_cast<std::uint32_t>(square * (kThree - 2U * t) >> 16U);
}

std::int32_t between(std::int32_t from, std::int32_t to, std::uint32_t part) {
    const std::int64_t way = static_cast<std::int64_t>(to) - from;
    return from + static_cast<std::int32_t>(way * part / kFullContact);
}

SurfacePlace between(SurfacePlace from, SurfacePlace to, std::uint32_t part) {
    return {between(from.x, to.x, part), between(from.y, to.y, part)};
}

/// The report's bytes: its id, then the structure, which is the wire's own layout.
template <typename Report>
std::vector<std::uint8_t> bytesOf(const Report& report) {
    std::vector<std::uint8_t> bytes(Report::minimumLength);
    bytes[0] = Report::reportId;
    std::memcpy(bytes.data() + 1, &report, sizeof report);
    return bytes;
}

std::vector<std::uint8_t> firmwareReport(std::uint8_t code, const std::vector<std::uint8_t>& data) {
    InputReport::FirmwareEvent event{code, {}};
    std::copy_n(data.begin(), std::min(data.size(), event.data.size()), event.data.begin());
    return bytesOf(event);
}

PipelineRecording::Frame reportFrame(std::vector<std::uint8_t> report) {
    PipelineRecording::Frame frame;
    frame.type = PipelineRecording::Frame::Type::InputReport;
    frame.report = std::move(report);
    return frame;
}

std::int32_t clampedTo16Bits(std::int64_t value) {
    return static_cast<std::int32_t>(std::clamp<std::int64_t>(value, -32'768, 32'767));
}

}  // namespace

std::array<std::int32_t, kPixelCount> footprint(const SurfaceContact& contact,
                                                std::uint32_t level) noexcept {
    std::array<std::int32_t, kPixelCount> values{};
    const std::int64_t radius = static_cast<std::int64_t>(contact.radius) * SurfacePlace::kUnit;
    const std::int64_t reach = radius * radius;
    const std::int64_t peak = static_cast<std::int64_t>(contact.strength) * level;
    for (const SurfacePad& pad : kSurfacePads) {
        const std::int64_t dx = pad.place().x - contact.place.x;
        const std::int64_t dy = pad.place().y - contact.place.y;
        const std::int64_t distance = dx * dx + dy * dy;
        if (distance < reach) {
            // (1 - d²/r²)², in parts of 65536: flat in the middle, soft at the rim.
            const std::int64_t nearness = (reach - distance) * 65'536 / reach;
            const std::int64_t weight = nearness * nearness >> 16U;
            values[pad.pixel()] += static_cast<std::int32_t>((peak * weight) >> 32U);
        }
    }
    return values;
}

SurfaceSynthesizer::SurfaceSynthesizer(Sink sink, std::optional<std::uint64_t> seed)
    : sink_(std::move(sink)), fixedSeed_(seed), random_(seed.value_or(kDefaultSeed)) {
    setRate(kDefaultRate);
    setDeviceClock(kStartDeviceMs);
}

void SurfaceSynthesizer::perform(const GestureScript& script) {
    for (const GestureCommand& command : script.commands) {
        perform(command);
    }
}

void SurfaceSynthesizer::perform(const GestureCommand& command) {
    const auto number = static_cast<std::uint32_t>(command.number);
    switch (command.kind) {
        case GestureKind::Tap:
        case GestureKind::Hold:
            touch(finger(command.place, command.number), command.place, command.durationMs);
            break;
        case GestureKind::Slide:
            touch(finger(command.place, command.number), command.target, command.durationMs);
            break;
        case GestureKind::Palm: {
            SurfaceContact palm = finger({}, command.number);
            palm.radius = kPalmRadius;
            touch(palm, palm.place, command.durationMs);
            break;
        }
        case GestureKind::Hover:
            touch({command.place, kHoverStrength, kHoverRadius}, command.place, command.durationMs);
            break;
        case GestureKind::Press:
            press(finger(command.place, command.number));
            break;
        case GestureKind::Move:
            move(command.place, command.durationMs);
            break;
        case GestureKind::Release:
            release();
            break;
        case GestureKind::Idle:
            rest(command.durationMs);
            break;
        case GestureKind::Strength:
            strength_ = number;
            break;
        case GestureKind::Finger:
            radius_ = number;
            break;
        case GestureKind::Approach:
            approachMs_ = command.durationMs;
            break;
        case GestureKind::Liftoff:
            liftoffMs_ = command.durationMs;
            break;
        case GestureKind::Gap:
            gapMs_ = command.durationMs;
            break;
        case GestureKind::Noise:
            noise_ = static_cast<std::int32_t>(number);
            break;
        case GestureKind::Drift:
            drift_ = static_cast<std::int32_t>(number);
            break;
        case GestureKind::Rate:
            setRate(number);
            break;
        case GestureKind::Seed:
            if (!fixedSeed_) {
                random_ = SeededNumbers(command.number);
            }
            break;
        case GestureKind::Reset:
            resetFirmware();
            break;
        case GestureKind::Firmware:
            sendReport(firmwareReport(static_cast<std::uint8_t>(number), command.bytes));
            break;
        case GestureKind::Invalid:
            sendReport(command.bytes);
            break;
        case GestureKind::Set:
            sendState(command.key, command.value);
            break;
        case GestureKind::Clock:
            setDeviceClock(number);
            break;
        case GestureKind::Frame:
            frameNumber_ = number;
            break;
        case GestureKind::Skip:
            frameNumber_ += number;
            break;
    }
}

void SurfaceSynthesizer::touch(const SurfaceContact& from, SurfacePlace to,
                               std::uint32_t durationMs) {
    const std::uint64_t whole = durationMs * kNsPerMs;
    const std::uint64_t approach = std::min(approachMs_ * kNsPerMs, whole / 2);
    const std::uint64_t liftoff = std::min(liftoffMs_ * kNsPerMs, whole / 2);
    const std::uint64_t count = imagesIn(durationMs, rate_);
    SurfaceContact contact = from;
    for (std::uint64_t k = 0; k < count; ++k) {
        const std::uint64_t now = std::min(middleOf(k), whole);
        contact.place = between(from.place, to, eased(now, whole));
        sendImage(&contact, std::min(eased(now, approach), eased(whole - now, liftoff)));
    }
    rest(gapMs_);
}

void SurfaceSynthesizer::press(const SurfaceContact& contact) {
    const std::uint64_t count = imagesIn(approachMs_, rate_);
    for (std::uint64_t k = 0; k < count; ++k) {
        sendImage(&contact, eased(middleOf(k), approachMs_ * kNsPerMs));
    }
    pressed_ = contact;
}

void SurfaceSynthesizer::move(SurfacePlace to, std::uint32_t durationMs) {
    if (!pressed_) {
        return;
    }
    const SurfacePlace from = pressed_->place;
    const std::uint64_t count = imagesIn(durationMs, rate_);
    for (std::uint64_t k = 0; k < count; ++k) {
        pressed_->place = between(from, to, eased(middleOf(k), durationMs * kNsPerMs));
        sendImage(&*pressed_, kFullContact);
    }
    pressed_->place = to;
}

void SurfaceSynthesizer::release() {
    if (!pressed_) {
        return;
    }
    const SurfaceContact contact = *pressed_;
    pressed_.reset();
    const std::uint64_t whole = liftoffMs_ * kNsPerMs;
    const std::uint64_t count = imagesIn(liftoffMs_, rate_);
    for (std::uint64_t k = 0; k < count; ++k) {
        sendImage(&contact, eased(whole - std::min(middleOf(k), whole), whole));
    }
    rest(gapMs_);
}

void SurfaceSynthesizer::rest(std::uint32_t durationMs) {
    const std::uint64_t count = imagesIn(durationMs, rate_);
    for (std::uint64_t k = 0; k < count; ++k) {
        sendImage(pressed_ ? &*pressed_ : nullptr, kFullContact);
    }
}

void SurfaceSynthesizer::resetFirmware() {
    sendReport(firmwareReport(0, {}));
    frameNumber_ = 0;
    setDeviceClock(0);
}

SurfaceContact SurfaceSynthesizer::finger(SurfacePlace place, std::uint64_t strength) const {
    return {place, strength == 0 ? strength_ : static_cast<std::uint32_t>(strength), radius_};
}

std::uint64_t SurfaceSynthesizer::middleOf(std::uint64_t image) const noexcept {
    return image * periodNs_ + periodNs_ / 2;
}

void SurfaceSynthesizer::sendImage(const SurfaceContact* contact, std::uint32_t level) {
    wander();
    std::array<std::int32_t, kPixelCount> values{};
    if (contact) {
        values = footprint(*contact, level);
    }
    InputReport::Image image{};
    image.frameNumber = frameNumber_++;
    image.timestampMs = deviceMs();
    std::int32_t baseline = kRawBaseline;
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        const std::int64_t raw = values[i] * kGainScale / kDecimalGains[i];
        const std::int32_t sample = clampedTo16Bits(raw + zero_[i] + random_.around0(noise_));
        image.signedPixels[i] = static_cast<std::int16_t>(sample);
        image.unsignedPixels[i] = static_cast<std::uint16_t>(std::max(baseline + sample, 0));
        baseline += kRawBaselineStep;
    }
    const auto jitterBound =
        static_cast<std::uint32_t>(std::min(periodNs_ / 8, kLargestJitterNs)) + 1;
    send(reportFrame(bytesOf(image)), kStartNs + elapsedNs_ + random_.below(jitterBound));
    elapsedNs_ += periodNs_;
}

void SurfaceSynthesizer::sendReport(std::vector<std::uint8_t> report) {
    send(reportFrame(std::move(report)), kStartNs + elapsedNs_ - periodNs_ / 4);
}

void SurfaceSynthesizer::sendState(const std::string& key, const Vexa::PropertyValue& value) {
    Frame frame;
    frame.type = Frame::Type::State;
    frame.key = key;
    frame.value = value;
    send(std::move(frame), kStartNs + elapsedNs_ - periodNs_ / 4);
}

void SurfaceSynthesizer::send(Frame frame, std::uint64_t timestampNs) {
    frame.timestamp = std::max(timestampNs, lastTimestampNs_ + kBetweenReportsNs);
    lastTimestampNs_ = frame.timestamp;
    sink_(std::move(frame));
}

std::uint32_t SurfaceSynthesizer::deviceMs() const noexcept {
    return clockBaseMs_ + static_cast<std::uint32_t>((elapsedNs_ - clockBaseNs_) / kNsPerMs);
}

void SurfaceSynthesizer::setRate(std::uint32_t rate) noexcept {
    rate_ = std::max(rate, 1U);
    periodNs_ = kNsPerSecond / rate_;
}

void SurfaceSynthesizer::setDeviceClock(std::uint32_t ms) noexcept {
    clockBaseMs_ = ms;
    clockBaseNs_ = elapsedNs_;
}

/// Each pixel's zero takes a step of one count at most every kWanderMs, within the drift's bounds.
void SurfaceSynthesizer::wander() {
    if (imagesUntilWander_-- > 0) {
        return;
    }
    imagesUntilWander_ = static_cast<std::uint32_t>(imagesIn(kWanderMs, rate_)) - 1;
    for (std::int32_t& zero : zero_) {
        zero = std::clamp(zero + random_.between(-1, 1), -drift_, drift_);
    }
}

FrameList synthesize(const GestureScript& script, std::optional<std::uint64_t> seed) {
    FrameList frames;
    SurfaceSynthesizer synthesizer(
        [&frames](PipelineRecording::Frame frame) { frames.push_back(std::move(frame)); }, seed);
    synthesizer.perform(script);
    return frames;
}

}  // namespace VexaTouch::Tools
