// Records of every kind as text: the forms with and without a format, and
// bodies that lie about their counts, lengths and offsets.

#include "record.h"

#include "data_block.h"
#include "frame.h"
#include "raw_trace.h"
#include "stdout_stream.h"
#include "store.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <vector>

using testing::HasSubstr;
using testing::internal::CaptureStderr;
using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStderr;
using testing::internal::GetCapturedStdout;

static bool bAllocationFails;

// The linker puts these in the place of malloc and calloc, from which states of
// threads and templates come.
extern "C" void* __real_malloc(size_t size);
extern "C" void* __real_calloc(size_t count, size_t size);
extern "C" void* __wrap_malloc(size_t size) {
    return bAllocationFails ? nullptr : __real_malloc(size);
}
extern "C" void* __wrap_calloc(size_t count, size_t size) {
    return bAllocationFails ? nullptr : __real_calloc(count, size);
}

namespace {

using byte_vector = std::vector<std::byte>;
using namespace std::string_view_literals;

using element_ptr = std::unique_ptr<trace_queue_element, void (*)(void*)>;

/// An element in a heap block of its exact size, so that the address sanitizer
/// sees every step beyond it.
element_ptr make_element(trace_file* pFile, uint16_t uFunction, const byte_vector& body,
                         std::string_view compId = "_ZPB") {
    const byte_vector bytes = raw_record_bytes({.function = uFunction,
                                                .seqNumber = 2,
                                                .compId = compId,
                                                .threadId = 7,
                                                .timeStamp = 5,
                                                .body = body});
    const size_t uBlock = bytes.size() + QUEUE_ELEMENT_OVERHEAD;
    auto* pElement = static_cast<trace_queue_element*>(std::malloc(uBlock));
    // What follows the record must not be taken for its end.
    std::memset(pElement, 'X', uBlock);
    pElement->pFile = pFile;
    pElement->length = static_cast<uint32_t>(uBlock);
    std::memcpy(reinterpret_cast<char*>(pElement) + offsetof(trace_queue_element, header),
                bytes.data(), bytes.size());
    return {pElement, std::free};
}

constexpr char templateText[] = R"(
0x01 "bare"
0x02 "one %d"
0x03 "two %u and %u"
0x04 "wide %llu"
0x05 "wide %llx, %lld"
0x06 "array %d %d"
0x07 "%s;%s"
0x08 "data %d %s"
0x08:2 "third %hd"
0x09 "plain data"
0x0a "error %d %s %d %s (%s) <%s>"
0x0b ">>enter"
0x0c "at %d 100%%\n"
0x0d "[%T]"
0x0e "%1$d %2$s %3$d %4$d"
)";

class record_test : public testing::Test {
protected:
    void SetUp() override {
        std::ofstream(directory.file("_ZPB.tpl")) << templateText;

        setenv("TZ", "UTC", 1);
        templatePath = directory.path();
        anchor.pTemplatePath = templatePath.data();
        anchor.pProgName = "kelvo";
        anchor.iNumberFiles = 1;
        anchor.outputOptions[0] = '\0'; // every line of a body begins with one blank
        file.addrMode64 = 1;
    }

    void TearDown() override {
        free_thread_info(&file);
        free_template_info();
        std::free(anchor.pFormatBuffer);
        anchor = {};
    }

    /// The text of one record.
    std::string format(uint16_t uFunction, const byte_vector& body,
                       std::string_view compId = "_ZPB") {
        CaptureStdout();
        EXPECT_EQ(format_record(make_element(&file, uFunction, body, compId).get()), 0);
        stdout_flush();
        return GetCapturedStdout();
    }

    temp_dir directory;
    std::string templatePath;
    trace_file file{};
};

std::string hex_line(const std::string& digits, const std::string& characters) {
    std::string line = " 0x00000000:" + digits;
    line.resize(49, ' ');
    return line + "|" + characters + std::string(16 - characters.size(), ' ') + "|\n";
}

TEST_F(record_test, bodies_by_format_and_raw) {
    const struct {
        uint16_t uFunction;
        byte_vector body;
        std::string raw;
        std::string byFormat{}; ///< empty: the same
    } cases[] = {
        {TRC_FUNC_ID, raw_bytes(1U), " id=0x00000001\n", " bare\n"},
        {TRC_FUNC_INT32, raw_bytes(2U, -5), " id=0x00000002 val=0xfffffffb\n", " one -5\n"},
        {TRC_FUNC_UINT32, raw_bytes(0x10U, 5U), " id=0x00000010 val=0x00000005\n"},
        {TRC_FUNC_UINT32_2, raw_bytes(3U, 1U, 2U),
         " id=0x00000003 val1=0x00000001 val2=0x00000002\n", " two 1 and 2\n"},
        {TRC_FUNC_INT64, raw_bytes(4U, int64_t{1} << 40), " id=0x00000004 val=0x0000010000000000\n",
         " wide 1099511627776\n"},
        {TRC_FUNC_INT64_2, raw_bytes(5U, int64_t{0xAB}, int64_t{-1}),
         " id=0x00000005 val1=0x00000000000000ab val2=0xffffffffffffffff\n", " wide ab, -1\n"},
        // The format that is named, as it stands.
        {TRC_FUNC_INT32, raw_bytes(0xDU, 0xC), " id=0x0000000d val=0x0000000c\n",
         " [at %d 100%%\n ]\n"},
        {TRC_FUNC_INT32, raw_bytes(0xDU, 0x7F), " id=0x0000000d val=0x0000007f\n", " []\n"},
        // What no parameter took is dumped.
        {TRC_FUNC_VALUES, raw_bytes(6U, 3U, 1U, 2U, 3U),
         " id=0x00000006 [0]=0x00000001 [1]=0x00000002 [2]=0x00000003\n",
         " array 1 2\n\n" + hex_line(" 03000000", "....")},
        {TRC_FUNC_VALUES, raw_bytes(0x20U, 6U, 0U, 1U, 2U, 3U, 4U, 5U),
         " id=0x00000020\n [0]=0x00000000 [1]=0x00000001 [2]=0x00000002 [3]=0x00000003\n"
         " [4]=0x00000004 [5]=0x00000005\n"},
        {TRC_FUNC_VALUES64, raw_bytes(4U, 1U, int64_t{0x100000002}),
         " id=0x00000004 [0]=0x0000000100000002\n", " wide 4294967298\n"},
        {TRC_FUNC_VALUES64, raw_bytes(5U, 3U, int64_t{1}, int64_t{2}, int64_t{3}),
         " id=0x00000005\n [0]=0x0000000000000001 [1]=0x0000000000000002\n"
         " [2]=0x0000000000000003\n",
         " wide 1, 2\n\n" + hex_line(" 03000000 00000000", "........")},
        {TRC_FUNC_STRINGS, raw_bytes(0xFFFFFFFF, 1U, 2U, "a\0"sv), "  a\n"},
        {TRC_FUNC_STRINGS, raw_bytes(7U, 2U, 5U, "a\0b\n\0"sv), " id=0x00000007 \n [0]=a\n [1]=b\n",
         " a;b\n\n"},
        {TRC_FUNC_STRING, raw_bytes("text\nmore\n\0"sv), "  text\n more\n"},
        {TRC_FUNC_DISCARDED,
         {},
         " kelvo: 2625-152 Unable to keep up with program being traced, trace records have been "
         "discarded at this point.\n"},
        // What is left of a cut array, of strings and of values is written by the
        // layout of the number as written.
        {TRC_FUNC_VALUES, raw_bytes(0x20U, ~0U, 9U, "xyz"), " id=0x00000020\n [0]=0x00000009\n"},
        {TRC_FUNC_STRINGS, raw_bytes(0x20U, ~0U, ~0U, "a\0b"sv),
         " id=0x00000020 \n [0]=a\n [1]=b\n"},
        {TRC_FUNC_UINT64_2, raw_bytes(0x20U, uint64_t{2}, 3U),
         " id=0x00000020 val1=0x0000000000000002 val2=0x0000000000000000\n"}};
    for (const auto& [uFunction, body, raw, byFormat] : cases) {
        SCOPED_TRACE(testing::Message() << "kind " << uFunction << ": " << raw);
        anchor.bRaw = 0;
        EXPECT_EQ(format(uFunction, body), byFormat.empty() ? raw : byFormat);
        anchor.bRaw = 1;
        EXPECT_EQ(format(uFunction, body), raw);
    }
}

TEST_F(record_test, data_blocks) {
    const auto heading = [](int iBlock) {
        return " ----------------- Data Block " + std::to_string(iBlock) + " ----------------\n";
    };
    const byte_vector formatted =
        raw_bytes(8U, 4U, block("\x05"), block("abc"), block("\x07"), block("Z"));
    EXPECT_EQ(format(TRC_FUNC_DATA, formatted), " data 5 abc\n third %hd\n\n" +
                                                    hex_line(" 07", ".") + heading(3) +
                                                    hex_line(" 5a", "Z"));
    // A format without parameters leaves every block to be written.
    EXPECT_EQ(format(TRC_FUNC_DATA, raw_bytes(9U, 1U, block("Z"))),
              " plain data\n" + heading(0) + hex_line(" 5a", "Z"));
    anchor.bBrief = 1;
    EXPECT_EQ(format(TRC_FUNC_DATA, formatted), " data 5 abc\n");

    anchor.bRaw = 1;
    const byte_vector two = raw_bytes(8U, 2U, block("Z"), block(""));
    EXPECT_EQ(format(TRC_FUNC_DATA, two), " id=0x00000008\n");
    anchor.bBrief = 0;
    EXPECT_EQ(format(TRC_FUNC_DATA, two),
              " id=0x00000008\n" + heading(0) + hex_line(" 5a", "Z") + heading(1));

    // A block that overruns the record ends with it.
    for (const int32_t iLength : {-1, INT32_MIN, INT32_MAX, 3}) {
        EXPECT_EQ(format(TRC_FUNC_DATA, raw_bytes(8U, ~0U, iLength, "ab")),
                  " id=0x00000008\n" + heading(0) + hex_line(" 6162", "ab"))
            << iLength;
    }
}

/// An error record with a string argument and an integer one. The strings stand
/// behind the arguments in the order of the fields.
byte_vector error_body(uint32_t uTraceId, const std::string& ffdcId,
                       const std::string& defaultText) {
    const auto uFirst = static_cast<uint32_t>(sizeof(trace_record_error) + 2 * 16);
    const uint32_t uFile = uFirst + 5, uArgument = uFile + 4, uFfdc = uArgument + 5;
    const auto uDefault = static_cast<uint32_t>(uFfdc + ffdcId.size() + 1);
    return raw_bytes(uTraceId, -2, 12U, uFirst, uFile, ffdcId.empty() ? 0U : uFfdc, 1U, 2U, 0U,
                     defaultText.empty() ? 0U : uDefault, 2U, CU_ERROR_ARG_CHAR_STR, 0U,
                     uint64_t{uArgument}, CU_ERROR_ARG_INT, 0U, uint64_t{28}, "open\0a.c\0sda1\0"sv,
                     ffdcId, '\0', defaultText);
}

TEST_F(record_test, refused_template_is_read_for_a_data_record_and_for_each_block) {
    std::ofstream(directory.file("BAD_.tpl")) << "1 \"%q\"\n";
    CaptureStderr();
    format(TRC_FUNC_DATA, raw_bytes(1U, 2U, block("Z"), block("")), "BAD_");
    std::string messages;
    for (int i = 0; i < 3; i++)
        messages += "kelvo: 2625-120 Format error on line 1. Invalid data type q specified.\n\n";
    EXPECT_EQ(GetCapturedStderr(), messages);
}

TEST_F(record_test, error_records) {
    const std::string plain =
        " id=0x00000030Error -2 was returned from \"open\" on line 12 in file \"a.c\".\n";
    const std::string longText(10000, 'm');
    const auto text_of = [this](uint32_t uTraceId, const std::string& ffdcId,
                                const std::string& defaultText) {
        return format(TRC_FUNC_ERROR, error_body(uTraceId, ffdcId, defaultText));
    };
    EXPECT_EQ(text_of(0x30, "", ""), plain);
    // The default text runs to the end of the record without a NUL.
    EXPECT_EQ(text_of(0x30, "ff-1", "disk %s: %d"),
              plain + "    Message=disk sda1: 28\n    FFDCID=\"ff-1\"\n");
    // 4095 characters of each text are kept.
    EXPECT_EQ(text_of(0x30, longText, longText), plain + "    Message=" + std::string(4084, 'm') +
                                                     "\n    FFDCID=\"" + std::string(4084, 'm') +
                                                     "\n");
    EXPECT_EQ(text_of(10, "ff-1", "disk %s: %d"), " error -2 open 12 a.c (disk sda1: 28) <ff-1>\n");
    EXPECT_EQ(text_of(10, "", ""), " error -2 open 12 a.c () <>\n");
    EXPECT_EQ(text_of(14, "", ""), " -2 open 12 6499937\n"); // "a.c" with its NUL
}

TEST_F(record_test, error_records_with_false_offsets_and_counts) {
    constexpr uint32_t BEYOND = 0xFFFFFFF0;
    const byte_vector lying = raw_bytes(0x30U, -2, 12U, BEYOND, BEYOND, BEYOND, 1U, 2U, 0U,
                                        uint32_t{sizeof(trace_record_error) + 16}, ~0U,
                                        CU_ERROR_ARG_CHAR_STR, 0U, ~uint64_t{0}, "text %s%s%s");
    EXPECT_EQ(format(TRC_FUNC_ERROR, lying),
              " id=0x00000030Error -2 was returned from \"\" on line 12 in file \"\".\n"
              "    Message=text %s%s\n");

    // More arguments than usual.
    byte_vector many = raw_bytes(0x30U, 1U, 2U, 0U, 0U, 0U, 0U, 0U, 0U,
                                 uint32_t{sizeof(trace_record_error) + 40 * 16}, 40U);
    for (uint64_t i = 0; i < 40; i++)
        add_bytes(&many, raw_bytes(CU_ERROR_ARG_LONG_LONG, 0U, 1000 + i));
    add_bytes(&many, raw_bytes("%40$lld!"));
    EXPECT_THAT(format(TRC_FUNC_ERROR, many), HasSubstr("Message=1039!\n"));
}

TEST_F(record_test, start_records_replace_the_time_base) {
    std::strcpy(anchor.outputOptions, "t");
    constexpr uint64_t uHour = 3600ULL * 1000000000;
    const auto start = [](uint64_t uBase, std::string_view text = "") {
        return raw_bytes(3U, 0x1FU, uBase, uint64_t{5}, text);
    };

    // The tracing library's own start record is shown by its own base, with the
    // library's own format; the others by the base so far.
    EXPECT_EQ(format(TRC_FUNC_START, start(uHour), "____"),
              " 01:00:00.000000000  ******************* Trace Started - Pid = 31 "
              "**********************\n");
    EXPECT_EQ(format(TRC_FUNC_START, start(2 * uHour)),
              " 01:00:00.000000000 id=0x00000003[0]=0x0000001f\n");
    EXPECT_EQ(file.timeInfo, (cu_timeinfo{2 * uHour, 5}));

    EXPECT_EQ(format(TRC_FUNC_TIME_CALIBRATION, raw_bytes(3 * uHour, uint64_t{5})), "");
    EXPECT_EQ(format(TRC_FUNC_RESTART, start(4 * uHour, "core\0"sv), "____"),
              " 03:00:00.000000000  ***** Trace restarting after client core dump -  Pid = 31 "
              "***** \n                    core\n");
    anchor.bRaw = 1;
    EXPECT_EQ(format(TRC_FUNC_RESTART, start(5 * uHour, "core\0"sv)),
              " 04:00:00.000000000 id=0x00000003[0]=0x0000001f\n                    core\n");
    EXPECT_EQ(file.timeInfo, (cu_timeinfo{5 * uHour, 5}));
}

TEST_F(record_test, records_of_the_tracing_library_end_the_nesting) {
    EXPECT_EQ(format(TRC_FUNC_ID, raw_bytes(11U)), " enter\n");
    EXPECT_EQ(format(TRC_FUNC_ID, raw_bytes(1U)), "   bare\n");
    EXPECT_EQ(format(TRC_FUNC_VALUES, raw_bytes(32U, 0U)), "   id=0x00000020\n");
    EXPECT_EQ(format(TRC_FUNC_VALUES, raw_bytes(32U, 0U), "____"), " id=0x00000020\n");
    EXPECT_EQ(format(TRC_FUNC_ID, raw_bytes(1U)), " bare\n");
}

TEST_F(record_test, unknown_kinds) {
    std::strcpy(anchor.outputOptions, "c");
    for (const unsigned uFunction : {0U, 18U, 20U, 0xFFFFU}) {
        CaptureStderr();
        EXPECT_EQ(format(static_cast<uint16_t>(uFunction), raw_bytes(1U)), " _ZPB\n");
        EXPECT_EQ(GetCapturedStderr(),
                  "kelvo: 2625-149 Internal Error, unknown trace record type found.\n\n");
    }
}

TEST_F(record_test, without_memory_a_record_is_left_out_or_open) {
    std::strcpy(anchor.outputOptions, "c");
    const element_ptr pValue = make_element(&file, TRC_FUNC_INT32, raw_bytes(2U, 2));
    const element_ptr pData = make_element(&file, TRC_FUNC_DATA, raw_bytes(8U, 0U));
    CaptureStdout();
    anchor.bRaw = 1;
    bAllocationFails = true;
    EXPECT_EQ(format_record(pValue.get()), 1); // for its thread
    bAllocationFails = false;
    EXPECT_EQ(format_record(pValue.get()), 0);
    anchor.bRaw = 0;
    bAllocationFails = true;
    EXPECT_EQ(format_record(pValue.get()), 1); // for its template
    EXPECT_EQ(format_record(pData.get()), 0);  // a data record is closed all the same
    bAllocationFails = false;
    EXPECT_EQ(format_record(pValue.get()), 0);
    stdout_flush();
    EXPECT_EQ(GetCapturedStdout(),
              " _ZPB id=0x00000002 val=0x00000002\n _ZPB\n _ZPB\n _ZPB one 2\n");
}

TEST_F(record_test, hostile_bodies_of_every_kind_stay_inside_the_record) {
    std::mt19937 generator(1);
    const auto random = [&generator] { return static_cast<uint32_t>(generator()); };
    const uint32_t words[] = {0, 1, 2, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF};
    CaptureStdout();
    CaptureStderr();
    for (const trc_kind& kind : TRC_KINDS) {
        for (uint32_t uRound = 0; uRound < 300; uRound++) {
            byte_vector body = raw_bytes(uRound % 13);
            for (uint32_t i = 0; i < uRound % 29; i++)
                add_bytes(&body, raw_bytes(random() % 2 ? words[random() % std::size(words)]
                                                        : random() % 140));
            body.resize(body.size() + random() % 4, std::byte{'s'});
            // Cut through the fixed fields too.
            if (uRound < 60)
                body.resize(uRound, std::byte{'%'});
            const element_ptr pElement =
                make_element(&file, kind.function, body, uRound % 5 ? "_ZPB" : "____");
            // The right length, and ones that name more, or less, than the block holds.
            const uint32_t uLength = pElement->header.length;
            for (const uint32_t uNamed : {uLength, uLength + 1000, random() % 28}) {
                pElement->header.length = uNamed;
                for (const int iMode : {0, 1, 2}) {
                    anchor.bRaw = iMode == 1;
                    anchor.bBrief = iMode == 2;
                    EXPECT_EQ(format_record(pElement.get()), 0);
                }
            }
        }
    }
    stdout_flush();
    GetCapturedStderr();
    EXPECT_LT(GetCapturedStdout().size(), 100U << 20);
}

} // namespace
