#include "Tools/Daemon/DaemonClient.h"

#include "Tools/Daemon/BusNames.h"
#include "Tools/Failure.h"
#include "Tools/OptionValues.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr const char* kBus = "org.freedesktop.DBus";
constexpr const char* kBusPath = "/org/freedesktop/DBus";
constexpr const char* kProperties = "org.freedesktop.DBus.Properties";

bool isNobodyThere(const std::string& name) {
    return name == "org.freedesktop.DBus.Error.ServiceUnknown" ||
           name == "org.freedesktop.DBus.Error.NameHasNoOwner";
}

std::string readAll(const FileDescriptor& file) {
    std::string text;
    std::array<char, 65'536> piece{};
    while (true) {
        const ssize_t got = ::read(file.get(), piece.data(), piece.size());
        if (got > 0) {
            text.append(piece.data(), static_cast<std::size_t>(got));
        } else if (got == 0) {
            return text;
        } else if (errno != EINTR) {
            throw Failure(std::string("the recording cannot be read: ") + std::strerror(errno));
        }
    }
}

unsigned numberOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    unsigned number = 0;
    std::from_chars(path.data() + slash + 1, path.data() + path.size(), number);
    return number;
}

}  // namespace

DaemonClient::DaemonClient(const std::string& bus, const std::string& otherwise) try
    : where_(bus), otherwise_(otherwise), bus_(bus) {
} catch (const Failure& error) {
    throw Failure(std::string("no daemon: ") + error.what() + "; start the bus, or " + otherwise);
}

std::unique_ptr<DaemonClient> DaemonClient::whereThereIsOne(const std::string& bus) {
    std::unique_ptr<DaemonClient> client;
    try {
        client = std::make_unique<DaemonClient>(bus);
    } catch (const Failure&) {
        return nullptr;
    }
    BusMessage call = client->bus_.call(kBus, kBusPath, kBus, "GetNameOwner");
    call.string(BusNames::kService);
    try {
        client->bus_.ask(call);
    } catch (const BusError& error) {
        if (isNobodyThere(error.name())) {
            return nullptr;
        }
        throw Failure(std::string(error.what()) + " (" + error.name() + ')');
    }
    return client;
}

BusMessage DaemonClient::ask(const BusMessage& call) {
    try {
        return bus_.ask(call);
    } catch (const BusError& error) {
        if (isNobodyThere(error.name())) {
            throw Failure("no daemon runs on the bus \"" + where_ +
                          "\": start it with systemctl start vexatouch or vexatouch daemon, or " +
                          otherwise_);
        }
        const std::string text = std::string(error.what()) + " (" + error.name() + ')';
        if (error.name() == ErrorName::kAccessDenied) {
            throw AccessDenied(text);
        }
        throw Failure(text);
    }
}

BusMessage DaemonClient::deviceCall(const std::string& path, const char* member) const {
    return bus_.call(BusNames::kService, path, BusNames::kDevice, member);
}

std::string DaemonClient::owner() {
    BusMessage call = bus_.call(kBus, kBusPath, kBus, "GetNameOwner");
    call.string(BusNames::kService);
    return ask(call).readString();
}

bool DaemonClient::readProperties(Device& device) {
    BusMessage call = bus_.call(BusNames::kService, device.path, kProperties, "GetAll");
    call.string(BusNames::kDevice);
    try {
        device.properties = bus_.ask(call).readDictionary();
        return true;
    } catch (const BusError& error) {
        if (error.name() == "org.freedesktop.DBus.Error.UnknownObject") {
            return false;
        }
        throw Failure(device.path + ": " + error.what() + " (" + error.name() + ')');
    }
}

std::vector<DaemonClient::Device> DaemonClient::devices() {
    BusMessage reply = ask(
        bus_.call(BusNames::kService, BusNames::kManagerPath, BusNames::kManager, "ListDevices"));
    std::vector<Device> devices;
    reply.enter('a', "o");
    while (!reply.atEnd()) {
        Device device;
        device.path = reply.readObjectPath();
        device.number = numberOf(device.path);
        devices.push_back(std::move(device));
    }
    std::erase_if(devices, [this](Device& device) { return !readProperties(device); });
    std::ranges::sort(devices, {}, &Device::number);
    return devices;
}

std::string DaemonClient::choose(const Arguments& arguments) {
    const auto wanted = numberOption(arguments, kSurfaceOption.name, 1, UINT32_MAX);
    if (wanted) {
        return BusNames::devicePath(static_cast<unsigned>(*wanted));
    }
    const std::vector<Device> all = devices();
    if (all.size() == 1) {
        return all.front().path;
    }
    if (all.empty()) {
        throw Failure("no surface is plugged in (the daemon runs and waits for one)");
    }
    std::string text = "there is more than one surface; name one with --surface:";
    for (const Device& device : all) {
        text += ' ' + std::to_string(device.number);
    }
    throw Failure(text);
}

Vexa::PropertyValue DaemonClient::get(const std::string& path, const std::string& key) {
    BusMessage call = deviceCall(path, "Get");
    call.text(key);
    return ask(call).readAnyValue();
}

Vexa::PropertyValue DaemonClient::find(const std::string& path, const std::string& key) {
    try {
        return get(path, key);
    } catch (const Failure&) {
        return {};
    }
}

Vexa::PropertyValue DaemonClient::set(const std::string& path, const std::string& key,
                                      const Vexa::PropertyValue& value) {
    BusMessage call = deviceCall(path, "Set");
    call.text(key);
    try {
        call.value(value);
    } catch (const BusError& error) {
        throw Failure(key + ": " + error.what() + " (" + error.name() + ')');
    }
    return ask(call).readAnyValue();
}

std::string DaemonClient::recording(const std::string& path) {
    return readAll(ask(deviceCall(path, "GetRecording")).readDescriptor());
}

FileDescriptor DaemonClient::recordStream(const std::string& path) {
    return ask(deviceCall(path, "RecordStream")).readDescriptor();
}

Vexa::PropertyValue DaemonClient::statistics(const std::string& path) {
    return ask(deviceCall(path, "GetStatistics")).readDictionary();
}

}  // namespace VexaTouch::Tools::Daemon
