// Every byte of the headers set to every value, and the edges of the words that
// lead through a file, in all their combinations. That reading ends, stays
// inside the file and leaves it alone is checked by the harness.
#include "hostile_harness.h"
#include "hostile_samples.h"

#include <gtest/gtest.h>

#include <cstring>
#include <numeric>
#include <set>

namespace {

constexpr uint32_t AREA = sizeof(trace_file_header);
constexpr size_t HEADER = sizeof(trace_record_header);

class Sweep : public testing::Test {
protected:
    static void SetUpTestSuite() {
        set_up_hostile_runs();
    }
};

hostile_result read_quietly(trace_bytes file, const hostile_options& options = {}) {
    const redirected_output dropped;
    return read_hostile_file(file, options);
}

template <class T> void store(std::vector<std::byte>* pFile, size_t uAt, T value) {
    if (lies_inside(*pFile, uAt, sizeof(T)))
        memcpy(pFile->data() + uAt, &value, sizeof(T));
}

/// Whether a sound little-endian file stays one when the header byte changes.
bool stays_acceptable(const std::vector<std::byte>& file, size_t uAt, uint8_t uValue) {
    const auto header = load<trace_file_header>(file, 0);
    switch (uAt) {
    case offsetof(trace_file_header, uProperties):
        return (uValue & 0x3F) == 0;
    case offsetof(trace_file_header, uPlatform):
        return uValue == 2 || uValue == 9;
    default:
        return header.uVersion <= 6 && header.uActualFileSize == file.size() &&
               uint64_t{header.uOffset} + HEADER <= file.size();
    }
}

TEST_F(Sweep, EveryByteOfTheFileHeader) {
    constexpr uint16_t KINDS[] = {TRC_FUNC_STRING, TRC_FUNC_DATA, TRC_FUNC_INT32};
    std::vector<std::byte> file = full_ring_of(KINDS).bytes();
    for (size_t i = 0; i < AREA; ++i) {
        const std::byte original = file[i];
        for (unsigned int uValue = 0; uValue < 256; ++uValue) {
            file[i] = static_cast<std::byte>(uValue);
            ASSERT_EQ(read_quietly(file).bAccepted,
                      stays_acceptable(file, i, static_cast<uint8_t>(uValue)))
                << "byte " << i << " = " << uValue;
        }
        file[i] = original;
    }
}

/// Bytes of a record that say nothing about where the next one stands and
/// whether this one can be read.
bool does_not_lead_the_walk(size_t uAt) {
    return (uAt >= offsetof(trace_record_header, reserved) &&
            uAt < offsetof(trace_record_header, seqNumber)) ||
           uAt >= offsetof(trace_record_header, threadId);
}

/// In the header every value, in the body those at edges.
TEST_F(Sweep, EveryByteOfARecordOfEachKind) {
    std::vector<unsigned int> all(256);
    std::iota(all.begin(), all.end(), 0);
    const std::vector<unsigned int> edges = {0x00, 0x01, 0x1B, 0x7F, 0x80, 0xFF};
    hostile_options options;
    options.bEveryKind = true;
    for (const uint16_t kind : SAMPLE_KINDS) {
        const uint16_t kinds[] = {kind, TRC_FUNC_STRING};
        std::vector<std::byte> file = full_ring_of(kinds).bytes();
        const hostile_result sound = read_quietly(file, options);
        ASSERT_TRUE(sound.bAccepted && sound.end == hostile_end::NO_MORE);
        for (size_t i = 0; i < HEADER + sample_body(kind).size(); ++i) {
            const std::byte original = file[AREA + i];
            for (const unsigned int uValue : i < HEADER ? all : edges) {
                file[AREA + i] = static_cast<std::byte>(uValue);
                const hostile_result result = read_quietly(file, options);
                if (does_not_lead_the_walk(i)) {
                    ASSERT_TRUE(result.end == sound.end && result.uWritten == sound.uWritten)
                        << "kind " << kind << ", byte " << i << " = " << uValue;
                }
            }
            file[AREA + i] = original;
        }
    }
}

/// Values at which a comparison of offsets in a file of `uSize` bytes could go
/// wrong.
std::set<uint32_t> edges(uint32_t uSize) {
    std::set<uint32_t> values = {0, 1, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF};
    const uint32_t uHeader = HEADER;
    for (const uint32_t uNear :
         {uHeader, AREA, uSize - AREA, uSize - uHeader, uSize, uint32_t{0} - uHeader})
        values.insert({uNear - 1, uNear, uNear + 1});
    return values;
}

/// All combinations: of the file header's offsets, and of a length and a kind of
/// the record at the oldest position or at the start of the area.
TEST_F(Sweep, EdgesOfOffsetsAndLengths) {
    constexpr uint16_t KINDS[] = {TRC_FUNC_INT32, TRC_FUNC_STRINGS, TRC_FUNC_INT32};
    const std::vector<std::byte> sound = full_ring_of(KINDS).bytes();
    const auto uSize = static_cast<uint32_t>(sound.size());
    const std::set<uint32_t> values = edges(uSize);
    hostile_options options;
    options.uForms = FORM_RAW;
    options.startRecords = 1;
    const auto read = [&](uint32_t uOffset, uint32_t uOldest, uint32_t uAt, uint32_t uLength) {
        for (const uint16_t function : {TRC_FUNC_FILLER, TRC_FUNC_INT32, TRC_FUNC_WRITING}) {
            std::vector<std::byte> file = sound;
            store(&file, offsetof(trace_file_header, uOffset), uOffset);
            store(&file, offsetof(trace_file_header, uOldestRecordOffset), uOldest);
            store(&file, uAt, uLength);
            store(&file, size_t{uAt} + offsetof(trace_record_header, function), function);
            options.startOptions = uLength % 2 == 0 ? START_NONE : START_RECORDS_FROM_END;
            const hostile_result result = read_quietly(file, options);
            // What lies before the record area, or leaves no room, is no position.
            if (uOldest < uOffset || uint64_t{uOldest} + HEADER > uSize) {
                ASSERT_TRUE(result.end == hostile_end::CORRUPT && result.uWritten == 0)
                    << "uOffset " << uOffset << ", uOldestRecordOffset " << uOldest;
            }
        }
    };
    for (const uint32_t uOffset : values)
        for (const uint32_t uOldest : values)
            for (const uint32_t uAt : {uOldest, AREA})
                for (const uint32_t uLength : values)
                    if (!HasFailure())
                        read(uOffset, uOldest, uAt, uLength);
}

} // namespace
