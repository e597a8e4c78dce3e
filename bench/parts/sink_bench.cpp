// The character sink, on its way to /dev/null.
#include "sink.h"

#include "frame.h"
#include "records.h"

#include <benchmark/benchmark.h>

#include <string>

namespace {

void count_bytes(benchmark::State& state, size_t uBytes) {
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(uBytes));
}

/// Runs of one line, of as many bytes as the argument says.
void text_lines(benchmark::State& state) {
    const output_to_nowhere nowhere;
    std::string sLine(static_cast<size_t>(state.range(0)), 'x');
    sLine.back() = '\n';
    for (auto _ : state)
        output_text(sLine);
    count_bytes(state, sLine.size());
}
BENCHMARK(text_lines)->ArgName("bytes")->Arg(8)->Arg(80)->Arg(1000);

void characters(benchmark::State& state) {
    const output_to_nowhere nowhere;
    char ch = 'a';
    for (auto _ : state)
        output_char(ch = static_cast<char>(ch ^ 1));
    count_bytes(state, 1);
}
BENCHMARK(characters);

/// The lines of a record's body, each of which is indented.
void indented_lines(benchmark::State& state) {
    const output_to_nowhere nowhere;
    trace_file file{};
    anchor.iNumberFiles = 1;
    output_start_rec(&file, "_VAL", 0x1000, TRC_FUNC_DATA, 2, 200, 0, &file.timeInfo);
    const std::string sLine(std::string(60, 'x') + '\n');
    for (auto _ : state)
        output_text(sLine);
    output_end_rec();
    free_thread_info(&file);
    count_bytes(state, sLine.size());
}
BENCHMARK(indented_lines);

} // namespace
