#include "ring.h"

#include <array>
#include <cstdio>
#include <ctime>
#include <thread>

namespace {

using namespace std::chrono_literals;

constexpr uint32_t MOST_VALUES = 4;
constexpr uint32_t LONGEST = sizeof(trace_record_header) + 8 + MOST_VALUES * 8;
constexpr uint32_t GAPS = 256; // what the gap and an end that is left over may take
constexpr uint32_t FEWEST_AHEAD = 16;
constexpr auto ROOM_INTERVAL = 50us;
constexpr auto READER_TIMEOUT = 10s;

uint64_t time_of_day() {
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
}

uint32_t load_shared(const uint32_t& word) {
    return __atomic_load_n(&word, __ATOMIC_ACQUIRE);
}

bool make_template(const std::string& sPath) {
    FILE* const pFile = fopen(sPath.c_str(), "w");
    if (pFile == nullptr)
        return false;
    const bool bWritten = fputs("1 \"#%llu%z\"\n", pFile) >= 0;
    return fclose(pFile) == 0 && bWritten;
}

} // namespace

bool soak_ring::make(const std::string& sDirectory, uint32_t uSize) {
    sPath = sDirectory + "/ring.trc";
    if (uSize < sizeof(trace_file_header) + GAPS + FEWEST_AHEAD * LONGEST) {
        fprintf(stderr, "kelvo_soak: the ring is too small\n");
        return false;
    }
    m_uMostAhead = (uSize - static_cast<uint32_t>(sizeof(trace_file_header)) - GAPS) / LONGEST;
    if (make_template(sDirectory + "/_SOK.tpl") &&
        m_writer.create(sPath.c_str(), {.uFileSize = uSize}) == TRACE_WRITER_OK) {
        m_pHeader = reinterpret_cast<const trace_file_header*>(m_writer.mapping().data());
        return true;
    }
    perror(sPath.c_str());
    return false;
}

bool soak_ring::wait_for_reader() {
    const auto end = std::chrono::steady_clock::now() + READER_TIMEOUT;
    while (std::chrono::steady_clock::now() < end) {
        m_writer.poll();
        if (load_shared(m_pHeader->uSeqLock) != TRC_SEQ_NO_READER &&
            load_shared(m_pHeader->uTailReq) == 0)
            return true;
        std::this_thread::sleep_for(1ms);
    }
    fprintf(stderr, "kelvo_soak: nobody reads %s\n", sPath.c_str());
    return false;
}

/// False when the reader has gone.
bool soak_ring::wait_for_room() {
    for (;;) {
        const uint32_t uReaderAt = load_shared(m_pHeader->uSeqLock);
        if (uReaderAt == TRC_SEQ_NO_READER || bStop)
            return false;
        if ((m_writer.next_seq_number() - uReaderAt) / 2 < m_uMostAhead)
            return true;
        std::this_thread::sleep_for(ROOM_INTERVAL);
    }
}

void soak_ring::append(uint64_t uNumber) {
    const std::array<uint64_t, MOST_VALUES> values{uNumber};
    const uint32_t uOldest = m_pHeader->uOldestRecordOffset;
    const trace_origin origin{"_SOK", static_cast<uint32_t>(uNumber % 3), time_of_day()};
    if (m_writer.append_values64(origin, 1, {values.data(), 1 + uNumber % MOST_VALUES}) !=
        TRACE_WRITER_OK)
        ++uDropped;
    if (m_pHeader->uOldestRecordOffset < uOldest)
        ++uWraps;
}

void soak_ring::write(uint64_t uRecords, std::chrono::steady_clock::time_point end) {
    for (uint64_t uNumber = 1; uNumber <= uRecords && wait_for_room(); ++uNumber) {
        if (uNumber % 256 == 0 && std::chrono::steady_clock::now() >= end)
            break;
        append(uNumber);
        uWritten = uNumber;
    }
    bDone = true;
}
