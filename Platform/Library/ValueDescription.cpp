#include "Platform/Library/DescriptionText.h"
#include "Platform/Library/ValueNode.h"

#include <vexa/value.h>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Vexa::Library {

namespace {

/// Writes the readable text of a value. Uses no recursion, so that any depth is fine.
class Describer {
public:
    /// May throw std::bad_alloc.
    std::string describe(const vexa_value* root) {
        enter(root);
        while (!open_.empty()) {
            auto& [container, next] = open_.back();
            if (next == container->count) {
                close(container->type == VEXA_VALUE_ARRAY ? ']' : '}');
                open_.pop_back();
            } else if (container->type == VEXA_VALUE_ARRAY) {
                enter(as<ArrayValue>(*container).items()[next++]);
            } else {
                const vexa_member& member = as<DictionaryValue>(*container).items()[next++];
                key(keyOf(member));
                enter(member.value);
            }
        }
        return std::move(text_);
    }

private:
    struct OpenContainer {
        const ContainerValue* container;
        std::size_t next;
    };

    void enter(const vexa_value* value) {
        separate();
        switch (typeOf(value)) {
            case VEXA_VALUE_NONE:
                text_ += "no value";
                return;
            case VEXA_VALUE_NULL:
                text_ += "null";
                return;
            case VEXA_VALUE_BOOLEAN:
                text_ += as<BooleanValue>(*value).content ? "true" : "false";
                return;
            case VEXA_VALUE_SIGNED:
                text_ += std::to_string(as<SignedValue>(*value).content);
                return;
            case VEXA_VALUE_UNSIGNED:
                text_ += std::to_string(as<UnsignedValue>(*value).content);
                return;
            case VEXA_VALUE_FLOAT:
                return appendNumber(text_, as<FloatValue>(*value).content);
            case VEXA_VALUE_DOUBLE:
                return appendNumber(text_, as<DoubleValue>(*value).content);
            case VEXA_VALUE_STRING:
                return quoted(as<TextValue>(*value).text());
            case VEXA_VALUE_BYTES:
                return bytes(*value);
            case VEXA_VALUE_ARRAY:
                return open(*value, '[');
            case VEXA_VALUE_DICTIONARY:
                return open(*value, '{');
        }
    }

    void separate() {
        if (!isFirst_) text_ += ", ";
        isFirst_ = false;
    }

    void key(std::string_view name) {
        separate();
        quoted(name);
        text_ += ": ";
        isFirst_ = true;
    }

    void open(const vexa_value& container, char bracket) {
        text_ += bracket;
        isFirst_ = true;
        open_.push_back({&as<ContainerValue>(container), 0});
    }

    void close(char bracket) {
        text_ += bracket;
        isFirst_ = false;
    }

    void quoted(std::string_view content) {
        text_ += '"';
        for (const char character : content) {
            const auto code = static_cast<unsigned char>(character);
            if (character == '"' || character == '\\') {
                text_ += '\\';
                text_ += character;
            } else if (code < 0x20 || code == 0x7F) {
                text_ += "\\x";
                appendHexadecimalByte(text_, code);
            } else {
                text_ += character;
            }
        }
        text_ += '"';
    }

    void bytes(const vexa_value& value) {
        std::size_t length = 0;
        const std::uint8_t* content = vexa_value_get_bytes(&value, &length);
        appendBytes(text_, {content, length});
    }

    std::string text_;
    bool isFirst_ = true;
    std::vector<OpenContainer> open_;
};

}  // namespace

}  // namespace Vexa::Library

extern "C" vexa_value* vexa_value_create_description(const vexa_value* value) noexcept {
    try {
        const std::string text = Vexa::Library::Describer().describe(value);
        return vexa_value_create_string(text.data(), text.size());
    } catch (...) {
        return nullptr;
    }
}
