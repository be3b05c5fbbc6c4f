#include "Tools/EventDifference.h"

#include <algorithm>
#include <array>
#include <cinttypes>
#include <cstdio>
#include <vector>

namespace VexaTouch::Tools {
namespace {

/// Equal lines shown before and after each difference.
constexpr std::size_t kContext = 3;
/// Above so many cells the longest common part is not looked for, lines are paired in order.
constexpr std::size_t kMaxCells = 16'000'000;
constexpr const char* kHeading =
    "   index        time_ns  device_ms      frame kind           region phase   mask";

struct Row {
    const EventRecord* expected = nullptr;
    const EventRecord* actual = nullptr;
    bool same = false;
};

class Comparison {
public:
    Comparison(std::span<const EventRecord> expected, std::span<const EventRecord> actual)
        : expected_(expected), actual_(actual) {
        while (!expected_.empty() && !actual_.empty() && expected_.front() == actual_.front()) {
            rows_.push_back({&expected_.front(), &actual_.front(), true});
            expected_ = expected_.subspan(1);
            actual_ = actual_.subspan(1);
        }
        std::vector<Row> tail;
        while (!expected_.empty() && !actual_.empty() && expected_.back() == actual_.back()) {
            tail.push_back({&expected_.back(), &actual_.back(), true});
            expected_ = expected_.first(expected_.size() - 1);
            actual_ = actual_.first(actual_.size() - 1);
        }
        if ((expected_.size() + 1) * (actual_.size() + 1) <= kMaxCells) {
            alignMiddle();
        } else {
            pairUp(0, expected_.size(), 0, actual_.size());
        }
        rows_.insert(rows_.end(), tail.rbegin(), tail.rend());
    }

    [[nodiscard]] const std::vector<Row>& rows() const noexcept { return rows_; }

private:
    /// Lines up what both sides have in common, in the longest common order.
    void alignMiddle() {
        const std::size_t width = actual_.size() + 1;
        std::vector<std::uint32_t> common((expected_.size() + 1) * width, 0);
        for (std::size_t i = expected_.size(); i-- > 0;) {
            for (std::size_t j = actual_.size(); j-- > 0;) {
                common[i * width + j] =
                    expected_[i] == actual_[j]
                        ? common[(i + 1) * width + j + 1] + 1
                        : std::max(common[(i + 1) * width + j], common[i * width + j + 1]);
            }
        }
        std::size_t i = 0;
        std::size_t j = 0;
        std::size_t fromI = 0;
        std::size_t fromJ = 0;
        while (i < expected_.size() && j < actual_.size()) {
            if (expected_[i] == actual_[j]) {
                pairUp(fromI, i, fromJ, j);
                rows_.push_back({&expected_[i], &actual_[j], true});
                fromI = ++i;
                fromJ = ++j;
            } else if (common[(i + 1) * width + j] >= common[i * width + j + 1]) {
                ++i;
            } else {
                ++j;
            }
        }
        pairUp(fromI, expected_.size(), fromJ, actual_.size());
    }

    void pairUp(std::size_t i, std::size_t endI, std::size_t j, std::size_t endJ) {
        while (i < endI || j < endJ) {
            Row row;
            row.expected = i < endI ? &expected_[i++] : nullptr;
            row.actual = j < endJ ? &actual_[j++] : nullptr;
            row.same =
                row.expected != nullptr && row.actual != nullptr && *row.expected == *row.actual;
            rows_.push_back(row);
        }
    }

    std::span<const EventRecord> expected_;
    std::span<const EventRecord> actual_;
    std::vector<Row> rows_;
};

std::string columns(const EventRecord* event) {
    if (event == nullptr) {
        return {};
    }
    std::array<char, 128> text{};
    const std::string kind(eventKindName(event->kind));
    const int length = std::snprintf(text.data(), text.size(),
                                     "%8" PRIu64 " %14" PRIu64 " %10" PRIu32 " %10" PRIu32
                                     " %-14s %6" PRIu32 " %5" PRIu32 " %6" PRIu32,
                                     event->index, event->timeNs, event->deviceMs, event->frame,
                                     kind.c_str(), event->region, event->phase, event->mask);
    return {text.data(), static_cast<std::size_t>(length)};
}

void appendRow(std::string& text, std::string left, std::string_view mark,
               const std::string& right) {
    left.resize(std::max(left.size(), std::char_traits<char>::length(kHeading)), ' ');
    left += ' ';
    left += mark;
    if (!right.empty()) {
        left += ' ';
        left += right;
    }
    left.resize(left.find_last_not_of(' ') + 1);
    text += left;
    text += '\n';
}

std::string_view markOf(const Row& row) {
    if (row.same) {
        return " ";
    }
    if (row.expected == nullptr) {
        return ">";
    }
    return row.actual == nullptr ? "<" : "|";
}

}  // namespace

EventDifference compareEvents(std::span<const EventRecord> expected,
                              std::span<const EventRecord> actual) {
    const Comparison comparison(expected, actual);
    const std::vector<Row>& rows = comparison.rows();
    std::vector<bool> shown(rows.size(), false);
    EventDifference difference;
    for (std::size_t i = 0; i < rows.size(); ++i) {
        if (!rows[i].same) {
            ++difference.differences;
            const std::size_t end = std::min(rows.size(), i + kContext + 1);
            for (std::size_t near = i - std::min(i, kContext); near < end; ++near) {
                shown[near] = true;
            }
        }
    }
    if (difference.differences == 0) {
        return difference;
    }
    appendRow(difference.text, "expected", " ", "replayed");
    appendRow(difference.text, kHeading, " ", kHeading);
    for (std::size_t i = 0; i < rows.size(); ++i) {
        if (shown[i]) {
            appendRow(difference.text, columns(rows[i].expected), markOf(rows[i]),
                      columns(rows[i].actual));
        } else if (i == 0 || shown[i - 1]) {
            difference.text += "...\n";
        }
    }
    return difference;
}

}  // namespace VexaTouch::Tools
