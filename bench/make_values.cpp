// Makes traces whose records are 64 bytes long: seven numbers each.
//
//   kelvo_make_values DIRECTORY FILES RECORDS-OF-EACH interleave|sequential|groups
//
// With groups, some records in a row are in one file, the next in another, at
// random; then the files have so many records on the average. The template goes
// beside the traces. The floor has the same template compiled in.
#include "trace_writer.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

namespace {

constexpr char TEMPLATE[] = "1 \"job %u: %u bytes in %d us, state %08x%z\"\n";
constexpr uint64_t START_NS = 1'773'493'385'000'000'000; // 2026-03-14 13:03:05 UTC
constexpr uint64_t STEP_NS = 10'000;
constexpr uint32_t RECORD_LENGTH = 64;
constexpr uint32_t THREADS = 4;
constexpr uint64_t LONGEST_GROUP = 16;

/// Records of one file that follow each other `uStep` places apart in the order
/// of all records.
struct record_group {
    uint64_t uFirst;
    uint64_t uCount;
    uint64_t uStep = 1;
};

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

bool make_file(const std::string& path, uint32_t uIndex, const std::vector<record_group>& groups) {
    trace_writer_options options;
    uint64_t uRecords = 0;
    for (const record_group& group : groups)
        uRecords += group.uCount;
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
    uint64_t u = 0;
    for (const record_group& group : groups)
        for (uint64_t uInGroup = 0; uInGroup < group.uCount; ++uInGroup, ++u) {
            const uint32_t uAny = random.next();
            const uint32_t values[] = {static_cast<uint32_t>(u),
                                       uAny >> (uAny & 31),
                                       random.next() % 100'000,
                                       random.next(),
                                       random.next(),
                                       random.next(),
                                       random.next()};
            const uint32_t uThread = 0x1000 + (uIndex << 8) + static_cast<uint32_t>(u % THREADS);
            const uint64_t uTime = START_NS + (group.uFirst + uInGroup * group.uStep) * STEP_NS;
            if (writer.append_values({"_VAL", uThread, uTime}, 1, values) != TRACE_WRITER_OK)
                return false;
        }
    return true;
}

/// The records of each file.
std::vector<std::vector<record_group>> plan_files(uint32_t uFiles, uint64_t uRecords,
                                                  std::string_view times) {
    std::vector<std::vector<record_group>> files(uFiles);
    if (times == "groups") {
        random_numbers random{uFiles};
        for (uint64_t uCount, uAt = 0; uAt < uFiles * uRecords; uAt += uCount) {
            uCount = std::min(1 + random.next() % LONGEST_GROUP, uFiles * uRecords - uAt);
            files[random.next() % uFiles].push_back({uAt, uCount});
        }
    } else {
        const bool bInARow = times == "sequential";
        for (uint32_t i = 0; i < uFiles; ++i)
            files[i] = {{bInARow ? i * uRecords : i, uRecords, bInARow ? 1 : uFiles}};
    }
    return files;
}

} // namespace

int main(int argc, char** argv) {
    if (argc != 5) {
        fputs("Usage: kelvo_make_values DIRECTORY FILES RECORDS-OF-EACH "
              "interleave|sequential|groups\n",
              stderr);
        return 1;
    }
    const std::string directory = argv[1];
    const auto uFiles = static_cast<uint32_t>(strtoul(argv[2], nullptr, 10));
    const uint64_t uRecords = strtoull(argv[3], nullptr, 10);
    if (uFiles == 0 || uRecords > (UINT32_MAX - 1024) / RECORD_LENGTH) {
        fputs("kelvo_make_values: no trace file can be made so\n", stderr);
        return 1;
    }
    // A file that has no room on the disk would end this program by a signal only
    // when the disk is full.
    std::error_code error;
    if (std::filesystem::space(directory, error).available / RECORD_LENGTH / uFiles < uRecords) {
        fputs("kelvo_make_values: not enough room for so many files of so many records\n", stderr);
        return 1;
    }
    const auto files = plan_files(uFiles, uRecords, argv[4]);
    bool bGood = write_template(directory);
    for (uint32_t i = 0; bGood && i < uFiles; ++i) {
        char name[32];
        snprintf(name, sizeof name, "/values-%05u.trc", i);
        bGood = make_file(directory + name, i, files[i]);
    }
    if (!bGood)
        perror("kelvo_make_values: cannot make the traces");
    return bGood ? 0 : 1;
}
