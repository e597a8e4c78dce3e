#include "faults_support.h"

#include "sample_trace.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::HasSubstr;
using testing::Not;

constexpr uint32_t RECORDS = 12; // of kind TRC_FUNC_UINT32, by which a file is judged

constexpr char TEMPLATES[] = "0x1 \"step took 0x%08x ms\"\n"
                             "0x2 \"name %s, number %s\"\n"
                             "0x3 \"block %d\"\n"
                             "0x3:0 \"first %d\"\n"
                             "0x4 \"error %s\"\n"
                             "0x5 \"never %d\"\n0x6 \"never\"\n0x7 \"never\"\n0x8 \"never\"\n";

constexpr std::string_view WARNING = "WARNING: Insufficient memory (size=";
constexpr std::string_view MARKER = "\t[INSUFFICIENT MEMORY TO PROCESS]\n";

uint32_t value_of(size_t uFile, uint32_t uRecord) {
    return 0xA0000 + static_cast<uint32_t>(uFile) * 0x1000 + uRecord;
}

/// Among the counted records one of each kind that needs more than the others.
void write_trace(const std::string& path, size_t uFile, uint64_t uFirstTime) {
    trace_writer writer;
    ASSERT_EQ(writer.create(path.c_str()), TRACE_WRITER_OK);
    uint64_t uTime = uFirstTime;
    const auto origin = [&](uint32_t uThread) {
        return trace_origin{"_FLT", uThread, uTime += 1000};
    };
    for (uint32_t uRecord = 0; uRecord < RECORDS; ++uRecord)
        writer.append_uint32(origin(uRecord % 3), 1, value_of(uFile, uRecord));
    const std::string_view strings[] = {"Anna", "seven"};
    const std::vector<std::byte> number = raw_bytes(7U);
    const trace_bytes blocks[] = {number, std::as_bytes(std::span(strings[0]))};
    const std::string sLong(5000, 'x');
    trace_error_content error;
    error.traceId = 4;
    error.msgCatName = "none.cat";
    error.defMsg = sLong;
    writer.append_strings(origin(1), 2, strings);
    writer.append_data(origin(1), 3, blocks);
    writer.append_error(origin(1), error);
    ASSERT_EQ(writer.counts().uAppended, RECORDS + 3);
}

/// The number that follows the text, or -1.
long number_after(const std::string& sText, const std::string& sIn) {
    const size_t uAt = sIn.find(sText);
    return uAt == std::string::npos ? -1 : strtol(sIn.c_str() + uAt + sText.size(), nullptr, 10);
}

void expect_counted(const command_result& result) {
    const auto uWarnings = static_cast<long>(count_of(std::string(WARNING), result.sErr));
    const auto uMarkers = static_cast<long>(count_of(std::string(MARKER), result.sOut));
    const std::string sTotal = "Total insufficient memory warning messages";
    const long iTotal = number_after(sTotal + ": ", result.sErr);
    if (iTotal != -1) {
        EXPECT_EQ(iTotal, uWarnings) << result.sErr;
        EXPECT_EQ(number_after(sTotal + " during file open: ", result.sErr), uMarkers)
            << result.sOut << result.sErr;
    } else if (uWarnings != 0) {
        EXPECT_EQ(result.status, 1) << "warnings without totals:\n" << result.sErr;
    }
}

} // namespace

command_setup failing_setup(const std::vector<std::string>& variables) {
    command_setup setup;
    setup.environment = variables;
#ifdef KELVO_SANITIZED
    setup.sProgram = KELVO_FAILING_PROGRAM;
#else
    setup.environment.push_back("LD_PRELOAD=" KELVO_FAILING_CALLS);
#endif
    return setup;
}

bool take_failure_note(command_result* pResult) {
    const std::string sNote = "[a call was made to fail]\n";
    const size_t uAt = pResult->sErr.find(sNote);
    if (uAt == std::string::npos)
        return false;
    pResult->sErr.erase(uAt, sNote.size());
    return true;
}

void expect_sound_end(const command_result& result) {
    EXPECT_EQ(result.signo, 0);
    EXPECT_TRUE(result.status == 0 || result.status == 1) << result.status;
    EXPECT_THAT(result.sErr, Not(HasSubstr("Sanitizer")));
    EXPECT_THAT(result.sErr, Not(HasSubstr("runtime error")));
    EXPECT_THAT(result.sErr, Not(HasSubstr("terminate called")));
}

size_t count_of(const std::string& sText, const std::string& sIn) {
    size_t uCount = 0;
    for (size_t uAt = 0; (uAt = sIn.find(sText, uAt)) != std::string::npos; uAt += sText.size())
        ++uCount;
    return uCount;
}

void expect_only_reader_words(const std::vector<std::byte>& before,
                              const std::vector<std::byte>& after) {
    std::vector<std::byte> blanked = after;
    ASSERT_EQ(before.size(), after.size());
    constexpr size_t WORDS = offsetof(trace_file_header, uSeqLock);
    static_assert(offsetof(trace_file_header, uTailReq) == WORDS + sizeof(uint32_t));
    memcpy(blanked.data() + WORDS, before.data() + WORDS, 2 * sizeof(uint32_t));
    EXPECT_TRUE(blanked == before) << "more than two words were written into a trace file";
}

fault_sample::fault_sample() : sTemplates(dir.file("_FLT.tpl")) {
    constexpr uint64_t FIRST_TIMES[] = {0, 6'500}; // the second file's begins among the first one's
    for (size_t uFile = 0; uFile < 2; ++uFile) {
        files[uFile] = dir.file(uFile == 0 ? "a.trc" : "b.trc");
        write_trace(files[uFile], uFile, FIRST_TIMES[uFile]);
        before[uFile] = read_file(files[uFile]);
    }
    EXPECT_TRUE(write_file(sTemplates, std::as_bytes(std::span(TEMPLATES, sizeof TEMPLATES - 1))));
}

std::vector<std::string> fault_sample::arguments(const std::vector<std::string>& options) const {
    std::vector<std::string> result = options;
    result.insert(result.end(), {"-t", dir.path(), files[0], files[1]});
    return result;
}

bool fault_sample::is_whole(size_t uIndex, const std::string& sOut) const {
    for (uint32_t uRecord = 0; uRecord < RECORDS; ++uRecord) {
        char value[16];
        snprintf(value, sizeof value, "0x%08x", value_of(uIndex, uRecord));
        if (sOut.find(value) == std::string::npos)
            return false;
    }
    return true;
}

void fault_sample::expect_honest(const command_result& result) const {
    expect_sound_end(result);
    const bool bExplained = result.status == 1 ||
                            result.sOut.find(": 2625-1") != std::string::npos ||
                            result.sErr.find(": 2625-1") != std::string::npos;
    for (size_t uFile = 0; uFile < 2; ++uFile) {
        expect_only_reader_words(before[uFile], read_file(files[uFile]));
        const bool bNamed = result.sErr.find(files[uFile]) != std::string::npos;
        EXPECT_TRUE(bExplained || bNamed || is_whole(uFile, result.sOut))
            << "records of file " << uFile << " are missing and nothing is said\n"
            << result.sOut << result.sErr;
    }
    expect_counted(result);
}

void sweep_faults(size_t uEnd, const std::function<fault_run(size_t, const fault_sample&)>& make,
                  const std::function<bool(size_t, const fault_sample&, command_result&)>& check) {
    constexpr size_t AT_ONCE = 6;
    struct slot {
        fault_sample sample;
        std::unique_ptr<live_command> pCommand{};
    };
    bool bGoesOn = true;
    for (size_t uFirst = 0; bGoesOn && uFirst < uEnd; uFirst += AT_ONCE) {
        std::vector<slot> slots(std::min(AT_ONCE, uEnd - uFirst));
        for (size_t i = 0; i < slots.size(); ++i) {
            const fault_run made = make(uFirst + i, slots[i].sample);
            slots[i].pCommand = std::make_unique<live_command>(made.arguments, made.setup);
        }
        for (size_t i = 0; i < slots.size(); ++i) {
            command_result result = slots[i].pCommand->wait();
            bGoesOn &= check(uFirst + i, slots[i].sample, result) && !testing::Test::HasFailure();
        }
    }
}

std::vector<std::string> make_samples(const std::string& directory,
                                      const std::vector<std::string>& options) {
    command_setup setup;
    setup.sProgram = KELVO_SAMPLE;
    std::vector<std::string> arguments{"-d", directory};
    arguments.insert(arguments.end(), options.begin(), options.end());
    const command_result made = run_command(arguments, setup);
    EXPECT_EQ(made.status, 0) << made.sErr;
    std::vector<std::string> files;
    for (const auto& entry : std::filesystem::directory_iterator(directory))
        if (entry.path().extension() == ".trc")
            files.push_back(entry.path());
    std::sort(files.begin(), files.end());
    return files;
}
