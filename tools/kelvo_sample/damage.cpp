#include "damage.h"

#include "trace_file_fmt.h"
#include "trace_load.h"

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <vector>

namespace {

using file_bytes = std::vector<std::byte>;

constexpr uint32_t MISSING_RECORDS = 5;
constexpr uint16_t NO_FUNCTION = 18;
constexpr size_t FUNCTION = offsetof(trace_record_header, function);
constexpr size_t SEQ_NUMBER = offsetof(trace_record_header, seqNumber);

template <class T> void store(file_bytes* pFile, size_t uAt, T value) {
    std::ranges::copy(std::as_bytes(std::span(&value, 1)),
                      pFile->begin() + static_cast<ptrdiff_t>(uAt));
}

/// Offsets of the records of a sound ring, the oldest first.
std::vector<uint32_t> records_of(const file_bytes& file) {
    const auto header = load<trace_file_header>(file, 0);
    std::vector<uint32_t> records;
    uint32_t uAt = header.uOldestRecordOffset;
    do {
        const auto record = load<trace_record_header>(file, uAt);
        if (record.function != TRC_FUNC_FILLER)
            records.push_back(uAt);
        uAt = record.length < file.size() - uAt ? uAt + record.length : header.uOffset;
    } while (uAt != header.uOldestRecordOffset);
    return records;
}

/// As when the machine went down between the last two stores of an append: the
/// record has its place, but its number and a page with half of its body are
/// lost, and nobody closed the file.
void tear(file_bytes* pFile, uint32_t uRecord) {
    const auto record = load<trace_record_header>(*pFile, uRecord);
    const uint32_t uLost = (record.length - TRC_MIN_RECORD) / 2;
    std::fill_n(pFile->begin() + uRecord + record.length - uLost, uLost, std::byte{0});
    store(pFile, uRecord + SEQ_NUMBER, TRC_SEQ_FILLER);
    store(pFile, offsetof(trace_file_header, uFlags), uint16_t{0});
}

void damage_bytes(file_bytes* pFile, sample_damage damage) {
    const std::vector<uint32_t> records = records_of(*pFile);
    const size_t uMiddle = records.size() / 2;
    switch (damage) {
    case sample_damage::GAP:
        for (const uint32_t uAt : std::span(records).subspan(uMiddle)) {
            const auto uNumber = load<uint32_t>(*pFile, uAt + SEQ_NUMBER);
            store(pFile, uAt + SEQ_NUMBER, uNumber + 2 * MISSING_RECORDS);
        }
        break;
    case sample_damage::TORN:
        tear(pFile, records.back());
        break;
    case sample_damage::FUNCTION:
        store(pFile, records[uMiddle] + FUNCTION, NO_FUNCTION);
        break;
    case sample_damage::FILLERS:
        for (const uint32_t uAt : records) {
            store(pFile, uAt + FUNCTION, uint16_t{TRC_FUNC_FILLER});
            store(pFile, uAt + SEQ_NUMBER, TRC_SEQ_FILLER);
        }
        break;
    case sample_damage::HEADER:
        store(pFile, offsetof(trace_file_header, uActualFileSize),
              static_cast<uint32_t>(pFile->size() * 2));
        break;
    case sample_damage::NONE:
        break;
    }
}

} // namespace

bool damage_file(const std::string& path, sample_damage damage) {
    std::fstream file(path, std::ios::in | std::ios::out | std::ios::binary | std::ios::ate);
    file_bytes bytes(file ? static_cast<size_t>(file.tellg()) : 0);
    file.seekg(0).read(reinterpret_cast<char*>(bytes.data()), std::ssize(bytes));
    if (file)
        damage_bytes(&bytes, damage);
    file.seekp(0).write(reinterpret_cast<const char*>(bytes.data()), std::ssize(bytes));
    file.close();
    if (!file)
        fprintf(stderr, "kelvo_sample: cannot damage %s\n", path.c_str());
    return !file.fail();
}
