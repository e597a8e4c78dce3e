// Writes a small trace file: a copy of two files as one thread saw it. What the
// trace ids mean is said in the template of the component, _EXM.tpl. A program
// with several threads is shown in trace_writer(3).
#include <trace_writer.h>

#include <string_view>

int main(int argc, char** argv) {
    trace_writer trace;
    if (argc != 2 || trace.create(argv[1], {.timeInfo = trace_time_base(),
                                            .program = "write_trace"}) != TRACE_WRITER_OK)
        return 1;
    trace.append_uint32(trace_here("_EXM"), 0x10, 2);
    for (const std::string_view name : {"letter.txt", "photo.png"})
        trace.append_strings(trace_here("_EXM"), 0x11, std::span(&name, 1));
    trace.append_int32_2(trace_here("_EXM"), 0x12, 2, 0);
}
