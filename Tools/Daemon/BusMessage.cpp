#include "Tools/Daemon/BusMessage.h"

#include "Tools/Daemon/BusError.h"
#include "Tools/Daemon/BusValue.h"

#include <fcntl.h>
#include <systemd/sd-bus.h>

#include <cerrno>
#include <cstring>

namespace VexaTouch::Tools::Daemon {
namespace {

void checkWritten(int result) {
    if (result < 0) {
        throw BusError(ErrorName::kInvalidValue,
                       std::string("the bus cannot carry this: ") + std::strerror(-result));
    }
}

void checkRead(int result) {
    if (result < 0) {
        throw BusError(
            SD_BUS_ERROR_INVALID_ARGS,
            std::string("the message does not hold what was expected: ") + std::strerror(-result));
    }
}

std::string textOf(const char* text) {
    return text == nullptr ? std::string() : std::string(text);
}

}  // namespace

void BusMessage::Release::operator()(sd_bus_message* message) const noexcept {
    sd_bus_message_unref(message);
}

BusMessage BusMessage::adopt(sd_bus_message* owned) noexcept {
    BusMessage message;
    message.message_ = std::shared_ptr<sd_bus_message>(owned, Release());
    return message;
}

BusMessage BusMessage::share(sd_bus_message* borrowed) noexcept {
    return adopt(sd_bus_message_ref(borrowed));
}

std::string BusMessage::sender() const {
    return textOf(sd_bus_message_get_sender(get()));
}

std::string BusMessage::path() const {
    return textOf(sd_bus_message_get_path(get()));
}

std::string BusMessage::member() const {
    return textOf(sd_bus_message_get_member(get()));
}

void BusMessage::basic(char type, const void* value) {
    checkWritten(sd_bus_message_append_basic(get(), type, value));
}

BusMessage& BusMessage::boolean(bool value) {
    const int truth = value ? 1 : 0;
    basic('b', &truth);
    return *this;
}

BusMessage& BusMessage::number32(std::uint32_t value) {
    basic('u', &value);
    return *this;
}

BusMessage& BusMessage::number64(std::uint64_t value) {
    basic('t', &value);
    return *this;
}

BusMessage& BusMessage::real(double value) {
    basic('d', &value);
    return *this;
}

BusMessage& BusMessage::string(std::string_view value) {
    if (value.find('\0') != std::string_view::npos) {
        throw BusError(ErrorName::kInvalidValue, "the bus carries no text with a zero byte");
    }
    basic('s', std::string(value).c_str());
    return *this;
}

BusMessage& BusMessage::text(std::string_view value) {
    std::string plain;
    for (const char each : value) {
        const auto byte = static_cast<unsigned char>(each);
        constexpr unsigned char kFirstBeyondAscii = 0x80;
        plain += byte == 0 || byte >= kFirstBeyondAscii ? '?' : each;
    }
    const bool isText = BusValue::isText(value);
    return string(isText ? value : std::string_view(plain));
}

BusMessage& BusMessage::objectPath(const std::string& path) {
    basic('o', path.c_str());
    return *this;
}

BusMessage& BusMessage::descriptor(const FileDescriptor& value) {
    const int number = value.get();
    basic('h', &number);
    return *this;
}

BusMessage& BusMessage::value(const Vexa::PropertyValue& value) {
    BusValue::append(get(), value);
    return *this;
}

BusMessage& BusMessage::dictionary(const Vexa::PropertyValue& value) {
    open('a', "{sv}");
    if (const auto members = value.asDictionary()) {
        for (const auto& [key, member] : *members) {
            open('e', "sv");
            string(key);
            this->value(member);
            close();
        }
    }
    return close();
}

BusMessage& BusMessage::open(char type, const char* contents) {
    checkWritten(sd_bus_message_open_container(get(), type, contents));
    return *this;
}

BusMessage& BusMessage::close() {
    checkWritten(sd_bus_message_close_container(get()));
    return *this;
}

void BusMessage::readBasic(char type, void* value) {
    const int result = sd_bus_message_read_basic(get(), type, value);
    checkRead(result == 0 ? -ENODATA : result);
}

bool BusMessage::readBoolean() {
    int truth = 0;
    readBasic('b', &truth);
    return truth != 0;
}

std::uint32_t BusMessage::readNumber32() {
    std::uint32_t value = 0;
    readBasic('u', &value);
    return value;
}

std::uint64_t BusMessage::readNumber64() {
    std::uint64_t value = 0;
    readBasic('t', &value);
    return value;
}

std::string BusMessage::readString() {
    const char* text = nullptr;
    readBasic('s', &text);
    return text;
}

std::string BusMessage::readKey() {
    const char* text = nullptr;
    readBasic('s', &text);
    constexpr std::size_t kLongest = 256;
    const std::size_t length = ::strnlen(text, kLongest + 1);
    if (length > kLongest) {
        throw BusError(ErrorName::kUnknownKey, "no key is as long as this one");
    }
    return {text, length};
}

std::string BusMessage::readObjectPath() {
    const char* text = nullptr;
    readBasic('o', &text);
    return text;
}

FileDescriptor BusMessage::readDescriptor() {
    int borrowed = -1;
    readBasic('h', &borrowed);
    FileDescriptor own(::fcntl(borrowed, F_DUPFD_CLOEXEC, 0));
    checkRead(own ? 0 : -errno);
    return own;
}

Vexa::PropertyValue BusMessage::readValue() {
    return BusValue::read(get());
}

Vexa::PropertyValue BusMessage::readAnyValue() {
    return BusValue::read(get(), BusValue::kNoLimit);
}

Vexa::PropertyValue BusMessage::readDictionary() {
    return BusValue::read(get(), BusValue::kNoLimit);
}

bool BusMessage::enter(char type, const char* contents) {
    const int result = sd_bus_message_enter_container(get(), type, contents);
    checkRead(result);
    return result > 0;
}

void BusMessage::leave() {
    checkRead(sd_bus_message_exit_container(get()));
}

bool BusMessage::atEnd() {
    const int result = sd_bus_message_at_end(get(), 0);
    checkRead(result);
    return result > 0;
}

void BusMessage::skip(const char* types) {
    checkRead(sd_bus_message_skip(get(), types));
}

}  // namespace VexaTouch::Tools::Daemon
