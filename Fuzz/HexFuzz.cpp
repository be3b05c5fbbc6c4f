// Hexadecimal text reads as a formatted stream would read it, and bytes come back from their text.

#include "Fuzz/FuzzInput.h"
#include "Shared/Util.h"

#include <cstdint>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace {

using namespace VexaTouch;
using Fuzz::require;
using Bytes = std::vector<std::uint8_t>;

/// No value for a number of 256 or more.
std::optional<Bytes> byStream(std::string_view text) {
    std::istringstream stream{std::string(text)};
    Bytes bytes;
    std::uint16_t value = 0;
    while (stream >> std::hex >> value) {
        if (value >= 256) {
            return std::nullopt;
        }
        bytes.push_back(static_cast<std::uint8_t>(value));
    }
    return bytes;
}

std::optional<Bytes> byReader(std::string_view text) {
    try {
        return Util::bytesFromHexString(text);
    } catch (const std::invalid_argument& error) {
        require(error.what() == std::string_view("invalid hex string"), "the reader's one text");
        return std::nullopt;
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    require(byReader(text) == byStream(text), "as a stream reads it");
    const Bytes bytes(data, data + size);
    require(byReader(Util::hexStringFromBytes(bytes)) == bytes, "bytes come back");
    return 0;
}
