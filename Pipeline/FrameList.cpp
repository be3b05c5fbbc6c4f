#include "Pipeline/FrameList.h"

#include <algorithm>
#include <bit>
#include <numeric>
#include <type_traits>

namespace VexaTouch {

// A claimed slot must come to hold a frame.
static_assert(std::is_nothrow_move_constructible_v<RecordedFrame>);

FrameList::Block::~Block() {
    // No list is left that could claim another one.
    for (std::uint32_t i = claimed.load(std::memory_order_relaxed); i-- > 0;) {
        std::destroy_at(&slots[i].frame);
    }
}

bool FrameList::BlockReference::add(std::uint32_t count, RecordedFrame&& frame) const noexcept {
    // Relaxed: a list sees no frame but those it added itself or was copied with.
    if (count == kBlockFrames ||
        !block_->claimed.compare_exchange_strong(count, count + 1, std::memory_order_relaxed)) {
        return false;
    }
    std::construct_at(&block_->slots[count].frame, std::move(frame));
    return true;
}

FrameList::FrameList(std::initializer_list<RecordedFrame> frames) {
    for (const RecordedFrame& frame : frames) {
        push_back(frame);
    }
}

FrameList::FrameList(const std::list<RecordedFrame>& frames) {
    for (const RecordedFrame& frame : frames) {
        push_back(frame);
    }
}

FrameList::FrameList(std::list<RecordedFrame>&& frames) {
    for (std::list<RecordedFrame> rest = std::move(frames); !rest.empty(); rest.pop_front()) {
        push_back(std::move(rest.front()));
    }
}

FrameList& FrameList::operator=(const FrameList& other) {
    return *this = FrameList(other);
}

FrameList& FrameList::operator=(FrameList&& other) noexcept {
    // By way of a third list, so that one that is moved to itself stays as it is.
    FrameList taken(std::move(other));
    parts_.swap(taken.parts_);
    std::swap(size_, taken.size_);
    return *this;
}

void FrameList::push_back(RecordedFrame&& frame) {
    if (parts_.empty() || !parts_.back().block.add(parts_.back().count, std::move(frame))) {
        // Behind a block that is full, or in which another list has gone on.
        parts_.push_back({.block = BlockReference::toNewBlock(), .count = 0});
        parts_.back().block.add(0, std::move(frame));  // NOLINT(bugprone-use-after-move)
    }
    ++parts_.back().count;
    ++size_;
}

void FrameList::append(FrameList&& frames) {
    FrameList taken(std::move(frames));
    for (Part& part : taken.parts_) {
        const FrameSet all = ~FrameSet{0} >> (kBlockFrames - part.count);
        take(std::move(part), all);
    }
}

void FrameList::clear() noexcept {
    *this = FrameList();
}

void FrameList::keepOnly(std::span<const FrameSet> kept) {
    const auto sum = [](std::size_t count, FrameSet frames) {
        return count + static_cast<std::size_t>(std::popcount(frames));
    };
    if (std::accumulate(kept.begin(), kept.end(), std::size_t{0}, sum) == size_) {
        return;
    }
    std::vector<Part> before = std::exchange(parts_, {});
    // A capped recording grows to as many parts again, or one more.
    parts_.reserve(before.size() + 1);
    size_ = 0;
    for (std::size_t i = 0; i < before.size(); ++i) {
        take(std::move(before[i]), kept[i]);
    }
}

/// Appends the frames of a part. A part that is kept whole stays in its block unless it fits behind
/// the frames of the last one: any two neighbours have more frames than one block could take, so
/// that few frames are never spread over many blocks.
void FrameList::take(Part&& part, FrameSet kept) {
    Part taken = std::move(part);
    const auto count = static_cast<std::uint32_t>(std::popcount(kept));
    const bool fits = !parts_.empty() && parts_.back().count + count <= kBlockFrames;
    if (count == taken.count && !fits) {
        parts_.push_back(std::move(taken));
        size_ += count;
        return;
    }
    const bool mayMove = taken.block.isOnly();
    for (; kept != 0; kept &= kept - 1) {
        RecordedFrame& frame = taken.block.frame(static_cast<std::size_t>(std::countr_zero(kept)));
        push_back(mayMove ? std::move(frame) : RecordedFrame(frame));
    }
}

bool operator==(const FrameList& a, const FrameList& b) {
    return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin());
}

bool operator==(const FrameList& a, const std::list<RecordedFrame>& b) {
    return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin());
}

}  // namespace VexaTouch
