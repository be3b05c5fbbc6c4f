#pragma once

#include <vexa/value.h>
#include <cstddef>
#include <string_view>
#include <vector>

namespace Vexa::Detail {

/// Visits a value and all that it contains in the order of a text, without counting references: the
/// root outlives the walk. The visitor has the operations `beginArray(count)`, `endArray()`,
/// `beginDictionary(count)`, `key(name)`, `endDictionary()` and `leaf(value, type)`. Uses no
/// recursion, so that any depth is fine; allocates only when it enters a container.
template <class Visitor>
class PropertyWalk {
public:
    explicit PropertyWalk(Visitor& visitor) : visitor_(visitor) {}

    void walk(const vexa_value* root) {
        enter(root);
        while (!open_.empty()) {
            Container& container = open_.back();
            if (container.left == 0) {
                const bool isArray = container.element != nullptr;
                open_.pop_back();
                isArray ? visitor_.endArray() : visitor_.endDictionary();
                continue;
            }
            --container.left;
            if (container.element) {
                enter(*container.element++);
            } else {
                const vexa_member& member = *container.member++;
                visitor_.key(std::string_view(member.key, member.key_length));
                enter(member.value);
            }
        }
    }

private:
    struct Container {
        const vexa_value* const* element;  // the next one of an array
        const vexa_member* member;         // the next one of a dictionary
        std::size_t left;
    };

    void enter(const vexa_value* value) {
        const vexa_value_type type = vexa_value_get_type(value);
        std::size_t count = 0;
        if (type == VEXA_VALUE_ARRAY) {
            const vexa_value* const* elements = vexa_value_get_elements(value, &count);
            visitor_.beginArray(count);
            open_.push_back({elements, nullptr, count});
        } else if (type == VEXA_VALUE_DICTIONARY) {
            const vexa_member* members = vexa_value_get_members(value, &count);
            visitor_.beginDictionary(count);
            open_.push_back({nullptr, members, count});
        } else {
            visitor_.leaf(value, type);
        }
    }

    Visitor& visitor_;
    std::vector<Container> open_;
};

}  // namespace Vexa::Detail
