// Every byte of the headers set to every value, and the edges of the words that
// lead through a file, in all their combinations. That reading ends, stays
// inside the file and leaves it alone is checked by the harness.
#include "hostile_harness.h"
#include "hostile_samples.h"

#include <gtest/gtest.h>

#include <cstring>
#include <set>

namespace {

constexpr uint32_t AREA = sizeof(trace_file_header);
constexpr size_t HEADER = sizeof(trace_record_header);

class Sweep : public testing::Test {
protected:
    static void SetUpTestSuite() {
        set_up_hostile_runs();
    }

    /// Counts what is not as expected and keeps the first: there may be
    /// thousands.
    void expect(bool bHolds, const std::string& what) {
        if (!bHolds && m_uFailures++ == 0)
            m_firstFailure = what;
    }

    void TearDown() override {
        EXPECT_EQ(m_uFailures, 0U) << "the first: " << m_firstFailure;
    }

    hostile_options m_options{.bEveryKind = true};

private:
    size_t m_uFailures = 0;
    std::string m_firstFailure;
};

std::string at(size_t uAt, unsigned int uValue) {
    return "byte " + std::to_string(uAt) + " = " + std::to_string(uValue);
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
    const redirected_output dropped;
    for (size_t i = 0; i < AREA; ++i) {
        const std::byte original = file[i];
        for (unsigned int uValue = 0; uValue < 256; ++uValue) {
            file[i] = static_cast<std::byte>(uValue);
            const hostile_result result = read_hostile_file(file);
            expect(result.bAccepted == stays_acceptable(file, i, static_cast<uint8_t>(uValue)),
                   at(i, uValue));
        }
        file[i] = original;
    }
}

/// Bytes of a record header that say nothing about where the next one stands
/// and whether the record can be read.
bool does_not_lead_the_walk(size_t uAt) {
    return (uAt >= offsetof(trace_record_header, reserved) &&
            uAt < offsetof(trace_record_header, seqNumber)) ||
           uAt >= offsetof(trace_record_header, threadId);
}

TEST_F(Sweep, EveryByteOfARecordHeaderOfEachKind) {
    const redirected_output dropped;
    for (const uint16_t kind : SAMPLE_KINDS) {
        const uint16_t kinds[] = {kind, TRC_FUNC_STRING};
        std::vector<std::byte> file = full_ring_of(kinds).bytes();
        const hostile_result sound = read_hostile_file(file, m_options);
        expect(sound.bAccepted && sound.end == hostile_end::NO_MORE, "sound file");
        for (size_t i = 0; i < HEADER; ++i) {
            const std::byte original = file[AREA + i];
            for (unsigned int uValue = 0; uValue < 256; ++uValue) {
                file[AREA + i] = static_cast<std::byte>(uValue);
                const hostile_result result = read_hostile_file(file, m_options);
                if (does_not_lead_the_walk(i))
                    expect(result.end == sound.end && result.uWritten == sound.uWritten,
                           "kind " + std::to_string(kind) + ", " + at(i, uValue));
            }
            file[AREA + i] = original;
        }
    }
}

TEST_F(Sweep, EveryByteOfABodyOfEachKind) {
    const redirected_output dropped;
    for (const uint16_t kind : SAMPLE_KINDS) {
        const uint16_t kinds[] = {kind, TRC_FUNC_STRING};
        std::vector<std::byte> file = full_ring_of(kinds).bytes();
        const hostile_result sound = read_hostile_file(file, m_options);
        const size_t uEnd = AREA + HEADER + sample_body(kind).size();
        for (size_t i = AREA + HEADER; i < uEnd; ++i) {
            const std::byte original = file[i];
            for (const unsigned int uValue : {0x00U, 0x01U, 0x1BU, 0x7FU, 0x80U, 0xFFU}) {
                file[i] = static_cast<std::byte>(uValue);
                const hostile_result result = read_hostile_file(file, m_options);
                expect(result.end == sound.end && result.uWritten == sound.uWritten,
                       "kind " + std::to_string(kind) + ", " + at(i, uValue));
            }
            file[i] = original;
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

/// One combination: the file header's offsets, and a length and a kind for the
/// record at `uAt`.
struct edge_case {
    uint32_t uOffset;
    uint32_t uOldest;
    uint32_t uAt;
    uint32_t uLength;
    uint16_t function;
};

std::vector<std::byte> with_edges(std::vector<std::byte> file, const edge_case& edge) {
    store(&file, offsetof(trace_file_header, uOffset), edge.uOffset);
    store(&file, offsetof(trace_file_header, uOldestRecordOffset), edge.uOldest);
    store(&file, edge.uAt, edge.uLength);
    store(&file, size_t{edge.uAt} + offsetof(trace_record_header, function), edge.function);
    return file;
}

TEST_F(Sweep, EdgesOfOffsetsAndLengths) {
    constexpr uint16_t KINDS[] = {TRC_FUNC_INT32, TRC_FUNC_STRINGS, TRC_FUNC_INT32};
    const std::vector<std::byte> sound = full_ring_of(KINDS).bytes();
    const auto uSize = static_cast<uint32_t>(sound.size());
    const std::set<uint32_t> values = edges(uSize);
    std::vector<edge_case> cases;
    for (const uint32_t uOffset : values)
        for (const uint32_t uOldest : values)
            for (const uint32_t uAt : {uOldest, AREA})
                for (const uint32_t uLength : values)
                    for (const uint16_t function :
                         {TRC_FUNC_FILLER, TRC_FUNC_INT32, TRC_FUNC_WRITING})
                        cases.push_back({uOffset, uOldest, uAt, uLength, function});

    const redirected_output dropped;
    hostile_options options;
    options.uForms = FORM_RAW;
    options.startRecords = 1;
    for (const edge_case& edge : cases) {
        options.startOptions = edge.uLength % 2 == 0 ? START_NONE : START_RECORDS_FROM_END;
        const hostile_result result = read_hostile_file(with_edges(sound, edge), options);
        // What lies before the record area, or leaves no room, is no position.
        if (edge.uOldest < edge.uOffset || uint64_t{edge.uOldest} + HEADER > uSize)
            expect(result.end == hostile_end::CORRUPT && result.uWritten == 0,
                   "uOffset " + std::to_string(edge.uOffset) + ", uOldestRecordOffset " +
                       std::to_string(edge.uOldest));
    }
}

} // namespace
