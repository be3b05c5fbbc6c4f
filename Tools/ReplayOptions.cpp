#include "Tools/ReplayOptions.h"

namespace VexaTouch::Tools {

void warnOfLostSetting(const Replay& replay, std::string_view command, std::string_view option,
                       Streams& streams) {
    if (const auto& lost = replay.lostSetting()) {
        streams.error << "vexatouch " << command << ": " << option << ' ' << lost->key
                      << " held until frame " << lost->index
                      << " only, in which the recording sets it; with " << kPinOption.name
                      << " it holds to the end\n";
    }
}

}  // namespace VexaTouch::Tools
