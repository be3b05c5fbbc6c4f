#pragma once

namespace VexaTouch::Testing {

/// The path of the program that was built with the tests.
const char* vexatouchProgram();

}  // namespace VexaTouch::Testing
