#include "Platform/Library/ServiceRegistry.h"

#include "Platform/Library/Mutex.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <map>
#include <new>
#include <utility>

namespace Vexa::Library {

Backend::~Backend() {
    if (table_.destroy) table_.destroy(context_);
}

void Backend::adopt(const vexa_device_backend& table, void* context) noexcept {
    // One of an older header is shorter: it has none of the newer entries.
    std::memcpy(&table_, &table, std::min(table.size, sizeof table_));
    context_ = context;
}

vexa_status Backend::open(std::uint32_t options, int& descriptor) const noexcept {
    return table_.open(context_, options, &descriptor);
}

void Backend::close(std::uint32_t options) const noexcept {
    if (table_.close) table_.close(context_, options);
}

vexa_status Backend::getReport(vexa_report_type type, std::uint32_t reportId, std::uint8_t* report,
                               std::size_t& length) const noexcept {
    if (!table_.get_report) return VEXA_STATUS_UNSUPPORTED;
    return table_.get_report(context_, type, reportId, report, &length);
}

vexa_value* Backend::copyProperty(const vexa_value* key) const noexcept {
    return table_.copy_property ? table_.copy_property(context_, key) : nullptr;
}

bool Backend::setProperty(const vexa_value* key, const vexa_value* value) const noexcept {
    return table_.set_property && table_.set_property(context_, key, value);
}

void Backend::reportHandled() const noexcept {
    if (table_.report_handled) table_.report_handled(context_);
}

void Backend::reportArrived(const std::uint8_t* report, std::size_t length) const noexcept {
    if (table_.report_arrived) table_.report_arrived(context_, report, length);
}

namespace {

class Registry {
public:
    std::uint32_t add(const vexa_device_backend& table, void* context) {
        const auto backend = std::make_shared<Backend>();
        const MutexLock lock(mutex_);
        std::uint32_t service = 0;
        do {
            service = ++last_;
        } while (service == 0 || backends_.contains(service));
        backends_.emplace(service, backend);
        // Nothing fails any more, so from now on it is ours.
        backend->adopt(table, context);
        return service;
    }

    bool remove(std::uint32_t service) noexcept {
        // Whoever is the last to let go of it does so without the lock: it may call anything.
        std::shared_ptr<const Backend> removed;
        const MutexLock lock(mutex_);
        const auto found = backends_.find(service);
        if (found == backends_.end()) return false;
        removed = std::move(found->second);
        backends_.erase(found);
        return true;
    }

    std::shared_ptr<const Backend> find(std::uint32_t service) noexcept {
        const MutexLock lock(mutex_);
        const auto found = backends_.find(service);
        return found == backends_.end() ? nullptr : found->second;
    }

private:
    Mutex mutex_;
    std::map<std::uint32_t, std::shared_ptr<const Backend>> backends_ GUARDED_BY(mutex_);
    std::uint32_t last_ GUARDED_BY(mutex_) = 0;
};

// Never destroyed: devices and registrations of statics may end after it.
Registry& registry() {
    static Registry& theOne = *new Registry;
    return theOne;
}

// Whether all entries up to the first optional one are there.
bool isWellFormed(const vexa_device_backend* backend) noexcept {
    return backend && backend->size >= offsetof(vexa_device_backend, close) && backend->open;
}

}  // namespace

std::shared_ptr<const Backend> registeredBackend(std::uint32_t service) noexcept {
    return registry().find(service);
}

}  // namespace Vexa::Library

extern "C" {

uint32_t vexa_service_register(const vexa_device_backend* backend, void* context) noexcept {
    using namespace Vexa::Library;
    if (!isWellFormed(backend)) return 0;
    try {
        return registry().add(*backend, context);
    } catch (const std::bad_alloc&) {
        return 0;
    }
}

bool vexa_service_unregister(uint32_t service) noexcept {
    return Vexa::Library::registry().remove(service);
}

}  // extern "C"
