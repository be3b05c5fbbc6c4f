#pragma once

#include <concepts>
#include <optional>

namespace Vexa {

/// A view, or none. Like std::optional, but `*` gives a copy of the view, so that
/// `for (const auto element : *value.asArray())` does not go through one that has ended.
template <class View>
class OptionalView {
public:
    using value_type = View;

    OptionalView() noexcept = default;
    // As with std::optional, a view is one that is there.
    // NOLINTBEGIN(google-explicit-constructor)
    OptionalView(std::nullopt_t) noexcept {}
    OptionalView(View view) noexcept : view_(view) {}
    // NOLINTEND(google-explicit-constructor)

    [[nodiscard]] bool has_value() const noexcept { return view_.has_value(); }
    [[nodiscard]] explicit operator bool() const noexcept { return has_value(); }
    /// There must be one.
    [[nodiscard]] View operator*() const noexcept { return *view_; }
    const View* operator->() const noexcept { return &*view_; }
    /// Throws std::bad_optional_access when there is none.
    [[nodiscard]] View value() const { return view_.value(); }
    [[nodiscard]] View value_or(View other) const noexcept { return view_.value_or(other); }

    /// None and none, or equal views.
    friend bool operator==(const OptionalView&, const OptionalView&) = default;
    friend bool operator==(const OptionalView& optional, std::nullopt_t) noexcept {
        return !optional;
    }
    /// There is a view, and it is equal to the other.
    template <class Other>
        requires(!std::same_as<Other, OptionalView>)
    friend bool operator==(const OptionalView& optional, const Other& other) noexcept {
        return optional && *optional == other;
    }

private:
    std::optional<View> view_;
};

}  // namespace Vexa
