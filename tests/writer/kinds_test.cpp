// The bodies of the record kinds, byte by byte.
#include "raw_trace.h"
#include "reference_reader.h"
#include "temp_dir.h"
#include "trace_writer.h"

#include <gtest/gtest.h>

namespace {

using bytes = std::vector<std::byte>;

TEST(trace_kinds, write_their_bodies) {
    const temp_dir dir;
    trace_writer w;
    ASSERT_EQ(w.create(dir.file("trace").c_str()), TRACE_WRITER_OK);
    const trace_origin o{"_TST", 0x1A2B, 0x1122334455667788};
    const auto u32 = [](uint32_t value) { return value; };
    struct expectation {
        uint16_t function;
        bytes body;
    };
    std::vector<expectation> expected;
    const auto add = [&](trace_writer_status status, uint16_t function, bytes body) {
        EXPECT_EQ(status, TRACE_WRITER_OK) << function;
        body.resize((body.size() + 3) & ~size_t{3});
        expected.push_back({function, std::move(body)});
    };
    const bytes b0, b1 = raw_bytes("x"), b5 = raw_bytes("abcde");
    const trace_bytes blocks[] = {b1, b0, b5};
    const uint32_t values[] = {1, 0xFFFFFFFF};
    const uint64_t values64[] = {1, uint64_t(-2)};
    const std::string_view strings[] = {"a", "bc", ""};
    const char nul = 0;
    const cu_timeinfo base{111, 222};

    add(w.append_id(o, 1), 1, raw_bytes(u32(1)));
    add(w.append_string(o, std::string_view("cut\0here", 8)), 2, raw_bytes("cut", nul));
    add(w.append_data(o, 3, blocks), 3,
        raw_bytes(u32(3), u32(3), u32(1), "x", nul, nul, nul, u32(0), u32(5), "abcde"));
    add(w.append_int32(o, 4, -4), 4, raw_bytes(u32(4), int32_t{-4}));
    add(w.append_int32_2(o, 5, -5, 6), 5, raw_bytes(u32(5), int32_t{-5}, int32_t{6}));
    add(w.append_uint32(o, 6, 66), 6, raw_bytes(u32(6), u32(66)));
    add(w.append_uint32_2(o, 7, 7, 77), 7, raw_bytes(u32(7), u32(7), u32(77)));
    add(w.append_int64(o, 8, -8), 8, raw_bytes(u32(8), int64_t{-8}));
    add(w.append_int64_2(o, 9, -9, 9), 9, raw_bytes(u32(9), int64_t{-9}, int64_t{9}));
    add(w.append_uint64(o, 10, 1), 10, raw_bytes(u32(10), uint64_t{1}));
    add(w.append_uint64_2(o, 11, 1, 2), 11, raw_bytes(u32(11), uint64_t{1}, uint64_t{2}));
    add(w.append_values(o, 12, values), 12, raw_bytes(u32(12), u32(2), values));
    add(w.append_values64(o, 13, values64), 13, raw_bytes(u32(13), u32(2), values64));
    add(w.append_strings(o, 15, strings), 15,
        raw_bytes(u32(15), u32(3), u32(6), "a", nul, "bc", nul, nul));
    add(w.append_start(o, 16, 99, base), 16, raw_bytes(u32(16), u32(99), base));
    add(w.append_time_calibration(o, base), 17, raw_bytes(base));
    add(w.append_restart(o, 19, 98, base, "again"), 19,
        raw_bytes(u32(19), u32(98), base, "again", nul));
    add(w.append_discarded(o), 0xFFFE, {});

    const std::vector<ring_element> records = list_ring(w.mapping()).records();
    ASSERT_EQ(records.size(), expected.size());
    for (size_t i = 0; i < records.size(); ++i) {
        const trace_record_header header = records[i].header;
        SCOPED_TRACE(unsigned{header.function});
        EXPECT_EQ(unsigned{header.function}, expected[i].function);
        EXPECT_EQ(uint32_t{header.threadId}, 0x1A2BU);
        EXPECT_EQ(uint64_t{header.timeStamp}, 0x1122334455667788U);
        EXPECT_EQ(std::string_view(header.compId, 4), "_TST");
        EXPECT_EQ(records[i].body, expected[i].body);
    }
}

TEST(trace_kinds, error_record_finds_its_strings) {
    const temp_dir dir;
    trace_writer w;
    ASSERT_EQ(w.create(dir.file("trace").c_str()), TRACE_WRITER_OK);
    cu_error_arg_t args[4]{};
    args[0].cu_arg_type = CU_ERROR_ARG_INT;
    args[0].cu_arg_value.cu_arg_int = -7;
    args[1].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    args[1].cu_arg_value.cu_arg_char_str = "first";
    args[2].cu_arg_type = CU_ERROR_ARG_CHAR_STR; // a null string
    args[3].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    args[3].cu_arg_value.cu_arg_char_str = "second";
    trace_error_content error;
    error.traceId = 14;
    error.errorId = 5;
    error.lineNumber = 123;
    error.funcName = "function";
    error.msgSetNumber = 3;
    error.msgNumber = 4;
    error.defMsg = "text %d %s";
    error.args = args;
    ASSERT_EQ(w.append_error({"_TST"}, error), TRACE_WRITER_OK);
    ASSERT_EQ(w.append_error({"_TST"}, {}), TRACE_WRITER_OK);

    const std::vector<ring_element> records = list_ring(w.mapping()).records();
    ASSERT_EQ(records.size(), 2U);
    const trace_bytes record =
        load_run(w.mapping(), records[0].uAt, uint32_t{records[0].header.length});
    const auto head = load<trace_record_error>(record, 0);
    EXPECT_EQ(uint32_t{head.traceId}, 14U);
    EXPECT_EQ(uint32_t{head.errorId}, 5U);
    EXPECT_EQ(uint32_t{head.lineNumber}, 123U);
    EXPECT_EQ(load_string(record, head.funcNameOffset), "function");
    EXPECT_NE(uint32_t{head.fileNameOffset}, 0U) << "always present";
    EXPECT_EQ(load_string(record, head.fileNameOffset), "");
    EXPECT_EQ(uint32_t{head.ffdcIdOffset}, 0U);
    EXPECT_EQ(uint32_t{head.msgCatNameOffset}, 0U);
    EXPECT_EQ(load_string(record, head.defMsgOffset), "text %d %s");
    EXPECT_EQ(uint32_t{head.argCount}, 4U);
    const auto arg = [&](size_t i) { return load<cu_error_arg_t>(record, 72 + 16 * i); };
    const auto offset = [&](size_t i) {
        return static_cast<size_t>(arg(i).cu_arg_value.cu_arg_long);
    };
    EXPECT_EQ(arg(0).cu_arg_value.cu_arg_int, -7);
    EXPECT_EQ(load_string(record, offset(1)), "first");
    EXPECT_EQ(offset(2), 0U);
    EXPECT_EQ(load_string(record, offset(3)), "second");
    EXPECT_LE(offset(3) + sizeof("second"), record.size());
}

} // namespace
