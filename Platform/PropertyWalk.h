#pragma once

#include "Platform/PropertyValue.h"

#include <cstddef>
#include <vector>

namespace Vexa::Detail {

/// Visits a value and all that it contains in the order of a text. The visitor has the operations
/// `beginArray(count)`, `endArray()`, `beginDictionary(count)`, `key(name)`, `endDictionary()` and
/// `leaf(value)`. Uses no recursion, so that any depth is fine; allocates only when it enters a
/// container.
template <class Visitor>
class PropertyWalk {
public:
    explicit PropertyWalk(Visitor& visitor) : visitor_(visitor) {}

    void walk(const PropertyValue& root) {
        enter(root);
        while (!open_.empty()) {
            Container& container = open_.back();
            if (container.array) {
                if (container.nextElement < container.array->size()) {
                    enter((*container.array)[container.nextElement++]);
                } else {
                    open_.pop_back();
                    visitor_.endArray();
                }
            } else if (container.nextMember != container.dictionary->end()) {
                const auto& [name, value] = *container.nextMember++;
                visitor_.key(name);
                enter(value);
            } else {
                open_.pop_back();
                visitor_.endDictionary();
            }
        }
    }

private:
    struct Container {
        const PropertyValue::Array* array = nullptr;
        std::size_t nextElement = 0;
        const PropertyValue::Dictionary* dictionary = nullptr;
        PropertyValue::Dictionary::const_iterator nextMember;
    };

    void enter(const PropertyValue& value) {
        if (const auto* array = value.asArray()) {
            visitor_.beginArray(array->size());
            open_.push_back({.array = array, .nextMember = {}});
        } else if (const auto* dictionary = value.asDictionary()) {
            visitor_.beginDictionary(dictionary->size());
            open_.push_back({.dictionary = dictionary, .nextMember = dictionary->begin()});
        } else {
            visitor_.leaf(value);
        }
    }

    Visitor& visitor_;
    std::vector<Container> open_;
};

}  // namespace Vexa::Detail
