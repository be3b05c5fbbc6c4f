#pragma once

#include <utility>

namespace Vexa {

/// A counted reference to an object of libvexaplatform, or none. Copying retains, destroying
/// releases; safe on any thread as long as one handle is not written by two at once.
template <typename Object, auto kRetain, auto kRelease>
class Handle {
public:
    Handle() noexcept = default;
    Handle(const Handle& other) noexcept : object_(retained(other.object_)) {}
    Handle(Handle&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    Handle& operator=(const Handle& other) noexcept {
        Handle(other).swap(*this);
        return *this;
    }
    Handle& operator=(Handle&& other) noexcept {
        Handle(std::move(other)).swap(*this);
        return *this;
    }
    ~Handle() {
        if (object_) kRelease(object_);
    }

    /// Takes over a reference that the caller owns.
    static Handle adopt(Object* owned) noexcept {
        Handle handle;
        handle.object_ = owned;
        return handle;
    }
    /// Takes a reference of its own.
    static Handle share(Object* borrowed) noexcept { return adopt(retained(borrowed)); }

    [[nodiscard]] Object* get() const noexcept { return object_; }
    /// Gives the reference to the caller and is empty afterwards.
    [[nodiscard]] Object* detach() noexcept { return std::exchange(object_, nullptr); }
    void reset() noexcept { Handle().swap(*this); }
    void swap(Handle& other) noexcept { std::swap(object_, other.object_); }

    explicit operator bool() const noexcept { return object_ != nullptr; }
    /// Same object.
    friend bool operator==(const Handle&, const Handle&) = default;

private:
    static Object* retained(Object* object) noexcept {
        if (object) kRetain(object);
        return object;
    }

    Object* object_ = nullptr;
};

}  // namespace Vexa
