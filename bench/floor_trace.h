// One mapped trace and the walk over its records, oldest first.
#pragma once

#include "trace_file_fmt.h"
#include "trace_load.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

class floor_trace {
public:
    floor_trace() = default;
    floor_trace(const floor_trace&) = delete;
    floor_trace& operator=(const floor_trace&) = delete;
    ~floor_trace() {
        close();
    }

    /// Maps the file; ends the program when that is not possible.
    void open(const char* pPath, unsigned uFileIndex) {
        pName = pPath;
        uNumber = uFileIndex;
        const int fd = ::open(pPath, O_RDONLY | O_CLOEXEC);
        struct stat status {};
        if (fd < 0 || fstat(fd, &status) != 0)
            give_up("cannot be opened");
        uSize = static_cast<size_t>(status.st_size);
        void* const pMapped = mmap(nullptr, uSize, PROT_READ, MAP_SHARED, fd, 0);
        ::close(fd);
        if (uSize < sizeof fileHeader || pMapped == MAP_FAILED)
            give_up("cannot be mapped");
        pMap = static_cast<const std::byte*>(pMapped);
        madvise(pMapped, uSize, MADV_SEQUENTIAL);
        std::memcpy(&fileHeader, pMap, sizeof fileHeader);
        uTimeShift = fileHeader.timeInfo.timeinfo1 - fileHeader.timeInfo.timeinfo2;
    }

    void close() {
        if (pMap != nullptr)
            munmap(const_cast<std::byte*>(pMap), uSize);
        pMap = nullptr;
    }

    /// Stands on the oldest record. False when there is none.
    bool begin() {
        uAt = fileHeader.uOldestRecordOffset;
        uLeft = uSize - fileHeader.uOffset;
        uLength = 0;
        return step();
    }

    /// Goes to the next record that is printed. False at the end.
    bool step() {
        for (;;) {
            uLeft -= uLength;
            uAt += uLength;
            if (uAt == uSize) [[unlikely]]
                uAt = fileHeader.uOffset;
            if (uLeft < sizeof(trace_record_header)) [[unlikely]]
                return false;
            if (uAt > uSize - sizeof(trace_record_header)) [[unlikely]]
                give_up("is damaged");
            std::memcpy(&uLength, pMap + uAt, sizeof uLength);
            if (uLength < sizeof(trace_record_header) || uLength > uLeft || uLength > uSize - uAt)
                [[unlikely]]
                give_up("is damaged");
            uint16_t uFunction;
            std::memcpy(&uFunction, pMap + uAt + offsetof(trace_record_header, function),
                        sizeof uFunction);
            if (uFunction - 1U < TRC_FUNC_START) [[likely]]
                break;
        }
        std::memcpy(&uTime, pMap + uAt + offsetof(trace_record_header, timeStamp), sizeof uTime);
        uTime += uTimeShift;
        return true;
    }

    /// Has the processor fetch the record behind this one.
    void fetch_ahead() const {
        __builtin_prefetch(pMap + uAt + uLength);
        __builtin_prefetch(pMap + uAt + uLength + 64);
    }

    /// Of the record, nanoseconds since the epoch.
    uint64_t time() const {
        return uTime;
    }
    trace_bytes record() const {
        return {pMap + uAt, uLength};
    }
    uint32_t length() const {
        return uLength;
    }
    const trace_file_header& header() const {
        return fileHeader;
    }
    const char* name() const {
        return pName;
    }
    unsigned index() const {
        return uNumber;
    }

private:
    [[noreturn]] void give_up(const char* pWhy) const {
        fprintf(stderr, "kelvo_floor: %s %s\n", pName, pWhy);
        exit(1);
    }

    const std::byte* pMap = nullptr;
    size_t uSize = 0;
    size_t uAt = 0;   ///< offset of the record
    size_t uLeft = 0; ///< bytes of the ring from here on round to where the walk began
    uint64_t uTime = 0;
    uint64_t uTimeShift = 0;
    uint32_t uLength = 0;
    unsigned uNumber = 0;
    const char* pName = nullptr;
    trace_file_header fileHeader{};
};
