#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/CommandTable.h"
#include "Tools/Daemon/Bus.h"
#include "Tools/Failure.h"
#include "Tools/FileDescriptor.h"

#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// The daemon, or its bus, does not let the caller.
class AccessDenied : public Failure {
public:
    using Failure::Failure;
};

/// The command line's end of the daemon's interface. Each operation waits for the answer and throws
/// Failure with what was asked for, what was wrong and the error's name, AccessDenied where it is
/// that. One thread.
class DaemonClient {
public:
    struct Device {
        unsigned number = 0;
        std::string path;
        Vexa::PropertyValue properties;  ///< of its interface, by name
    };

    static constexpr const char* kOwnDeviceHint =
        "give the command a device of its own with --device sim";

    /// `otherwise` is what the command can do without a daemon, for messages. Throws Failure when
    /// the bus does not answer; so does each operation when the daemon does not.
    explicit DaemonClient(const std::string& bus, const std::string& otherwise = kOwnDeviceHint);
    /// Null when the bus cannot be reached, or no daemon is on it. Throws Failure when the bus
    /// fails otherwise.
    static std::unique_ptr<DaemonClient> whereThereIsOne(const std::string& bus);

    /// The unique name of the daemon's connection, which its signals come from.
    [[nodiscard]] std::string owner();
    /// By number.
    [[nodiscard]] std::vector<Device> devices();
    /// The object of the surface that --surface names, or of the only one there is.
    [[nodiscard]] std::string choose(const Arguments& arguments);

    [[nodiscard]] Vexa::PropertyValue get(const std::string& path, const std::string& key);
    /// The same; no value when the daemon gives none, whatever the reason.
    [[nodiscard]] Vexa::PropertyValue find(const std::string& path, const std::string& key);
    /// Gives what the property is afterwards.
    Vexa::PropertyValue set(const std::string& path, const std::string& key,
                            const Vexa::PropertyValue& value);
    /// The text of "Recording".
    [[nodiscard]] std::string recording(const std::string& path);
    /// Frames as FrameDecoder reads them, until the surface is gone.
    [[nodiscard]] FileDescriptor recordStream(const std::string& path);
    [[nodiscard]] Vexa::PropertyValue statistics(const std::string& path);

    [[nodiscard]] Bus& bus() noexcept { return bus_; }

private:
    /// False when it was unplugged meanwhile.
    bool readProperties(Device& device);
    [[nodiscard]] BusMessage deviceCall(const std::string& path, const char* member) const;
    BusMessage ask(const BusMessage& call);

    std::string where_;
    std::string otherwise_;
    Bus bus_;
};

/// Options of commands that talk to the daemon unless they are given a device of their own.
inline constexpr OptionEntry kSurfaceOption = {
    .name = "--surface",
    .valueName = "N",
    .help =
        "The daemon's surface with this number (vexatouch devices lists them); not needed when "
        "there is only one"};

}  // namespace VexaTouch::Tools::Daemon
