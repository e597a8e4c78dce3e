// Makes traces whose records are 64 bytes long: seven numbers each.
//
//   kelvo_make_values DIRECTORY FILES RECORDS interleave|sequential
//
// RECORDS is per file. The template goes beside the traces. The floor has the
// same template compiled in.
#include "trace_writer.h"

#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

namespace {

constexpr char TEMPLATE[] = "1 \"job %u: %u bytes in %d us, state %08x%z\"\n";
constexpr uint64_t START_NS = 1'773'493'385'000'000'000; // 2026-03-14 13:03:05 UTC
constexpr uint64_t STEP_NS = 10'000;
constexpr uint32_t RECORD_LENGTH = 64;
constexpr uint32_t THREADS = 4;

/// Numbers of very different lengths, the same for every run.
struct random_numbers {
    uint64_t uState;
    uint32_t next() {
        uState = uState * 6364136223846793005 + 1442695040888963407;
        return static_cast<uint32_t>(uState >> 32);
    }
};

bool write_template(const std::string& directory) {
    FILE* const pFile = fopen((directory + "/_VAL.tpl").c_str(), "w");
    const bool bGood = pFile != nullptr && fputs(TEMPLATE, pFile) >= 0;
    return pFile != nullptr && fclose(pFile) == 0 && bGood;
}

bool make_file(const std::string& path, uint32_t uIndex, uint64_t uRecords, uint64_t uFirstNs,
               uint64_t uStepNs) {
    trace_writer_options options;
    // Room behind the records, so that the oldest ones stay.
    options.uFileSize = static_cast<uint32_t>(MIN_HDR_SIZE_FOR_TZ + RECORD_LENGTH * uRecords + 128);
    options.uPid = 4000 + uIndex;
    options.program = "/usr/bin/sample";
    options.baseProgName = "sample";
    options.tz_offset = -60;
    trace_writer writer;
    if (writer.create(path.c_str(), options) != TRACE_WRITER_OK)
        return false;
    random_numbers random{uIndex};
    for (uint64_t u = 0; u < uRecords; ++u) {
        const uint32_t uAny = random.next();
        const uint32_t values[] = {static_cast<uint32_t>(u),
                                   uAny >> (uAny & 31),
                                   random.next() % 100'000,
                                   random.next(),
                                   random.next(),
                                   random.next(),
                                   random.next()};
        const uint32_t uThread = 0x1000 + (uIndex << 8) + static_cast<uint32_t>(u % THREADS);
        if (writer.append_values({"_VAL", uThread, uFirstNs + u * uStepNs}, 1, values) !=
            TRACE_WRITER_OK)
            return false;
    }
    return true;
}

} // namespace

int main(int argc, char** argv) {
    if (argc != 5) {
        fputs("Usage: kelvo_make_values DIRECTORY FILES RECORDS interleave|sequential\n", stderr);
        return 1;
    }
    const std::string directory = argv[1];
    const auto uFiles = static_cast<uint32_t>(strtoul(argv[2], nullptr, 10));
    const uint64_t uRecords = strtoull(argv[3], nullptr, 10);
    const bool bSequential = std::string_view(argv[4]) == "sequential";
    if (uFiles == 0 || uRecords > (UINT32_MAX - 1024) / RECORD_LENGTH) {
        fputs("kelvo_make_values: no trace file can be made so\n", stderr);
        return 1;
    }
    bool bGood = write_template(directory);
    for (uint32_t i = 0; bGood && i < uFiles; ++i) {
        char name[32];
        snprintf(name, sizeof name, "/values-%04u.trc", i);
        bGood = make_file(directory + name, i, uRecords,
                          START_NS + (bSequential ? i * uRecords : i) * STEP_NS,
                          bSequential ? STEP_NS : STEP_NS * uFiles);
    }
    if (!bGood)
        perror("kelvo_make_values: cannot make the traces");
    return bGood ? 0 : 1;
}
