// The ring that is followed, and the thread that fills it.
#pragma once

#include "trace_writer.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <string>

/// Writes records 1, 2, 3... of uneven lengths, as fast as the reader lets it:
/// it never goes further ahead of the reader's position (uSeqLock) than the ring
/// holds of the longest records. So the writer has no reason to drop a record,
/// and one that does not come out was lost by the reader.
class soak_ring {
public:
    /// Makes the file, which takes `uSize` bytes, and the template of its records
    /// in the directory. False, with a message, when that fails.
    bool make(const std::string& sDirectory, uint32_t uSize);

    /// Waits until a reader has found its first record. False when none comes.
    bool wait_for_reader();

    /// Writes up to `uRecords` records or until `end`, or until bStop. To be run
    /// by a thread of its own; true in bDone says that it is done.
    void write(uint64_t uRecords, std::chrono::steady_clock::time_point end);

    std::string sPath;
    std::atomic<bool> bStop{false};
    std::atomic<bool> bDone{false};
    std::atomic<uint64_t> uWritten{0}; ///< numbers given to records so far
    uint64_t uWraps = 0;               ///< once it is done
    uint64_t uDropped = 0;             ///< once it is done

private:
    bool wait_for_room();
    void append(uint64_t uNumber);

    trace_writer m_writer;
    const trace_file_header* m_pHeader = nullptr;
    uint32_t m_uMostAhead = 0; ///< records
};
