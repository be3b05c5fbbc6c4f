#pragma once

#include "Platform/JsonHandler.h"

#include <memory>
#include <string_view>

namespace Vexa {

/// Builds one PropertyValue from handler calls; of duplicate members the last one stands. Feed it
/// the events of exactly one value, then take it. Not thread safe.
class JsonValueBuilder final : public JsonHandler {
public:
    JsonValueBuilder();
    ~JsonValueBuilder() override;
    JsonValueBuilder(const JsonValueBuilder&) = delete;
    JsonValueBuilder& operator=(const JsonValueBuilder&) = delete;

    // Each may throw std::bad_alloc.
    void onObjectBegin() override;
    void onObjectEnd() override;
    void onArrayBegin() override;
    void onArrayEnd() override;
    void onKey(std::string_view piece, bool last) override;
    void onString(std::string_view piece, bool last) override;
    void onNumber(const JsonNumber& number) override;
    void onBoolean(bool value) override;
    void onNull() override;

    /// True when a whole value is there to take.
    [[nodiscard]] bool isComplete() const noexcept;
    /// The value, or no value when it is not complete; the builder is then empty and may be used
    /// again.
    PropertyValue take();

private:
    struct State;
    std::unique_ptr<State> state_;
};

}  // namespace Vexa
