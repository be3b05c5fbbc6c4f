#include "Platform/JsonValueBuilder.h"

#include <string>
#include <utility>
#include <variant>
#include <vector>

namespace Vexa {

PropertyValue JsonNumber::toPropertyValue() const {
    switch (kind) {
        case Kind::Signed:
            return signedValue;
        case Kind::Unsigned:
            return unsignedValue;
        case Kind::Double:
            break;
    }
    return doubleValue;
}

struct JsonValueBuilder::State {
    struct OpenObject {
        PropertyValue::Dictionary members;
        std::string key;  // of the member whose value comes next
    };
    using Container = std::variant<PropertyValue::Array, OpenObject>;

    std::vector<Container> open;
    std::string text;  // the pieces of a key or string so far
    PropertyValue root;

    void add(PropertyValue value) {
        if (open.empty()) {
            root = std::move(value);
        } else if (auto* array = std::get_if<PropertyValue::Array>(&open.back())) {
            array->push_back(std::move(value));
        } else {
            auto& object = std::get<OpenObject>(open.back());
            // Texts that we wrote come in order, so that the end is where most members belong.
            object.members.insert_or_assign(object.members.end(), std::move(object.key),
                                            std::move(value));
        }
    }

    /// The whole text once its last piece is there.
    std::string join(std::string_view lastPiece) {
        if (text.empty()) return std::string(lastPiece);
        text += lastPiece;
        return std::exchange(text, {});
    }
};

JsonValueBuilder::JsonValueBuilder() : state_(std::make_unique<State>()) {}
JsonValueBuilder::~JsonValueBuilder() = default;

void JsonValueBuilder::onObjectBegin() {
    state_->open.emplace_back(State::OpenObject());
}

void JsonValueBuilder::onObjectEnd() {
    PropertyValue value(std::move(std::get<State::OpenObject>(state_->open.back()).members));
    state_->open.pop_back();
    state_->add(std::move(value));
}

void JsonValueBuilder::onArrayBegin() {
    state_->open.emplace_back(PropertyValue::Array());
}

void JsonValueBuilder::onArrayEnd() {
    auto& elements = std::get<PropertyValue::Array>(state_->open.back());
    elements.shrink_to_fit();
    PropertyValue value(std::move(elements));
    state_->open.pop_back();
    state_->add(std::move(value));
}

void JsonValueBuilder::onKey(std::string_view piece, bool last) {
    if (last) {
        std::get<State::OpenObject>(state_->open.back()).key = state_->join(piece);
    } else {
        state_->text += piece;
    }
}

void JsonValueBuilder::onString(std::string_view piece, bool last) {
    if (last) {
        state_->add(state_->join(piece));
    } else {
        state_->text += piece;
    }
}

void JsonValueBuilder::onNumber(const JsonNumber& number) {
    state_->add(number.toPropertyValue());
}

void JsonValueBuilder::onBoolean(bool value) {
    state_->add(value);
}

void JsonValueBuilder::onNull() {
    state_->add(PropertyValue::null());
}

bool JsonValueBuilder::isComplete() const noexcept {
    return state_->open.empty() && state_->root;
}

PropertyValue JsonValueBuilder::take() {
    PropertyValue value;
    if (isComplete()) value = std::move(state_->root);
    *state_ = State();
    return value;
}

}  // namespace Vexa
