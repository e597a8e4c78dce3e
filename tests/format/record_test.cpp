// Records of every kind as text: the forms with and without a format, and
// bodies that lie about their counts, lengths and offsets.

#include "record.h"

#include "frame.h"
#include "record_kinds.h"
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

static bool bCallocFails;

// The linker puts this in the place of calloc, from which templates come.
extern "C" void* __real_calloc(size_t count, size_t size);
extern "C" void* __wrap_calloc(size_t count, size_t size);
extern "C" void* __wrap_calloc(size_t count, size_t size) {
    return bCallocFails ? nullptr : __real_calloc(count, size);
}

namespace {

struct block_deleter {
    void operator()(trace_queue_element* pElement) const {
        std::free(pElement);
    }
};
using element_ptr = std::unique_ptr<trace_queue_element, block_deleter>;

/// The bytes of a record body, put together field by field.
struct body {
    std::string bytes;

    template <class T> body& put(T value) {
        bytes.append(reinterpret_cast<const char*>(&value), sizeof(value));
        return *this;
    }
    body& u32(uint32_t uValue) {
        return put(uValue);
    }
    body& u64(uint64_t uValue) {
        return put(uValue);
    }
    body& text(std::string_view value) {
        bytes.append(value);
        return *this;
    }
    body& string(std::string_view value) {
        return text(value).put('\0');
    }
    body& block(std::string_view data) {
        put(static_cast<int32_t>(data.size())).text(data);
        bytes.resize((bytes.size() + 3) / 4 * 4);
        return *this;
    }
};

/// An element in a heap block of its exact size, so that the address sanitizer
/// sees every step beyond it.
element_ptr make_element(trace_file* pFile, uint16_t uFunction, const std::string& bodyBytes,
                         const char* pCompId = "_ZPB") {
    const auto uLength = static_cast<uint32_t>(sizeof(trace_record_header) + bodyBytes.size());
    const size_t uBlock = uLength + QUEUE_ELEMENT_OVERHEAD;
    auto* pElement = static_cast<trace_queue_element*>(std::malloc(uBlock));
    // What follows the record must not be taken for its end.
    std::memset(pElement, 'X', uBlock);
    pElement->pFile = pFile;
    pElement->length = static_cast<uint32_t>(uBlock);
    pElement->offset = 200;
    pElement->header = {.length = uLength,
                        .function = uFunction,
                        .reserved = 0,
                        .seqNumber = 2,
                        .compId = {pCompId[0], pCompId[1], pCompId[2], pCompId[3]},
                        .threadId = 7,
                        .timeStamp = 5};
    std::memcpy(reinterpret_cast<char*>(pElement) + offsetof(trace_queue_element, header) +
                    sizeof(trace_record_header),
                bodyBytes.data(), bodyBytes.size());
    return element_ptr(pElement);
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
0x0c "<<leave"
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
        file.pHeader = &header;
        file.pName = name;
        file.addrMode64 = 1;
    }

    void TearDown() override {
        free_thread_info(&file);
        free_template_info();
        std::free(anchor.pFormatBuffer);
        anchor = {};
    }

    /// The text of one record, without the blank before each line.
    std::string format(uint16_t uFunction, const body& content, const char* pCompId = "_ZPB") {
        const element_ptr pElement = make_element(&file, uFunction, content.bytes, pCompId);
        return format(*pElement);
    }

    std::string format(trace_queue_element& element) {
        CaptureStdout();
        EXPECT_EQ(format_record(&element), 0);
        stdout_flush();
        return GetCapturedStdout();
    }

    temp_dir directory;
    std::string templatePath;
    trace_file_header header{};
    char name[8] = "a.trc";
    trace_file file{};
};

/// A record and its texts by the template and in raw output.
struct body_case {
    uint16_t uFunction;
    body content;
    std::string byFormat;
    std::string raw;
};

std::string hex_line(const std::string& digits, const std::string& characters) {
    std::string line = " 0x00000000:" + digits;
    line.resize(49, ' ');
    return line + "|" + characters + std::string(16 - characters.size(), ' ') + "|\n";
}

TEST_F(record_test, bodies_by_format_and_raw) {
    const std::string threeValues = "[0]=0x00000001 [1]=0x00000002 [2]=0x00000003\n";
    const body_case cases[] = {
        {TRC_FUNC_ID, body().u32(1), " bare\n", " id=0x00000001\n"},
        {TRC_FUNC_INT32, body().u32(2).u32(0xFFFFFFFB), " one -5\n",
         " id=0x00000002 val=0xfffffffb\n"},
        {TRC_FUNC_UINT32, body().u32(0x10).u32(5), " id=0x00000010 val=0x00000005\n",
         " id=0x00000010 val=0x00000005\n"},
        {TRC_FUNC_UINT32_2, body().u32(3).u32(1).u32(2), " two 1 and 2\n",
         " id=0x00000003 val1=0x00000001 val2=0x00000002\n"},
        {TRC_FUNC_INT64, body().u32(4).u64(1ULL << 40), " wide 1099511627776\n",
         " id=0x00000004 val=0x0000010000000000\n"},
        {TRC_FUNC_INT64_2, body().u32(5).u64(0xAB).u64(~0ULL), " wide ab, -1\n",
         " id=0x00000005 val1=0x00000000000000ab val2=0xffffffffffffffff\n"},
        // What no parameter took is dumped.
        {TRC_FUNC_VALUES, body().u32(6).u32(3).u32(1).u32(2).u32(3),
         " array 1 2\n\n" + hex_line(" 03000000", "...."), " id=0x00000006 " + threeValues},
        {TRC_FUNC_VALUES, body().u32(0x20).u32(6).u32(0).u32(1).u32(2).u32(3).u32(4).u32(5),
         " id=0x00000020\n [0]=0x00000000 [1]=0x00000001 [2]=0x00000002 [3]=0x00000003\n"
         " [4]=0x00000004 [5]=0x00000005\n",
         " id=0x00000020\n [0]=0x00000000 [1]=0x00000001 [2]=0x00000002 [3]=0x00000003\n"
         " [4]=0x00000004 [5]=0x00000005\n"},
        {TRC_FUNC_VALUES64, body().u32(4).u32(1).u64(0x0000000100000002), " wide 4294967298\n",
         " id=0x00000004 [0]=0x0000000100000002\n"},
        {TRC_FUNC_VALUES64, body().u32(5).u32(3).u64(1).u64(2).u64(3),
         " wide 1, 2\n\n" + hex_line(" 03000000 00000000", "........"),
         " id=0x00000005\n [0]=0x0000000000000001 [1]=0x0000000000000002\n"
         " [2]=0x0000000000000003\n"},
        {TRC_FUNC_STRINGS, body().u32(0xFFFFFFFF).u32(1).u32(2).string("a"), "  a\n", "  a\n"},
        {TRC_FUNC_STRINGS, body().u32(7).u32(2).u32(5).string("a").string("b\n"), " a;b\n\n",
         " id=0x00000007 \n [0]=a\n [1]=b\n"},
        {TRC_FUNC_STRING, body().string("text\nmore\n"), "  text\n more\n", "  text\n more\n"},
        {TRC_FUNC_DISCARDED, body(),
         " kelvo: 2625-152 Unable to keep up with program being traced, trace records have been "
         "discarded at this point.\n",
         " kelvo: 2625-152 Unable to keep up with program being traced, trace records have been "
         "discarded at this point.\n"},
    };
    for (const body_case& test : cases) {
        SCOPED_TRACE(testing::Message() << "kind " << test.uFunction << ": " << test.raw);
        anchor.bRaw = 0;
        EXPECT_EQ(format(test.uFunction, test.content), test.byFormat);
        anchor.bRaw = 1;
        EXPECT_EQ(format(test.uFunction, test.content), test.raw);
    }
}

TEST_F(record_test, data_blocks) {
    const std::string heading = " ----------------- Data Block ";
    const body content = body().u32(8).u32(4).block("\x05").block("abc").block("\x07").block("Z");
    EXPECT_EQ(format(TRC_FUNC_DATA, content), " data 5 abc\n third %hd\n\n" + hex_line(" 07", ".") +
                                                  heading + "3 ----------------\n" +
                                                  hex_line(" 5a", "Z"));
    // A format without parameters leaves every block to be written.
    EXPECT_EQ(format(TRC_FUNC_DATA, body().u32(9).u32(1).block("Z")),
              " plain data\n" + heading + "0 ----------------\n" + hex_line(" 5a", "Z"));

    anchor.bRaw = 1;
    const body two = body().u32(8).u32(2).block("Z").block("");
    EXPECT_EQ(format(TRC_FUNC_DATA, two), " id=0x00000008\n" + heading + "0 ----------------\n" +
                                              hex_line(" 5a", "Z") + heading +
                                              "1 ----------------\n");
    anchor.bBrief = 1;
    EXPECT_EQ(format(TRC_FUNC_DATA, two), " id=0x00000008\n");
    anchor.bRaw = 0;
    EXPECT_EQ(format(TRC_FUNC_DATA, content), " data 5 abc\n");
}

TEST_F(record_test, data_blocks_that_overrun_end_with_the_record) {
    anchor.bRaw = 1;
    const std::string start = " id=0x00000008\n ----------------- Data Block 0 ----------------\n";
    for (const int32_t iLength : {-1, INT32_MIN, INT32_MAX, 3}) {
        SCOPED_TRACE(iLength);
        EXPECT_EQ(format(TRC_FUNC_DATA, body().u32(8).u32(~0U).put(iLength).text("ab")),
                  start + hex_line(" 6162", "ab"));
    }
}

/// An error record with a string argument and an integer one. The strings stand
/// behind the arguments in the order of the fields.
body error_body(uint32_t uTraceId, const std::string& ffdcId, const std::string& defaultText) {
    const auto uFirst = static_cast<uint32_t>(sizeof(trace_record_error) + 2 * 16);
    const uint32_t uFile = uFirst + 5, uArgument = uFile + 4, uFfdc = uArgument + 5;
    const auto uDefault = static_cast<uint32_t>(uFfdc + ffdcId.size() + 1);
    body content;
    content.u32(uTraceId).u32(0xFFFFFFFE).u32(12).u32(uFirst).u32(uFile);
    content.u32(ffdcId.empty() ? 0 : uFfdc).u32(1).u32(2).u32(0);
    content.u32(defaultText.empty() ? 0 : uDefault).u32(2);
    content.u32(CU_ERROR_ARG_CHAR_STR).u32(0).u64(uArgument);
    content.u32(CU_ERROR_ARG_INT).u32(0).u64(28);
    return content.string("open").string("a.c").string("sda1").string(ffdcId).text(defaultText);
}

TEST_F(record_test, error_records) {
    const std::string plain = "Error -2 was returned from \"open\" on line 12 in file \"a.c\".\n";
    EXPECT_EQ(format(TRC_FUNC_ERROR, error_body(0x30, "", "")), " id=0x00000030" + plain);
    // The default text runs to the end of the record without a NUL.
    EXPECT_EQ(format(TRC_FUNC_ERROR, error_body(0x30, "ff-1", "disk %s: %d")),
              " id=0x00000030" + plain + "    Message=disk sda1: 28\n    FFDCID=\"ff-1\"\n");
    EXPECT_EQ(format(TRC_FUNC_ERROR, error_body(10, "ff-1", "disk %s: %d")),
              " error -2 open 12 a.c (disk sda1: 28) <ff-1>\n");
    EXPECT_EQ(format(TRC_FUNC_ERROR, error_body(10, "", "")), " error -2 open 12 a.c () <>\n");

    const std::string longText(10000, 'm');
    EXPECT_THAT(format(TRC_FUNC_ERROR, error_body(0x30, "", longText)),
                HasSubstr("Message=" + longText + "\n"));
}

TEST_F(record_test, error_records_with_false_offsets_and_counts) {
    body content = error_body(0x30, "ff-1", "text %s%s%s");
    const auto patch = [&content](size_t uOffset, uint64_t uValue, size_t uSize) {
        std::memcpy(content.bytes.data() + uOffset - sizeof(trace_record_header), &uValue, uSize);
    };
    for (const size_t uField : {40U, 44U, 48U})
        patch(uField, 0xFFFFFFF0, 4);
    patch(offsetof(trace_record_error, argCount), 0xFFFFFFFF, 4);
    patch(sizeof(trace_record_error) + 8, ~0ULL, 8);
    const std::string text = format(TRC_FUNC_ERROR, content);
    EXPECT_THAT(text, HasSubstr("returned from \"\" on line 12 in file \"\".\n    Message=text "));
    EXPECT_EQ(text.find("FFDCID"), std::string::npos);

    // More arguments than usual.
    body many;
    many.u32(0x30).u32(1).u32(2).u32(0).u32(0).u32(0).u32(0).u32(0).u32(0);
    many.u32(static_cast<uint32_t>(sizeof(trace_record_error) + 40 * 16)).u32(40);
    for (uint64_t i = 0; i < 40; i++)
        many.u32(CU_ERROR_ARG_LONG_LONG).u32(0).u64(1000 + i);
    EXPECT_THAT(format(TRC_FUNC_ERROR, many.string("%40$lld!")), HasSubstr("Message=1039!\n"));
}

TEST_F(record_test, start_records_replace_the_time_base) {
    std::strcpy(anchor.outputOptions, "t");
    constexpr uint64_t uHour = 3600ULL * 1000000000;
    const auto start = [](uint64_t uBase) { return body().u32(3).u32(0x1F).u64(uBase).u64(5); };

    // The tracing library's own start record is shown by its own base, with the
    // library's own format; the others by the base so far.
    const std::string banner = " ******************* Trace Started - Pid = 31 "
                               "**********************\n";
    EXPECT_EQ(format(TRC_FUNC_START, start(uHour), "____"), " 01:00:00.000000000 " + banner);
    EXPECT_EQ(format(TRC_FUNC_START, start(2 * uHour)),
              " 01:00:00.000000000 id=0x00000003[0]=0x0000001f\n");
    EXPECT_EQ(file.timeInfo, (cu_timeinfo{2 * uHour, 5}));

    EXPECT_EQ(format(TRC_FUNC_TIME_CALIBRATION, body().u64(3 * uHour).u64(5)), "");
    EXPECT_EQ(format(TRC_FUNC_RESTART, start(4 * uHour).string("core"), "____"),
              " 03:00:00.000000000  ***** Trace restarting after client core dump -  Pid = 31 "
              "***** \n                    core\n");
    anchor.bRaw = 1;
    EXPECT_EQ(format(TRC_FUNC_RESTART, start(5 * uHour).string("core")),
              " 04:00:00.000000000 id=0x00000003[0]=0x0000001f\n                    core\n");
    EXPECT_EQ(file.timeInfo, (cu_timeinfo{5 * uHour, 5}));
}

TEST_F(record_test, records_of_the_tracing_library_end_the_nesting) {
    const std::string entered = format(TRC_FUNC_ID, body().u32(11));
    EXPECT_EQ(entered + format(TRC_FUNC_ID, body().u32(1)), " enter\n   bare\n");
    EXPECT_EQ(format(TRC_FUNC_VALUES, body().u32(32).u32(0)), "   id=0x00000020\n");
    EXPECT_EQ(format(TRC_FUNC_VALUES, body().u32(32).u32(0), "____"), " id=0x00000020\n");
    EXPECT_EQ(format(TRC_FUNC_ID, body().u32(1)), " bare\n");
}

TEST_F(record_test, unknown_kinds) {
    std::strcpy(anchor.outputOptions, "c");
    for (const unsigned uFunction : {0U, 18U, 20U, 0xFFFFU}) {
        CaptureStderr();
        EXPECT_EQ(format(static_cast<uint16_t>(uFunction), body().u32(1)), " _ZPB\n");
        EXPECT_EQ(GetCapturedStderr(),
                  "kelvo: 2625-149 Internal Error, unknown trace record type found.\n\n");
    }
}

TEST_F(record_test, a_template_without_memory_leaves_the_record_open) {
    std::strcpy(anchor.outputOptions, "c");
    const element_ptr pValue = make_element(&file, TRC_FUNC_INT32, body().u32(2).u32(2).bytes);
    const element_ptr pData = make_element(&file, TRC_FUNC_DATA, body().u32(8).u32(0).bytes);
    CaptureStdout();
    bCallocFails = true;
    EXPECT_EQ(format_record(pValue.get()), 1);
    EXPECT_EQ(format_record(pData.get()), 0); // a data record is closed all the same
    bCallocFails = false;
    EXPECT_EQ(format_record(pValue.get()), 0);
    stdout_flush();
    EXPECT_EQ(GetCapturedStdout(), " _ZPB\n _ZPB\n _ZPB one 2\n");
}

/// Formats the record in normal, raw and brief mode.
void format_in_all_modes(trace_queue_element& element) {
    for (const int iMode : {0, 1, 2}) {
        anchor.bRaw = iMode == 1;
        anchor.bBrief = iMode == 2;
        EXPECT_EQ(format_record(&element), 0);
    }
}

TEST_F(record_test, hostile_bodies_of_every_kind_stay_inside_the_record) {
    std::mt19937 generator(1);
    const auto random = [&generator] { return static_cast<uint32_t>(generator()); };
    const auto small = [&random] { return random() % 140; };
    const uint32_t words[] = {0, 1, 2, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF};
    CaptureStdout();
    CaptureStderr();
    for (uint32_t uFunction = 0; uFunction <= 20; uFunction++) {
        const uint16_t uKind =
            uFunction == 20 ? uint16_t{TRC_FUNC_DISCARDED} : static_cast<uint16_t>(uFunction);
        for (uint32_t uRound = 0; uRound < 300; uRound++) {
            body content;
            content.u32(uRound % 13);
            for (uint32_t i = 0; i < uRound % 29; i++)
                content.u32(random() % 2 ? words[random() % std::size(words)] : small());
            content.bytes.resize(content.bytes.size() + random() % 4, 's');
            // Cut through the fixed fields too.
            if (uRound < 60)
                content.bytes.resize(uRound, '%');
            const element_ptr pElement =
                make_element(&file, uKind, content.bytes, uRound % 5 ? "_ZPB" : "____");
            format_in_all_modes(*pElement);
            // A length that names more, or less, than the block holds.
            pElement->header.length += 1000;
            format_in_all_modes(*pElement);
            pElement->header.length = random() % 28;
            format_in_all_modes(*pElement);
        }
    }
    stdout_flush();
    GetCapturedStderr();
    EXPECT_LT(GetCapturedStdout().size(), 100U << 20);
}

TEST_F(record_test, what_is_left_of_cut_bodies_is_written) {
    // What is left of an array and of strings is written by the layout of the
    // number as written.
    anchor.bRaw = 1;
    EXPECT_EQ(format(TRC_FUNC_VALUES, body().u32(1).u32(~0U).u32(9).text("xyz")),
              " id=0x00000001\n [0]=0x00000009\n");
    EXPECT_EQ(format(TRC_FUNC_STRINGS, body().u32(1).u32(~0U).u32(~0U).string("a").text("b")),
              " id=0x00000001 \n [0]=a\n [1]=b\n");
    EXPECT_EQ(format(TRC_FUNC_UINT64_2, body().u32(1).u64(2).u32(3)),
              " id=0x00000001 val1=0x0000000000000002 val2=0x0000000000000000\n");
}

} // namespace
