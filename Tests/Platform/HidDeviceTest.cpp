#include "Platform/HidDevice.h"

#include "Platform/HostClock.h"
#include "Platform/ScriptedDevice.h"
#include "Tests/Platform/LoopThread.h"

#include <gmock/gmock.h>

#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <latch>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

using Bytes = std::vector<std::uint8_t>;
using Writes = ScriptedDevice::Writes;

constexpr const char* kMode = LoopThread::kMode;
// Only a failing test waits that long.
constexpr std::uint64_t kGuard = 60'000'000'000;

// One report as the callback got it.
struct Seen {
    vexa_status result;
    vexa_device* sender;
    vexa_report_type type;
    std::uint32_t reportId;
    Bytes bytes;
    std::uint64_t timestamp;
};

// The user of a device: a buffer, and all reports that came in.
class Reader {
public:
    explicit Reader(std::size_t room = 512) : buffer_(room) {}

    vexa_status registerWith(const HidDevice& device) {
        return device.setInputReportCallback(buffer_, &Reader::receive, this);
    }
    void unregisterFrom(const HidDevice& device) {
        device.setInputReportCallback(buffer_, nullptr, nullptr);
    }
    void setReaction(std::function<void()> reaction) { reaction_ = std::move(reaction); }

    std::vector<Seen> seen() const {
        const std::scoped_lock lock(mutex_);
        return seen_;
    }
    std::vector<Bytes> reports() const {
        std::vector<Bytes> reports;
        for (const Seen& each : seen()) reports.push_back(each.bytes);
        return reports;
    }
    const std::uint8_t* buffer() const { return buffer_.data(); }

private:
    static void receive(void* context, vexa_status result, vexa_device* sender,
                        vexa_report_type type, std::uint32_t reportId, const std::uint8_t* report,
                        std::size_t length, std::uint64_t timestamp) {
        auto& self = *static_cast<Reader*>(context);
        EXPECT_EQ(report, self.buffer_.data());
        {
            const std::scoped_lock lock(self.mutex_);
            self.seen_.push_back({.result = result,
                                  .sender = sender,
                                  .type = type,
                                  .reportId = reportId,
                                  .bytes = Bytes(report, report + length),
                                  .timestamp = timestamp});
        }
        if (self.reaction_) self.reaction_();
    }

    std::vector<std::uint8_t> buffer_;
    std::function<void()> reaction_;
    mutable std::mutex mutex_;
    std::vector<Seen> seen_;
};

// Holds a reader in its callback.
class Held {
public:
    explicit Held(Reader& reader) {
        reader.setReaction([this] {
            inside_.count_down();
            goOn_.wait();
        });
    }

    void waitUntilInside() const { inside_.wait(); }
    void goOn() { goOn_.count_down(); }

private:
    std::latch inside_{1};
    std::latch goOn_{1};
};

// Looks for devices and loops that are left over.
class HidDeviceTest : public testing::Test {
protected:
    HidDeviceTest() = default;

    void TearDown() override {
        device_.reset();
        registration_.reset();
        scripted_.reset();
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_DEVICE), devicesBefore_);
    }

    // Lets the reports come to the reader, on the loop's thread.
    void readOn(const LoopThread& input, Reader& reader) const {
        input.call([&] {
            reader.registerWith(device_);
            device_.schedule(input.loop(), kMode);
        });
    }

    std::vector<std::string_view> operations() const {
        std::vector<std::string_view> names;
        for (const ScriptedDevice::Call& call : scripted_->calls()) names.push_back(call.operation);
        return names;
    }

    std::int64_t devicesBefore_ = vexa_live_objects(VEXA_OBJECT_DEVICE);
    std::shared_ptr<ScriptedDevice> scripted_ = std::make_shared<ScriptedDevice>();
    std::unique_ptr<DeviceRegistration> registration_ =
        std::make_unique<DeviceRegistration>(scripted_);
    HidDevice device_ = HidDevice::create(registration_->service());
};

// ---- which device ----

TEST_F(HidDeviceTest, IsMadeForRegisteredServicesOnly) {
    EXPECT_TRUE(device_);
    EXPECT_FALSE(HidDevice::create(0));
    EXPECT_FALSE(HidDevice::create(registration_->service() + 1'000'000));
}

TEST_F(HidDeviceTest, GoesOnWhenItsServiceIsUnregistered) {
    const std::uint32_t service = registration_->service();
    registration_.reset();
    EXPECT_FALSE(HidDevice::create(service));
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_FALSE(vexa_service_unregister(service));
}

TEST_F(HidDeviceTest, KeepsItsBackendAlive) {
    const std::weak_ptr<ScriptedDevice> backend = scripted_;
    scripted_.reset();
    registration_.reset();
    EXPECT_FALSE(backend.expired());
    device_.reset();
    EXPECT_TRUE(backend.expired());
}

TEST_F(HidDeviceTest, SeveralStandBeforeOneBackend) {
    const HidDevice second = HidDevice::create(registration_->service());
    EXPECT_NE(second.get(), device_.get());
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_DEVICE), devicesBefore_ + 2);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_EQ(second.open(0), VEXA_STATUS_SUCCESS);
}

TEST(HidDeviceNone, AnswersLikeADeviceThatIsNotThere) {
    const HidDevice none;
    EXPECT_EQ(none.open(0), VEXA_STATUS_NOT_OPEN);
    none.close(0);
    std::array<std::uint8_t, 4> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(none.featureReport(1, buffer.data(), length), VEXA_STATUS_NOT_OPEN);
    EXPECT_EQ(length, 0U);
    EXPECT_FALSE(none.property("key"));
    EXPECT_FALSE(none.setProperty("key", 1));
    none.setInputReportCallback(buffer, nullptr, nullptr);
    EXPECT_EQ(none.schedule(RunLoop::current(), kMode), VEXA_STATUS_NOT_OPEN);
    none.unschedule(RunLoop::current(), kMode);
    EXPECT_FALSE(none.isPresent());
    EXPECT_EQ(vexa_device_retain(nullptr), nullptr);
    vexa_device_release(nullptr);
}

// ---- open and close ----

TEST_F(HidDeviceTest, PassesOptionsToItsBackend) {
    EXPECT_EQ(device_.open(0xAB), VEXA_STATUS_SUCCESS);
    EXPECT_EQ(vexa_device_close(device_.get(), 0xCD), VEXA_STATUS_SUCCESS);
    EXPECT_THAT(scripted_->calls(),
                ElementsAre(ScriptedDevice::Call{.operation = "open", .options = 0xAB},
                            ScriptedDevice::Call{.operation = "close", .options = 0xCD}));
}

TEST_F(HidDeviceTest, SecondOpenNeedsAClose) {
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_ALREADY_OPEN);
    device_.close(0);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_THAT(operations(), ElementsAre("open", "close", "open"));
}

TEST_F(HidDeviceTest, CloseOfAClosedDeviceDoesNothing) {
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_NOT_OPEN);
    device_.open(0);
    device_.close(0);
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_NOT_OPEN);
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
}

TEST_F(HidDeviceTest, FailedOpenIsNoOpen) {
    scripted_->setNextOpenStatuses({VEXA_STATUS_IO_ERROR, VEXA_STATUS_NO_RESOURCES});
    EXPECT_EQ(device_.open(0), VEXA_STATUS_IO_ERROR);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_NO_RESOURCES);
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_NOT_OPEN);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_THAT(operations(), ElementsAre("open", "open", "open"));
}

TEST_F(HidDeviceTest, LastReleaseClosesAnOpenDevice) {
    device_.open(5);
    HidDevice second = device_;
    device_.reset();
    EXPECT_THAT(operations(), ElementsAre("open"));
    second.reset();
    EXPECT_THAT(scripted_->calls(),
                ElementsAre(ScriptedDevice::Call{.operation = "open", .options = 5},
                            ScriptedDevice::Call{.operation = "close", .options = 0}));
}

TEST_F(HidDeviceTest, OpenAndCloseInProgressExcludeOthers) {
    std::vector<vexa_status> statuses;
    scripted_->setHook([&](std::string_view operation) {
        if (operation == "open" || operation == "close") {
            statuses.push_back(device_.open(0));
            statuses.push_back(vexa_device_close(device_.get(), 0));
        }
    });
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_THAT(statuses, ElementsAre(VEXA_STATUS_ALREADY_OPEN, VEXA_STATUS_NOT_OPEN));
    device_.close(0);
    EXPECT_THAT(statuses, ElementsAre(VEXA_STATUS_ALREADY_OPEN, VEXA_STATUS_NOT_OPEN,
                                      VEXA_STATUS_ALREADY_OPEN, VEXA_STATUS_NOT_OPEN));
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
}

// ---- input reports ----

TEST_F(HidDeviceTest, HandsOverAReportWithAllThatBelongsToIt) {
    const LoopThread input;
    Reader reader;
    input.call([&] {
        reader.registerWith(device_);
        EXPECT_EQ(device_.schedule(input.loop(), kMode), VEXA_STATUS_SUCCESS);
    });
    device_.open(0);
    const std::uint64_t before = HostClock::system().now();
    scripted_->sendReport(Bytes{0x31, 2, 3});
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    const std::uint64_t after = HostClock::system().now();
    ASSERT_THAT(reader.seen(), SizeIs(1));
    const Seen seen = reader.seen().front();
    EXPECT_EQ(seen.result, VEXA_STATUS_SUCCESS);
    EXPECT_EQ(seen.sender, device_.get());
    EXPECT_EQ(seen.type, VEXA_REPORT_INPUT);
    EXPECT_EQ(seen.reportId, 0x31U);
    EXPECT_THAT(seen.bytes, ElementsAre(0x31, 2, 3));
    EXPECT_GE(seen.timestamp, before);
    EXPECT_LE(seen.timestamp, after);
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, ServesReportsWhicheverCameFirstOpenOrSchedule) {
    for (const bool openFirst : {true, false}) {
        const LoopThread input;
        Reader reader;
        const std::uint64_t before = scripted_->handled();
        if (openFirst) {
            device_.open(0);
            scripted_->sendReport(Bytes{1});
        }
        input.call([&] {
            reader.registerWith(device_);
            EXPECT_EQ(device_.schedule(input.loop(), kMode), VEXA_STATUS_SUCCESS);
        });
        if (!openFirst) {
            device_.open(0);
            scripted_->sendReport(Bytes{1});
        }
        scripted_->sendReport(Bytes{2});
        EXPECT_TRUE(scripted_->waitUntilHandled(before + 2));
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
        input.call([&] {
            device_.unschedule(input.loop(), kMode);
            reader.unregisterFrom(device_);
        });
        device_.close(0);
    }
}

TEST_F(HidDeviceTest, CutsLongReportsAndDeliversEmptyOnes) {
    const LoopThread input;
    Reader reader(4);
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1, 2, 3, 4});
    scripted_->sendReport(Bytes{5, 6, 7, 8, 9});
    scripted_->sendReport({});
    scripted_->sendReport(Bytes(5000, 10));
    scripted_->sendReport(Bytes{11});
    ASSERT_TRUE(scripted_->waitUntilHandled(5));
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1, 2, 3, 4}, Bytes{5, 6, 7, 8}, Bytes{},
                                              Bytes{10, 10, 10, 10}, Bytes{11}));
    EXPECT_EQ(reader.seen()[2].reportId, 0U);
    EXPECT_TRUE(device_.isPresent());
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, CutsReportsToNothingForAnEmptyBuffer) {
    const LoopThread input;
    std::vector<std::size_t> lengths;
    input.call([&] {
        vexa_device_set_input_report_callback(
            device_.get(), nullptr, 100,
            [](void* context, vexa_status, vexa_device*, vexa_report_type, std::uint32_t id,
               const std::uint8_t*, std::size_t length, std::uint64_t) {
                EXPECT_EQ(id, 0U);
                static_cast<std::vector<std::size_t>*>(context)->push_back(length);
            },
            &lengths);
        device_.schedule(input.loop(), kMode);
    });
    device_.open(0);
    scripted_->sendReport(Bytes{1, 2, 3});
    scripted_->sendReport({});
    ASSERT_TRUE(scripted_->waitUntilHandled(2));
    EXPECT_THAT(lengths, ElementsAre(0, 0));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, KeepsReportsUntilThereIsACallback) {
    const LoopThread input;
    Reader reader;
    input.call([&] { device_.schedule(input.loop(), kMode); });
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    input.call([] {});
    EXPECT_EQ(scripted_->handled(), 0U);
    input.call([&] { reader.registerWith(device_); });
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    input.call([&] { reader.unregisterFrom(device_); });
    scripted_->sendReport(Bytes{2});
    input.call([] {});
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
    Reader second;
    input.call([&] { second.registerWith(device_); });
    ASSERT_TRUE(scripted_->waitUntilHandled(2));
    EXPECT_THAT(second.reports(), ElementsAre(Bytes{2}));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, RefusesASecondCallbackUntilTheFirstIsTakenBack) {
    const LoopThread input;
    Reader first;
    Reader second;
    input.call([&] {
        first.registerWith(device_);
        device_.schedule(input.loop(), kMode);
    });
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    EXPECT_EQ(second.registerWith(device_), VEXA_STATUS_BAD_ARGUMENT);
    scripted_->sendReport(Bytes{2});
    ASSERT_TRUE(scripted_->waitUntilHandled(2));
    input.call([&] {
        first.unregisterFrom(device_);
        EXPECT_EQ(second.registerWith(device_), VEXA_STATUS_SUCCESS);
    });
    scripted_->sendReport(Bytes{3});
    ASSERT_TRUE(scripted_->waitUntilHandled(3));
    EXPECT_THAT(first.reports(), ElementsAre(Bytes{1}, Bytes{2}));
    EXPECT_THAT(second.reports(), ElementsAre(Bytes{3}));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

// ---- run loop ----

TEST_F(HidDeviceTest, ServesReportsInItsModeOnly) {
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        reader.registerWith(device_);
        EXPECT_EQ(device_.schedule(loop, kMode), VEXA_STATUS_SUCCESS);
        device_.open(0);
        scripted_->sendReport(Bytes{1});
        EXPECT_EQ(loop.run("other", 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(reader.reports(), IsEmpty());
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
        device_.unschedule(loop, kMode);
    }).join();
}

TEST_F(HidDeviceTest, ReportIsASourceServed) {
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        reader.registerWith(device_);
        device_.schedule(loop, kMode);
        device_.open(0);
        scripted_->sendReport(Bytes{1});
        scripted_->sendReport(Bytes{2});
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
        reader.setReaction([&] { loop.stop(); });
        EXPECT_EQ(loop.run(kMode, kGuard), VEXA_RUN_STOPPED);
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
        EXPECT_EQ(loop.run(kMode, 0, true), VEXA_RUN_TIMED_OUT);
        device_.unschedule(loop, kMode);
    }).join();
}

TEST_F(HidDeviceTest, IsScheduledAtOnePlaceAtATime) {
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        EXPECT_EQ(device_.schedule(loop, kMode), VEXA_STATUS_SUCCESS);
        EXPECT_EQ(device_.schedule(loop, kMode), VEXA_STATUS_BAD_ARGUMENT);
        EXPECT_EQ(device_.schedule(loop, "other"), VEXA_STATUS_BAD_ARGUMENT);
        device_.unschedule(loop, "other");
        EXPECT_EQ(device_.schedule(loop, "other"), VEXA_STATUS_BAD_ARGUMENT);
        device_.unschedule(RunLoop(), kMode);
        EXPECT_EQ(device_.schedule(loop, "other"), VEXA_STATUS_BAD_ARGUMENT);
        device_.unschedule(loop, kMode);
        device_.unschedule(loop, kMode);
        EXPECT_EQ(device_.schedule(loop, "other"), VEXA_STATUS_SUCCESS);
        device_.unschedule(loop, "other");
        EXPECT_EQ(vexa_device_schedule(device_.get(), nullptr, kMode), VEXA_STATUS_BAD_ARGUMENT);
        EXPECT_EQ(vexa_device_schedule(device_.get(), loop.get(), nullptr),
                  VEXA_STATUS_BAD_ARGUMENT);
    }).join();
}

TEST_F(HidDeviceTest, LeavesALoopWhoseThreadHasEnded) {
    const std::int64_t loopsBefore = vexa_live_objects(VEXA_OBJECT_RUN_LOOP);
    RunLoop ended;
    std::jthread([&] {
        ended = RunLoop::current();
        device_.schedule(ended, kMode);
    }).join();
    std::jthread([&] {
        EXPECT_EQ(device_.schedule(RunLoop::current(), kMode), VEXA_STATUS_SUCCESS);
        device_.unschedule(RunLoop::current(), kMode);
        EXPECT_EQ(device_.schedule(ended, kMode), VEXA_STATUS_BAD_ARGUMENT);
    }).join();
    ended.reset();
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_RUN_LOOP), loopsBefore);
}

TEST_F(HidDeviceTest, KeepsItsLoopUntilItLeavesIt) {
    const std::int64_t loopsBefore = vexa_live_objects(VEXA_OBJECT_RUN_LOOP);
    std::jthread([&] { device_.schedule(RunLoop::current(), kMode); }).join();
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_RUN_LOOP), loopsBefore + 1);
    device_.reset();
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_RUN_LOOP), loopsBefore);
}

TEST_F(HidDeviceTest, GetsNoReportAfterBeingUnscheduled) {
    const LoopThread input;
    Reader reader;
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
    scripted_->sendReport(Bytes{2});
    input.call([] {});
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
    input.call([&] { device_.schedule(input.loop(), kMode); });
    ASSERT_TRUE(scripted_->waitUntilHandled(2));
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, TwoShareALoop) {
    const auto otherBackend = std::make_shared<ScriptedDevice>();
    const DeviceRegistration otherService(otherBackend);
    const HidDevice other = HidDevice::create(otherService.service());
    const LoopThread input;
    Reader reader;
    Reader otherReader;
    input.call([&] {
        reader.registerWith(device_);
        otherReader.registerWith(other);
        device_.schedule(input.loop(), kMode);
        other.schedule(input.loop(), kMode);
    });
    device_.open(0);
    other.open(0);
    scripted_->sendReport(Bytes{1});
    otherBackend->sendReport(Bytes{2});
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    ASSERT_TRUE(otherBackend->waitUntilHandled(1));
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
    EXPECT_THAT(otherReader.reports(), ElementsAre(Bytes{2}));
    input.call([&] {
        device_.unschedule(input.loop(), kMode);
        other.unschedule(input.loop(), kMode);
    });
}

// More than one wait tells of at once.
TEST_F(HidDeviceTest, ManyShareALoopAndEachHasItsTurn) {
    constexpr std::size_t kDevices = 40;
    struct Stand {
        std::shared_ptr<ScriptedDevice> scripted = std::make_shared<ScriptedDevice>();
        DeviceRegistration registration{scripted};
        HidDevice device = HidDevice::create(registration.service());
        Reader reader;
    };
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        std::vector<std::unique_ptr<Stand>> stands;
        for (std::size_t i = 0; i < kDevices; ++i) {
            Stand& stand = *stands.emplace_back(std::make_unique<Stand>());
            stand.reader.registerWith(stand.device);
            EXPECT_EQ(stand.device.schedule(loop, kMode), VEXA_STATUS_SUCCESS);
            EXPECT_EQ(stand.device.open(0), VEXA_STATUS_SUCCESS);
        }
        for (std::size_t round = 1; round <= 4; ++round) {
            for (const auto& stand : stands) stand->scripted->sendReport(Bytes{1});
            EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
            EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
            for (const auto& stand : stands) EXPECT_THAT(stand->reader.seen(), SizeIs(round));
        }
        for (const auto& stand : stands) stand->device.unschedule(loop, kMode);
    }).join();
}

TEST_F(HidDeviceTest, JoinsAndLeavesALoopThatWaits) {
    const LoopThread input;
    Reader reader;
    reader.registerWith(device_);
    for (std::uint64_t i = 1; i <= 200; ++i) {
        ASSERT_EQ(device_.schedule(input.loop(), kMode), VEXA_STATUS_SUCCESS);
        ASSERT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
        scripted_->sendReport(Bytes{1});
        ASSERT_TRUE(scripted_->waitUntilHandled(i));
        // The loop may be in its wait again or just on its way there.
        if (i % 2 == 0) {
            device_.unschedule(input.loop(), kMode);
            device_.close(0);
        } else {
            device_.close(0);
            device_.unschedule(input.loop(), kMode);
        }
    }
    EXPECT_THAT(reader.seen(), SizeIs(200));
}

TEST_F(HidDeviceTest, CloseLosesWhatWasNotRead) {
    const LoopThread input;
    Reader reader;
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    device_.close(0);
    device_.open(0);
    readOn(input, reader);
    scripted_->sendReport(Bytes{2});
    ASSERT_TRUE(scripted_->waitUntilHandled(1));
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{2}));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

// ---- from inside the callback ----

TEST_F(HidDeviceTest, MayBeClosedFromItsCallback) {
    const LoopThread input;
    Reader reader;
    reader.setReaction([&] { device_.close(1); });
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    EXPECT_TRUE(scripted_->waitUntilHandled(1));
    EXPECT_TRUE(scripted_->waitUntilOpen(false));
    reader.setReaction({});
    EXPECT_EQ(device_.open(0), VEXA_STATUS_SUCCESS);
    scripted_->sendReport(Bytes{2});
    EXPECT_TRUE(scripted_->waitUntilHandled(2));
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
}

TEST_F(HidDeviceTest, MayBeReleasedFromItsCallback) {
    const LoopThread input;
    Reader reader;
    reader.setReaction([&] {
        device_.reset();
        // The loop still holds it.
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_DEVICE), devicesBefore_ + 1);
        EXPECT_THAT(operations(), ElementsAre("open"));
    });
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    scripted_->sendReport(Bytes{2});
    EXPECT_TRUE(scripted_->waitUntilHandled(1));
    EXPECT_TRUE(scripted_->waitUntilOpen(false));
    input.call([] {});
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_DEVICE), devicesBefore_);
}

TEST_F(HidDeviceTest, MayBeUnscheduledFromItsCallback) {
    const LoopThread input;
    Reader reader;
    reader.setReaction([&] {
        device_.unschedule(input.loop(), kMode);
        reader.unregisterFrom(device_);
    });
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    scripted_->sendReport(Bytes{2});
    EXPECT_TRUE(scripted_->waitUntilHandled(1));
    input.call([] {});
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
}

TEST_F(HidDeviceTest, MayBeClosedByOthersDuringItsCallback) {
    const LoopThread input;
    Reader reader;
    Held held(reader);
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    scripted_->sendReport(Bytes{2});
    held.waitUntilInside();
    // Does not wait for the callback.
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_SUCCESS);
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
    held.goOn();
    EXPECT_TRUE(scripted_->waitUntilHandled(1));
    input.call([&] { device_.unschedule(input.loop(), kMode); });
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}));
}

TEST_F(HidDeviceTest, MayBeReleasedByOthersDuringItsCallback) {
    const LoopThread input;
    Reader reader;
    Held held(reader);
    readOn(input, reader);
    device_.open(0);
    scripted_->sendReport(Bytes{1});
    held.waitUntilInside();
    device_.reset();
    held.goOn();
    EXPECT_TRUE(scripted_->waitUntilOpen(false));
    input.call([] {});
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_DEVICE), devicesBefore_);
}

TEST_F(HidDeviceTest, ServesOthersInARunInsideOfItsCallback) {
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        bool isInner = false;
        reader.setReaction([&] {
            if (std::exchange(isInner, true)) return;
            EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        });
        reader.registerWith(device_);
        device_.schedule(loop, kMode);
        device_.open(0);
        scripted_->sendReport(Bytes{1});
        scripted_->sendReport(Bytes{2});
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
        EXPECT_EQ(scripted_->handled(), 2U);
        device_.unschedule(loop, kMode);
    }).join();
}

// ---- unplug ----

TEST_F(HidDeviceTest, IsGoneOnceItsReportsHaveBeenRead) {
    const LoopThread input;
    Reader reader;
    device_.open(0);
    EXPECT_TRUE(device_.isPresent());
    scripted_->sendReport(Bytes{1});
    scripted_->sendReport(Bytes(5000, 2));
    scripted_->sendReport({});
    scripted_->sendReport({});
    scripted_->unplug();
    EXPECT_TRUE(device_.isPresent());
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        reader.registerWith(device_);
        device_.schedule(loop, kMode);
        for (int i = 0; i < 4; ++i) {
            EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
            EXPECT_TRUE(device_.isPresent());
        }
        EXPECT_EQ(loop.run(kMode, 0, true), VEXA_RUN_TIMED_OUT);
        EXPECT_FALSE(device_.isPresent());
        EXPECT_EQ(loop.run(kMode, 0, true), VEXA_RUN_TIMED_OUT);
        device_.unschedule(loop, kMode);
    }).join();
    EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes(512, 2), Bytes{}, Bytes{}));
}

TEST_F(HidDeviceTest, AnswersGoneAfterAnUnplugAndIsStillClosed) {
    scripted_->setFeatureReport(4, {1, 2});
    scripted_->setPropertyValue("key", 1);
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        reader.registerWith(device_);
        device_.schedule(loop, kMode);
        device_.open(0);
        scripted_->unplug();
        loop.run(kMode, 0);
        device_.unschedule(loop, kMode);
    }).join();
    ASSERT_FALSE(device_.isPresent());
    std::array<std::uint8_t, 8> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(device_.featureReport(4, buffer.data(), length), VEXA_STATUS_GONE);
    EXPECT_EQ(length, 0U);
    EXPECT_FALSE(device_.property("key"));
    EXPECT_FALSE(device_.setProperty("key", 2));
    EXPECT_EQ(device_.open(0), VEXA_STATUS_GONE);
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_SUCCESS);
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_NOT_OPEN);
    EXPECT_EQ(device_.open(0), VEXA_STATUS_GONE);
    // The back-end was not asked any more.
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
}

TEST_F(HidDeviceTest, IsUnpluggedDuringEachCall) {
    scripted_->setHook([&](std::string_view) { scripted_->unplug(); });
    std::array<std::uint8_t, 8> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(device_.open(0), VEXA_STATUS_GONE);
    EXPECT_EQ(device_.featureReport(4, buffer.data(), length), VEXA_STATUS_GONE);
    EXPECT_FALSE(device_.property("key"));
    EXPECT_FALSE(device_.setProperty("key", 2));
    EXPECT_EQ(vexa_device_close(device_.get(), 0), VEXA_STATUS_NOT_OPEN);
}

TEST_F(HidDeviceTest, IsUnpluggedDuringItsCallback) {
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        reader.setReaction([&] { scripted_->unplug(); });
        reader.registerWith(device_);
        device_.schedule(loop, kMode);
        device_.open(0);
        scripted_->sendReport(Bytes{1});
        scripted_->sendReport(Bytes{2});
        loop.run(kMode, 0);
        loop.run(kMode, 0);
        loop.run(kMode, 0);
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{1}, Bytes{2}));
        EXPECT_FALSE(device_.isPresent());
        device_.unschedule(loop, kMode);
    }).join();
    device_.close(0);
    EXPECT_THAT(operations(), ElementsAre("open", "close"));
}

TEST_F(HidDeviceTest, IsUnpluggedAtRestAndFoundSoLater) {
    device_.open(0);
    scripted_->unplug();
    device_.close(0);
    EXPECT_TRUE(device_.isPresent());
    EXPECT_EQ(device_.open(0), VEXA_STATUS_GONE);
    EXPECT_THAT(operations(), ElementsAre("open", "close", "open"));
}

// ---- feature reports and properties ----

TEST_F(HidDeviceTest, AsksForFeatureReports) {
    scripted_->setFeatureReport(4, {4, 9, 8});
    scripted_->setFeatureReport(5, {});
    scripted_->setFeatureReportStatus(6, VEXA_STATUS_IO_ERROR);
    const auto ask = [this](std::uint32_t id, std::size_t room) {
        Bytes buffer(room);
        std::size_t length = room;
        const vexa_status status = device_.featureReport(id, buffer.data(), length);
        buffer.resize(length);
        return std::pair(status, buffer);
    };
    EXPECT_EQ(ask(4, 32), std::pair(VEXA_STATUS_SUCCESS, Bytes{4, 9, 8}));
    EXPECT_EQ(ask(4, 2), std::pair(VEXA_STATUS_SUCCESS, Bytes{4, 9}));
    EXPECT_EQ(ask(4, 0), std::pair(VEXA_STATUS_SUCCESS, Bytes{}));
    EXPECT_EQ(ask(5, 32), std::pair(VEXA_STATUS_SUCCESS, Bytes{}));
    EXPECT_EQ(ask(6, 32), std::pair(VEXA_STATUS_IO_ERROR, Bytes{}));
    EXPECT_EQ(ask(7, 32), std::pair(VEXA_STATUS_UNSUPPORTED, Bytes{}));
    EXPECT_EQ(
        scripted_->calls().front(),
        (ScriptedDevice::Call{
            .operation = "getReport", .type = VEXA_REPORT_FEATURE, .reportId = 4, .room = 32}));
}

TEST_F(HidDeviceTest, RefusesToAskWithoutABuffer) {
    std::uint8_t byte = 0;
    std::size_t length = 1;
    EXPECT_EQ(vexa_device_get_report(device_.get(), VEXA_REPORT_FEATURE, 4, nullptr, &length),
              VEXA_STATUS_BAD_ARGUMENT);
    EXPECT_EQ(vexa_device_get_report(device_.get(), VEXA_REPORT_FEATURE, 4, &byte, nullptr),
              VEXA_STATUS_BAD_ARGUMENT);
    EXPECT_THAT(operations(), IsEmpty());
}

TEST_F(HidDeviceTest, ReadsAndWritesProperties) {
    scripted_->setPropertyValue("Name", "surface");
    EXPECT_EQ(device_.property("Name"), PropertyValue("surface"));
    EXPECT_FALSE(device_.property("Nothing"));
    EXPECT_TRUE(device_.setProperty("Name", 7));
    EXPECT_EQ(device_.property("Name"), PropertyValue(7));
    scripted_->setWrites(Writes::Accepted);
    EXPECT_TRUE(device_.setProperty("Name", 8));
    EXPECT_EQ(device_.property("Name"), PropertyValue(7));
    scripted_->setWrites(Writes::Refused);
    EXPECT_FALSE(device_.setProperty("Name", 9));
    EXPECT_EQ(scripted_->calls()[2],
              (ScriptedDevice::Call{.operation = "setProperty", .key = "Name", .value = 7}));
}

TEST_F(HidDeviceTest, KnowsNoPropertyWithoutAKey) {
    EXPECT_FALSE(device_.property(PropertyValue()));
    EXPECT_FALSE(device_.setProperty(PropertyValue(), 1));
    EXPECT_THAT(operations(), IsEmpty());
    EXPECT_TRUE(device_.setProperty("Name", PropertyValue()));
}

// ---- bare back-ends ----

// The least that a back-end must have: it opens a descriptor that it is given.
struct Bare {
    vexa_status status = VEXA_STATUS_SUCCESS;
    int descriptor = -1;
    int closes = 0;
    int destroys = 0;

    static vexa_status open(void* context, std::uint32_t, int* descriptor) {
        const Bare& self = *static_cast<Bare*>(context);
        *descriptor = self.descriptor;
        return self.status;
    }
    static void close(void* context, std::uint32_t) { ++static_cast<Bare*>(context)->closes; }
    static void destroy(void* context) { ++static_cast<Bare*>(context)->destroys; }

    static vexa_device_backend table() {
        vexa_device_backend table{};
        table.size = sizeof table;
        table.open = &open;
        return table;
    }
};

TEST(BareBackend, MalformedOnesAreNotRegistered) {
    Bare bare;
    EXPECT_EQ(vexa_service_register(nullptr, &bare), 0U);
    vexa_device_backend table = Bare::table();
    table.destroy = &Bare::destroy;
    table.open = nullptr;
    EXPECT_EQ(vexa_service_register(&table, &bare), 0U);
    table.open = &Bare::open;
    table.size = 0;
    EXPECT_EQ(vexa_service_register(&table, &bare), 0U);
    table.size = offsetof(vexa_device_backend, open);
    EXPECT_EQ(vexa_service_register(&table, &bare), 0U);
    EXPECT_EQ(bare.destroys, 0);
    EXPECT_FALSE(vexa_service_unregister(0));
}

TEST(BareBackend, NeedsNothingButOpen) {
    Bare bare;
    const vexa_device_backend table = Bare::table();
    const std::uint32_t service = vexa_service_register(&table, &bare);
    ASSERT_NE(service, 0U);
    HidDevice device = HidDevice::create(service);
    std::array<std::uint8_t, 8> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(device.featureReport(4, buffer.data(), length), VEXA_STATUS_UNSUPPORTED);
    EXPECT_FALSE(device.property("key"));
    EXPECT_FALSE(device.setProperty("key", 1));
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe(ends.data()), 0);
    bare.descriptor = ends[0];
    EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    EXPECT_NE(::fcntl(ends[0], F_GETFL) & O_NONBLOCK, 0);
    device.close(0);
    // Closed with the device.
    EXPECT_EQ(::fcntl(ends[0], F_GETFL), -1);
    ::close(ends[1]);
    device.reset();
    EXPECT_TRUE(vexa_service_unregister(service));
}

TEST(BareBackend, OfAnOlderHeaderHasNoNewerEntries) {
    Bare bare;
    vexa_device_backend table = Bare::table();
    table.close = &Bare::close;
    table.destroy = &Bare::destroy;
    table.size = offsetof(vexa_device_backend, get_report);
    const std::uint32_t service = vexa_service_register(&table, &bare);
    ASSERT_NE(service, 0U);
    HidDevice device = HidDevice::create(service);
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe(ends.data()), 0);
    bare.descriptor = ends[0];
    EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    device.reset();
    EXPECT_EQ(bare.closes, 1);
    vexa_service_unregister(service);
    EXPECT_EQ(bare.destroys, 0);
    ::close(ends[1]);
}

TEST(BareBackend, IsToldOfTheLoopThatServesIt) {
    struct Heard {
        int descriptor = -1;
        std::vector<std::string> what;
    };
    Heard told;
    vexa_device_backend table{};
    table.size = sizeof table;
    table.open = [](void* context, std::uint32_t, int* descriptor) -> vexa_status {
        *descriptor = static_cast<Heard*>(context)->descriptor;
        return VEXA_STATUS_SUCCESS;
    };
    table.report_arrived = [](void* context, const std::uint8_t* report, std::size_t length,
                              std::uint64_t) {
        static_cast<Heard*>(context)->what.push_back("arrived " +
                                                     std::string(report, report + length));
    };
    table.scheduled = [](void* context, vexa_run_loop* loop, const char* mode) {
        static_cast<Heard*>(context)->what.push_back(loop == vexa_run_loop_current()
                                                         ? std::string("scheduled in ") + mode
                                                     : loop == nullptr ? "left"
                                                                       : "another loop");
    };
    const std::uint32_t service = vexa_service_register(&table, &told);
    std::array<int, 2> ends{};
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends.data()), 0);
    told.descriptor = ends[0];
    {
        const HidDevice device = HidDevice::create(service);
        const RunLoop loop = RunLoop::current();
        ASSERT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
        std::array<std::uint8_t, 4> buffer{};
        device.setInputReportCallback(
            buffer,
            [](void* context, vexa_status, vexa_device*, vexa_report_type, std::uint32_t,
               const std::uint8_t*, std::size_t,
               std::uint64_t) { static_cast<Heard*>(context)->what.emplace_back("callback"); },
            &told);
        ASSERT_EQ(device.schedule(loop, "mode"), VEXA_STATUS_SUCCESS);
        // Longer than the buffer: both get what is in there.
        ASSERT_EQ(::send(ends[1], "report", 6, 0), 6);
        EXPECT_EQ(loop.run("mode", VEXA_RUN_FOREVER, true), VEXA_RUN_HANDLED);
        device.unschedule(loop, "another mode");
        device.unschedule(loop, "mode");
        device.unschedule(loop, "mode");
        ASSERT_EQ(device.schedule(loop, "mode"), VEXA_STATUS_SUCCESS);
        EXPECT_EQ(device.schedule(loop, "mode"), VEXA_STATUS_BAD_ARGUMENT);
    }
    ::close(ends[1]);
    vexa_service_unregister(service);
    EXPECT_EQ(told.what, (std::vector<std::string>{"scheduled in mode", "arrived repo", "callback",
                                                   "left", "scheduled in mode", "left"}));
}

// Notes what it is told of reports, in order, with what the callback got in between.
struct Told {
    struct Arrived {
        Bytes bytes;
        std::uint64_t timestamp;
    };
    std::vector<Arrived> arrived;
    std::vector<std::string_view> order;
    int descriptor = -1;
    std::latch done{2};

    static vexa_status open(void* context, std::uint32_t, int* descriptor) {
        *descriptor = static_cast<Told*>(context)->descriptor;
        return VEXA_STATUS_SUCCESS;
    }
    static void reportArrived(void* context, const std::uint8_t* report, std::size_t length,
                              std::uint64_t timestamp) {
        auto& self = *static_cast<Told*>(context);
        self.arrived.push_back({Bytes(report, report + length), timestamp});
        self.order.emplace_back("arrived");
    }
    static void reportHandled(void* context) {
        auto& self = *static_cast<Told*>(context);
        self.order.emplace_back("handled");
        self.done.count_down();
    }
};

TEST(BareBackend, IsToldOfEachReportBeforeTheCallbackAndAfterIt) {
    Told told;
    std::array<int, 2> ends{};
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends.data()), 0);
    told.descriptor = ends[0];
    vexa_device_backend table{};
    table.size = sizeof table;
    table.open = &Told::open;
    table.report_arrived = &Told::reportArrived;
    table.report_handled = &Told::reportHandled;
    const std::uint32_t service = vexa_service_register(&table, &told);
    ASSERT_NE(service, 0U);
    const HidDevice device = HidDevice::create(service);
    ASSERT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    Reader reader(4);
    reader.setReaction([&told] { told.order.emplace_back("callback"); });
    const LoopThread thread;
    thread.call([&] {
        reader.registerWith(device);
        EXPECT_EQ(device.schedule(thread.loop(), kMode), VEXA_STATUS_SUCCESS);
    });
    const Bytes longer = {1, 2, 3, 4, 5, 6};
    ASSERT_EQ(::send(ends[1], longer.data(), longer.size(), 0), 6);
    ASSERT_EQ(::send(ends[1], nullptr, 0, 0), 0);
    told.done.wait();
    thread.call([&] { device.unschedule(thread.loop(), kMode); });
    EXPECT_THAT(told.order,
                ElementsAre("arrived", "callback", "handled", "arrived", "callback", "handled"));
    ASSERT_THAT(told.arrived, SizeIs(2));
    const std::vector<Seen> seen = reader.seen();
    for (std::size_t i = 0; i < 2; ++i) {
        EXPECT_EQ(told.arrived[i].bytes, seen[i].bytes);
        EXPECT_EQ(told.arrived[i].timestamp, seen[i].timestamp);
    }
    EXPECT_EQ(told.arrived[0].bytes, (Bytes{1, 2, 3, 4}));
    vexa_service_unregister(service);
    ::close(ends[1]);
}

TEST(BareBackend, IsToldOnceThatNobodyNeedsIt) {
    Bare bare;
    vexa_device_backend table = Bare::table();
    table.destroy = &Bare::destroy;
    const std::uint32_t service = vexa_service_register(&table, &bare);
    HidDevice device = HidDevice::create(service);
    EXPECT_TRUE(vexa_service_unregister(service));
    EXPECT_FALSE(vexa_service_unregister(service));
    EXPECT_EQ(bare.destroys, 0);
    device.reset();
    EXPECT_EQ(bare.destroys, 1);
}

TEST(BareBackend, ThatOpensNoDescriptorIsClosedAgain) {
    Bare bare;
    vexa_device_backend table = Bare::table();
    table.close = &Bare::close;
    const std::uint32_t service = vexa_service_register(&table, &bare);
    const HidDevice device = HidDevice::create(service);
    EXPECT_EQ(device.open(0), VEXA_STATUS_IO_ERROR);
    EXPECT_EQ(bare.closes, 1);
    // What it could not open it need not close.
    bare.status = VEXA_STATUS_NO_RESOURCES;
    EXPECT_EQ(device.open(0), VEXA_STATUS_NO_RESOURCES);
    EXPECT_EQ(vexa_device_close(device.get(), 0), VEXA_STATUS_NOT_OPEN);
    EXPECT_EQ(bare.closes, 1);
    vexa_service_unregister(service);
}

TEST(BareBackend, ThatOpensWhatCannotBeWatchedIsClosedAgain) {
    Bare bare;
    vexa_device_backend table = Bare::table();
    table.close = &Bare::close;
    const std::uint32_t service = vexa_service_register(&table, &bare);
    const HidDevice device = HidDevice::create(service);
    std::jthread([&] {
        Reader reader;
        reader.registerWith(device);
        device.schedule(RunLoop::current(), kMode);
        bare.descriptor = ::open(VEXA_SOURCE_DIR "/CMakeLists.txt", O_RDONLY | O_CLOEXEC);
        EXPECT_EQ(device.open(0), VEXA_STATUS_NO_RESOURCES);
        EXPECT_EQ(bare.closes, 1);
        EXPECT_EQ(::fcntl(bare.descriptor, F_GETFL), -1);
        device.unschedule(RunLoop::current(), kMode);
    }).join();
    vexa_service_unregister(service);
}

TEST(BareBackend, ThatOpensWhatCannotBeWatchedIsClosedAgainBeforeAnybodyWaits) {
    Bare bare;
    vexa_device_backend table = Bare::table();
    table.close = &Bare::close;
    const std::uint32_t service = vexa_service_register(&table, &bare);
    const HidDevice device = HidDevice::create(service);
    bare.descriptor = ::open(VEXA_SOURCE_DIR "/CMakeLists.txt", O_RDONLY | O_CLOEXEC);
    EXPECT_EQ(device.open(0), VEXA_STATUS_NO_RESOURCES);
    EXPECT_EQ(bare.closes, 1);
    EXPECT_EQ(::fcntl(bare.descriptor, F_GETFL), -1);
    EXPECT_EQ(vexa_device_close(device.get(), 0), VEXA_STATUS_NOT_OPEN);
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
    bare.descriptor = ends[0];
    EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    device.close(0);
    EXPECT_EQ(bare.closes, 2);
    ::close(ends[1]);
    vexa_service_unregister(service);
}

TEST(BareBackend, WhoseDescriptorTurnsUnwatchableCannotBeScheduled) {
    Bare bare;
    const vexa_device_backend table = Bare::table();
    const std::uint32_t service = vexa_service_register(&table, &bare);
    const HidDevice device = HidDevice::create(service);
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
    bare.descriptor = ends[0];
    std::jthread([&] {
        Reader reader;
        reader.registerWith(device);
        EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
        const int file = ::open(VEXA_SOURCE_DIR "/CMakeLists.txt", O_RDONLY | O_CLOEXEC);
        ASSERT_EQ(::dup3(file, ends[0], O_CLOEXEC), ends[0]);
        ::close(file);
        EXPECT_EQ(device.schedule(RunLoop::current(), kMode), VEXA_STATUS_NO_RESOURCES);
        // Nothing is scheduled then.
        device.close(0);
        EXPECT_EQ(device.schedule(RunLoop::current(), kMode), VEXA_STATUS_SUCCESS);
        device.unschedule(RunLoop::current(), kMode);
    }).join();
    ::close(ends[1]);
    vexa_service_unregister(service);
}

TEST(BareBackend, MayGiveAPipe) {
    Bare bare;
    const vexa_device_backend table = Bare::table();
    const std::uint32_t service = vexa_service_register(&table, &bare);
    const HidDevice device = HidDevice::create(service);
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
    bare.descriptor = ends[0];
    std::jthread([&] {
        const RunLoop loop = RunLoop::current();
        Reader reader;
        reader.registerWith(device);
        device.schedule(loop, kMode);
        EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
        EXPECT_EQ(::write(ends[1], "ab", 2), 2);
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_EQ(::write(ends[1], "c", 1), 1);
        ::close(ends[1]);
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_TRUE(device.isPresent());
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_FALSE(device.isPresent());
        EXPECT_THAT(reader.reports(), ElementsAre(Bytes{'a', 'b'}, Bytes{'c'}));
        device.unschedule(loop, kMode);
    }).join();
    vexa_service_unregister(service);
}

// ---- everything at once ----

// Reports, feature reports, properties, opening and closing, rescheduling and in the end an unplug,
// from several threads. What is asserted is little: it is for the sanitizers.
TEST_F(HidDeviceTest, SurvivesEverythingAtOnce) {
    constexpr int kRounds = 300;
    scripted_->setFeatureReport(4, {1, 2, 3});
    const LoopThread input;
    Reader reader;
    readOn(input, reader);
    std::atomic<bool> finished = false;
    {
        std::vector<std::jthread> threads;
        threads.emplace_back([&] {
            std::uint8_t number = 0;
            while (!finished) scripted_->sendReport(Bytes{++number, 2, 3});
        });
        threads.emplace_back([&] {
            std::array<std::uint8_t, 32> buffer{};
            while (!finished) {
                std::size_t length = buffer.size();
                static_cast<void>(device_.featureReport(4, buffer.data(), length));
                device_.setProperty("key", 1);
                static_cast<void>(device_.property("key"));
            }
        });
        threads.emplace_back([&] {
            for (int i = 0; i < kRounds; ++i) {
                input.call([&] { device_.unschedule(input.loop(), kMode); });
                input.call([&] { device_.schedule(input.loop(), kMode); });
            }
        });
        threads.emplace_back([&] {
            for (int i = 0; i < kRounds; ++i) {
                device_.open(0);
                device_.close(0);
            }
            device_.open(0);
        });
        threads[3].join();
        threads[2].join();
        EXPECT_TRUE(scripted_->waitUntilHandled(scripted_->handled() + 10));
        scripted_->unplug();
        finished = true;
    }
    HidDevice shared = device_;
    device_.reset();
    std::jthread last([shared = std::move(shared)]() mutable { shared.reset(); });
    last.join();
    input.call([] {});
    EXPECT_EQ(scripted_->callCount("open"), kRounds + 1U);
    EXPECT_EQ(scripted_->callCount("close"), kRounds + 1U);
    for (const Bytes& report : reader.reports()) ASSERT_THAT(report, SizeIs(3));
}

// The last reference goes at any moment of a report's way.
TEST_F(HidDeviceTest, IsReleasedAtAnyMoment) {
    const LoopThread input;
    for (int i = 0; i < 200; ++i) {
        Reader reader;
        HidDevice device = HidDevice::create(registration_->service());
        input.call([&] {
            reader.registerWith(device);
            device.schedule(input.loop(), kMode);
        });
        device.open(0);
        const std::uint64_t before = scripted_->handled();
        std::jthread sender([&] {
            for (std::uint8_t j = 0; j < 20; ++j) scripted_->sendReport(Bytes{j});
        });
        if (i % 3 == 0) {
            EXPECT_TRUE(scripted_->waitUntilHandled(before + 1));
        }
        device.reset();
        sender.join();
        // Behind a report that is being handled.
        input.call([] {});
    }
    EXPECT_EQ(scripted_->callCount("open"), scripted_->callCount("close"));
}

}  // namespace
}  // namespace Vexa
