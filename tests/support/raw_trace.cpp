#include "raw_trace.h"

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iterator>

void add_bytes(std::vector<std::byte>* pBytes, trace_bytes more) {
    const size_t uEnd = pBytes->size();
    pBytes->resize(uEnd + more.size());
    std::copy(more.begin(), more.end(), pBytes->begin() + static_cast<ptrdiff_t>(uEnd));
}

std::vector<std::byte> raw_record_bytes(const raw_record& record) {
    trace_record_header header{};
    header.length = static_cast<uint32_t>(
        record.length < 0 ? static_cast<int64_t>(sizeof(header) + record.body.size())
                          : record.length);
    header.function = record.function;
    header.reserved = record.reserved;
    header.seqNumber = record.seqNumber;
    memcpy(header.compId, record.compId.data(),
           std::min(record.compId.size(), sizeof(header.compId)));
    header.threadId = record.threadId;
    header.timeStamp = record.timeStamp;
    std::vector<std::byte> bytes = raw_bytes(header);
    add_bytes(&bytes, record.body);
    return bytes;
}

raw_trace::raw_trace(uint32_t uSize) : content(uSize) {
    header.uProperties = TRC_PROP_LITTLE_ENDIAN | TRC_PROP_ADDR_64;
    header.uPlatform = 2;
    header.uVersion = TRC_MAX_VERSION;
    header.uFlags = TRC_FLAG_TAIL_ACK;
    header.uOffset = sizeof(trace_file_header);
    header.uSeqLock = TRC_SEQ_NO_READER;
    header.uActualFileSize = uSize;
    header.uOldestRecordOffset = header.uOffset;
    header.tz_offset = TRC_TZ_NOT_RECORDED;
}

raw_trace& raw_trace::put(uint32_t uAt, trace_bytes bytes) {
    if (uAt < content.size())
        std::copy_n(bytes.begin(), std::min(bytes.size(), content.size() - uAt),
                    content.begin() + uAt);
    return *this;
}

raw_trace& raw_trace::put(uint32_t uAt, const raw_record& record) {
    const std::vector<std::byte> bytes = raw_record_bytes(record);
    uEnd = uAt + static_cast<uint32_t>(bytes.size());
    return put(uAt, bytes);
}

uint32_t raw_trace::add(const raw_record& record) {
    const uint32_t uAt = end();
    put(uAt, record);
    return uAt;
}

uint32_t raw_trace::add_filler(uint32_t uLength, uint32_t seqNumber) {
    raw_record filler{.function = TRC_FUNC_FILLER, .seqNumber = seqNumber};
    filler.body.resize(uLength > sizeof(trace_record_header) ? uLength - sizeof(trace_record_header)
                                                             : 0);
    filler.length = uLength;
    return add(filler);
}

uint32_t raw_trace::add_rest() {
    return add_filler(static_cast<uint32_t>(content.size()) - end());
}

std::vector<std::byte> raw_trace::bytes() const {
    std::vector<std::byte> result = content;
    const size_t uSize = std::min<size_t>({sizeof(header), uHeaderBytes, result.size()});
    std::copy_n(std::as_bytes(std::span(&header, 1)).begin(), uSize, result.begin());
    return result;
}

bool raw_trace::write(const std::string& path) const {
    return write_file(path, bytes());
}

bool write_file(const std::string& path, trace_bytes bytes) {
    std::ofstream file(path, std::ios::binary);
    file.write(reinterpret_cast<const char*>(bytes.data()), std::ssize(bytes));
    file.close();
    return file.good();
}

std::vector<std::byte> read_file(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    const std::string sText{std::istreambuf_iterator<char>(file), {}};
    return raw_bytes(sText);
}
