#include "Platform/JsonValueBuilder.h"

#include <vexa/value.h>
#include <cstddef>
#include <new>
#include <span>
#include <string>
#include <utility>
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
    struct Key {
        std::size_t begin;
        std::size_t length;
    };
    struct Container {
        std::size_t firstValue;
        std::size_t firstKey;
        std::size_t firstKeyText;
    };

    // Each holds what belongs to the open containers, the innermost one last.
    std::vector<Container> open;
    std::vector<PropertyValue> values;  // the root, once it is complete
    std::vector<Key> keys;              // of objects only, one for each value but the next
    std::string keyTexts;

    std::size_t keyBegin = 0;  // of the key whose pieces come in
    std::string text;          // the pieces of a string so far
    std::vector<vexa_member> members;

    void add(PropertyValue value) { values.push_back(std::move(value)); }

    void begin() { open.push_back({values.size(), keys.size(), keyTexts.size()}); }

    /// The values of the innermost container.
    [[nodiscard]] std::span<PropertyValue> innermost() {
        return std::span(values).subspan(open.back().firstValue);
    }

    /// The container takes the place of what it contains.
    void end(PropertyValue container) {
        const Container& ended = open.back();
        values.resize(ended.firstValue);
        keys.resize(ended.firstKey);
        keyTexts.resize(ended.firstKeyText);
        keyBegin = keyTexts.size();
        open.pop_back();
        add(std::move(container));
    }
};

JsonValueBuilder::JsonValueBuilder() : state_(std::make_unique<State>()) {}
JsonValueBuilder::~JsonValueBuilder() = default;

void JsonValueBuilder::onObjectBegin() {
    state_->begin();
}

void JsonValueBuilder::onObjectEnd() {
    std::vector<vexa_member>& members = state_->members;
    members.clear();
    const State::Key* key = state_->keys.data() + state_->open.back().firstKey;
    for (const PropertyValue& value : state_->innermost()) {
        members.push_back({state_->keyTexts.data() + key->begin, key->length, value.handle()});
        ++key;
    }
    PropertyValue object =
        PropertyValue::adopt(vexa_value_create_dictionary_of(members.data(), members.size()));
    if (!object) throw std::bad_alloc();
    state_->end(std::move(object));
}

void JsonValueBuilder::onArrayBegin() {
    state_->begin();
}

void JsonValueBuilder::onArrayEnd() {
    state_->end(PropertyValue::arrayOf(state_->innermost()));
}

void JsonValueBuilder::onKey(std::string_view piece, bool last) {
    state_->keyTexts += piece;
    if (!last) return;
    state_->keys.push_back({state_->keyBegin, state_->keyTexts.size() - state_->keyBegin});
    state_->keyBegin = state_->keyTexts.size();
}

void JsonValueBuilder::onString(std::string_view piece, bool last) {
    if (last && state_->text.empty()) return state_->add(piece);
    state_->text += piece;
    if (last) state_->add(std::exchange(state_->text, {}));
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
    return state_->open.empty() && !state_->values.empty();
}

PropertyValue JsonValueBuilder::take() {
    PropertyValue value;
    if (isComplete()) value = std::move(state_->values.back());
    *state_ = State();
    return value;
}

}  // namespace Vexa
