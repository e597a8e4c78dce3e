// What the main thread does with a record: the frame, the parameters, and both.
#include "records.h"

#include "../temp_directory.h"
#include "compile.h"
#include "format_text.h"
#include "frame.h"
#include "record.h"
#include "record_view.h"
#include "store.h"

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <cstring>
#include <vector>

namespace {

struct free_entry {
    void operator()(format_entry* pEntry) const {
        free(pEntry);
    }
};
using entry_owner = std::unique_ptr<format_entry, free_entry>;

/// A trace file of which only the output side is used.
struct open_file {
    open_file() {
        anchor.iNumberFiles = 1;
        file.addrMode64 = 1;
        file.uPlatform = 2;
    }
    ~open_file() {
        free_thread_info(&file);
    }
    trace_file file{};
};

// ------------------------------------------------------------------- frame

void frame(benchmark::State& state, const char* pLetters) {
    const output_to_nowhere nowhere;
    open_file open;
    char kept[sizeof anchor.outputOptions];
    std::memcpy(kept, anchor.outputOptions, sizeof kept);
    strncpy(anchor.outputOptions, pLetters, sizeof anchor.outputOptions - 1);
    uint64_t uTime = 1'773'493'385'000'000'000;
    uint32_t uNumber = 0;
    for (auto _ : state) {
        ++uNumber;
        output_start_rec(&open.file, "_VAL", 0x1000 + uNumber % 4, TRC_FUNC_VALUES, 2 * uNumber,
                         64 * uNumber, uTime += RECORD_STEP_NS, &open.file.timeInfo);
        output_end_rec();
    }
    std::memcpy(anchor.outputOptions, kept, sizeof kept);
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK_CAPTURE(frame, default, "tic");
BENCHMARK_CAPTURE(frame, all_letters, "dticfso");

// -------------------------------------------------------------- parameters

/// One format over one packed run of parameters, again and again.
void write_packed(benchmark::State& state, const char* pFormat,
                  const std::vector<std::byte>& data) {
    const entry_owner pEntry(parse_format_string(pFormat, nullptr));
    const output_to_nowhere nowhere;
    for (auto _ : state)
        format_data_block(pEntry.get(), data, 1);
    state.SetItemsProcessed(state.iterations());
}

template <class... T> std::vector<std::byte> packed(const T&... values) {
    std::vector<std::byte> bytes;
    [[maybe_unused]] const auto add = [&bytes](const auto& value) {
        const auto* const pValue = reinterpret_cast<const std::byte*>(&value);
        bytes.insert(bytes.end(), pValue, pValue + sizeof value);
    };
    (add(values), ...);
    return bytes;
}

constexpr char NODE[] = "node-a";

BENCHMARK_CAPTURE(write_packed, no_parameter, "nothing to see here", packed());
BENCHMARK_CAPTURE(write_packed, three_numbers_and_a_string,
                  "item %u, %d units at %d cents, from %s", packed(116'039'725, 360, 38'655, NODE));
BENCHMARK_CAPTURE(write_packed, eight_numbers, "%u %d %x %u %d %x %u %d",
                  packed(1, -2, 3, 40, -500, 6000, 70'000, -800'000));

// One conversion each, with the few characters of text around it.
BENCHMARK_CAPTURE(write_packed, conversion_d, "%d", packed(-123'456));
BENCHMARK_CAPTURE(write_packed, conversion_u, "%u", packed(116'039'725));
BENCHMARK_CAPTURE(write_packed, conversion_08x, "%08x", packed(0xBADC0DE));
BENCHMARK_CAPTURE(write_packed, conversion_lld, "%lld", packed(int64_t{-1'234'567'890'123}));
BENCHMARK_CAPTURE(write_packed, conversion_plus_10d, "%+10d", packed(4711));
BENCHMARK_CAPTURE(write_packed, conversion_hd, "%hd", packed(int16_t{-321}));
BENCHMARK_CAPTURE(write_packed, conversion_c, "%c", packed('x'));
BENCHMARK_CAPTURE(write_packed, conversion_s, "%s", packed(NODE));
BENCHMARK_CAPTURE(write_packed, conversion_20s, "%-20.4s", packed(NODE));
BENCHMARK_CAPTURE(write_packed, conversion_star_d, "%*d", packed(4711, 12));
BENCHMARK_CAPTURE(write_packed, conversion_f, "%.3f", packed(38.655));
BENCHMARK_CAPTURE(write_packed, conversion_p, "%p", packed(uint64_t{0x7F00'1234'5678}));

/// The parameters of a data record, one in each block.
void find_and_write_blocks(benchmark::State& state) {
    const entry_owner pEntry(
        parse_format_string("item %u, %d units at %d cents, from %s", nullptr));
    const std::vector<std::byte> blocks = packed(4, 116'039'725, 4, 360, 4, 38'655, 7, NODE, '\0');
    const output_to_nowhere nowhere;
    parm_list list;
    for (auto _ : state) {
        trace_bytes run = blocks;
        bld_parm_list_unpacked(pEntry.get(), &run, 4, &list);
        format_parms(pEntry.get(), &list, 1);
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(find_and_write_blocks);

// ------------------------------------------------------------- whole records

constexpr size_t RECORDS = 4096;

/// format_record over records that lie in a row.
void record(benchmark::State& state, const char* pTemplate) {
    const temp_directory directory;
    const std::string sFile = directory.path() + "/_VAL.tpl";
    FILE* const pFile = fopen(sFile.c_str(), "w");
    if (pFile == nullptr || fputs(pTemplate, pFile) < 0 || fclose(pFile) != 0)
        state.SkipWithError("no template could be written");
    std::string sPath = directory.path();
    char* const pKept = anchor.pTemplatePath;
    anchor.pTemplatePath = sPath.data();
    open_file open;
    anchor.bRaw = pTemplate[0] == '\0';
    std::vector<numbers_element> elements;
    elements.reserve(RECORDS);
    for (uint32_t i = 0; i < RECORDS; ++i)
        elements.emplace_back(&open.file, i * RECORD_STEP_NS, i);
    {
        const output_to_nowhere nowhere;
        for (auto _ : state)
            for (numbers_element& element : elements)
                format_record(element.element());
    }
    state.SetItemsProcessed(state.iterations() * int64_t{RECORDS});
    anchor.bRaw = 0;
    free_template_info();
    anchor.pTemplatePath = pKept;
}
BENCHMARK_CAPTURE(record, four_numbers,
                  "1 \"job %u: %u bytes in %d us, state %08x%z\"\n"
                  "2 \"job %u: %u bytes in %d us, state %08x%z\"\n");
BENCHMARK_CAPTURE(record, enter_and_leave,
                  "1 \">>job %u: %u bytes in %d us%z\"\n"
                  "2 \"<<job %u: %u bytes in %d us%z\"\n");
BENCHMARK_CAPTURE(record, raw, "");

} // namespace
