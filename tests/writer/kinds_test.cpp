// The bodies of the record kinds, byte by byte; where and when they are written.
#include "raw_trace.h"
#include "reference_reader.h"
#include "temp_dir.h"
#include "trace_writer.h"

#include <algorithm>
#include <ctime>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace {

using bytes = std::vector<std::byte>;

TEST(trace_kinds, write_their_bodies) {
    const temp_dir dir;
    trace_writer w;
    ASSERT_EQ(w.create(dir.file("trace").c_str()), TRACE_WRITER_OK);
    const trace_origin o{"_TST", 0x1A2B, 0x1122334455667788};
    std::vector<std::pair<uint16_t, bytes>> expected;
    const auto add = [&](trace_writer_status status, uint16_t function, bytes body) {
        EXPECT_EQ(status, TRACE_WRITER_OK) << function;
        body.resize((body.size() + 3) & ~size_t{3});
        expected.emplace_back(function, std::move(body));
    };
    const bytes b0, b1 = raw_bytes("x"), b5 = raw_bytes("abcde");
    const trace_bytes blocks[] = {b1, b0, b5};
    const uint32_t values[] = {1, 0xFFFFFFFF};
    const uint64_t values64[] = {1, uint64_t(-2)};
    const std::string_view strings[] = {"a", "bc", ""};
    const char nul = 0;
    const cu_timeinfo base{111, 222};

    add(w.append_id(o, 1), 1, raw_bytes(1U));
    add(w.append_string(o, std::string_view("cut\0here", 8)), 2, raw_bytes("cut", nul));
    add(w.append_data(o, 3, blocks), 3, raw_bytes(3U, 3U, 1U, "x", nul, nul, nul, 0U, 5U, "abcde"));
    add(w.append_int32(o, 4, -4), 4, raw_bytes(4U, -4));
    add(w.append_int32_2(o, 5, -5, 6), 5, raw_bytes(5U, -5, 6));
    add(w.append_uint32(o, 6, 66), 6, raw_bytes(6U, 66U));
    add(w.append_uint32_2(o, 7, 7, 77), 7, raw_bytes(7U, 7U, 77U));
    add(w.append_int64(o, 8, -8), 8, raw_bytes(8U, -8L));
    add(w.append_int64_2(o, 9, -9, 9), 9, raw_bytes(9U, -9L, 9L));
    add(w.append_uint64(o, 10, 1), 10, raw_bytes(10U, 1UL));
    add(w.append_uint64_2(o, 11, 1, 2), 11, raw_bytes(11U, 1UL, 2UL));
    add(w.append_values(o, 12, values), 12, raw_bytes(12U, 2U, values));
    add(w.append_values64(o, 13, values64), 13, raw_bytes(13U, 2U, values64));
    add(w.append_strings(o, 15, strings), 15, raw_bytes(15U, 3U, 6U, "a", nul, "bc", nul, nul));
    add(w.append_start(o, 16, 99, base), 16, raw_bytes(16U, 99U, base));
    add(w.append_time_calibration(o, base), 17, raw_bytes(base));
    add(w.append_restart(o, 19, 98, base, "again"), 19, raw_bytes(19U, 98U, base, "again", nul));
    add(w.append_discarded(o), 0xFFFE, {});

    // Error records give the offsets of their strings; those of function and file are always there.
    cu_error_arg_t args[4]{{CU_ERROR_ARG_INT, 0, {-7}}}, stored[4];
    for (size_t i = 1; i < 4; ++i)
        args[i].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    std::ranges::copy(args, stored);
    args[1].cu_arg_value.cu_arg_char_str = "first";
    args[3].cu_arg_value.cu_arg_char_str = "second";
    stored[1].cu_arg_value.cu_arg_long = 157;
    stored[3].cu_arg_value.cu_arg_long = 163;
    trace_error_content error;
    error.traceId = 14;
    error.errorId = 5;
    error.lineNumber = 123;
    error.funcName = "function";
    error.msgSetNumber = 3;
    error.msgNumber = 4;
    error.defMsg = "text %d %s";
    error.args = args;
    add(w.append_error(o, error), 14,
        raw_bytes(14U, 5U, 123U, 136U, 145U, 0U, 3U, 4U, 0U, 146U, 4U, stored, "function", nul, nul,
                  "text %d %s", nul, "first", nul, "second", nul));
    add(w.append_error(o, {}), 14,
        raw_bytes(0U, 0U, 0U, 72U, 73U, 0U, 0U, 0U, 0U, 0U, 0U, nul, nul));

    const std::vector<ring_element> records = list_ring(w.mapping()).records();
    ASSERT_EQ(records.size(), expected.size());
    for (size_t i = 0; i < records.size(); ++i) {
        const auto& [function, body] = expected[i];
        EXPECT_EQ(records[i].header.function, function);
        EXPECT_EQ(records[i].header.threadId, 0x1A2BU);
        EXPECT_EQ(records[i].header.timeStamp, 0x1122334455667788U);
        EXPECT_EQ(std::string_view(records[i].header.compId, 4), "_TST");
        EXPECT_EQ(records[i].body, body) << function;
    }
}

TEST(trace_clock, knows_the_time_of_day_and_the_thread) {
    const auto time_of_day = [] {
        timespec now{};
        clock_gettime(CLOCK_REALTIME, &now);
        return static_cast<cu_nanoseconds>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
    };
    constexpr cu_nanoseconds SLACK = 1'000'000'000; // the time of day may be adjusted meanwhile
    const cu_nanoseconds before = time_of_day();
    const cu_timeinfo base = trace_time_base();
    const trace_origin here = trace_here("_TST");
    const cu_nanoseconds now = cu_time_ns(here.timeStamp, base);
    EXPECT_TRUE(now > before - SLACK && now < time_of_day() + SLACK);
    EXPECT_LE(here.timeStamp, trace_now());

    EXPECT_EQ(here.threadId, static_cast<uint32_t>(gettid()));
    std::thread([&here] { EXPECT_NE(trace_thread_id(), here.threadId); }).join();
    const pid_t child = fork();
    if (child == 0)
        _exit(trace_thread_id() == static_cast<uint32_t>(getpid()) ? 0 : 1);
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

} // namespace
