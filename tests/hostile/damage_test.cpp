// Files cut at every length and with every bit flipped: what stands before the
// damage is written as in the sound file, and so is what stands behind damage
// that does not lead the walk astray.
#include "hostile_samples.h"
#include "written_records.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>

namespace {

using testing::ElementsAreArray;

constexpr uint32_t AREA = sizeof(trace_file_header);
constexpr size_t HEADER = sizeof(trace_record_header);

class Damage : public testing::Test {
protected:
    static void SetUpTestSuite() {
        set_up_hostile_runs();
    }
};

TEST_F(Damage, SoundFilesAreWrittenWhole) {
    const written_file kinds = write_records_of(full_ring_of(SAMPLE_KINDS).bytes());
    EXPECT_TRUE(kinds.result.bAccepted);
    EXPECT_EQ(kinds.result.end, hostile_end::NO_MORE);
    EXPECT_EQ(kinds.records.size(), 17U); // neither restarts nor notices of discarded records
    const written_file wrapped = write_records_of(wrapped_ring(1024).bytes());
    EXPECT_EQ(wrapped.result.end, hostile_end::NO_MORE);
    ASSERT_GT(wrapped.records.size(), 15U);
    EXPECT_GT(wrapped.records.front().uOffset, wrapped.records.back().uOffset);
}

/// The records that end at `uEnd` or before.
std::vector<written_record> whole_records_before(const std::vector<written_record>& records,
                                                 size_t uEnd) {
    std::vector<written_record> whole;
    for (const written_record& record : records)
        if (record.uOffset + record.uLength <= uEnd)
            whole.push_back(record);
    return whole;
}

TEST_F(Damage, EveryPrefix) {
    const std::vector<std::byte> sound = full_ring_of(SAMPLE_KINDS).bytes();
    for (size_t uSize = 0; uSize < sound.size(); ++uSize) {
        const written_file cut = write_records_of(trace_bytes(sound).first(uSize));
        ASSERT_FALSE(cut.result.bAccepted) << uSize;
        ASSERT_EQ(cut.result.end == hostile_end::TOO_SMALL, uSize < AREA) << uSize;
    }
}

TEST_F(Damage, EveryPrefixThatClaimsToBeWhole) {
    const std::vector<std::byte> sound = full_ring_of(SAMPLE_KINDS).bytes();
    const std::vector<written_record> records = write_records_of(sound, FORM_ALL).records;
    for (size_t uSize = AREA; uSize < sound.size(); ++uSize) {
        std::vector<std::byte> file(sound.begin(), sound.begin() + static_cast<ptrdiff_t>(uSize));
        const auto uActualFileSize = static_cast<uint32_t>(uSize);
        memcpy(file.data() + offsetof(trace_file_header, uActualFileSize), &uActualFileSize,
               sizeof(uActualFileSize));
        const written_file cut = write_records_of(file, FORM_ALL);
        ASSERT_EQ(cut.result.bAccepted, uSize >= AREA + HEADER) << uSize;

        // The whole records, and then perhaps the one that is cut.
        const std::vector<written_record> whole = whole_records_before(records, uSize);
        ASSERT_LE(whole.size(), cut.records.size()) << uSize;
        ASSERT_LE(cut.records.size(), whole.size() + 1) << uSize;
        ASSERT_TRUE(std::equal(whole.begin(), whole.end(), cut.records.begin())) << uSize;
        if (cut.records.size() > whole.size()) {
            const written_record& last = cut.records.back();
            ASSERT_EQ(last.uOffset + last.uLength, uSize);
            ASSERT_EQ(cut.result.end, hostile_end::CORRUPT) << uSize;
        }
    }
}

/// Where a flipped bit of the wrapped ring lies, in walking order.
struct damage_site {
    size_t uIntactBefore = 0; ///< records that stand before it
    bool bOnlyItself = false; ///< nothing but the record that it lies in may change
    bool bNothing = false;    ///< nothing at all may change
};

/// Bytes of the file header that are displayed or not looked at, and the two
/// that the reader overwrites.
bool is_display_only(size_t uAt) {
    const auto in = [uAt](size_t uFirst, size_t uBehind) { return uAt >= uFirst && uAt < uBehind; };
    return in(4, 8) || in(12, 20) || in(40, 44) || in(48, AREA);
}

damage_site find_site(const std::vector<written_record>& records, uint32_t uGapAt, size_t uAt) {
    if (uAt < AREA)
        return {.bNothing = is_display_only(uAt)};
    for (size_t i = 0; i < records.size(); ++i) {
        const size_t uInside = uAt - records[i].uOffset; // huge when it lies before
        if (uInside >= records[i].uLength)
            continue;
        const bool bReserved = uInside == 6 || uInside == 7;
        return {.uIntactBefore = i, .bOnlyItself = bReserved || uInside >= 16};
    }
    return {.bNothing = uAt - uGapAt >= HEADER}; // the filler at the oldest position
}

TEST_F(Damage, EveryBit) {
    const raw_trace ring = wrapped_ring(1024);
    std::vector<std::byte> file = ring.bytes();
    const std::vector<written_record> records = write_records_of(file).records;
    const uint32_t uGapAt = ring.header.uOldestRecordOffset;
    for (size_t uBit = 0; uBit < file.size() * 8; ++uBit) {
        const auto mask = static_cast<std::byte>(1U << uBit % 8);
        file[uBit / 8] ^= mask;
        std::vector<written_record> written = write_records_of(file).records;
        file[uBit / 8] ^= mask;

        const damage_site site = find_site(records, uGapAt, uBit / 8);
        ASSERT_GE(written.size(), site.uIntactBefore) << "bit " << uBit;
        if (site.bOnlyItself && written.size() == records.size())
            written[site.uIntactBefore] = records[site.uIntactBefore];
        if (site.bOnlyItself || site.bNothing)
            ASSERT_THAT(written, ElementsAreArray(records)) << "bit " << uBit;
        else
            ASSERT_TRUE(std::equal(records.begin(),
                                   records.begin() + static_cast<ptrdiff_t>(site.uIntactBefore),
                                   written.begin()))
                << "bit " << uBit;
    }
}

} // namespace
