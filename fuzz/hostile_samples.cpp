#include "hostile_samples.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <iterator>

namespace {

constexpr cu_timeinfo TIME_BASE{1'700'000'000'000'000'000, 1'000};

/// A block of a data record, with its padding.
std::vector<std::byte> data_block(trace_bytes data) {
    std::vector<std::byte> block = raw_bytes(static_cast<int32_t>(data.size()));
    add_bytes(&block, data);
    block.resize((block.size() + 3) / 4 * 4);
    return block;
}

std::vector<std::byte> data_body() {
    std::vector<std::byte> body = raw_bytes(uint32_t{TRC_FUNC_DATA}, uint32_t{8});
    add_bytes(&body, data_block(raw_bytes(int32_t{-5})));
    add_bytes(&body, data_block(raw_bytes("text", '\0')));
    add_bytes(&body, data_block(raw_bytes(uint8_t{200})));
    add_bytes(&body, data_block(raw_bytes('c')));
    add_bytes(&body, data_block(raw_bytes(uint32_t{0xBEEF}, "block", '\0')));
    add_bytes(&body, data_block(raw_bytes("what is left")));
    add_bytes(&body, data_block(raw_bytes(int32_t{7}, int32_t{5}, 1.5, int32_t{-9}, int32_t{3})));
    add_bytes(&body, data_block(raw_bytes("no format for these bytes")));
    return body;
}

cu_error_arg_t error_argument(int32_t type, int64_t value) {
    cu_error_arg_t argument{};
    argument.cu_arg_type = type;
    argument.cu_arg_value.cu_arg_long_long = value;
    return argument;
}

std::vector<std::byte> error_body() {
    constexpr uint32_t ARGUMENTS = 4;
    constexpr uint32_t TEXTS = sizeof(trace_record_error) + ARGUMENTS * sizeof(cu_error_arg_t);
    constexpr std::string_view FUNCTION = "open", FILE_NAME = "disk.c", FFDC = "ffdc", NAME = "sda",
                               MESSAGE = "%s: %d of %lld, %5.2f%%\n";
    uint32_t uNext = TEXTS;
    const auto place = [&uNext](std::string_view text) {
        const uint32_t uAt = uNext;
        uNext += static_cast<uint32_t>(text.size()) + 1;
        return uAt;
    };
    const uint32_t uFunction = place(FUNCTION), uFile = place(FILE_NAME), uFfdc = place(FFDC),
                   uName = place(NAME), uMessage = place(MESSAGE);
    const auto half = std::bit_cast<int64_t>(0.5);
    return raw_bytes(
        uint32_t{TRC_FUNC_ERROR}, uint32_t{5}, uint32_t{321}, uFunction, uFile, uFfdc, uint32_t{1},
        uint32_t{2}, uint32_t{0}, uMessage, ARGUMENTS, error_argument(CU_ERROR_ARG_CHAR_STR, uName),
        error_argument(CU_ERROR_ARG_INT, 3), error_argument(CU_ERROR_ARG_LONG_LONG, 1L << 40),
        error_argument(CU_ERROR_ARG_DOUBLE, half), FUNCTION, '\0', FILE_NAME, '\0', FFDC, '\0',
        NAME, '\0', MESSAGE, '\0');
}

/// Bodies of the kinds that hold numbers only, by function code.
std::vector<std::byte> number_body(uint16_t function) {
    const uint32_t uId = function;
    switch (function) {
    case TRC_FUNC_ID:
        return raw_bytes(uId);
    case TRC_FUNC_INT32:
    case TRC_FUNC_UINT32:
        return raw_bytes(uId, int32_t{-3});
    case TRC_FUNC_INT32_2:
    case TRC_FUNC_UINT32_2:
        return raw_bytes(uId, int32_t{-3}, int32_t{70'000});
    case TRC_FUNC_INT64:
    case TRC_FUNC_UINT64:
        return raw_bytes(uId, int64_t{-4});
    case TRC_FUNC_INT64_2:
    case TRC_FUNC_UINT64_2:
        return raw_bytes(uId, int64_t{-4}, int64_t{1} << 40);
    case TRC_FUNC_VALUES:
        return raw_bytes(uId, uint32_t{6}, int32_t{1}, int32_t{2}, int32_t{3}, int32_t{4},
                         int32_t{5}, int32_t{0x41424344});
    case TRC_FUNC_VALUES64:
        return raw_bytes(uId, uint32_t{5}, int64_t{-1}, int64_t{2}, int64_t{3}, 4.0, 5.0);
    default:
        return {};
    }
}

/// Fills the file from `uAt` to `uEnd`; the last record is as long as what is
/// left. The records are numbered on from `*pNumber`.
void fill_with_records(raw_trace* pFile, uint32_t uAt, uint32_t uEnd, uint32_t* pNumber) {
    constexpr uint32_t SHORTEST = 40;
    while (uAt < uEnd) {
        const uint32_t uNumber = ++*pNumber;
        raw_record record = sample_of_kind(uNumber % 2 == 0 ? TRC_FUNC_STRING : TRC_FUNC_UINT32);
        record.seqNumber = 2 * uNumber;
        record.threadId = uNumber;
        record.timeStamp = 1'000'000ULL * uNumber;
        const auto uUsual = static_cast<uint32_t>(raw_record_bytes(record).size());
        const uint32_t uLength = uEnd - uAt < uUsual + SHORTEST ? uEnd - uAt : uUsual;
        record.body.resize(uLength - sizeof(trace_record_header));
        pFile->put(uAt, record);
        uAt += uLength;
    }
}

} // namespace

std::vector<std::byte> sample_body(uint16_t function) {
    const uint32_t uId = function;
    switch (function) {
    case TRC_FUNC_STRING:
        return raw_bytes("a text", '\0');
    case TRC_FUNC_DATA:
        return data_body();
    case TRC_FUNC_ERROR:
        return error_body();
    case TRC_FUNC_STRINGS:
        return raw_bytes(uId, uint32_t{4}, uint32_t{18}, "one", '\0', "two", '\0', "three", '\0',
                         "end", '\0');
    case TRC_FUNC_START:
        return raw_bytes(uId, uint32_t{4711}, TIME_BASE);
    case TRC_FUNC_RESTART:
        return raw_bytes(uId, uint32_t{4711}, TIME_BASE, "restarted", '\0');
    case TRC_FUNC_TIME_CALIBRATION:
        return raw_bytes(TIME_BASE);
    default:
        return number_body(function);
    }
}

raw_record sample_of_kind(uint16_t function) {
    return {.function = function, .compId = "_FUZ", .body = sample_body(function)};
}

raw_trace full_ring(std::span<const raw_record> records) {
    size_t uSize = sizeof(trace_file_header);
    for (const raw_record& record : records)
        uSize += sizeof(trace_record_header) + record.body.size();
    raw_trace file(static_cast<uint32_t>(uSize));
    memcpy(file.header.program, "sample", sizeof("sample"));
    memcpy(file.header.buildName, "level", sizeof("level"));
    memcpy(file.header.baseProgName, "base", sizeof("base"));
    file.header.timeInfo = TIME_BASE;
    uint32_t uNumber = 0;
    for (raw_record record : records) {
        ++uNumber;
        record.seqNumber = 2 * uNumber;
        record.timeStamp = 1'000'000ULL * uNumber;
        file.add(record);
    }
    return file;
}

raw_trace full_ring_of(std::span<const uint16_t> kinds) {
    std::vector<raw_record> records;
    std::transform(kinds.begin(), kinds.end(), std::back_inserter(records), sample_of_kind);
    return full_ring(records);
}

raw_trace wrapped_ring(uint32_t uSize) {
    constexpr uint32_t GAP = 60; // the filler between the newest and the oldest record
    raw_trace file(uSize);
    file.header.timeInfo = TIME_BASE;
    constexpr uint32_t AREA = sizeof(trace_file_header);
    const uint32_t uGapAt = AREA + (uSize - AREA) / 2;
    uint32_t uNumber = 0;
    fill_with_records(&file, uGapAt + GAP, uSize, &uNumber);
    fill_with_records(&file, AREA, uGapAt, &uNumber);
    file.put(uGapAt, raw_record{.function = TRC_FUNC_FILLER,
                                .seqNumber = TRC_SEQ_FILLER,
                                .body = std::vector<std::byte>(GAP - sizeof(trace_record_header))});
    file.header.uOldestRecordOffset = uGapAt;
    return file;
}
