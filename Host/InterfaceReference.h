#pragma once

#include <utility>

namespace VexaTouch::Host {

/// One counted reference to an interface of a plug-in (a pointer to a pointer to its table), or
/// none. Given back through the table's Release.
template <typename Table>
class InterfaceReference {
public:
    InterfaceReference() noexcept = default;
    InterfaceReference(const InterfaceReference&) = delete;
    InterfaceReference(InterfaceReference&& other) noexcept
        : self_(std::exchange(other.self_, nullptr)) {}
    InterfaceReference& operator=(const InterfaceReference&) = delete;
    InterfaceReference& operator=(InterfaceReference&& other) noexcept {
        if (this != &other) {
            reset();
            self_ = std::exchange(other.self_, nullptr);
        }
        return *this;
    }
    ~InterfaceReference() { reset(); }

    /// Takes over a reference that the caller owns.
    static InterfaceReference adopt(void* owned) noexcept {
        InterfaceReference reference;
        reference.self_ = static_cast<Table**>(owned);
        return reference;
    }

    void reset() noexcept {
        if (self_ != nullptr) {
            Table** self = std::exchange(self_, nullptr);
            (*self)->Release(self);
        }
    }

    /// What each slot takes first.
    [[nodiscard]] void* self() const noexcept { return static_cast<void*>(self_); }
    /// The table; there must be a reference.
    const Table* operator->() const noexcept { return *self_; }
    explicit operator bool() const noexcept { return self_ != nullptr; }

private:
    Table** self_ = nullptr;
};

}  // namespace VexaTouch::Host
