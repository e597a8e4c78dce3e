// The output queue while records of 1, 8, 64 and 1,024 files flow through it.
#include "output_queue.h"

#include "records.h"

#include <benchmark/benchmark.h>

#include <vector>

namespace {

constexpr size_t QUEUED_RECORDS = 32'768; // about what a merge keeps queued

/// A full queue: every file has as many records, all interleaved in time, each in a
/// batch of its own.
struct full_queue {
    explicit full_queue(size_t uFiles) : traceFiles(uFiles), files(uFiles) {
        bGood = queue.reserve(files);
        for (size_t i = 0; i < uFiles; ++i) {
            files[i].pFile = &traceFiles[i];
            files[i].uNumber = static_cast<uint32_t>(i);
            queue.file_begins(files[i]);
        }
        elements.reserve(QUEUED_RECORDS);
        batches.resize(QUEUED_RECORDS);
        for (uint32_t i = 0; i < QUEUED_RECORDS; ++i) {
            const size_t uFile = i % uFiles;
            elements.emplace_back(&traceFiles[uFile], i * RECORD_STEP_NS, i);
            batches[i].pFile = &files[uFile];
            push(&batches[i], elements.back().element());
        }
    }

    void push(record_batch* pBatch, trace_queue_element* pElement) {
        pBatch->pHead = pElement;
        pBatch->uCount = pBatch->uLeft = 1;
        pBatch->uLastStamp = pElement->header.timeStamp;
        queue.push(pBatch);
    }

    std::vector<trace_file> traceFiles;
    std::vector<merge_file> files;
    std::vector<numbers_element> elements;
    std::vector<record_batch> batches;
    output_queue queue;
    bool bGood;
};

/// Takes the earliest record and pushes it again as the latest.
void take_and_push(benchmark::State& state) {
    full_queue full(static_cast<size_t>(state.range(0)));
    if (!full.bGood)
        state.SkipWithError("memory ran out");
    uint64_t uPushes = QUEUED_RECORDS;
    for (auto _ : state) {
        trace_queue_element* const pElement = full.queue.pop().pElement;
        pElement->header.timeStamp += QUEUED_RECORDS * RECORD_STEP_NS;
        pElement->pushSeqn = uPushes++;
        full.push(full.queue.finished.take_first(), pElement);
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(take_and_push)->ArgName("files")->Arg(1)->Arg(8)->Arg(64)->Arg(1024);

} // namespace
