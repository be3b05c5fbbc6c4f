// A process of its own, since /sys, /dev and system calls are replaced by made-up ones.

#include "Platform/HidrawDevice.h"

#include "Platform/HidDevice.h"
#include "Tests/Platform/LoopThread.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/MockedDevices.h"
#include "Tests/Support/PrintPropertyValue.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <poll.h>
#include <array>
#include <condition_variable>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <memory>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using Vexa::HidrawDevice;
using Vexa::PropertyValue;
using Bytes = std::vector<std::uint8_t>;

/// A feature report as it was answered.
struct Answer {
    vexa_status status = 0;
    Bytes bytes;

    friend bool operator==(const Answer&, const Answer&) = default;
    friend void PrintTo(const Answer& answer, std::ostream* out) {
        *out << std::hex << answer.status << ' ' << testing::PrintToString(answer.bytes);
    }
};

Answer featureOf(HidrawDevice& device, std::uint32_t id, std::size_t room = 64) {
    Bytes buffer(room, 0xEE);
    std::size_t length = 0;
    const vexa_status status = device.getReport(VEXA_REPORT_FEATURE, id, buffer, length);
    buffer.resize(length);
    return {status, buffer};
}

/// Reads a device on a run loop of its own and keeps the reports.
class Reader {
public:
    explicit Reader(const std::shared_ptr<Vexa::DeviceBackend>& backend)
        : registration_(backend), device_(Vexa::HidDevice::create(registration_.service())) {
        opened_ = device_.open(0);
        thread_.call([this] {
            device_.setInputReportCallback(buffer_, &arrived, this);
            device_.schedule(thread_.loop(), Vexa::LoopThread::kMode);
        });
    }
    ~Reader() {
        thread_.call([this] {
            device_.unschedule(thread_.loop(), Vexa::LoopThread::kMode);
            device_.setInputReportCallback({}, nullptr, nullptr);
        });
        device_.close(0);
    }
    Reader(const Reader&) = delete;
    Reader& operator=(const Reader&) = delete;

    /// All reports, once there are so many.
    std::vector<Bytes> waitFor(std::size_t count) {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [&] { return reports_.size() >= count; });
        return reports_;
    }
    [[nodiscard]] vexa_status opened() const { return opened_; }
    [[nodiscard]] const Vexa::HidDevice& device() const { return device_; }

private:
    static void arrived(void* context, vexa_status, vexa_device*, vexa_report_type, std::uint32_t,
                        const std::uint8_t* report, std::size_t length, std::uint64_t) noexcept {
        auto& self = *static_cast<Reader*>(context);
        const std::lock_guard lock(self.mutex_);
        self.reports_.emplace_back(report, report + length);
        self.changed_.notify_all();
    }

    Vexa::DeviceRegistration registration_;
    Vexa::HidDevice device_;
    vexa_status opened_ = 0;
    std::array<std::uint8_t, 512> buffer_{};
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Bytes> reports_;
    Vexa::LoopThread thread_;
};

class HidrawDeviceTest : public testing::Test {
protected:
    void waitUntilGone(const HidrawDevice& device) {
        pollfd waiting{.fd = device.hangUpDescriptor(), .events = 0, .revents = 0};
        ASSERT_EQ(::poll(&waiting, 1, 60'000), 1);
    }

    MockedDevices devices_;
};

TEST_F(HidrawDeviceTest, TellsWhatItIs) {
    devices_.plug(0, {.bus = 3, .vendor = 0xFEDC, .product = 0x8001, .serial = ""});
    HidrawDevice device("/dev/hidraw0");

    const MockedIdentity ours;
    EXPECT_EQ(device.property("Bus"), PropertyValue(3));
    EXPECT_EQ(device.property("Transport"), PropertyValue("USB"));
    EXPECT_EQ(device.property("VendorID"), PropertyValue(0xFEDC));
    EXPECT_EQ(device.property("ProductID"), PropertyValue(0x8001));
    EXPECT_EQ(device.property("Product"), PropertyValue("Vexa Touch"));
    EXPECT_EQ(device.property("PhysicalPath"), PropertyValue("port-1"));
    EXPECT_EQ(device.property("SerialNumber"), PropertyValue(""));
    EXPECT_EQ(device.property("ReportDescriptor"), PropertyValue(ours.descriptor));
    EXPECT_EQ(device.property("MaxInputReportSize"), PropertyValue(73));
    EXPECT_EQ(device.property("Colour"), PropertyValue());
    EXPECT_EQ(device.property(1), PropertyValue());
    for (const auto& entry : Vexa::HidrawKey::kAll) {
        EXPECT_TRUE(device.property(entry.key)) << entry.key;
    }
}

TEST_F(HidrawDeviceTest, AnswersForTheKeysOfTheManualAndNoOthers) {
    std::ifstream stream(VEXA_SOURCE_DIR "/docs/operations.md");
    const std::string manual{std::istreambuf_iterator<char>(stream), {}};
    std::string table = "| key | what it is |\n|---|---|\n";
    for (const auto& entry : Vexa::HidrawKey::kAll) {
        table += "| `" + std::string(entry.key) + "` | " + std::string(entry.meaning) + " |\n";
    }
    EXPECT_THAT(manual, HasSubstr(table + '\n'));
}

TEST_F(HidrawDeviceTest, KeepsWhatIsWrittenForItsLife) {
    devices_.plug(0);
    {
        HidrawDevice device("/dev/hidraw0");
        EXPECT_TRUE(device.setProperty("Product", "My surface"));
        EXPECT_TRUE(device.setProperty("Colour", 7));
        EXPECT_FALSE(device.setProperty(7, "Colour"));
        EXPECT_FALSE(device.setProperty("Colour", PropertyValue()));
        EXPECT_EQ(device.property("Product"), PropertyValue("My surface"));
        EXPECT_EQ(device.property("Colour"), PropertyValue(7));
    }
    HidrawDevice next("/dev/hidraw0");
    EXPECT_EQ(next.property("Product"), PropertyValue("Vexa Touch"));
    EXPECT_EQ(next.property("Colour"), PropertyValue());
}

TEST_F(HidrawDeviceTest, GivesEachReportThatComes) {
    devices_.plug(0);
    const auto backend = std::make_shared<HidrawDevice>("/dev/hidraw0");
    Reader reader(backend);
    ASSERT_EQ(reader.opened(), VEXA_STATUS_SUCCESS);

    const Bytes image(73, 1);
    const Bytes event = {2, 0, 1, 2, 3, 4, 5, 6, 7, 8};
    devices_.send(0, image);
    reader.waitFor(1);
    devices_.send(0, event);
    EXPECT_THAT(reader.waitFor(2), ElementsAre(image, event));
    EXPECT_TRUE(reader.device().isPresent());
}

TEST_F(HidrawDeviceTest, UnpluggedWhileReadingEverythingIsGone) {
    devices_.plug(0);
    const auto backend = std::make_shared<HidrawDevice>("/dev/hidraw0");
    Reader reader(backend);
    devices_.send(0, Bytes(73, 1));
    reader.waitFor(1);
    EXPECT_FALSE(backend->isGone());

    devices_.unplug(0);
    waitUntilGone(*backend);

    EXPECT_TRUE(backend->isGone());
    EXPECT_EQ(featureOf(*backend, 4), (Answer{VEXA_STATUS_GONE, {}}));
    EXPECT_EQ(backend->setFeatureReport(Bytes{31, 1, 0, 0, 0}), VEXA_STATUS_GONE);
    EXPECT_EQ(backend->property("Product"), PropertyValue());
    EXPECT_FALSE(backend->setProperty("Product", 1));
    int descriptor = -1;
    EXPECT_EQ(backend->open(0, descriptor), VEXA_STATUS_GONE);
    EXPECT_EQ(descriptor, -1);
}

TEST_F(HidrawDeviceTest, NeverReachesTheDeviceThatTakesItsNode) {
    const std::string before = devices_.plug(0);
    HidrawDevice device("/dev/hidraw0", before);
    devices_.unplug(0);
    const std::string after = devices_.plug(0, {.name = "Another"});
    devices_.setFeature(0, 4, {.bytes = {4, 1, 0}});

    int descriptor = -1;
    EXPECT_EQ(device.open(0, descriptor), VEXA_STATUS_GONE);
    EXPECT_EQ(featureOf(device, 4), (Answer{VEXA_STATUS_GONE, {}}));
    EXPECT_EQ(device.property("Product"), PropertyValue());

    // What was found before the plug was pulled is not what is there now.
    try {
        const HidrawDevice mistaken("/dev/hidraw0", before);
        FAIL() << "took another device for the one that was found";
    } catch (const std::system_error& error) {
        EXPECT_EQ(error.code().value(), ENODEV);
        EXPECT_THAT(error.what(), HasSubstr("/dev/hidraw0"));
    }
    HidrawDevice other("/dev/hidraw0", after);
    EXPECT_EQ(other.property("Product"), PropertyValue("Another"));
}

TEST_F(HidrawDeviceTest, OpensAgainAfterItWasClosed) {
    devices_.plug(0);
    const auto backend = std::make_shared<HidrawDevice>("/dev/hidraw0");
    for (std::uint8_t round = 0; round < 2; ++round) {
        Reader reader(backend);
        ASSERT_EQ(reader.opened(), VEXA_STATUS_SUCCESS);
        devices_.send(0, Bytes(10, round));
        EXPECT_THAT(reader.waitFor(1), ElementsAre(Bytes(10, round)));
    }
}

TEST_F(HidrawDeviceTest, PassesFeatureReportsOnAsTheyAre) {
    devices_.plug(0);
    devices_.setFeature(0, 4, {.bytes = {4, 1, 2}});
    devices_.setFeature(0, 31, {.bytes = {31, 0x10}});
    devices_.setFeature(0, 63, {.bytes = {}});
    HidrawDevice device("/dev/hidraw0");

    EXPECT_EQ(featureOf(device, 4), (Answer{VEXA_STATUS_SUCCESS, {4, 1, 2}}));
    EXPECT_EQ(featureOf(device, 4, 2), (Answer{VEXA_STATUS_SUCCESS, {4, 1}}));
    EXPECT_EQ(featureOf(device, 31), (Answer{VEXA_STATUS_SUCCESS, {31, 0x10}}));
    EXPECT_EQ(featureOf(device, 63), (Answer{VEXA_STATUS_SUCCESS, {}}));
    EXPECT_EQ(featureOf(device, 4, 0), (Answer{VEXA_STATUS_BAD_ARGUMENT, {}}));
    EXPECT_EQ(featureOf(device, 256), (Answer{VEXA_STATUS_BAD_ARGUMENT, {}}));
    // Room for more than a request can ask for.
    EXPECT_EQ(featureOf(device, 4, 100'000), (Answer{VEXA_STATUS_SUCCESS, {4, 1, 2}}));
}

TEST_F(HidrawDeviceTest, SaysWhyAFeatureReportFailed) {
    devices_.plug(0);
    HidrawDevice device("/dev/hidraw0");
    const std::vector<std::pair<int, vexa_status>> outcomes = {
        {EIO, VEXA_STATUS_IO_ERROR},
        {EPIPE, VEXA_STATUS_IO_ERROR},
        {ETIMEDOUT, VEXA_STATUS_IO_ERROR},
        {EINVAL, VEXA_STATUS_IO_ERROR},
        {ENOMEM, VEXA_STATUS_NO_RESOURCES},
        {ENOSYS, VEXA_STATUS_UNSUPPORTED},
        // An address on a bus that did not answer, a transfer that was taken back.
        {ENXIO, VEXA_STATUS_IO_ERROR},
        {ENOENT, VEXA_STATUS_IO_ERROR},
        {ENODEV, VEXA_STATUS_IO_ERROR},
    };
    for (const auto& [error, status] : outcomes) {
        devices_.setFeature(0, 4, {.bytes = {}, .error = error});
        EXPECT_EQ(featureOf(device, 4), (Answer{status, {}})) << error;
        EXPECT_FALSE(device.isGone()) << error;
    }
    devices_.setFeature(0, 4, {.bytes = {4, 1, 2}});
    EXPECT_EQ(featureOf(device, 4), (Answer{VEXA_STATUS_SUCCESS, {4, 1, 2}}));

    Bytes buffer(8);
    std::size_t length = 8;
    EXPECT_EQ(device.getReport(VEXA_REPORT_INPUT, 1, buffer, length), VEXA_STATUS_UNSUPPORTED);
    EXPECT_EQ(length, 0U);
}

TEST_F(HidrawDeviceTest, AFeatureReportThatFailsIsLoggedWhenThatChangesAndNotEachTime) {
    devices_.plug(0);
    HidrawDevice device("/dev/hidraw0");
    LogCapture log;
    const auto askTwice = [&](std::uint8_t id, const MockedAnswer& answer, std::size_t room = 64) {
        devices_.setFeature(0, id, answer);
        featureOf(device, id, room);
        featureOf(device, id, room);
        return log.take();
    };
    EXPECT_THAT(askTwice(4, {.bytes = {4, 1, 2}}), ElementsAre());
    EXPECT_THAT(
        askTwice(4, {.bytes = {}, .error = EIO}),
        ElementsAre(error("/dev/hidraw0: feature report 4 is not given: Input/output error")));
    EXPECT_THAT(
        askTwice(4, {.bytes = {}, .error = ETIMEDOUT}),
        ElementsAre(error("/dev/hidraw0: feature report 4 is not given: Connection timed out")));
    EXPECT_THAT(askTwice(4, {.bytes = {4, 1}}),
                ElementsAre(error("/dev/hidraw0: feature report 4 is too short: 2 of 3 bytes")));
    EXPECT_THAT(askTwice(4, {.bytes = {}}),
                ElementsAre(error("/dev/hidraw0: feature report 4 is too short: 0 of 3 bytes")));
    // Another report has its own.
    EXPECT_THAT(
        askTwice(63, {.bytes = {}, .error = EIO}),
        ElementsAre(error("/dev/hidraw0: feature report 63 is not given: Input/output error")));
    EXPECT_THAT(askTwice(4, {.bytes = {4, 1, 2}}),
                ElementsAre(info("/dev/hidraw0: feature report 4 is given again")));
    // It is whole for who has room for two bytes; of one that nothing declares nothing is missing.
    EXPECT_THAT(askTwice(4, {.bytes = {4, 1, 2}}, 2), ElementsAre());
    EXPECT_THAT(askTwice(7, {.bytes = {7}}), ElementsAre());

    devices_.unplug(0);
    featureOf(device, 4);
    EXPECT_THAT(log.take(), ElementsAre());
}

TEST_F(HidrawDeviceTest, ARequestThatEndsWithTheUnplugSaysGone) {
    devices_.plug(0);
    HidrawDevice device("/dev/hidraw0");
    devices_.holdNextFeature(0);
    Answer answer;
    std::jthread asking([&] { answer = featureOf(device, 4); });
    devices_.waitUntilHeld(0);
    devices_.unplug(0);
    asking.join();
    EXPECT_EQ(answer, (Answer{VEXA_STATUS_GONE, {}}));
    EXPECT_TRUE(device.isGone());
}

TEST_F(HidrawDeviceTest, SendsFeatureReports) {
    devices_.plug(0);
    HidrawDevice device("/dev/hidraw0");
    EXPECT_EQ(device.setFeatureReport(Bytes{31, 1, 2, 3, 4}), VEXA_STATUS_SUCCESS);
    EXPECT_EQ(device.setFeatureReport(Bytes{}), VEXA_STATUS_BAD_ARGUMENT);
    EXPECT_THAT(devices_.written(0), ElementsAre(Bytes{31, 1, 2, 3, 4}));
}

TEST_F(HidrawDeviceTest, ReadsOnWhileAFeatureReportIsWaitedFor) {
    devices_.plug(0);
    devices_.setFeature(0, 4, {.bytes = {}, .error = ETIMEDOUT});
    const auto backend = std::make_shared<HidrawDevice>("/dev/hidraw0");
    Reader reader(backend);
    devices_.holdNextFeature(0);
    Answer answer;
    std::jthread asking([&] { answer = featureOf(*backend, 4); });
    devices_.waitUntilHeld(0);

    devices_.send(0, Bytes(73, 1));
    EXPECT_THAT(reader.waitFor(1), ElementsAre(Bytes(73, 1)));
    devices_.answerHeld(0);
    asking.join();
    EXPECT_EQ(answer, (Answer{VEXA_STATUS_IO_ERROR, {}}));
}

TEST_F(HidrawDeviceTest, ShowsReportsToWhoeverWantsToSeeThem) {
    struct Watching : HidrawDevice {
        using HidrawDevice::HidrawDevice;
        void reportArrived(std::span<const std::uint8_t> report,
                           std::uint64_t /*timestamp*/) noexcept override {
            seen.emplace_back(report.begin(), report.end());
        }
        std::vector<Bytes> seen;
    };
    devices_.plug(0);
    const auto backend = std::make_shared<Watching>("/dev/hidraw0");
    {
        Reader reader(backend);
        devices_.send(0, Bytes(73, 1));
        reader.waitFor(1);
    }
    EXPECT_THAT(backend->seen, ElementsAre(Bytes(73, 1)));
}

TEST_F(HidrawDeviceTest, TwoDevicesDoNotMeet) {
    devices_.plug(0, {.name = "First"});
    devices_.plug(1, {.name = "Second"});
    const auto first = std::make_shared<HidrawDevice>("/dev/hidraw0");
    const auto second = std::make_shared<HidrawDevice>("/dev/hidraw1");
    Reader firstReader(first);
    Reader secondReader(second);
    devices_.send(1, Bytes(73, 2));
    EXPECT_THAT(secondReader.waitFor(1), ElementsAre(Bytes(73, 2)));
    devices_.unplug(1);
    waitUntilGone(*second);
    devices_.send(0, Bytes(73, 1));
    EXPECT_THAT(firstReader.waitFor(1), ElementsAre(Bytes(73, 1)));
    EXPECT_EQ(first->property("Product"), PropertyValue("First"));
    EXPECT_TRUE(second->isGone());
}

TEST_F(HidrawDeviceTest, NamesTheNodeThatCannotBeUsed) {
    try {
        const HidrawDevice device("/dev/hidraw7");
        FAIL() << "there is no such node";
    } catch (const std::system_error& error) {
        EXPECT_EQ(error.code().value(), ENOENT);
        EXPECT_THAT(error.what(), HasSubstr("/dev/hidraw7"));
    }
    try {
        const HidrawDevice device("/dev/null");
        FAIL() << "it is no HID device";
    } catch (const std::system_error& error) {
        EXPECT_THAT(error.what(), HasSubstr("/dev/null: HIDIOCGRAWINFO"));
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
