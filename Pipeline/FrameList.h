#pragma once

#include "Pipeline/RecordedFrame.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <iterator>
#include <list>
#include <memory>
#include <span>
#include <utility>
#include <vector>

namespace VexaTouch {

/// Recorded frames, oldest first, in a list whose copy costs next to nothing: frames lie in blocks,
/// and a copy shares the blocks, one atomic increment each.
///
/// A frame never changes once it is in a list. Appending writes behind the last frame that any copy
/// sees; a trim leaves blocks alone that others share. Lists are therefore as independent as if
/// each had frames of its own, also on different threads; one list needs one caller at a time, as
/// any container does. Iterators stay valid when frames are appended and are void after anything
/// else; a Pin holds a frame through everything.
class FrameList {
    struct Part;

public:
    static constexpr std::size_t kBlockFrames = 64;

    class Iterator;
    class Pin;
    using value_type = RecordedFrame;
    using reference = const RecordedFrame&;
    using const_reference = const RecordedFrame&;
    using iterator = Iterator;
    using const_iterator = Iterator;
    using reverse_iterator = std::reverse_iterator<Iterator>;
    using const_reverse_iterator = reverse_iterator;
    using difference_type = std::ptrdiff_t;
    using size_type = std::size_t;

    FrameList() noexcept = default;
    // From frames as one writes them down or edits them, implicitly.
    // NOLINTBEGIN(google-explicit-constructor)
    FrameList(std::initializer_list<RecordedFrame> frames);
    FrameList(const std::list<RecordedFrame>& frames);
    FrameList(std::list<RecordedFrame>&& frames);
    // NOLINTEND(google-explicit-constructor)

    FrameList(const FrameList& other) = default;
    FrameList& operator=(const FrameList& other);
    /// What is moved from is empty.
    FrameList(FrameList&& other) noexcept
        : parts_(std::move(other.parts_)), size_(std::exchange(other.size_, 0)) {}
    FrameList& operator=(FrameList&& other) noexcept;
    ~FrameList() = default;

    [[nodiscard]] std::size_t size() const noexcept { return size_; }
    [[nodiscard]] bool empty() const noexcept { return size_ == 0; }

    [[nodiscard]] Iterator begin() const noexcept;
    [[nodiscard]] Iterator end() const noexcept;
    [[nodiscard]] reverse_iterator rbegin() const noexcept;
    [[nodiscard]] reverse_iterator rend() const noexcept;
    /// Of a list that is not empty.
    [[nodiscard]] const RecordedFrame& front() const noexcept;
    [[nodiscard]] const RecordedFrame& back() const noexcept;

    void push_back(RecordedFrame&& frame);
    void push_back(const RecordedFrame& frame) { push_back(RecordedFrame(frame)); }
    /// Appends all frames of another list; blocks that are well filled change hands as they are.
    void append(FrameList&& frames);
    void clear() noexcept;

    /// Keeps the frames for which `keep` is true and erases the others. It is asked for each frame
    /// once, from the newest to the oldest, before any frame is moved.
    template <typename Keep>
    void retain(Keep&& keep);

    /// Holds the frame at `position`, which is not the end.
    [[nodiscard]] Pin pin(Iterator position) const noexcept;

    friend bool operator==(const FrameList& a, const FrameList& b);
    friend bool operator==(const FrameList& a, const std::list<RecordedFrame>& b);

private:
    /// Memory for a frame that may not be there yet.
    union Slot {
        Slot() noexcept {}
        ~Slot() {}
        Slot(const Slot&) = delete;
        Slot& operator=(const Slot&) = delete;

        RecordedFrame frame;
    };

    /// Frames are added to its end, by whichever list claims the next slot, and never change. Who
    /// looks at them knows their number by itself: `claimed` may grow at any time.
    struct Block {
        Block() noexcept = default;
        ~Block();
        Block(const Block&) = delete;
        Block& operator=(const Block&) = delete;

        std::atomic<std::uint32_t> references{1};
        std::atomic<std::uint32_t> claimed{0};
        std::array<Slot, kBlockFrames> slots;
    };

    /// A counted reference to a block. Unlike std::shared_ptr it can tell with certainty that it is
    /// the only one: the frames may then be moved from, since all that others did with them
    /// happened before.
    class BlockReference {
    public:
        BlockReference() noexcept = default;
        static BlockReference toNewBlock() { return BlockReference(new Block); }
        BlockReference(const BlockReference& other) noexcept : block_(other.block_) {
            if (block_ != nullptr) {
                block_->references.fetch_add(1, std::memory_order_relaxed);
            }
        }
        BlockReference(BlockReference&& other) noexcept
            : block_(std::exchange(other.block_, nullptr)) {}
        BlockReference& operator=(BlockReference other) noexcept {
            std::swap(block_, other.block_);
            return *this;
        }
        ~BlockReference() {
            if (block_ != nullptr &&
                block_->references.fetch_sub(1, std::memory_order_acq_rel) == 1) {
                delete block_;
            }
        }

        [[nodiscard]] bool isOnly() const noexcept {
            return block_->references.load(std::memory_order_acquire) == 1;
        }
        [[nodiscard]] RecordedFrame& frame(std::size_t index) const noexcept {
            return block_->slots[index].frame;
        }
        /// Adds a frame behind the first `count`, unless another list has done so.
        bool add(std::uint32_t count, RecordedFrame&& frame) const noexcept;

    private:
        explicit BlockReference(Block* block) noexcept : block_(block) {}

        Block* block_ = nullptr;
    };

    /// The first frames of a block, at least one.
    struct Part {
        BlockReference block;
        std::uint32_t count = 0;
    };

    /// Bit i stands for frame i of a part.
    using FrameSet = std::uint64_t;
    static_assert(kBlockFrames <= 64);

    void keepOnly(std::span<const FrameSet> kept);
    void take(Part&& part, FrameSet kept);

    std::vector<Part> parts_;
    std::size_t size_ = 0;
};

/// A place in a list: bidirectional, its frames cannot be changed.
class FrameList::Iterator {
public:
    using iterator_category = std::bidirectional_iterator_tag;
    using value_type = RecordedFrame;
    using difference_type = std::ptrdiff_t;
    using pointer = const RecordedFrame*;
    using reference = const RecordedFrame&;

    Iterator() noexcept = default;

    reference operator*() const noexcept { return list_->parts_[part_].block.frame(frame_); }
    pointer operator->() const noexcept { return &**this; }

    Iterator& operator++() noexcept {
        if (++frame_ == list_->parts_[part_].count) {
            ++part_;
            frame_ = 0;
        }
        return *this;
    }
    Iterator& operator--() noexcept {
        if (frame_ == 0) {
            frame_ = list_->parts_[--part_].count;
        }
        --frame_;
        return *this;
    }
    Iterator operator++(int) noexcept {
        const Iterator before = *this;
        ++*this;
        return before;
    }
    Iterator operator--(int) noexcept {
        const Iterator before = *this;
        --*this;
        return before;
    }

    friend bool operator==(const Iterator&, const Iterator&) = default;

private:
    friend class FrameList;
    Iterator(const FrameList& list, std::size_t part) noexcept : list_(&list), part_(part) {}

    const FrameList* list_ = nullptr;
    std::size_t part_ = 0;     // the number of parts at the end
    std::uint32_t frame_ = 0;  // in the part
};

/// Holds a frame as it is and where it is, whatever becomes of the list.
class FrameList::Pin {
public:
    const RecordedFrame& operator*() const noexcept { return *frame_; }
    const RecordedFrame* operator->() const noexcept { return frame_; }

private:
    friend class FrameList;
    Pin(BlockReference block, const RecordedFrame& frame) noexcept
        : block_(std::move(block)), frame_(&frame) {}

    BlockReference block_;
    const RecordedFrame* frame_;
};

inline FrameList::Iterator FrameList::begin() const noexcept {
    return {*this, 0};
}

inline FrameList::Iterator FrameList::end() const noexcept {
    return {*this, parts_.size()};
}

inline FrameList::reverse_iterator FrameList::rbegin() const noexcept {
    return reverse_iterator(end());
}

inline FrameList::reverse_iterator FrameList::rend() const noexcept {
    return reverse_iterator(begin());
}

inline const RecordedFrame& FrameList::front() const noexcept {
    return parts_.front().block.frame(0);
}

inline const RecordedFrame& FrameList::back() const noexcept {
    return parts_.back().block.frame(parts_.back().count - 1);
}

inline FrameList::Pin FrameList::pin(Iterator position) const noexcept {
    return {parts_[position.part_].block, *position};
}

template <typename Keep>
void FrameList::retain(Keep&& keep) {
    std::vector<FrameSet> kept(parts_.size());
    for (std::size_t part = parts_.size(); part-- > 0;) {
        for (std::uint32_t frame = parts_[part].count; frame-- > 0;) {
            if (keep(std::as_const(parts_[part].block.frame(frame)))) {
                kept[part] |= FrameSet{1} << frame;
            }
        }
    }
    keepOnly(kept);
}

}  // namespace VexaTouch
