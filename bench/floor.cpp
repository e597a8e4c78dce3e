// The floor: what kelvo's output costs at the least.
//
//   kelvo_floor [-r] FILE...
//
// Writes, byte for byte, what kelvo writes for traces of the components that
// the benchmarks use, in one thread and one loop over the mapped files. Their
// templates are compiled in; there are no threads, no queue, no copies of
// records, no nesting, no locks on files. Checked is only what keeps a walk
// inside its mapping, so a damaged file ends the program.
#include "floor_merge.h"
#include "floor_output.h"
#include "floor_text.h"
#include "floor_trace.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <memory>
#include <vector>

namespace {

/// Writes the records of `pTrace` as long as they are earlier than `uUntil`.
/// False when the trace has come to its end.
template <class put_body>
bool write_run(floor_output& out, record_text& text, floor_trace& trace, uint64_t uUntil) {
    do {
        char* const pStart = out.room(MAX_TEXT + trace.length());
        out.commit(put_body{}(text, text.put_prefix(pStart, trace), trace.record()));
        if (!trace.step())
            return false;
    } while (trace.time() < uUntil);
    return true;
}

/// Writes all records of all traces in the order of their times.
template <class put_body>
void write_records(floor_output& out, record_text& text, const std::vector<floor_trace*>& traces) {
    std::vector<uint64_t> times;
    for (const floor_trace* pTrace : traces)
        times.push_back(pTrace->time());
    floor_merge merge(times);
    size_t uLast = SIZE_MAX;
    while (merge.time() != UINT64_MAX) {
        const size_t uFirst = merge.first();
        floor_trace& trace = *traces[uFirst];
        // Where one trace gives many records in a row, the rest need no look.
        const uint64_t uUntil = uFirst == uLast ? merge.second_time() : 0;
        uLast = uFirst;
        if (write_run<put_body>(out, text, trace, uUntil)) {
            trace.fetch_ahead();
            merge.replace_first(trace.time());
        } else {
            trace.close();
            merge.replace_first(UINT64_MAX);
        }
    }
}

void write_summary(floor_output& out, const floor_trace& trace, int iIndex, bool bOne) {
    const trace_file_header& header = trace.header();
    char text[8192];
    char index[16] = "";
    if (!bOne)
        snprintf(index, sizeof index, "[%02d] ", iIndex);
    const int iLength = snprintf(
        text, sizeof text,
        "%sFilename: %s\n\tProgram Name: %.48s\n\tProperties: Little Endian, 64-bit mode\n"
        "\tPlatform: Linux x86-64\n\tFileVersion: %d\n\tNode Number: %d\n\tProcess Id: %u\n"
        "\tMachine Id: 0x%08x\n\tNode ID:    0x%llx\n\tTrace Library Build Level: %.32s\n",
        index, trace.name(), header.program, header.uVersion, header.uNodeNumber, header.uPid,
        header.machineId, static_cast<unsigned long long>(header.uNode_ID), header.buildName);
    out.write({text, std::min(static_cast<size_t>(iLength), sizeof text - 1)});
}

void write_time_zone(floor_output& out, int iMinutesWest) {
    char text[80];
    const int iMinutes = -iMinutesWest;
    const int iLength =
        snprintf(text, sizeof text, "\t\t\t\t*** Formatting traces using TZ=UTC%c%02d:%02d ***\n",
                 iMinutes < 0 ? '-' : '+', std::abs(iMinutes) / 60, std::abs(iMinutes) % 60);
    out.write({text, static_cast<size_t>(iLength)});
}

} // namespace

int main(int argc, char** argv) {
    const bool bRaw = argc > 1 && std::strcmp(argv[1], "-r") == 0;
    const int iFirst = bRaw ? 2 : 1;
    const int iFiles = argc - iFirst;
    if (iFiles < 1) {
        fputs("Usage: kelvo_floor [-r] FILE...\n", stderr);
        return 1;
    }
    floor_output out;
    const auto files = std::make_unique<floor_trace[]>(static_cast<size_t>(iFiles));
    std::vector<floor_trace*> traces;
    for (int i = 0; i < iFiles; ++i) {
        floor_trace& trace = files[static_cast<size_t>(i)];
        trace.open(argv[iFirst + i], static_cast<unsigned>(i));
        write_summary(out, trace, i, iFiles == 1);
        if (trace.begin())
            traces.push_back(&trace);
    }
    const int iMinutesWest = files[0].header().tz_offset;
    write_time_zone(out, iMinutesWest);
    record_text text(iMinutesWest, iFiles > 1);
    if (bRaw)
        write_records<put_raw>(out, text, traces);
    else
        write_records<put_formatted>(out, text, traces);
    return 0;
}
