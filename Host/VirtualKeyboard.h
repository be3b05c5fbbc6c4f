#pragma once

#include "Host/Keyboard.h"

#include <cstdint>
#include <memory>
#include <span>
#include <string>

struct libevdev_uinput;

namespace VexaTouch::Host {

/// A keyboard of the kernel's that this process types on, made through uinput. To the rest of the
/// system it is a keyboard like any other: it has a node /dev/input/eventN, and the kernel repeats
/// a key that stays down (after 250 ms, every 33 ms, unless its reader asks for something else).
///
/// It is gone, and its keys are up, when the object or the process ends, however that ends.
class VirtualKeyboard final : public Keyboard {
public:
    static constexpr const char* kNode = "/dev/uinput";

    /// What others know it by. Fixed, so that a desktop's rules for it stay valid.
    static constexpr const char* kName = "Vexa Touch media keys";
    static constexpr std::uint16_t kBus = 0x06;  ///< virtual
    static constexpr std::uint16_t kVendor = 0x5658;
    static constexpr std::uint16_t kProduct = 0x4D4B;
    static constexpr std::uint16_t kVersion = 1;

    /// Has these keys from now on and no others; `node` is that of uinput. Throws HostFailure,
    /// which says why there is no keyboard and what to do about it.
    explicit VirtualKeyboard(std::span<const KeyCode> keys, const std::string& node = kNode);
    ~VirtualKeyboard() override;

    [[nodiscard]] std::error_code press(KeyCode key) noexcept override;
    [[nodiscard]] std::error_code release(KeyCode key) noexcept override;
    [[nodiscard]] std::error_code synchronise() noexcept override;

    /// "/dev/input/event7"; empty when the system does not tell.
    [[nodiscard]] std::string eventNode() const;

private:
    /// An open descriptor.
    class Node {
    public:
        explicit Node(const std::string& path) noexcept;
        ~Node();
        Node(const Node&) = delete;
        Node(Node&&) = delete;
        Node& operator=(const Node&) = delete;
        Node& operator=(Node&&) = delete;
        /// -1, and errno says why, when it could not be opened.
        [[nodiscard]] int get() const noexcept { return descriptor_; }

    private:
        int descriptor_;
    };
    struct Destroy {
        void operator()(libevdev_uinput* device) const noexcept;
    };

    [[nodiscard]] std::error_code write(std::uint16_t type, std::uint16_t code, int value) noexcept;

    Node node_;  // outlives the device, which is taken back through it
    std::unique_ptr<libevdev_uinput, Destroy> device_;
};

}  // namespace VexaTouch::Host
