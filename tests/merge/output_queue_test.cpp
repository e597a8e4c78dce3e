#include "output_queue.h"

#include "merge.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <deque>
#include <memory>
#include <random>
#include <vector>

namespace {

/// Elements and files that live as long as the test, and a queue over them.
class OutputQueue : public testing::Test {
protected:
    ~OutputQueue() override {
        m_queue.release();
    }

    trace_file& file(cu_timeinfo base = {}) {
        trace_file& newFile = m_files.emplace_back();
        newFile.timeInfo = base;
        return newFile;
    }

    trace_queue_element* element(trace_file& from, uint64_t uTimeStamp, uint16_t function = 1) {
        auto& block = m_blocks.emplace_back(std::make_unique<std::byte[]>(sizeof(start_element)));
        auto* pElement = reinterpret_cast<trace_queue_element*>(block.get());
        pElement->pFile = &from;
        pElement->pushSeqn = m_uPushes++;
        pElement->header.length = sizeof(trace_record_start);
        pElement->header.function = function;
        pElement->header.timeStamp = uTimeStamp;
        return pElement;
    }

    trace_queue_element* start_record(trace_file& from, uint64_t uTimeStamp, cu_timeinfo base) {
        trace_queue_element* pElement = element(from, uTimeStamp, TRC_FUNC_START);
        std::memcpy(reinterpret_cast<std::byte*>(&pElement->header) +
                        offsetof(trace_record_start, timeInfo),
                    &base, sizeof base);
        return pElement;
    }

    trace_queue_element* push(trace_queue_element* pElement) {
        EXPECT_TRUE(m_queue.push(pElement));
        m_queued.push_back(pElement);
        return pElement;
    }

    /// The earliest of what is queued, found by looking at everything.
    trace_queue_element* expected() {
        const auto earliest = std::min_element(m_queued.begin(), m_queued.end(),
                                               [](const auto* pFirst, const auto* pSecond) {
                                                   return cmp_Q_elements(pFirst, pSecond) < 0;
                                               });
        trace_queue_element* const pElement = *earliest;
        m_queued.erase(earliest);
        return pElement;
    }

    output_queue m_queue;
    std::vector<trace_queue_element*> m_queued;

private:
    struct start_element {
        trace_queue_element element;
        std::byte body[sizeof(trace_record_start)];
    };
    std::deque<trace_file> m_files;
    std::vector<std::unique_ptr<std::byte[]>> m_blocks;
    uint64_t m_uPushes = 0;
};

TEST_F(OutputQueue, TiesLeaveInPushOrderAcrossFilesAndThePushNumbersWrap) {
    trace_file& first = file();
    trace_file& second = file();
    std::vector<trace_queue_element*> pushed;
    for (uint64_t uPush : {0xFFFFFFFEULL, 0xFFFFFFFFULL, 0x100000000ULL, 0x100000001ULL}) {
        trace_queue_element* pElement = element(pushed.size() % 2 == 0 ? first : second, 7);
        pElement->pushSeqn = uPush;
        pushed.push_back(push(pElement));
    }
    for (trace_queue_element* pElement : pushed)
        EXPECT_EQ(m_queue.pop().pElement, pElement);
    EXPECT_EQ(m_queue.pop().pElement, nullptr);
}

TEST_F(OutputQueue, AStartRecordIsPlacedByTheTimeBaseInItsBody) {
    trace_file& early = file({1000, 0});
    trace_file& late = file({5000, 0});
    trace_queue_element* const pRecord = push(element(late, 10));                 // 5010
    trace_queue_element* const pStart = push(start_record(early, 10, {9000, 0})); // 9010
    EXPECT_EQ(m_queue.pop().pElement, pRecord);
    EXPECT_EQ(m_queue.pop().pElement, pStart);
}

TEST_F(OutputQueue, TimesBeforeTheEpochAndBeyond64BitsKeepTheirOrder) {
    trace_file& before = file({5, 100});        // raw 0: -95
    trace_file& beyond = file({UINT64_MAX, 0}); // raw max: 2^65
    trace_file& plain = file();
    trace_queue_element* const pBeyond = push(element(beyond, UINT64_MAX));
    trace_queue_element* const pPlain = push(element(plain, UINT64_MAX));
    trace_queue_element* const pBefore = push(element(before, 0));
    EXPECT_EQ(m_queue.pop().pElement, pBefore);
    EXPECT_EQ(m_queue.pop().pElement, pPlain);
    EXPECT_EQ(m_queue.pop().pElement, pBeyond);
}

/// Random pushes, takes and changes of time bases against a search of all that
/// is queued: in order, out of order, with ties, with start records.
TEST_F(OutputQueue, AgreesWithASearchWhateverThePushesAre) {
    for (uint32_t uSeed = 0; uSeed < 200; ++uSeed) {
        std::mt19937 random(uSeed);
        const auto below = [&](uint64_t uLimit) { return random() % uLimit; };
        std::vector<trace_file*> files;
        for (uint64_t i = 0, uFiles = 1 + below(6); i < uFiles; ++i)
            files.push_back(&file({below(50), below(50)}));
        const uint64_t uDisorder = below(3) * 20;
        for (uint64_t uTime = 0; uTime < 300; uTime += below(3)) {
            trace_file& from = *files[below(files.size())];
            if (below(20) == 0)
                push(start_record(from, uTime, {below(50), below(50)}));
            else
                push(element(from, uTime + below(uDisorder + 1)));
            while (!m_queued.empty() && below(2) == 0)
                ASSERT_EQ(m_queue.pop().pElement, expected()) << "seed " << uSeed;
            if (below(10) == 0) {
                // What is queued behind a start record does not move with it;
                // the readers never let it come to that.
                const bool bStartQueued = std::any_of(
                    m_queued.begin(), m_queued.end(), [](const trace_queue_element* pElement) {
                        return pElement->header.function == TRC_FUNC_START;
                    });
                while (bStartQueued && !m_queued.empty())
                    ASSERT_EQ(m_queue.pop().pElement, expected()) << "seed " << uSeed;
                files[below(files.size())]->timeInfo = {below(100), below(100)};
                m_queue.time_base_changed();
            }
        }
        while (!m_queued.empty())
            ASSERT_EQ(m_queue.pop().pElement, expected()) << "seed " << uSeed;
        EXPECT_TRUE(m_queue.empty());
    }
}

TEST(FileOrder, IsByConvertedTimeOfTheFirstRecord) {
    trace_file files[3]{};
    files[0].timeInfo = {2'000'000'000, 0};
    files[1].timeInfo = {1'000'000'000, 900};
    TrcPreProcHdrElem elems[3]{};
    for (int i = 0; i < 3; ++i)
        elems[i].pTrcFile = &files[i];
    elems[1].header.timeStamp = 1'000'000'900; // 2 s
    elems[2].header.timeStamp = 2'000'000'001;
    EXPECT_EQ(cmp_trc_file_hdrs(&elems[0], &elems[1]), 0);
    EXPECT_EQ(cmp_trc_file_hdrs(&elems[0], &elems[2]), -1);
    EXPECT_EQ(cmp_trc_file_hdrs(&elems[2], &elems[1]), 1);
}

} // namespace
