// Positions in a mapped file, as 64-bit offsets from its start. A step of any
// 32-bit length from any position inside the mapping is a number here, so it is
// tested before a pointer is made of it.
#pragma once

#include "kelvo.h"

/// End of the mapping.
inline uint64_t ring_end(const trace_file* pTraceFile) {
    return reinterpret_cast<uintptr_t>(pTraceFile->pMapEnd) -
           reinterpret_cast<uintptr_t>(pTraceFile->pHeader);
}

/// Start of the record area; may lie beyond the end when the file is damaged.
inline uint64_t ring_start(const trace_file* pTraceFile) {
    return reinterpret_cast<uintptr_t>(pTraceFile->pWrap) -
           reinterpret_cast<uintptr_t>(pTraceFile->pHeader);
}

/// Size of the record area; 0 when it starts beyond the end.
inline uint64_t ring_size(const trace_file* pTraceFile) {
    const uint64_t uStart = ring_start(pTraceFile);
    const uint64_t uEnd = ring_end(pTraceFile);
    return uStart < uEnd ? uEnd - uStart : 0;
}

/// Offset of a position; huge when it lies before the start of the file.
inline uint64_t ring_offset(const trace_file* pTraceFile, const trace_record_header* pRec) {
    return reinterpret_cast<uintptr_t>(pRec) - reinterpret_cast<uintptr_t>(pTraceFile->pHeader);
}

/// The position at an offset. Outside the mapping, where no pointer could be
/// moved to, it is good for a message only.
inline trace_record_header* ring_position(const trace_file* pTraceFile, uint64_t uOffset) {
    return reinterpret_cast<trace_record_header*>(reinterpret_cast<uintptr_t>(pTraceFile->pHeader) +
                                                  uOffset);
}

/// Where the record of `uLength` bytes at `uOffset` is followed by the next one: at its
/// end, or at the start of the area when it ends with the file. Not yet tested.
inline uint64_t ring_next(const trace_file* pTraceFile, uint64_t uOffset, uint32_t uLength) {
    const uint64_t uNext = uOffset + uLength;
    return uNext != ring_end(pTraceFile) ? uNext : ring_start(pTraceFile);
}

/// Lets the record stand for the `uSize` bytes of a trace file at `pBytes`; positions
/// go by the low 32 bits of the size. The record area begins where the header says.
inline void ring_map_over(trace_file* pTraceFile, void* pBytes, uint64_t uSize) {
    pTraceFile->uSize = static_cast<uint32_t>(uSize);
    pTraceFile->pHeader = static_cast<trace_file_header*>(pBytes);
    pTraceFile->pMapEnd = ring_position(pTraceFile, pTraceFile->uSize);
    pTraceFile->pWrap = ring_position(pTraceFile, pTraceFile->pHeader->uOffset);
}

/// Whether a record header at `uOffset` lies wholly inside the record area.
inline bool ring_holds_header(const trace_file* pTraceFile, uint64_t uOffset) {
    const uint64_t uEnd = ring_end(pTraceFile);
    return uOffset >= ring_start(pTraceFile) && uOffset <= uEnd &&
           uEnd - uOffset >= sizeof(trace_record_header);
}

/// Whether a record at `uOffset` covers the words of the file header that the
/// reader writes, as in a damaged file whose record area begins inside its
/// header. Such a record changes while it is walked over.
inline bool ring_covers_reader_words(uint64_t uOffset) {
    return uOffset < offsetof(trace_file_header, uTailReq) + sizeof(trace_file_header::uTailReq);
}
