#pragma once

namespace VexaTouch::Tools {

/// An interface reference as every slot takes it first.
template <typename Table>
void* selfOf(Table** reference) noexcept {
    return static_cast<void*>(reference);
}

}  // namespace VexaTouch::Tools
