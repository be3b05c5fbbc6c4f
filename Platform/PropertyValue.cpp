#include "Platform/PropertyValue.h"

#include "Platform/PropertyWalk.h"
#include "Platform/ShortestText.h"

#include <algorithm>
#include <atomic>
#include <bit>
#include <cmath>
#include <limits>
#include <memory>
#include <utility>

namespace Vexa {

using Type = PropertyValue::Type;

namespace Detail {

/// The head of every node; the content follows in a node of the type that `type` tells.
struct PropertyNode {
    constexpr explicit PropertyNode(Type nodeType) noexcept : type(nodeType) {}

    std::atomic<std::size_t> references = 1;
    const Type type;

    /// null, true and false are static and are not counted.
    [[nodiscard]] bool isCounted() const noexcept { return type > Type::Boolean; }

    static PropertyNode* retain(PropertyNode* node) noexcept {
        if (node && node->isCounted()) node->references.fetch_add(1, std::memory_order_relaxed);
        return node;
    }
    /// Frees the node and all that only it held, however deep.
    static void release(PropertyNode* node) noexcept;

    static const PropertyNode* of(const PropertyValue& value) noexcept { return value.node_; }
    static PropertyNode* take(PropertyValue& value) noexcept {
        return std::exchange(value.node_, nullptr);
    }

private:
    static bool dropReference(PropertyNode* node) noexcept {
        return node && node->isCounted() &&
               node->references.fetch_sub(1, std::memory_order_acq_rel) == 1;
    }
};

namespace {

struct BooleanNode : PropertyNode {
    constexpr explicit BooleanNode(bool value) noexcept
        : PropertyNode(Type::Boolean), content(value) {}
    bool content;
};

template <Type kType, class T>
struct Node final : PropertyNode {
    explicit Node(T value) noexcept : PropertyNode(kType), content(std::move(value)) {}
    T content;
};

/// A node that holds other values.
struct ContainerNode : PropertyNode {
    using PropertyNode::PropertyNode;
    /// The next one to free, once nobody refers to this one.
    ContainerNode* nextToFree = nullptr;
};

template <Type kType, class T>
struct ContainerNodeOf final : ContainerNode {
    explicit ContainerNodeOf(T value) noexcept : ContainerNode(kType), content(std::move(value)) {}
    T content;
};

using SignedNode = Node<Type::Signed, std::int64_t>;
using UnsignedNode = Node<Type::Unsigned, std::uint64_t>;
using FloatNode = Node<Type::Float, float>;
using DoubleNode = Node<Type::Double, double>;
using StringNode = Node<Type::String, std::string>;
using BytesNode = Node<Type::Bytes, PropertyValue::Bytes>;
using ArrayNode = ContainerNodeOf<Type::Array, PropertyValue::Array>;
using DictionaryNode = ContainerNodeOf<Type::Dictionary, PropertyValue::Dictionary>;

constinit PropertyNode nullNode(Type::Null);
constinit BooleanNode falseNode(false);
constinit BooleanNode trueNode(true);

/// The content of a node whose type is known.
template <class NodeType>
const auto& contentOf(const PropertyNode& node) noexcept {
    return static_cast<const NodeType&>(node).content;
}

template <class NodeType, class T>
PropertyNode* makeNode(T&& value) {
    return std::make_unique<NodeType>(std::forward<T>(value)).release();
}

template <class NodeType>
void freeNode(PropertyNode* node) noexcept {
    const std::unique_ptr<NodeType> owned(static_cast<NodeType*>(node));
}

void freeLeaf(PropertyNode* node) noexcept {
    switch (node->type) {
        case Type::Signed:
            return freeNode<SignedNode>(node);
        case Type::Unsigned:
            return freeNode<UnsignedNode>(node);
        case Type::Float:
            return freeNode<FloatNode>(node);
        case Type::Double:
            return freeNode<DoubleNode>(node);
        case Type::String:
            return freeNode<StringNode>(node);
        case Type::Bytes:
            return freeNode<BytesNode>(node);
        default:
            return;
    }
}

bool isContainer(const PropertyNode& node) noexcept {
    return node.type >= Type::Array;
}

}  // namespace

void PropertyNode::release(PropertyNode* root) noexcept {
    // Containers that are to be freed wait in a list that runs through themselves: neither the
    // stack nor the heap is needed, whatever the depth.
    ContainerNode* waiting = nullptr;
    const auto drop = [&waiting](PropertyNode* node) {
        if (!dropReference(node)) return;
        if (isContainer(*node)) {
            auto* container = static_cast<ContainerNode*>(node);
            container->nextToFree = std::exchange(waiting, container);
        } else {
            freeLeaf(node);
        }
    };

    drop(root);
    while (waiting) {
        ContainerNode* container = std::exchange(waiting, waiting->nextToFree);
        if (container->type == Type::Array) {
            const std::unique_ptr<ArrayNode> array(static_cast<ArrayNode*>(container));
            for (PropertyValue& element : array->content) drop(take(element));
        } else {
            const std::unique_ptr<DictionaryNode> dictionary(
                static_cast<DictionaryNode*>(container));
            for (auto& [name, value] : dictionary->content) drop(take(value));
        }
    }
}

}  // namespace Detail

using namespace Detail;

PropertyValue::PropertyValue(const PropertyValue& other) noexcept
    : node_(PropertyNode::retain(other.node_)) {}

// The old node goes last: it may be what holds the other value, or be the same one.
PropertyValue& PropertyValue::operator=(const PropertyValue& other) noexcept {
    PropertyValue next(other);
    std::swap(node_, next.node_);
    return *this;
}

PropertyValue& PropertyValue::operator=(PropertyValue&& other) noexcept {
    PropertyValue next(std::move(other));
    std::swap(node_, next.node_);
    return *this;
}

PropertyValue::~PropertyValue() {
    PropertyNode::release(node_);
}

PropertyValue PropertyValue::null() noexcept {
    return PropertyValue(&nullNode);
}

PropertyValue PropertyValue::fromBoolean(bool value) {
    return PropertyValue(static_cast<PropertyNode*>(value ? &trueNode : &falseNode));
}

PropertyValue PropertyValue::fromSigned(std::int64_t value) {
    return PropertyValue(makeNode<SignedNode>(value));
}

PropertyValue PropertyValue::fromUnsigned(std::uint64_t value) {
    return PropertyValue(makeNode<UnsignedNode>(value));
}

PropertyValue::PropertyValue(float value) : node_(makeNode<FloatNode>(value)) {}
PropertyValue::PropertyValue(double value) : node_(makeNode<DoubleNode>(value)) {}
PropertyValue::PropertyValue(const char* text) : PropertyValue(std::string(text)) {}
PropertyValue::PropertyValue(std::string_view text) : PropertyValue(std::string(text)) {}
PropertyValue::PropertyValue(std::string text) : node_(makeNode<StringNode>(std::move(text))) {}
PropertyValue::PropertyValue(Bytes bytes) : node_(makeNode<BytesNode>(std::move(bytes))) {}
PropertyValue::PropertyValue(Array elements) : node_(makeNode<ArrayNode>(std::move(elements))) {}
PropertyValue::PropertyValue(Dictionary members)
    : node_(makeNode<DictionaryNode>(std::move(members))) {}

PropertyValue::Type PropertyValue::type() const noexcept {
    return node_ ? node_->type : Type::None;
}

bool PropertyValue::isNumber() const noexcept {
    const Type mine = type();
    return mine >= Type::Signed && mine <= Type::Double;
}

namespace {

std::uint64_t unsignedFromDouble(double value) noexcept {
    constexpr double kTwoTo63 = 0x1p63;
    constexpr double kTwoTo64 = 0x1p64;
    if (std::isnan(value)) return 0;
    if (value >= kTwoTo64) return std::numeric_limits<std::uint64_t>::max();
    if (value >= 0) return static_cast<std::uint64_t>(value);
    const std::int64_t asSigned = value <= -kTwoTo63 ? std::numeric_limits<std::int64_t>::min()
                                                     : static_cast<std::int64_t>(value);
    return static_cast<std::uint64_t>(asSigned);
}

float floatFromDouble(double value) noexcept {
    // What rounds to beyond the largest float is stated, since the language leaves it undefined.
    constexpr double kRoundsToInfinity = 0x1.ffffffp127;
    constexpr float kLargest = std::numeric_limits<float>::max();
    const double magnitude = std::fabs(value);
    if (magnitude >= kRoundsToInfinity) {
        return std::copysign(std::numeric_limits<float>::infinity(), value < 0 ? -1.0f : 1.0f);
    }
    if (magnitude > static_cast<double>(kLargest)) return value < 0 ? -kLargest : kLargest;
    return static_cast<float>(value);
}

}  // namespace

bool PropertyValue::toBoolean() const noexcept {
    switch (type()) {
        case Type::Boolean:
            return contentOf<BooleanNode>(*node_);
        case Type::Signed:
            return contentOf<SignedNode>(*node_) != 0;
        case Type::Unsigned:
            return contentOf<UnsignedNode>(*node_) != 0;
        case Type::Float:
            return contentOf<FloatNode>(*node_) != 0;
        case Type::Double:
            return contentOf<DoubleNode>(*node_) != 0;
        default:
            return false;
    }
}

std::uint64_t PropertyValue::toUnsigned64() const noexcept {
    switch (type()) {
        case Type::Boolean:
            return contentOf<BooleanNode>(*node_) ? 1 : 0;
        case Type::Signed:
            return static_cast<std::uint64_t>(contentOf<SignedNode>(*node_));
        case Type::Unsigned:
            return contentOf<UnsignedNode>(*node_);
        case Type::Float:
            return unsignedFromDouble(static_cast<double>(contentOf<FloatNode>(*node_)));
        case Type::Double:
            return unsignedFromDouble(contentOf<DoubleNode>(*node_));
        default:
            return 0;
    }
}

float PropertyValue::toFloat() const noexcept {
    switch (type()) {
        case Type::Boolean:
            return contentOf<BooleanNode>(*node_) ? 1.0f : 0.0f;
        case Type::Signed:
            return static_cast<float>(contentOf<SignedNode>(*node_));
        case Type::Unsigned:
            return static_cast<float>(contentOf<UnsignedNode>(*node_));
        case Type::Float:
            return contentOf<FloatNode>(*node_);
        case Type::Double:
            return floatFromDouble(contentOf<DoubleNode>(*node_));
        default:
            return 0.0f;
    }
}

double PropertyValue::toDouble() const noexcept {
    switch (type()) {
        case Type::Boolean:
            return contentOf<BooleanNode>(*node_) ? 1.0 : 0.0;
        case Type::Signed:
            return static_cast<double>(contentOf<SignedNode>(*node_));
        case Type::Unsigned:
            return static_cast<double>(contentOf<UnsignedNode>(*node_));
        case Type::Float:
            return static_cast<double>(contentOf<FloatNode>(*node_));
        case Type::Double:
            return contentOf<DoubleNode>(*node_);
        default:
            return 0.0;
    }
}

const std::string* PropertyValue::asString() const noexcept {
    return type() == Type::String ? &contentOf<StringNode>(*node_) : nullptr;
}

const PropertyValue::Bytes* PropertyValue::asBytes() const noexcept {
    return type() == Type::Bytes ? &contentOf<BytesNode>(*node_) : nullptr;
}

const PropertyValue::Array* PropertyValue::asArray() const noexcept {
    return type() == Type::Array ? &contentOf<ArrayNode>(*node_) : nullptr;
}

const PropertyValue::Dictionary* PropertyValue::asDictionary() const noexcept {
    return type() == Type::Dictionary ? &contentOf<DictionaryNode>(*node_) : nullptr;
}

const std::int64_t* PropertyValue::asSigned() const noexcept {
    return type() == Type::Signed ? &contentOf<SignedNode>(*node_) : nullptr;
}

const std::uint64_t* PropertyValue::asUnsigned() const noexcept {
    return type() == Type::Unsigned ? &contentOf<UnsignedNode>(*node_) : nullptr;
}

PropertyValue PropertyValue::member(std::string_view key) const noexcept {
    const Dictionary* members = asDictionary();
    if (!members) return {};
    const auto found = members->find(key);
    return found == members->end() ? PropertyValue() : found->second;
}

namespace {

bool sameDouble(double a, double b) noexcept {
    if (std::isnan(a) || std::isnan(b)) return std::isnan(a) && std::isnan(b);
    return std::bit_cast<std::uint64_t>(a) == std::bit_cast<std::uint64_t>(b);
}

/// Integers, floating-point numbers and everything else: values of two kinds are never equal.
int kindOf(Type type) noexcept {
    switch (type) {
        case Type::Unsigned:
            return static_cast<int>(Type::Signed);
        case Type::Float:
            return static_cast<int>(Type::Double);
        default:
            return static_cast<int>(type);
    }
}

/// Compares values in a recursion of bounded depth; what lies deeper waits for another round.
class Comparison {
public:
    bool areEqual(const PropertyValue& a, const PropertyValue& b) {
        if (!compare(a, b, kMaxDepth)) return false;
        while (!deferred_.empty()) {
            const auto [first, second] = deferred_.back();
            deferred_.pop_back();
            if (!compare(*first, *second, kMaxDepth)) return false;
        }
        return true;
    }

private:
    static constexpr int kMaxDepth = 128;

    bool compare(const PropertyValue& a, const PropertyValue& b, int depthLeft) {
        if (PropertyNode::of(a) == PropertyNode::of(b)) return true;
        if (kindOf(a.type()) != kindOf(b.type())) return false;
        switch (a.type()) {
            case Type::None:
            case Type::Null:
            case Type::Boolean:
                return false;  // one node for each value, and these are not the same
            case Type::Signed:
            case Type::Unsigned:
                return areIntegersEqual(a, b);
            case Type::Float:
            case Type::Double:
                return sameDouble(a.toDouble(), b.toDouble());
            case Type::String:
                return *a.asString() == *b.asString();
            case Type::Bytes:
                return *a.asBytes() == *b.asBytes();
            case Type::Array:
            case Type::Dictionary:
                break;
        }
        if (depthLeft == 0) {
            deferred_.emplace_back(&a, &b);
            return true;
        }
        if (a.type() == Type::Array) return compareArrays(*a.asArray(), *b.asArray(), depthLeft);
        return compareDictionaries(*a.asDictionary(), *b.asDictionary(), depthLeft);
    }

    static bool areIntegersEqual(const PropertyValue& a, const PropertyValue& b) {
        // Two that differ in sign type are equal only where both types have the value.
        const auto isNegative = [](const PropertyValue& value) {
            const std::int64_t* content = value.asSigned();
            return content && *content < 0;
        };
        return isNegative(a) == isNegative(b) && a.toUnsigned64() == b.toUnsigned64();
    }

    bool compareArrays(const PropertyValue::Array& a, const PropertyValue::Array& b,
                       int depthLeft) {
        return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                          [&](const PropertyValue& first, const PropertyValue& second) {
                              return compare(first, second, depthLeft - 1);
                          });
    }

    bool compareDictionaries(const PropertyValue::Dictionary& a, const PropertyValue::Dictionary& b,
                             int depthLeft) {
        if (a.size() != b.size()) return false;
        return std::equal(a.begin(), a.end(), b.begin(),
                          [&](const auto& first, const auto& second) {
                              return first.first == second.first &&
                                     compare(first.second, second.second, depthLeft - 1);
                          });
    }

    std::vector<std::pair<const PropertyValue*, const PropertyValue*>> deferred_;
};

/// Writes the readable text as it is walked through a value.
class Describer {
public:
    void beginArray(std::size_t /*count*/) { open('['); }
    void endArray() { close(']'); }
    void beginDictionary(std::size_t /*count*/) { open('{'); }
    void endDictionary() { close('}'); }

    void key(const std::string& name) {
        separate();
        quoted(name);
        text_ += ": ";
        isFirst_ = true;
    }

    void leaf(const PropertyValue& value) {
        separate();
        switch (value.type()) {
            case Type::Boolean:
                text_ += value.toBoolean() ? "true" : "false";
                break;
            case Type::Signed:
                text_ += std::to_string(*value.asSigned());
                break;
            case Type::Unsigned:
                text_ += std::to_string(*value.asUnsigned());
                break;
            case Type::Float:
                appendShortest(text_, value.toFloat());
                break;
            case Type::Double:
                appendShortest(text_, value.toDouble());
                break;
            case Type::String:
                quoted(*value.asString());
                break;
            case Type::Bytes:
                hexadecimal(*value.asBytes());
                break;
            case Type::Null:
                text_ += "null";
                break;
            default:
                text_ += "no value";
                break;
        }
    }

    std::string take() { return std::move(text_); }

private:
    static constexpr std::string_view kDigits = "0123456789abcdef";

    void separate() {
        if (!isFirst_) text_ += ", ";
        isFirst_ = false;
    }

    void open(char bracket) {
        separate();
        text_ += bracket;
        isFirst_ = true;
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
                byte(code);
            } else {
                text_ += character;
            }
        }
        text_ += '"';
    }

    void hexadecimal(const PropertyValue::Bytes& bytes) {
        text_ += '<';
        for (const std::uint8_t value : bytes) byte(value);
        text_ += '>';
    }

    void byte(unsigned value) {
        text_ += kDigits[value >> 4];
        text_ += kDigits[value & 15];
    }

    std::string text_;
    bool isFirst_ = true;
};

}  // namespace

bool operator==(const PropertyValue& a, const PropertyValue& b) noexcept {
    return Comparison().areEqual(a, b);
}

std::string PropertyValue::description() const {
    Describer describer;
    PropertyWalk(describer).walk(*this);
    return describer.take();
}

}  // namespace Vexa
