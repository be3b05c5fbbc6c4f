#pragma once

#include "Platform/Library/FileDescriptor.h"
#include "Platform/Library/LiveObjects.h"
#include "Platform/Library/RunLoop.h"
#include "Platform/Library/ServiceRegistry.h"
#include "Platform/Mutex.h"

#include <vexa/device.h>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

/// A device: what its users want (callback, loop and mode), the descriptor while it is open, and a
/// watch on the loop while both are there.
///
/// Its lock is held for the read of a report but never while anything foreign is called, so that
/// back-ends and callbacks may do whatever they like with the device.
struct vexa_device final : public Vexa::Library::Source,
                           private Vexa::Library::Counted<VEXA_OBJECT_DEVICE> {
public:
    explicit vexa_device(std::shared_ptr<const Vexa::Library::Backend> backend) noexcept;

    void retain() noexcept { references_.fetch_add(1, std::memory_order_relaxed); }
    bool tryRetain() noexcept override;
    void release() noexcept override;

    vexa_status open(std::uint32_t options) noexcept;
    vexa_status close(std::uint32_t options) noexcept;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId, std::uint8_t* buffer,
                          std::size_t* length) noexcept;
    vexa_value* copyProperty(const vexa_value* key) noexcept;
    bool setProperty(const vexa_value* key, const vexa_value* value) noexcept;

    vexa_status setInputReportCallback(std::uint8_t* buffer, std::size_t length,
                                       vexa_input_report_callback callback, void* context) noexcept;
    vexa_status schedule(vexa_run_loop* loop, const char* mode) noexcept;
    void unschedule(vexa_run_loop* loop, const char* mode) noexcept;

    [[nodiscard]] bool isPresent() const noexcept { return present_; }

    bool serve(std::uint64_t watch, bool isClosed) noexcept override;

private:
    // The steps between are those in which the back-end is being called.
    enum class State : std::uint8_t { Closed, Opening, Open, Closing };

    struct Target {
        std::uint8_t* buffer = nullptr;
        std::size_t length = 0;
        vexa_input_report_callback callback = nullptr;
        void* context = nullptr;
    };

    ~vexa_device();

    vexa_status openBackend(std::uint32_t options,
                            Vexa::Library::FileDescriptor& descriptor) noexcept;
    void closeBackend(std::uint32_t options, Vexa::Library::FileDescriptor descriptor) noexcept;
    [[nodiscard]] bool watch() noexcept REQUIRES(mutex_);
    void unwatch() noexcept REQUIRES(mutex_);
    /// Whether there was one to leave.
    bool leaveLoop() noexcept REQUIRES(mutex_);
    /// The report's length, or nothing when there is none; then it may be that the device has gone.
    std::optional<std::size_t> read(bool isClosed) noexcept REQUIRES(mutex_);

    std::atomic<std::uint32_t> references_{1};
    std::atomic<bool> present_{true};
    const std::shared_ptr<const Vexa::Library::Backend> backend_;

    Vexa::Mutex mutex_;
    State state_ GUARDED_BY(mutex_) = State::Closed;
    Vexa::Library::FileDescriptor descriptor_ GUARDED_BY(mutex_);
    bool isPacketSocket_ GUARDED_BY(mutex_) = false;
    Target target_ GUARDED_BY(mutex_);
    vexa_run_loop* loop_ GUARDED_BY(mutex_) = nullptr;  // retained
    Vexa::Library::Mode* mode_ GUARDED_BY(mutex_) = nullptr;
    std::uint64_t watch_ GUARDED_BY(mutex_) = 0;
};
