#include "output_queue.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <deque>
#include <list>
#include <random>

namespace {

/// An element in the queue, and what is known of its time.
struct queued {
    alignas(trace_queue_element)
        std::byte block[sizeof(trace_queue_element) + sizeof(trace_record_start)]{};
    cu_timeinfo ownBase{}; ///< of a start record
    const cu_timeinfo* pBase = &ownBase;

    trace_queue_element* element() {
        return reinterpret_cast<trace_queue_element*>(block);
    }
    cu_nanoseconds time() {
        return cu_time_ns(element()->header.timeStamp, *pBase);
    }
};

/// Random pushes, takes and changes of time bases against a search of all that
/// is queued, in the order of the pushes: in order, out of order, with ties over
/// all files, with start records, with times before the epoch and beyond 64 bits.
TEST(OutputQueue, AgreesWithASearchWhateverThePushesAre) {
    for (uint32_t uSeed = 0; uSeed < 200 && !HasFailure(); ++uSeed) {
        SCOPED_TRACE(uSeed);
        std::mt19937 random(uSeed);
        const auto below = [&](uint64_t uLimit) { return random() % uLimit; };
        const auto base = [&] {
            return cu_timeinfo{(below(6) == 0 ? UINT64_MAX - 300 : 0) + below(50), below(50)};
        };
        output_queue queue;
        std::list<queued> expected, taken;
        uint64_t uPushes = 0xFFFFFFC0; // 32 bits of it are compared: they wrap
        const auto push = [&](trace_file& from, uint64_t uTimeStamp, bool bStart) {
            queued& added = expected.emplace_back();
            trace_queue_element* const pElement = added.element();
            pElement->pFile = &from;
            pElement->pushSeqn = uPushes++;
            pElement->header.length = sizeof(trace_record_start);
            pElement->header.function = bStart ? TRC_FUNC_START : TRC_FUNC_ID;
            pElement->header.timeStamp = uTimeStamp;
            added.ownBase = base();
            memcpy(added.block + offsetof(trace_queue_element, header) +
                       offsetof(trace_record_start, timeInfo),
                   &added.ownBase, sizeof added.ownBase);
            if (!bStart)
                added.pBase = &from.timeInfo;
            EXPECT_TRUE(queue.push(pElement));
        };
        const auto pop = [&] {
            const auto earliest = std::ranges::min_element(expected, {}, &queued::time);
            EXPECT_EQ(queue.pop().pElement, earliest->element());
            taken.splice(taken.end(), expected, earliest);
        };

        std::deque<trace_file> files(1 + below(6));
        for (trace_file& file : files)
            file.timeInfo = base();
        const uint64_t uDisorder = below(3) * 20;
        for (uint64_t uTime = 0; uTime < 300; uTime += below(3)) {
            const bool bStart = below(20) == 0;
            push(files[below(files.size())], uTime + (bStart ? 0 : below(uDisorder + 1)), bStart);
            while (!expected.empty() && below(2) == 0)
                pop();
            if (below(10) == 0) {
                // What is queued behind a start record does not move with it;
                // the readers never let it come to that.
                const bool bStartQueued = std::ranges::any_of(
                    expected, [](const queued& each) { return each.pBase == &each.ownBase; });
                while (bStartQueued && !expected.empty())
                    pop();
                files[below(files.size())].timeInfo = base();
                queue.time_base_changed();
            }
        }
        while (!expected.empty())
            pop();
        EXPECT_TRUE(queue.empty());
        EXPECT_EQ(queue.pop().pElement, nullptr);
        queue.release();
    }
}

} // namespace
