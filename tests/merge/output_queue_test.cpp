#include "output_queue.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <list>
#include <new>
#include <random>
#include <vector>

namespace {

constexpr size_t RECORD_SIZE = sizeof(trace_record_start);
constexpr size_t ELEMENT_SIZE = (RECORD_SIZE + QUEUE_ELEMENT_OVERHEAD + 7) & ~size_t{7};

/// A record that is queued, as a search of all of them sees it.
struct queued {
    merge_file* pFile;
    uint64_t uTimeStamp;
    uint16_t uFunction;
    cu_timeinfo brought; ///< of a record that changes the base
    uint64_t pushSeqn;

    bool changes_base() const {
        return trc_kind_changes_time_base(uFunction);
    }
    cu_nanoseconds time() const {
        return cu_time_ns(uTimeStamp,
                          uFunction == TRC_FUNC_START ? brought : pFile->pFile->timeInfo);
    }
};

class OutputQueue : public testing::Test {
protected:
    uint64_t below(uint64_t uLimit) {
        return random() % uLimit;
    }
    cu_timeinfo base() {
        return {(below(6) == 0 ? UINT64_MAX - 300 : 0) + below(50), below(50)};
    }

    void begin(uint32_t uSeed) {
        random.seed(uSeed);
        const size_t uFiles = 1 + below(7);
        traceFiles = std::vector<trace_file>(uFiles);
        files = std::vector<merge_file>(uFiles);
        ASSERT_TRUE(queue.reserve(files));
        for (size_t i = 0; i < uFiles; ++i) {
            traceFiles[i].timeInfo = base();
            files[i] = {};
            files[i].pFile = &traceFiles[i];
            files[i].uNumber = static_cast<uint32_t>(i);
            files[i].bOldestKnown = below(2) == 0;
            files[i].oldestTime = cu_time_ns(0, traceFiles[i].timeInfo);
            queue.file_begins(files[i]);
        }
    }

    /// Pushes records of one file as its reader does: in batches that ascend and
    /// end at a record that changes the base.
    void push(merge_file& file, const std::vector<queued>& records) {
        for (size_t uBegin = 0; uBegin < records.size();) {
            size_t uEnd = uBegin;
            do
                ++uEnd;
            while (uEnd < records.size() && !records[uEnd - 1].changes_base() &&
                   records[uEnd].uFunction != TRC_FUNC_START &&
                   records[uEnd].uTimeStamp >= records[uEnd - 1].uTimeStamp);
            queue.push(make_batch(file, {records.begin() + static_cast<ptrdiff_t>(uBegin),
                                         records.begin() + static_cast<ptrdiff_t>(uEnd)}));
            uBegin = uEnd;
        }
        expected.insert(expected.end(), records.begin(), records.end());
    }

    static record_batch* make_batch(merge_file& file, const std::vector<queued>& records) {
        auto* const pBytes =
            static_cast<std::byte*>(malloc(sizeof(record_batch) + records.size() * ELEMENT_SIZE));
        auto* const pBatch = new (pBytes) record_batch{};
        pBatch->pFile = &file;
        pBatch->pHead = reinterpret_cast<trace_queue_element*>(pBytes + sizeof(record_batch));
        pBatch->uCount = pBatch->uLeft = static_cast<uint32_t>(records.size());
        pBatch->uLastStamp = records.back().uTimeStamp;
        pBatch->bChangesBase = records.back().changes_base();
        pBatch->bOwnBase = records.back().uFunction == TRC_FUNC_START;
        pBatch->base = records.back().brought;
        trace_queue_element* pElement = pBatch->pHead;
        for (const queued& record : records) {
            memset(pElement, 0, ELEMENT_SIZE);
            pElement->pFile = file.pFile;
            pElement->pushSeqn = record.pushSeqn;
            pElement->length = RECORD_SIZE + QUEUE_ELEMENT_OVERHEAD;
            pElement->header.length = RECORD_SIZE;
            pElement->header.function = record.uFunction;
            pElement->header.timeStamp = record.uTimeStamp;
            pElement = next_element(pElement);
        }
        return pBatch;
    }

    /// The earliest record that is not behind one of its file which changes the base.
    std::list<queued>::iterator earliest() {
        auto found = expected.end();
        std::vector<const merge_file*> closed;
        for (auto it = expected.begin(); it != expected.end(); ++it) {
            if (std::ranges::find(closed, it->pFile) != closed.end())
                continue;
            if (found == expected.end() || it->time() < found->time())
                found = it;
            if (it->changes_base())
                closed.push_back(it->pFile);
        }
        return found;
    }

    bool is_complete() {
        const cu_nanoseconds first = earliest()->time();
        return std::ranges::all_of(files, [&](const merge_file& file) {
            const bool bQueued = std::ranges::any_of(
                expected, [&](const queued& each) { return each.pFile == &file; });
            return bQueued || file.run.bEnded ||
                   (file.bOldestKnown && !file.run.bHadRecords && first < file.oldestTime);
        });
    }

    void pop() {
        EXPECT_EQ(queue.is_complete(), is_complete());
        const auto first = earliest();
        const output_queue::taken taken = queue.pop();
        ASSERT_EQ(taken.pElement->pushSeqn, first->pushSeqn);
        ASSERT_EQ(taken.pBaseOf, first->changes_base() ? first->pFile : nullptr);
        if (taken.pBaseOf != nullptr) {
            first->pFile->pFile->timeInfo = first->brought;
            queue.base_was_replaced(*taken.pBaseOf);
        }
        expected.erase(first);
    }

    std::mt19937 random;
    std::vector<trace_file> traceFiles;
    std::vector<merge_file> files;
    std::list<queued> expected; ///< in the order of the pushes
    output_queue queue;
};

/// Random pushes and takes against a search of all that is queued: in order, out of
/// order, with ties over all files, with records that change the base at any place,
/// with times before the epoch and beyond 64 bits.
TEST_F(OutputQueue, AgreesWithASearchWhateverThePushesAre) {
    for (uint32_t uSeed = 0; uSeed < 300 && !HasFailure(); ++uSeed) {
        SCOPED_TRACE(uSeed);
        begin(uSeed);
        uint64_t uPushes = 0xFFFFFFC0; // 32 bits of it are compared: they wrap
        const uint64_t uDisorder = below(3) * 20;
        for (uint64_t uTime = 0; uTime < 300; uTime += below(4)) {
            merge_file& file = files[below(files.size())];
            std::vector<queued> records;
            for (uint64_t uLeft = 1 + below(6); uLeft > 0; --uLeft) {
                const uint64_t uKind = below(20);
                records.push_back({&file, uTime + below(uDisorder + 1),
                                   static_cast<uint16_t>(uKind == 0   ? TRC_FUNC_START
                                                         : uKind == 1 ? TRC_FUNC_TIME_CALIBRATION
                                                                      : TRC_FUNC_ID),
                                   base(), uPushes++});
                uTime += below(2);
            }
            if (!file.run.bEnded)
                push(file, records);
            if (below(20) == 0)
                queue.file_ends(file);
            while (!expected.empty() && below(5) != 0 && !HasFailure())
                pop();
        }
        while (!expected.empty() && !HasFailure())
            pop();
        EXPECT_TRUE(queue.empty());
        release_batches(queue.finished);
        queue.finished = {};
    }
}

} // namespace
