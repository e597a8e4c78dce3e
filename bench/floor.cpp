// The floor: what kelvo's output costs at the least.
//
//   kelvo_floor [-r] FILE...
//
// Writes, byte for byte, what kelvo writes for traces of the components that
// the benchmarks use, in one thread and one loop over the mapped files. Their
// templates are compiled in; there are no threads, no queue, no copies of
// records, no nesting, no locks on files. Checked is only what keeps a walk
// inside its mapping, so a damaged file ends the program.
#include "floor_output.h"
#include "floor_text.h"
#include "floor_trace.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <memory>
#include <vector>

namespace {

/// One number that the merge compares in place of the trace behind it.
struct merge_head {
    uint64_t uTime;
    floor_trace* pTrace;
};

/// Makes `head` the new top of the heap of `uSize` heads, or the entry below
/// which it belongs.
void replace_top(merge_head* pHeads, size_t uSize, const merge_head& head) {
    size_t uHole = 0;
    for (size_t uChild = 1; uChild < uSize; uChild = 2 * uHole + 1) {
        const size_t uRight = std::min(uChild + 1, uSize - 1);
        uChild = pHeads[uRight].uTime < pHeads[uChild].uTime ? uRight : uChild;
        if (head.uTime <= pHeads[uChild].uTime)
            break;
        pHeads[uHole] = pHeads[uChild];
        uHole = uChild;
    }
    pHeads[uHole] = head;
}

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

/// Writes all records of all traces in the order of their times. `traces` are
/// sorted by their first record; one that has not begun costs nothing.
template <class put_body>
void write_records(floor_output& out, record_text& text, std::vector<floor_trace*> traces) {
    std::vector<merge_head> heads(traces.size());
    size_t uHeads = 0;
    size_t uNext = 0;
    while (uHeads != 0 || uNext != traces.size()) {
        const bool bBegin =
            uNext != traces.size() && (uHeads == 0 || traces[uNext]->time() < heads[0].uTime);
        if (bBegin) {
            heads[uHeads++] = {traces[uNext]->time(), traces[uNext]};
            ++uNext;
            std::push_heap(heads.data(), heads.data() + uHeads,
                           [](const auto& a, const auto& b) { return a.uTime > b.uTime; });
            continue;
        }
        floor_trace& trace = *heads[0].pTrace;
        uint64_t uUntil = uNext != traces.size() ? traces[uNext]->time() : UINT64_MAX;
        for (size_t u = 1; u < std::min<size_t>(uHeads, 3); ++u)
            uUntil = std::min(uUntil, heads[u].uTime);
        if (write_run<put_body>(out, text, trace, uUntil)) {
            trace.fetch_ahead();
            replace_top(heads.data(), uHeads, {trace.time(), &trace});
        } else {
            trace.close();
            --uHeads;
            replace_top(heads.data(), uHeads, heads[uHeads]);
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
    std::stable_sort(traces.begin(), traces.end(),
                     [](const auto* pA, const auto* pB) { return pA->time() < pB->time(); });
    record_text text(iMinutesWest, iFiles > 1);
    if (bRaw)
        write_records<put_raw>(out, text, traces);
    else
        write_records<put_formatted>(out, text, traces);
    return 0;
}
