// The walk round a ring in memory, alone and with the copies of the records.
#include "records.h"

#include "first_record.h"
#include "merge_file.h"
#include "record_batch.h"
#include "ring.h"
#include "walk.h"

#include <benchmark/benchmark.h>

#include <cstring>
#include <vector>

namespace {

constexpr size_t RECORDS = 16'384; // 1 MiB

/// A full ring whose oldest record stands at the start of the area.
struct memory_ring {
    memory_ring() : bytes(sizeof(trace_file_header) + RECORDS * sizeof(numbers_record)) {
        trace_file_header header{};
        header.uProperties = TRC_PROP_LITTLE_ENDIAN | TRC_PROP_ADDR_64;
        header.uOffset = sizeof header;
        header.uActualFileSize = static_cast<uint32_t>(bytes.size());
        header.uOldestRecordOffset = sizeof header;
        header.uSeqLock = TRC_SEQ_NO_READER;
        std::memcpy(bytes.data(), &header, sizeof header);
        for (uint32_t i = 0; i < RECORDS; ++i) {
            const numbers_record record = make_record(i * RECORD_STEP_NS, i);
            std::memcpy(&bytes[sizeof header + i * sizeof record], &record, sizeof record);
        }
        file.pName = name;
        ring_map_over(&file, bytes.data(), bytes.size());
    }

    std::vector<std::byte> bytes;
    char name[9] = "ring.trc";
    trace_file file{};
};

/// Goes once round the ring as a reader does; false when it does not find all.
template <class function> bool go_round(trace_file* pFile, const function& use_record) {
    trace_record_header header;
    size_t uRecords = 0;
    if (find_first_record(pFile) != 0)
        return false;
    walk_result here = is_last_record(pFile, &header);
    while (here == WALK_RECORD) {
        use_record(header);
        ++uRecords;
        here = step_and_judge(pFile, &header);
    }
    return here == WALK_NO_RECORD && uRecords == RECORDS;
}

void walk(benchmark::State& state) {
    memory_ring ring;
    for (auto _ : state) {
        if (!go_round(&ring.file, [](const trace_record_header& header) {
                benchmark::DoNotOptimize(header.timeStamp);
            }))
            state.SkipWithError("not all records were found");
    }
    state.SetItemsProcessed(state.iterations() * int64_t{RECORDS});
}
BENCHMARK(walk);

void walk_and_copy(benchmark::State& state) {
    memory_ring ring;
    merge_file file{};
    file.pFile = &ring.file;
    cu_timeinfo base{};
    for (auto _ : state) {
        batch_writer records(&file);
        bool bAll = true;
        bAll = go_round(&ring.file,
                        [&](const trace_record_header& header) {
                            bAll = records.add(header, &base) && bAll;
                        }) &&
               bAll;
        if (!bAll)
            state.SkipWithError("not all records were found");
    }
    state.SetItemsProcessed(state.iterations() * int64_t{RECORDS});
}
BENCHMARK(walk_and_copy);

} // namespace
