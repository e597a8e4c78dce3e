// Writes a small trace file: a copy of two files as one thread saw it. What the
// trace ids mean is said in the template of the component, _EXM.tpl.
#include <trace_writer.h>

#include <chrono>
#include <string_view>

int main(int argc, char** argv) {
    trace_writer trace;
    if (argc != 2 || trace.create(argv[1], {.program = "write_trace"}) != TRACE_WRITER_OK)
        return 1;
    const auto here = [] { // component, thread, nanoseconds since the epoch
        const std::chrono::nanoseconds now = std::chrono::system_clock::now().time_since_epoch();
        return trace_origin{"_EXM", 7, static_cast<uint64_t>(now.count())};
    };
    trace.append_uint32(here(), 0x10, 2);
    for (const std::string_view name : {"letter.txt", "photo.png"})
        trace.append_strings(here(), 0x11, std::span(&name, 1));
    trace.append_int32_2(here(), 0x12, 2, 0);
}
