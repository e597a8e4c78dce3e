// The output queue while records of 1, 8 and 64 files flow through it.
#include "output_queue.h"

#include "records.h"

#include <benchmark/benchmark.h>

#include <deque>
#include <vector>

namespace {

constexpr size_t QUEUED_RECORDS = 32'768; // about what a merge keeps queued

/// A full queue: every file has as many records, all interleaved in time.
struct full_queue {
    explicit full_queue(size_t uFiles) : files(uFiles) {
        elements.reserve(QUEUED_RECORDS);
        for (uint32_t i = 0; i < QUEUED_RECORDS; ++i) {
            elements.emplace_back(&files[i % uFiles], i * RECORD_STEP_NS, i);
            bGood = queue.push(elements.back().element()) && bGood;
        }
    }
    full_queue(const full_queue&) = delete;
    full_queue& operator=(const full_queue&) = delete;
    ~full_queue() {
        queue.release();
    }

    std::deque<trace_file> files;
    std::vector<numbers_element> elements;
    output_queue queue;
    bool bGood = true;
};

/// Takes the earliest record and pushes it again as the latest.
void take_and_push(benchmark::State& state) {
    full_queue full(static_cast<size_t>(state.range(0)));
    uint64_t uPushes = QUEUED_RECORDS;
    for (auto _ : state) {
        trace_queue_element* const pElement = full.queue.pop().pElement;
        pElement->header.timeStamp += QUEUED_RECORDS * RECORD_STEP_NS;
        pElement->pushSeqn = uPushes++;
        full.bGood = full.queue.push(pElement) && full.bGood;
    }
    if (!full.bGood)
        state.SkipWithError("memory ran out");
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(take_and_push)->ArgName("files")->Arg(1)->Arg(8)->Arg(64);

} // namespace
