#include "Tests/Tools/VexatouchProgram.h"

namespace VexaTouch::Testing {

const char* vexatouchProgram() {
    return VEXATOUCH_PROGRAM;
}

}  // namespace VexaTouch::Testing
