// What the benchmarks of single parts work on: records in memory, and standard
// output that goes nowhere.
#pragma once

#include "kelvo.h"
#include "stdout_stream.h"

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <fcntl.h>
#include <memory>
#include <unistd.h>

/// A record of 64 bytes: seven numbers, with trace id 1 or 2.
struct [[gnu::packed]] numbers_record {
    trace_record_values head;
    uint32_t values[7];
};
static_assert(sizeof(numbers_record) == 64);

inline constexpr uint64_t RECORD_STEP_NS = 10'000;

inline numbers_record make_record(uint64_t uTime, uint32_t uNumber) {
    numbers_record record{};
    record.head.header.length = sizeof record;
    record.head.header.function = TRC_FUNC_VALUES;
    record.head.header.seqNumber = 2 * uNumber + 2;
    for (size_t i = 0; i < 4; ++i)
        record.head.header.compId[i] = "_VAL"[i];
    record.head.header.threadId = 0x1000 + uNumber % 4;
    record.head.header.timeStamp = uTime;
    record.head.id = 1 + uNumber / 4 % 2; // each thread by turns
    record.head.number = 7;
    for (uint32_t i = 0; i < 7; ++i)
        record.values[i] = (uNumber + i) * 2654435761U >> (uNumber + 5 * i) % 32;
    return record;
}

/// A queue element with such a record; `pFile` is not owned.
class numbers_element {
public:
    numbers_element(trace_file* pFile, uint64_t uTime, uint32_t uNumber) {
        element()->pFile = pFile;
        element()->pushSeqn = uNumber;
        element()->length = sizeof(numbers_record) + QUEUE_ELEMENT_OVERHEAD;
        const numbers_record record = make_record(uTime, uNumber);
        __builtin_memcpy(&element()->header, &record, sizeof record);
    }
    trace_queue_element* element() {
        return reinterpret_cast<trace_queue_element*>(bytes);
    }

private:
    alignas(trace_queue_element) std::byte bytes[sizeof(numbers_record) + QUEUE_ELEMENT_OVERHEAD];
};

/// While it lives, standard output goes to /dev/null.
class output_to_nowhere {
public:
    output_to_nowhere() {
        fflush(stdout);
        kept = dup(STDOUT_FILENO);
        const int null = open("/dev/null", O_WRONLY | O_CLOEXEC);
        dup2(null, STDOUT_FILENO);
        close(null);
        stdout_reset();
    }
    output_to_nowhere(const output_to_nowhere&) = delete;
    output_to_nowhere& operator=(const output_to_nowhere&) = delete;
    ~output_to_nowhere() {
        stdout_flush();
        dup2(kept, STDOUT_FILENO);
        close(kept);
    }

private:
    int kept;
};
