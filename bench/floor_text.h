// The text of one record: its prefix, and its body by hard-coded templates.
#pragma once

#include "floor_digits.h"
#include "floor_trace.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <string_view>

/// Room for the text of a record: this, and for dumps 64 times its length; the
/// length itself is asked for on top.
inline constexpr size_t MAX_TEXT = 512 * 1024;

template <size_t N> char* put_literal(char* pOut, const char (&text)[N]) {
    std::memcpy(pOut, text, N - 1);
    return pOut + N - 1;
}

inline char* put_bytes(char* pOut, std::string_view text) {
    std::memcpy(pOut, text.data(), text.size());
    return pOut + text.size();
}

class record_text {
public:
    record_text(int iMinutesWest, bool bIndex)
        : bWithIndex(bIndex),
          uZoneNs(static_cast<uint64_t>(-int64_t{iMinutesWest}) * 60 * 1'000'000'000) {}

    /// "[00] 14:03:05.000000000 T(1000) _NUM " with the blank before the body.
    char* put_prefix(char* pOut, const floor_trace& trace) {
        char* pStart = pOut;
        const std::byte* const pRecord = trace.record().data();
        if (bWithIndex) {
            *pOut++ = '[';
            const uint32_t uIndex = trace.index();
            pOut = uIndex < 100 ? put_pair(pOut, uIndex) : put_decimal(pOut, uIndex);
            *pOut++ = ']';
            pStart = pOut - 4; // an index counts as two columns, also where it takes more
        }
        const uint64_t uTime = trace.time() + uZoneNs;
        if (uTime - uSecondNs >= 1'000'000'000) [[unlikely]]
            take_second(uTime);
        std::memcpy(pOut, second, sizeof second);
        pOut = put_nine(pOut + sizeof second, static_cast<uint32_t>(uTime - uSecondNs));
        pOut = put_literal(pOut, " T(");
        uint32_t uThread;
        std::memcpy(&uThread, pRecord + offsetof(trace_record_header, threadId), sizeof uThread);
        pOut = put_hex_right(pOut, uThread);
        *pOut++ = ')';
        *pOut++ = ' ';
        std::memcpy(pOut, pRecord + offsetof(trace_record_header, compId), 4);
        pOut[4] = ' ';
        pOut += 5;
        uIndent = static_cast<size_t>(pOut - pStart);
        return pOut;
    }

    /// A newline and the blanks up to where the body began.
    char* put_line_start(char* pOut) const {
        *pOut++ = '\n';
        std::memset(pOut, ' ', uIndent);
        return pOut + uIndent;
    }

private:
    void take_second(uint64_t uTime) {
        const uint64_t uSeconds = uTime / 1'000'000'000;
        uSecondNs = uSeconds * 1'000'000'000;
        const auto uOfDay = static_cast<uint32_t>(uSeconds % 86400);
        char* pOut = second;
        *pOut++ = ' ';
        pOut = put_pair(pOut, uOfDay / 3600);
        *pOut++ = ':';
        pOut = put_pair(pOut, uOfDay / 60 % 60);
        *pOut++ = ':';
        pOut = put_pair(pOut, uOfDay % 60);
        *pOut = '.';
    }

    bool bWithIndex;
    uint64_t uZoneNs;
    uint64_t uSecondNs = UINT64_MAX / 2; ///< where the second of `second` began
    size_t uIndent = 0;
    char second[10] = {}; ///< " 14:03:05."
};

/// A word of the record; the caller has tested that it is there.
inline uint32_t word_at(trace_bytes record, size_t uOffset) {
    uint32_t uWord;
    std::memcpy(&uWord, record.data() + uOffset, sizeof uWord);
    return uWord;
}

inline uint32_t component_of(const char (&text)[5]) {
    uint32_t uWord;
    std::memcpy(&uWord, text, sizeof uWord);
    return uWord;
}

[[noreturn]] inline void unknown_record() {
    fputs("kelvo_floor: a record that the benchmarks do not use\n", stderr);
    exit(1);
}

// Offsets of words in records.
inline constexpr size_t AT_COMPONENT = offsetof(trace_record_header, compId);
inline constexpr size_t AT_VALUES = sizeof(trace_record_values);
inline constexpr size_t AT_BLOCKS = sizeof(trace_record_data);

/// The body through its template, and the newline.
struct put_formatted {
    char* operator()(const record_text&, char* pOut, trace_bytes record) const {
        // Static, so that the comparison is with a constant.
        const uint32_t uComponent = word_at(record, AT_COMPONENT);
        if (uComponent == component_of("_VAL"))
            pOut = put_values(pOut, record);
        else if (uComponent == component_of("_NUM"))
            pOut = put_numbers(pOut, record);
        else if (uComponent == component_of("_STR"))
            pOut = put_strings(pOut, record);
        else if (uComponent == component_of("_PLN"))
            pOut = put_plain(pOut, record);
        else
            unknown_record();
        *pOut++ = '\n';
        return pOut;
    }

private:
    /// "job %u: %u bytes in %d us, state %08x%z"
    static char* put_values(char* pOut, trace_bytes record) {
        if (record.size() < AT_VALUES + 4 * sizeof(uint32_t))
            unknown_record();
        pOut = put_decimal(put_literal(pOut, "job "), word_at(record, AT_VALUES));
        pOut = put_decimal(put_literal(pOut, ": "), word_at(record, AT_VALUES + 4));
        pOut = put_signed(put_literal(pOut, " bytes in "), word_at(record, AT_VALUES + 8));
        return put_hex_eight(put_literal(pOut, " us, state "), word_at(record, AT_VALUES + 12));
    }

    /// "item %u, %d units at %d cents, from %s"
    static char* put_numbers(char* pOut, trace_bytes record) {
        if (record.size() < AT_BLOCKS + 3 * 8 + 4)
            unknown_record();
        pOut = put_decimal(put_literal(pOut, "item "), word_at(record, AT_BLOCKS + 4));
        pOut = put_signed(put_literal(pOut, ", "), word_at(record, AT_BLOCKS + 12));
        pOut = put_signed(put_literal(pOut, " units at "), word_at(record, AT_BLOCKS + 20));
        pOut = put_literal(pOut, " cents, from ");
        const size_t uString = word_at(record, AT_BLOCKS + 24);
        return put_bytes(pOut, load_string(load_run(record, AT_BLOCKS + 28, uString), 0));
    }

    /// "%s: %s"
    static char* put_strings(char* pOut, trace_bytes record) {
        const std::string_view first = load_string(record, sizeof(trace_record_strings));
        pOut = put_literal(put_bytes(pOut, first), ": ");
        return put_bytes(pOut,
                         load_string(record, sizeof(trace_record_strings) + first.size() + 1));
    }

    /// "number %u"
    static char* put_plain(char* pOut, trace_bytes record) {
        if (record.size() < sizeof(trace_record_uint32))
            unknown_record();
        return put_decimal(put_literal(pOut, "number "),
                           word_at(record, offsetof(trace_record_uint32, value)));
    }
};

/// The body as kelvo -r writes it.
struct put_raw {
    char* operator()(const record_text& text, char* pOut, trace_bytes record) const {
        uint16_t uFunction;
        std::memcpy(&uFunction, record.data() + offsetof(trace_record_header, function),
                    sizeof uFunction);
        if (record.size() < AT_VALUES || record.size() > MAX_TEXT / 64)
            unknown_record();
        pOut = put_hex_eight(put_literal(pOut, "id=0x"), word_at(record, 28));
        if (uFunction == TRC_FUNC_VALUES)
            pOut = put_values(text, pOut, record);
        else if (uFunction == TRC_FUNC_DATA)
            pOut = put_blocks(text, pOut, record);
        else
            unknown_record();
        *pOut++ = '\n';
        return pOut;
    }

private:
    static char* put_values(const record_text& text, char* pOut, trace_bytes record) {
        const uint32_t uCount = std::min(word_at(record, AT_VALUES - 4),
                                         static_cast<uint32_t>((record.size() - AT_VALUES) / 4));
        const bool bLines = uCount > 4;
        for (uint32_t i = 0; i < uCount; ++i) {
            if (bLines && i % 4 == 0)
                pOut = text.put_line_start(pOut);
            else
                *pOut++ = ' ';
            *pOut++ = '[';
            pOut = put_literal(put_decimal(pOut, i), "]=0x");
            pOut = put_hex_eight(pOut, word_at(record, AT_VALUES + 4 * size_t{i}));
        }
        return pOut;
    }

    static char* put_blocks(const record_text& text, char* pOut, trace_bytes record) {
        const uint32_t uBlocks = word_at(record, AT_BLOCKS - 4);
        size_t uAt = AT_BLOCKS;
        for (uint32_t i = 0; i < uBlocks && record.size() - uAt >= 4; ++i) {
            const size_t uLength = word_at(record, uAt);
            const size_t uStep = 4 + ((uLength + 3) & ~size_t{3});
            if (uStep > record.size() - uAt)
                unknown_record();
            pOut = put_literal(text.put_line_start(pOut), "----------------- Data Block ");
            pOut = put_literal(put_decimal(pOut, i), " ----------------");
            pOut = put_dump(text, pOut, record.subspan(uAt + 4, uLength));
            uAt += uStep;
        }
        return pOut;
    }

    static char* put_dump(const record_text& text, char* pOut, trace_bytes data) {
        for (size_t uLine = 0; uLine < data.size(); uLine += 16) {
            const trace_bytes line = load_run(data, uLine, 16);
            pOut = put_literal(text.put_line_start(pOut), "0x");
            pOut = put_hex_eight(pOut, static_cast<uint32_t>(uLine));
            *pOut++ = ':';
            // The groups of hexadecimal digits, then the characters.
            std::memset(pOut, ' ', 36 + 2 + 16);
            char* pHex = pOut;
            char* pChar = pOut + 38;
            for (size_t i = 0; i < line.size(); ++i) {
                pHex += i % 4 == 0;
                const auto uByte = std::to_integer<uint8_t>(line[i]);
                pHex = put_hex_pair(pHex, uByte);
                *pChar++ = uByte >= 0x20 && uByte <= 0x7F ? static_cast<char>(uByte) : '.';
            }
            pOut[37] = '|';
            pOut[54] = '|';
            pOut += 55;
        }
        return pOut;
    }
};
