#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/FileDescriptor.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

struct sd_bus_message;

namespace VexaTouch::Tools::Daemon {

/// One message of the bus: a counted reference, copied by sharing. One thread.
///
/// Reads and writes go through the message in the order of its signature. Reading something else
/// than what is there, or past the end, throws BusError (InvalidArgs); so does writing what the bus
/// cannot carry (InvalidValue).
class BusMessage {
public:
    /// No message.
    BusMessage() noexcept = default;
    static BusMessage adopt(sd_bus_message* owned) noexcept;
    static BusMessage share(sd_bus_message* borrowed) noexcept;
    [[nodiscard]] sd_bus_message* get() const noexcept { return message_.get(); }
    explicit operator bool() const noexcept { return static_cast<bool>(message_); }

    /// The unique name of who sent it; empty without a bus between.
    [[nodiscard]] std::string sender() const;
    [[nodiscard]] std::string path() const;
    [[nodiscard]] std::string member() const;

    /// Keeps something as long as this message, and what is copied from it from now on, is kept.
    void hold(std::shared_ptr<const void> what) noexcept { held_ = std::move(what); }

    // Writing.
    BusMessage& boolean(bool value);
    BusMessage& number32(std::uint32_t value);
    BusMessage& number64(std::uint64_t value);
    BusMessage& real(double value);
    /// Throws for what is no UTF-8 or holds a zero byte.
    BusMessage& string(std::string_view value);
    /// The same with what the bus does not carry left out.
    BusMessage& text(std::string_view value);
    BusMessage& objectPath(const std::string& path);
    /// The descriptor is duplicated.
    BusMessage& descriptor(const FileDescriptor& value);
    /// As a variant; BusValue.h says which type becomes which.
    BusMessage& value(const Vexa::PropertyValue& value);
    /// As a{sv}; its keys must be texts.
    BusMessage& dictionary(const Vexa::PropertyValue& value);
    /// 'a', 'v', 'r' or 'e' and what is inside.
    BusMessage& open(char type, const char* contents);
    BusMessage& close();

    // Reading.
    bool readBoolean();
    std::uint32_t readNumber32();
    std::uint64_t readNumber64();
    std::string readString();
    /// A string of bounded length; throws BusError (UnknownKey) for a longer one.
    std::string readKey();
    std::string readObjectPath();
    /// A duplicate.
    FileDescriptor readDescriptor();
    /// A variant, of bounded size and depth (BusValue.h).
    Vexa::PropertyValue readValue();
    /// The same of any size, from somebody who is trusted; and one that is a{sv}, not a variant.
    Vexa::PropertyValue readAnyValue();
    Vexa::PropertyValue readDictionary();
    /// Enters a container; false when there is none any more (of an array).
    bool enter(char type, const char* contents);
    void leave();
    [[nodiscard]] bool atEnd();
    void skip(const char* types);

private:
    struct Release {
        void operator()(sd_bus_message* message) const noexcept;
    };
    void basic(char type, const void* value);
    void readBasic(char type, void* value);

    std::shared_ptr<sd_bus_message> message_;
    std::shared_ptr<const void> held_;
};

}  // namespace VexaTouch::Tools::Daemon
