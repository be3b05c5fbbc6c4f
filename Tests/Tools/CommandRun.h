#pragma once

#include "Pipeline/ContainerWriter.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Tools/CommandLine.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <ostream>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

/// How tests run the program in their own process, on real files.
namespace VexaTouch::Testing {

struct CommandResult {
    int exitCode = 0;
    std::string out;
    std::string error;

    friend bool operator==(const CommandResult&, const CommandResult&) = default;
    friend std::ostream& operator<<(std::ostream& stream, const CommandResult& result) {
        return stream << "exit code " << result.exitCode << "\n--- out\n"
                      << result.out << "--- error\n"
                      << result.error;
    }
};

/// Runs vexatouch with these arguments; `input` is what it finds on standard input, `clock` what it
/// waits by, `patience` how long a service may leave reports alone.
inline CommandResult runCommand(const std::vector<std::string>& arguments,
                                const std::string& input = {},
                                Vexa::HostClock& clock = Vexa::HostClock::system(),
                                std::chrono::nanoseconds patience = std::chrono::minutes(1)) {
    std::istringstream in(input);
    std::ostringstream out;
    std::ostringstream error;
    Tools::Streams streams{
        .in = in, .out = out, .error = error, .clock = clock, .patience = patience};
    CommandResult result;
    result.exitCode = Tools::CommandLine::run(arguments, streams);
    result.out = out.str();
    result.error = error.str();
    return result;
}

/// The text with what differs from run to run (times, rates, memory) as #.
inline std::string withoutTimes(const std::string& text) {
    return std::regex_replace(
        text, std::regex("[0-9]+\\.[0-9]{3} s|[0-9]+ frames/s|memory [0-9.]+ MB"), "#");
}

/// A folder that is gone, with all in it, when the test ends.
class TemporaryFolder {
public:
    TemporaryFolder() {
        std::string name = std::filesystem::temp_directory_path() / "vexatouch-test-XXXXXX";
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("cannot make a temporary folder");
        }
        path_ = name;
    }
    ~TemporaryFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    [[nodiscard]] std::string path(std::string_view name) const { return path_ / name; }

    /// Makes a file and gives its path.
    [[nodiscard]] std::string file(std::string_view name, std::string_view content) const {
        std::ofstream stream(path_ / name, std::ios::binary);
        stream << content;
        return path(name);
    }

    /// The names in the folder, sorted.
    [[nodiscard]] std::vector<std::string> names() const {
        std::vector<std::string> all;
        for (const auto& entry : std::filesystem::directory_iterator(path_)) {
            all.push_back(entry.path().filename());
        }
        std::ranges::sort(all);
        return all;
    }

private:
    std::filesystem::path path_;
};

inline std::string contentOf(const std::string& path) {
    std::ifstream stream(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
}

inline std::vector<std::string> linesOf(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

/// The text of a container with these frames.
inline std::string containerText(const FrameList& frames) {
    std::string text;
    ContainerWriter writer([&text](std::string_view piece) { text += piece; });
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
    }
    writer.finish();
    return text;
}

}  // namespace VexaTouch::Testing
