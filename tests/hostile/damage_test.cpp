// Files cut at every length and with every bit flipped: what stands before the
// damage is written as in the sound file, and so is what stands behind damage
// that does not lead the walk astray.
#include "hostile_harness.h"
#include "hostile_samples.h"
#include "stdout_stream.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <sys/mman.h>
#include <unistd.h>

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

struct written_record {
    uint32_t uOffset = 0; ///< in the file
    uint32_t uLength = 0; ///< as far as it lies in the file
    std::string text{};

    size_t end() const {
        return size_t{uOffset} + uLength;
    }
    friend bool operator==(const written_record&, const written_record&) = default;
};

/// What was written to the file in memory since the last call.
std::string take_text(int fd) {
    stdout_flush();
    std::string text(static_cast<size_t>(lseek(fd, 0, SEEK_CUR)), '\0');
    hostile_check(pread(fd, text.data(), text.size(), 0) == std::ssize(text) &&
                      ftruncate(fd, 0) == 0 && lseek(fd, 0, SEEK_SET) == 0,
                  "output can be read back");
    return text;
}

/// Reads the file and writes each record in the forms.
std::pair<hostile_result, std::vector<written_record>>
write_records_of(trace_bytes file, uint8_t uForms = FORM_TEMPLATE) {
    static const int fdText = memfd_create("output", MFD_CLOEXEC);
    std::vector<written_record> written;
    hostile_options options;
    options.uForms = uForms;
    options.onWritten = [&written](const trace_queue_element& element) {
        written.push_back({element.offset, element.header.length, take_text(fdText)});
    };
    const redirected_output redirected(fdText);
    const hostile_result result = read_hostile_file(file, options);
    return {result, written};
}

/// As it is, and when it claims to be whole.
TEST_F(Damage, EveryPrefix) {
    const std::vector<std::byte> sound = full_ring_of(SAMPLE_KINDS).bytes();
    const auto [result, records] = write_records_of(sound, FORM_ALL);
    ASSERT_TRUE(result.bAccepted);
    ASSERT_EQ(result.end, hostile_end::NO_MORE);
    ASSERT_EQ(records.size(), 17U); // neither restarts nor notices of discarded records
    for (uint32_t uSize = 0; uSize < sound.size(); ++uSize) {
        std::vector<std::byte> file(sound.begin(), sound.begin() + uSize);
        const hostile_result asItIs = write_records_of(file, FORM_ALL).first;
        ASSERT_FALSE(asItIs.bAccepted) << uSize;
        ASSERT_EQ(asItIs.end == hostile_end::TOO_SMALL, uSize < AREA) << uSize;
        if (uSize < AREA)
            continue;
        memcpy(file.data() + offsetof(trace_file_header, uActualFileSize), &uSize, sizeof(uSize));
        const auto [cut, written] = write_records_of(file, FORM_ALL);
        ASSERT_EQ(cut.bAccepted, uSize >= AREA + HEADER) << uSize;

        // The whole records, and then perhaps the one that is cut.
        const auto pCut = std::find_if(records.begin(), records.end(),
                                       [&](const auto& record) { return record.end() > uSize; });
        const std::vector<written_record> whole(records.begin(), pCut);
        ASSERT_LE(whole.size(), written.size()) << uSize;
        ASSERT_LE(written.size(), whole.size() + 1) << uSize;
        ASSERT_TRUE(std::equal(whole.begin(), whole.end(), written.begin())) << uSize;
        if (written.size() > whole.size()) {
            ASSERT_EQ(written.back().end(), uSize);
            ASSERT_EQ(cut.end, hostile_end::CORRUPT) << uSize;
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
    const auto [result, records] = write_records_of(file);
    ASSERT_EQ(result.end, hostile_end::NO_MORE);
    ASSERT_GT(records.size(), 15U);
    ASSERT_GT(records.front().uOffset, records.back().uOffset);
    const uint32_t uGapAt = ring.header.uOldestRecordOffset;
    for (size_t uBit = 0; uBit < file.size() * 8; ++uBit) {
        const auto mask = static_cast<std::byte>(1U << uBit % 8);
        file[uBit / 8] ^= mask;
        std::vector<written_record> written = write_records_of(file).second;
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
