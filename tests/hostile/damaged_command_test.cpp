// Damaged files through the built command, many at a time: it ends by itself,
// with an exit status, and prints the sound file among them whole.
#include "hostile_samples.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <iterator>
#include <random>

namespace {

using testing::AnyOf;
using testing::HasSubstr;

constexpr unsigned int BATCHES = 8;
constexpr unsigned int FILES_PER_BATCH = 16;

/// Changes up to four bytes, often in the headers, and now and then the length.
std::vector<std::byte> damaged(std::vector<std::byte> file, std::mt19937& random) {
    const auto below = [&random](size_t uLimit) { return random() % uLimit; };
    for (size_t uChanges = 1 + below(4); uChanges > 0; --uChanges) {
        const size_t uLimit = below(2) == 0 ? sizeof(trace_file_header) + 64 : file.size();
        constexpr uint8_t VALUES[] = {0x00, 0x01, 0x1C, 0x7F, 0x80, 0xFF};
        const auto value =
            below(2) == 0 ? VALUES[below(std::size(VALUES))] : static_cast<uint8_t>(random());
        file[below(std::min(uLimit, file.size()))] = std::byte{value};
    }
    if (below(4) == 0) {
        file.resize(below(file.size()));
        const auto uSize = static_cast<uint32_t>(file.size());
        if (uSize >= sizeof(trace_file_header))
            memcpy(file.data() + offsetof(trace_file_header, uActualFileSize), &uSize,
                   sizeof(uSize));
    }
    return file;
}

class DamagedFiles : public testing::TestWithParam<const char*> {};

TEST_P(DamagedFiles, EndTheirOwnReadingAlone) {
    const temp_dir directory;
    const std::string healthy = directory.file("healthy");
    ASSERT_EQ(write_sample_trace(healthy,
                                 {sample_uint32(1, 1, 0xA1), sample_uint32(1ULL << 40, 1, 0xA2)}),
              TRACE_WRITER_OK);
    const std::vector<std::byte> sound[] = {full_ring_of(SAMPLE_KINDS).bytes(),
                                            wrapped_ring(1024).bytes()};
    std::mt19937 random(20261122); // the same files in every run
    for (unsigned int uBatch = 0; uBatch < BATCHES; ++uBatch) {
        std::vector<std::string> arguments = {"-t", KELVO_FUZZ_TEMPLATES};
        if (*GetParam() != '\0')
            arguments.emplace_back(GetParam());
        for (unsigned int i = 0; i < FILES_PER_BATCH; ++i) {
            arguments.push_back(directory.file("damaged" + std::to_string(i)));
            ASSERT_TRUE(write_file(arguments.back(), damaged(sound[i % 2], random)));
        }
        arguments.push_back(healthy);
        const command_result result = run_command(arguments);
        ASSERT_EQ(result.signo, 0) << "batch " << uBatch << '\n' << result.sErr;
        ASSERT_THAT(result.status, AnyOf(0, 1)) << result.sErr;
        ASSERT_THAT(result.sOut, HasSubstr("id=0x00000001 val=0x000000a1\n")) << uBatch;
        ASSERT_THAT(result.sOut, HasSubstr("id=0x00000001 val=0x000000a2\n")) << uBatch;
    }
}

INSTANTIATE_TEST_SUITE_P(Options, DamagedFiles, testing::Values("", "-r", "-s-1r"));

} // namespace
