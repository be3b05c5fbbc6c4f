#include "Host/PluginPlaces.h"

#include "Host/HostFailure.h"

#include <algorithm>
#include <cstdlib>
#include <string>
#include <string_view>
#include <system_error>

namespace VexaTouch::Host {
namespace {

namespace fs = std::filesystem;

constexpr const char* kVariable = "VEXATOUCH_PLUGIN";
constexpr std::string_view kFile = "libVexaTouchHIDService.so";
constexpr std::string_view kFolder = "vexatouch";

/// The library folders of a prefix: lib and lib64, and the folders of lib that are named after a
/// machine ("x86_64-linux-gnu"), sorted.
std::vector<fs::path> libraryFolders(const fs::path& prefix) {
    std::vector<fs::path> machines;
    std::error_code error;
    for (fs::directory_iterator each(prefix / "lib", error), end; !error && each != end;
         each.increment(error)) {
        const std::string name = each->path().filename();
        if (name.find("-linux-") != std::string::npos) {
            machines.push_back(each->path());
        }
    }
    std::ranges::sort(machines);
    std::vector<fs::path> folders = {prefix / "lib", prefix / "lib64"};
    folders.insert(folders.end(), machines.begin(), machines.end());
    return folders;
}

bool isFile(const fs::path& path) {
    std::error_code error;
    return fs::exists(path, error) && !fs::is_directory(path, error);
}

}  // namespace

PluginPlaces PluginPlaces::of(const fs::path& program, const std::optional<fs::path>& named) {
    PluginPlaces places;
    if (named && !named->empty()) {
        // dlopen() searches the system's folders for a bare name, but this names a file.
        places.files.push_back(fs::absolute(*named));
        places.overridden = true;
        return places;
    }
    const fs::path folder = program.parent_path();
    places.files.push_back(folder / kFile);
    for (const fs::path& libraries : libraryFolders(folder.parent_path())) {
        places.files.push_back(libraries / kFolder / kFile);
    }
    return places;
}

PluginPlaces PluginPlaces::ofThisProgram() {
    std::error_code error;
    const fs::path program = fs::read_symlink("/proc/self/exe", error);
    const char* named = std::getenv(kVariable);
    return of(error ? fs::current_path() / "program" : program,
              named != nullptr ? std::optional<fs::path>(named) : std::nullopt);
}

fs::path PluginPlaces::find() const {
    const auto found = std::ranges::find_if(files, isFile);
    if (found != files.end()) {
        return *found;
    }
    if (overridden) {
        throw HostFailure("there is no plug-in at " + files.front().string() + ", which " +
                          kVariable + " names");
    }
    std::string text = "no plug-in found at";
    for (const fs::path& file : files) {
        text += (file == files.front() ? " " : ", ") + file.string();
    }
    throw HostFailure(text + "; " + kVariable + " names another place");
}

}  // namespace VexaTouch::Host
