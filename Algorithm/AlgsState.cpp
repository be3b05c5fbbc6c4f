#include "Algorithm/Algs.h"
#include "Algorithm/StateKeys.h"
#include "Shared/Util.h"

#include <locale>
#include <optional>
#include <sstream>

namespace VexaTouch {

namespace {

/// The index behind the factors' domain, or nothing when the key is of another domain. What does
/// not read as a number is index 0; negative and overflowing numbers are beyond every list.
std::optional<std::uint64_t> factorIndex(const std::string& key) {
    std::string remainder = key;
    if (!Util::stripDomainFromKey(remainder, std::string(StateKey::VirtualNormalizationFactors))) {
        return std::nullopt;
    }
    std::istringstream stream(remainder);
    stream.imbue(std::locale::classic());
    std::int64_t index = 0;
    stream >> index;  // gives 0 when there is no number, the nearest limit when it overflows
    return static_cast<std::uint64_t>(index);
}

}  // namespace

Vexa::PropertyValue Algs::getState(const std::string& key) const {
    if (key == StateKey::EnableHoldSuppression) {
        return _handStats._enableHoldSuppression;
    }
    if (key == StateKey::EnableTapSuppression) {
        return _handStats._enableTapSuppression;
    }
    if (key == StateKey::HoldTimeoutMilliseconds) {
        return _handStats._hold_timeout_ms;
    }
    if (key == StateKey::ActivationThreshold) {
        return _handStats._activationThreshold;
    }
    if (const auto index = factorIndex(key)) {
        const auto& factors = _virtual_image._normalizationFactors;
        return *index < factors.size() ? Vexa::PropertyValue(factors[*index])
                                       : Vexa::PropertyValue();
    }
    if (key == StateKey::EventStats) {
        return _EventStats.statsDictionary();
    }
    if (key == StateKey::DebugInfo) {
        return Vexa::PropertyValue::Dictionary{
            {std::string(StateKey::EventStats), _EventStats.statsDictionary()}};
    }
    return {};
}

void Algs::setState(const std::string& key, const Vexa::PropertyValue& value) {
    if (key == StateKey::EnableHoldSuppression) {
        _handStats._enableHoldSuppression = value.toBoolean();
    } else if (key == StateKey::EnableTapSuppression) {
        _handStats._enableTapSuppression = value.toBoolean();
    } else if (key == StateKey::ResetEventStats) {
        _EventStats.Reset();
    } else if (key == StateKey::ActivationThreshold) {
        _handStats._activationThreshold = value.toFloat();
    } else if (const auto index = factorIndex(key)) {
        auto& factors = _virtual_image._normalizationFactors;
        if (*index < factors.size()) {
            factors[*index] = value.toFloat();
        }
    } else if (key == StateKey::HoldTimeoutMilliseconds) {
        // The high half is dropped.
        _handStats._hold_timeout_ms = static_cast<std::uint32_t>(value.toUnsigned64());
    }
}

}  // namespace VexaTouch
