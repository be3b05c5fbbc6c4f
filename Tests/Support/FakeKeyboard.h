#pragma once

#include "Host/KeyName.h"
#include "Host/Keyboard.h"
#include "Host/SharedKeyboard.h"

#include <cstddef>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <system_error>

namespace VexaTouch::Testing {

/// What has been typed on a fake keyboard. Outlives it.
struct TypedKeys {
    /// "+KEY_A " a press, "-KEY_A " a release, "| " what came before is seen by readers.
    std::string text;
    std::set<Host::KeyCode> down;
    /// Written behind the last "|": readers have not seen it.
    bool unseen = false;
    /// A press of what is down, a release of what is not: no keyboard of ours may do it.
    std::string wrong;
    /// How many writes succeed before every other one fails.
    std::optional<std::size_t> good;
    std::size_t writes = 0;
    bool gone = false;

    /// The text, which begins anew.
    std::string take() {
        std::string taken = text.empty() ? text : text.substr(0, text.size() - 1);
        text.clear();
        return taken;
    }
};

/// A keyboard that takes down what is typed, and like the kernel's lets go of every key when it
/// ends.
class FakeKeyboard final : public Host::Keyboard {
public:
    explicit FakeKeyboard(TypedKeys& typed) : typed_(typed) {}
    ~FakeKeyboard() override {
        typed_.down.clear();
        typed_.gone = true;
    }

    [[nodiscard]] std::error_code press(Host::KeyCode key) noexcept override {
        return write('+', key, [this, key] { return typed_.down.insert(key).second; });
    }
    [[nodiscard]] std::error_code release(Host::KeyCode key) noexcept override {
        return write('-', key, [this, key] { return typed_.down.erase(key) == 1; });
    }
    [[nodiscard]] std::error_code synchronise() noexcept override {
        if (fails()) {
            return std::make_error_code(std::errc::no_such_device);
        }
        typed_.text += "| ";
        typed_.unseen = false;
        return {};
    }

    /// One that surfaces can share.
    static std::unique_ptr<Host::SharedKeyboard> shared(TypedKeys& typed) {
        return std::make_unique<Host::SharedKeyboard>(std::make_unique<FakeKeyboard>(typed));
    }

private:
    bool fails() { return typed_.good && typed_.writes++ >= *typed_.good; }

    template <typename Change>
    std::error_code write(char sign, Host::KeyCode key, Change&& change) {
        if (fails()) {
            return std::make_error_code(std::errc::no_such_device);
        }
        const std::string stroke = sign + std::string(Host::keyName(key)) + ' ';
        typed_.text += stroke;
        typed_.unseen = true;
        if (!change()) {
            typed_.wrong += stroke;
        }
        return {};
    }

    TypedKeys& typed_;
};

}  // namespace VexaTouch::Testing
