#pragma once

#include <rapidcheck.h>

#include <algorithm>
#include <iostream>
#include <string>
#include <utility>

namespace VexaTouch::Testing {

/// As rc::check, with this many rounds unless RC_PARAMS asks for more. On failure the seed and the
/// smallest case are printed; RC_PARAMS="seed=..." repeats it.
template <typename Property>
bool holds(const std::string& description, int rounds, Property&& property) {
    rc::detail::TestMetadata metadata;
    metadata.id = description;
    metadata.description = description;
    rc::detail::TestParams params = rc::detail::configuration().testParams;
    params.maxSuccess = std::max(params.maxSuccess, rounds);
    const auto result =
        rc::detail::checkTestable(std::forward<Property>(property), metadata, params);
    if (result.template is<rc::detail::SuccessResult>()) {
        return true;
    }
    std::cerr << description << ": ";
    rc::detail::printResultMessage(result, std::cerr);
    std::cerr << '\n';
    return false;
}

}  // namespace VexaTouch::Testing
