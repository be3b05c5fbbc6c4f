#include "Pipeline/FrameList.h"

#include "Pipeline/TrimRule.h"
#include "Tests/Support/RecordingFrames.h"
#include "Tests/Support/SeededRandom.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <list>
#include <mutex>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace Testing;

static_assert(std::bidirectional_iterator<FrameList::Iterator>);
static_assert(std::is_nothrow_move_constructible_v<FrameList>);
static_assert(std::is_nothrow_move_assignable_v<FrameList>);

constexpr std::size_t kBlock = FrameList::kBlockFrames;

/// A report that is told from all others by its time.
RecordedFrame numbered(std::uint64_t number) {
    return reportFrame(number, {static_cast<std::uint8_t>(number), 7});
}

FrameList numberedFrom(std::uint64_t first, std::size_t count) {
    FrameList frames;
    for (std::size_t i = 0; i < count; ++i) {
        frames.push_back(numbered(first + i));
    }
    return frames;
}

std::vector<std::uint64_t> numbersOf(const FrameList& frames) {
    std::vector<std::uint64_t> numbers;
    for (const RecordedFrame& frame : frames) {
        EXPECT_EQ(frame, numbered(frame.timestamp));
        numbers.push_back(frame.timestamp);
    }
    return numbers;
}

std::vector<std::uint64_t> range(std::uint64_t first, std::size_t count) {
    std::vector<std::uint64_t> numbers(count);
    std::ranges::generate(numbers, [&] { return first++; });
    return numbers;
}

void keepNewest(FrameList& frames, std::size_t count) {
    frames.retain(TrimRule(count));
}

const RecordedFrame& at(const FrameList& frames, std::size_t index) {
    return *std::next(frames.begin(), static_cast<std::ptrdiff_t>(index));
}

TEST(FrameListTest, BeginsEmpty) {
    const FrameList frames;
    EXPECT_TRUE(frames.empty());
    EXPECT_EQ(frames.size(), 0U);
    EXPECT_EQ(frames.begin(), frames.end());
    EXPECT_EQ(frames.rbegin(), frames.rend());
    EXPECT_EQ(frames, FrameList());
}

TEST(FrameListTest, KeepsFramesInTheirOrderAcrossBlocks) {
    for (const std::size_t count :
         {std::size_t{1}, kBlock - 1, kBlock, kBlock + 1, 2 * kBlock, std::size_t{1000}}) {
        const FrameList frames = numberedFrom(5, count);
        EXPECT_FALSE(frames.empty());
        EXPECT_EQ(frames.size(), count);
        EXPECT_EQ(frames.front(), numbered(5));
        EXPECT_EQ(frames.back(), numbered(4 + count));
        std::vector<std::uint64_t> expected = range(5, count);
        EXPECT_EQ(numbersOf(frames), expected);
        std::vector<std::uint64_t> backwards;
        std::transform(frames.rbegin(), frames.rend(), std::back_inserter(backwards),
                       [](const RecordedFrame& frame) { return frame.timestamp; });
        std::ranges::reverse(expected);
        EXPECT_EQ(backwards, expected);
    }
}

TEST(FrameListTest, IteratorsStepBothWays) {
    const FrameList frames = numberedFrom(0, kBlock + 2);
    auto place = std::next(frames.begin(), kBlock - 1);
    EXPECT_EQ((place++)->timestamp, kBlock - 1);
    EXPECT_EQ(place->timestamp, kBlock);
    EXPECT_EQ((place--)->timestamp, kBlock);
    EXPECT_EQ(place->timestamp, kBlock - 1);
    EXPECT_EQ(std::distance(frames.begin(), place), static_cast<std::ptrdiff_t>(kBlock - 1));
    EXPECT_EQ(std::prev(frames.end())->timestamp, kBlock + 1);
}

TEST(FrameListTest, IteratorsAndFramesStayWhereTheyAreWhenFramesAreAppended) {
    FrameList frames = numberedFrom(0, 1);
    const auto first = frames.begin();
    const RecordedFrame* const address = &frames.front();
    for (std::size_t i = 1; i < 20 * kBlock; ++i) {
        frames.push_back(numbered(i));
    }
    EXPECT_EQ(first, frames.begin());
    EXPECT_EQ(&*first, address);
    EXPECT_EQ(std::next(first, 700)->timestamp, 700U);
}

TEST(FrameListTest, IsMadeFromFramesAsTheyAreWrittenDown) {
    const std::list<RecordedFrame> written = {numbered(1), stateFrame(2, "a", 3), numbered(4)};
    const FrameList copied = written;
    EXPECT_EQ(copied, written);
    EXPECT_EQ(copied, (FrameList{numbered(1), stateFrame(2, "a", 3), numbered(4)}));
    std::list<RecordedFrame> spent = written;
    const std::uint8_t* const bytes = spent.front().report.data();
    const FrameList moved = std::move(spent);
    EXPECT_EQ(moved, written);
    EXPECT_EQ(moved.front().report.data(), bytes);
}

TEST(FrameListTest, IsEqualWhenAllFramesAre) {
    const FrameList frames = numberedFrom(0, 100);
    EXPECT_EQ(frames, numberedFrom(0, 100));
    EXPECT_NE(frames, numberedFrom(0, 99));
    EXPECT_NE(frames, numberedFrom(0, 101));
    EXPECT_NE(frames, numberedFrom(1, 100));
    // However they lie in blocks.
    FrameList trimmed = numberedFrom(0, 190);
    trimmed.retain([](const RecordedFrame& frame) { return frame.timestamp < 100; });
    FrameList late = numberedFrom(0, 150);
    late.retain([](const RecordedFrame& frame) { return frame.timestamp < 40; });
    late.append(numberedFrom(40, 60));
    EXPECT_EQ(frames, trimmed);
    EXPECT_EQ(frames, late);
}

// Copies.

TEST(FrameListCopyTest, SharesTheFrames) {
    const FrameList frames = numberedFrom(0, 100);
    const FrameList copy = frames;
    EXPECT_EQ(copy, frames);
    EXPECT_EQ(&copy.front(), &frames.front());
    EXPECT_EQ(&copy.back(), &frames.back());
}

TEST(FrameListCopyTest, DoesNotSeeWhatIsAppendedToTheOriginal) {
    for (const std::size_t count :
         {std::size_t{0}, std::size_t{1}, kBlock - 1, kBlock, 3 * kBlock}) {
        FrameList frames = numberedFrom(0, count);
        const FrameList copy = frames;
        frames.append(numberedFrom(count, 2 * kBlock));
        EXPECT_EQ(numbersOf(frames), range(0, count + 2 * kBlock));
        EXPECT_EQ(numbersOf(copy), range(0, count));
    }
}

TEST(FrameListCopyTest, DoesNotShowWhatIsAppendedToIt) {
    const FrameList frames = numberedFrom(0, 10);
    FrameList copy = frames;
    copy.push_back(numbered(10));
    EXPECT_EQ(numbersOf(frames), range(0, 10));
    EXPECT_EQ(numbersOf(copy), range(0, 11));
}

TEST(FrameListCopyTest, GoesItsOwnWayWhenBothAreAppendedTo) {
    FrameList frames = numberedFrom(0, 10);
    FrameList copy = frames;
    FrameList copyOfCopy = copy;
    for (std::uint64_t i = 0; i < 2 * kBlock; ++i) {
        frames.push_back(numbered(10 + i));
        copy.push_back(numbered(1000 + i));
        copyOfCopy.push_back(numbered(2000 + i));
    }
    EXPECT_EQ(numbersOf(frames), range(0, 10 + 2 * kBlock));
    const auto tenAnd = [](std::uint64_t first) {
        std::vector<std::uint64_t> numbers = range(0, 10);
        std::ranges::copy(range(first, 2 * kBlock), std::back_inserter(numbers));
        return numbers;
    };
    EXPECT_EQ(numbersOf(copy), tenAnd(1000));
    EXPECT_EQ(numbersOf(copyOfCopy), tenAnd(2000));
}

TEST(FrameListCopyTest, DoesNotSeeTheOriginalTrimmed) {
    FrameList frames = numberedFrom(0, 200);
    const FrameList copy = frames;
    const RecordedFrame* const shared = &at(copy, 100);
    keepNewest(frames, 100);
    EXPECT_EQ(numbersOf(frames), range(100, 100));
    EXPECT_EQ(numbersOf(copy), range(0, 200));
    EXPECT_EQ(&at(copy, 100), shared);
    frames.clear();
    EXPECT_EQ(numbersOf(copy), range(0, 200));
}

TEST(FrameListCopyTest, IsTrimmedAlone) {
    const FrameList frames = numberedFrom(0, 200);
    FrameList copy = frames;
    FrameList copyOfCopy = copy;
    keepNewest(copy, 30);
    copy.push_back(numbered(200));
    keepNewest(copyOfCopy, 0);
    EXPECT_EQ(numbersOf(frames), range(0, 200));
    EXPECT_EQ(numbersOf(copy), range(170, 31));
    EXPECT_THAT(numbersOf(copyOfCopy), IsEmpty());
}

TEST(FrameListCopyTest, OutlivesTheOriginal) {
    std::optional<FrameList> frames = numberedFrom(0, 100);
    const FrameList copy = *frames;
    frames->push_back(numbered(100));
    frames.reset();
    EXPECT_EQ(numbersOf(copy), range(0, 100));
}

TEST(FrameListCopyTest, ReplacesWhatWasThere) {
    const FrameList frames = numberedFrom(0, 100);
    FrameList other = numberedFrom(7, 70);
    other = frames;
    EXPECT_EQ(numbersOf(other), range(0, 100));
    const FrameList& same = other;
    other = same;
    EXPECT_EQ(numbersOf(other), range(0, 100));
}

TEST(FrameListMoveTest, LeavesAnEmptyListThatTakesNewFrames) {
    FrameList frames = numberedFrom(0, 100);
    const RecordedFrame* const first = &frames.front();
    FrameList moved = std::move(frames);
    EXPECT_EQ(&moved.front(), first);
    EXPECT_EQ(numbersOf(moved), range(0, 100));
    EXPECT_TRUE(frames.empty());  // NOLINT(bugprone-use-after-move)
    EXPECT_EQ(frames.begin(), frames.end());
    frames.push_back(numbered(5));
    EXPECT_THAT(numbersOf(frames), ElementsAre(5));
    FrameList assigned = numberedFrom(9, 9);
    assigned = std::move(moved);
    EXPECT_EQ(numbersOf(assigned), range(0, 100));
    EXPECT_TRUE(moved.empty());  // NOLINT(bugprone-use-after-move)
    FrameList& same = assigned;
    assigned = std::move(same);
    EXPECT_EQ(numbersOf(assigned), range(0, 100));
}

// Erasing.

TEST(FrameListRetainTest, AsksForEachFrameOnceFromTheNewestToTheOldest) {
    FrameList frames = numberedFrom(0, 150);
    std::vector<std::uint64_t> asked;
    frames.retain([&](const RecordedFrame& frame) {
        asked.push_back(frame.timestamp);
        return frame.timestamp % 3 == 0;
    });
    std::vector<std::uint64_t> expected = range(0, 150);
    std::ranges::reverse(expected);
    EXPECT_EQ(asked, expected);
    EXPECT_EQ(frames.size(), 50U);
    EXPECT_EQ(frames.back(), numbered(147));
}

TEST(FrameListRetainTest, MayKeepAllOrNothing) {
    FrameList frames = numberedFrom(0, 150);
    frames.retain([](const RecordedFrame&) { return true; });
    EXPECT_EQ(numbersOf(frames), range(0, 150));
    frames.retain([](const RecordedFrame&) { return false; });
    EXPECT_TRUE(frames.empty());
    EXPECT_EQ(frames.begin(), frames.end());
    frames.retain([](const RecordedFrame&) { return false; });
    EXPECT_TRUE(frames.empty());
    frames.push_back(numbered(3));
    EXPECT_THAT(numbersOf(frames), ElementsAre(3));
}

/// Where the bytes of each report lie.
std::vector<const std::uint8_t*> bytesOf(const FrameList& frames) {
    std::vector<const std::uint8_t*> bytes;
    for (const RecordedFrame& frame : frames) {
        bytes.push_back(frame.report.data());
    }
    return bytes;
}

TEST(FrameListRetainTest, MovesFramesThatNobodyShares) {
    FrameList frames = numberedFrom(0, 200);
    const std::vector<const std::uint8_t*> before = bytesOf(frames);
    {
        const FrameList gone = frames;
    }
    keepNewest(frames, 99);
    EXPECT_EQ(bytesOf(frames), std::vector(before.begin() + 101, before.end()));
    frames.retain([](const RecordedFrame& frame) { return frame.timestamp % 2 == 0; });
    EXPECT_EQ(frames.size(), 49U);
    EXPECT_EQ(frames.front().report.data(), before[102]);
    EXPECT_EQ(frames.back().report.data(), before[198]);
}

TEST(FrameListRetainTest, SharesOnWhatLosesNoFrame) {
    FrameList frames = numberedFrom(0, 200);
    const FrameList copy = frames;
    keepNewest(frames, 99);
    EXPECT_EQ(&frames.back(), &copy.back());
    EXPECT_EQ(&at(frames, 98 - 71), &at(copy, 128));  // the first of a block
    EXPECT_NE(&frames.front(), &at(copy, 101));       // of a block that lost frames
}

TEST(FrameListAppendTest, PutsOneListBehindAnother) {
    FrameList frames = numberedFrom(0, 70);
    FrameList more = numberedFrom(70, 100);
    const FrameList copy = more;
    const std::uint8_t* const bytes = frames.back().report.data();
    frames.append(std::move(more));
    EXPECT_EQ(numbersOf(frames), range(0, 170));
    EXPECT_EQ(at(frames, 69).report.data(), bytes);
    EXPECT_EQ(numbersOf(copy), range(70, 100));
    EXPECT_TRUE(more.empty());  // NOLINT(bugprone-use-after-move)
    frames.append(FrameList());
    FrameList empty;
    empty.append(std::move(frames));
    EXPECT_EQ(numbersOf(empty), range(0, 170));
    empty.append(FrameList(empty));
    EXPECT_EQ(empty.size(), 340U);
    EXPECT_EQ(at(empty, 170), numbered(0));
}

TEST(FrameListPinTest, HoldsAFrameThroughEverything) {
    std::optional<FrameList> frames = numberedFrom(0, 100);
    const auto place = std::next(frames->begin(), 50);
    const RecordedFrame* const address = &*place;
    const FrameList::Pin pin = frames->pin(place);
    const FrameList::Pin pinOfKept = frames->pin(std::next(frames->begin(), 99));
    keepNewest(*frames, 45);
    EXPECT_EQ(&*pin, address);
    EXPECT_EQ(*pin, numbered(50));
    EXPECT_EQ(*pinOfKept, numbered(99));
    EXPECT_EQ(numbersOf(*frames), range(55, 45));
    frames.reset();
    EXPECT_EQ(pin->timestamp, 50U);
    EXPECT_EQ(pin->report, numbered(50).report);
}

// Against a list that is nothing but a list.

TEST(FrameListModelTest, BehavesAsPlainListsThatAreCopied) {
    const char* given = std::getenv("VEXA_PROPERTY_SEED");
    const std::uint64_t seed =
        given == nullptr ? std::random_device{}() : std::strtoull(given, nullptr, 10);
    std::cout << "seed " << seed << '\n';
    SCOPED_TRACE("VEXA_PROPERTY_SEED=" + std::to_string(seed));
    SeededRandom random(seed);
    struct Pair {
        FrameList frames;
        std::list<RecordedFrame> model;
    };
    std::vector<Pair> pairs(4);
    struct Held {
        FrameList::Pin pin;
        RecordedFrame model;
    };
    std::vector<Held> held;
    std::uint64_t number = 0;
    std::size_t most = 0;
    std::size_t erased = 0;
    for (int step = 0; step < 20'000 && !HasFailure(); ++step) {
        Pair& pair = pairs[random.next() % pairs.size()];
        Pair& other = pairs[random.next() % pairs.size()];
        switch (random.between(0, 9)) {
            case 0:
            case 1:
            case 2:
            case 3:
                for (int i = random.between(1, 40); i > 0; --i) {
                    RecordedFrame frame =
                        random.oneIn(4) ? stateFrame(number, "key " + std::to_string(number % 9), 1)
                                        : numbered(number);
                    ++number;
                    pair.model.push_back(frame);
                    pair.frames.push_back(std::move(frame));
                }
                break;
            case 4:
                other = pair;
                break;
            case 5: {
                Pair taken = std::move(pair);
                pair = Pair();
                other = std::move(taken);
                break;
            }
            case 6: {
                const auto count = static_cast<std::size_t>(random.between(0, 200));
                erased += pair.model.size();
                keepNewest(pair.frames, count);
                TrimRule keeps(count);
                for (auto next = pair.model.end(); next != pair.model.begin();) {
                    const auto frame = std::prev(next);
                    next = keeps(*frame) ? frame : pair.model.erase(frame);
                }
                erased -= pair.model.size();
                break;
            }
            case 7: {
                const int sparsity = random.between(1, 50);
                const std::uint64_t salt = random.next();
                const auto keep = [&](const RecordedFrame& frame) {
                    return SeededRandom(frame.timestamp ^ salt).oneIn(sparsity);
                };
                pair.frames.retain(keep);
                std::erase_if(pair.model, [&](const RecordedFrame& f) { return !keep(f); });
                break;
            }
            case 8:
                if (pair.frames.size() < 1000) {
                    FrameList copy = other.frames;
                    pair.frames.append(random.oneIn(2) ? std::move(copy) : FrameList(copy));
                    const std::list<RecordedFrame> modelCopy = other.model;
                    pair.model.insert(pair.model.end(), modelCopy.begin(), modelCopy.end());
                }
                break;
            default:
                if (random.oneIn(2)) {
                    held.clear();
                } else if (!pair.frames.empty()) {
                    const auto place =
                        std::next(pair.frames.begin(),
                                  static_cast<std::ptrdiff_t>(random.next() % pair.frames.size()));
                    held.push_back({pair.frames.pin(place), *place});
                }
        }
        for (const Pair& each : pairs) {
            ASSERT_EQ(each.frames.size(), each.model.size());
            ASSERT_TRUE(each.frames == each.model);
            most = std::max(most, each.frames.size());
        }
        for (const Held& each : held) {
            ASSERT_EQ(*each.pin, each.model);
        }
    }
    EXPECT_GT(most, 3 * kBlock);
    EXPECT_GT(erased, 1000U);
}

// Threads: run by the thread sanitizer as well.

TEST(FrameListThreadTest, CopiesAreReadWhileTheOwnerGoesOn) {
    constexpr std::size_t kMost = 200;
    constexpr int kCopies = 300;
    std::mutex mutex;
    FrameList frames;  // guarded by the mutex
    std::atomic<int> copiesLeft = 2 * kCopies;
    const auto read = [&] {
        for (int i = 0; i < kCopies; ++i, --copiesLeft) {
            FrameList copy;
            {
                const std::scoped_lock lock(mutex);
                copy = frames;
            }
            const std::vector<std::uint64_t> numbers = numbersOf(copy);
            EXPECT_EQ(numbers, range(numbers.empty() ? 0 : numbers.front(), numbers.size()));
            // The reader does with its copy as it likes.
            keepNewest(copy, 70);
            if (!numbers.empty()) {
                copy.push_back(numbered(numbers.back() + 1));
                EXPECT_EQ(numbersOf(copy).back(), numbers.back() + 1);
            }
        }
    };
    std::thread reader(read);
    std::thread anotherReader(read);
    std::uint64_t number = 0;
    while (copiesLeft > 0 || number < 10 * kMost) {
        const std::scoped_lock lock(mutex);
        frames.push_back(numbered(number++));
        if (frames.size() == kMost) {
            keepNewest(frames, kMost / 2);
        }
    }
    reader.join();
    anotherReader.join();
    EXPECT_EQ(frames.back(), numbered(number - 1));
}

}  // namespace
}  // namespace VexaTouch
