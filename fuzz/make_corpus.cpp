// Makes the seed inputs of fuzz_file and fuzz_format that are no plain text, in
// the directory that is named. The same call makes the same bytes.
#include "hostile_samples.h"

#include <cstdio>
#include <filesystem>
#include <string>
#include <system_error>

namespace {

class corpus {
public:
    explicit corpus(std::filesystem::path path) : directory(std::move(path)) {
        std::error_code error;
        std::filesystem::create_directories(directory, error);
    }

    void add(const std::string& name, trace_bytes bytes) {
        bComplete = write_file((directory / name).string(), bytes) && bComplete;
    }

    bool bComplete = true;

private:
    std::filesystem::path directory;
};

/// Sets the options of a run; see fuzz_file.cpp.
raw_trace with_options(raw_trace file, uint8_t uFlags, uint32_t uNumber) {
    file.header.sp_flags = uFlags;
    file.header.sp_reuse_tm = uNumber;
    return file;
}

raw_trace of_32_bits(raw_trace file) {
    file.header.uProperties = TRC_PROP_LITTLE_ENDIAN;
    return file;
}

/// A small file, whose header ends before the fields of later versions.
raw_trace old_file() {
    raw_trace file(400);
    file.header.uVersion = 1;
    file.header.uOffset = 100;
    file.uHeaderBytes = 100;
    file.header.uOldestRecordOffset = 100;
    file.add(sample_of_kind(TRC_FUNC_STRING));
    file.add_rest();
    return file;
}

/// Fillers and records that are not yet written at the oldest position.
raw_trace unfinished_file() {
    raw_trace file(512);
    file.add_filler(40);
    for (uint32_t i = 0; i < 3; ++i)
        file.add({.function = TRC_FUNC_WRITING, .seqNumber = 0, .body = raw_bytes(i)});
    file.add({.function = TRC_FUNC_FILLER, .seqNumber = 6});
    raw_record record = sample_of_kind(TRC_FUNC_INT32);
    record.seqNumber = 8;
    file.add(record);
    file.add_rest();
    return file;
}

/// A ring in which nothing counts, so that no number tells where it ends.
raw_trace fillers_file() {
    raw_trace file(400);
    file.add_filler(60);
    file.add_filler(28);
    file.add_rest();
    return file;
}

/// Nested calls, and the formats that are named by a trace id.
raw_trace formats_file() {
    std::vector<raw_record> records;
    const auto add = [&records](uint32_t uTraceId) {
        raw_record record = sample_of_kind(TRC_FUNC_VALUES);
        record.body = raw_bytes(uTraceId, uint32_t{8}, int32_t{5}, int32_t{3}, int32_t{0x41}, 1.5,
                                int32_t{0x20}, "text", int32_t{0});
        records.push_back(record);
    };
    for (uint32_t uTraceId = 0x20; uTraceId <= 0x2E; ++uTraceId)
        add(uTraceId);
    raw_record internal = sample_of_kind(TRC_FUNC_START);
    internal.compId = TRC_COMP_INTERNAL;
    records.push_back(internal);
    internal = sample_of_kind(TRC_FUNC_VALUES);
    internal.compId = TRC_COMP_INTERNAL;
    records.push_back(internal);
    return full_ring(records);
}

void add_files(corpus& files) {
    const raw_trace wrapped = wrapped_ring(1024);
    files.add("all_kinds", full_ring_of(SAMPLE_KINDS).bytes());
    files.add("every_kind", with_options(full_ring_of(SAMPLE_KINDS), 0x10, 0).bytes());
    files.add("all_kinds_32", of_32_bits(full_ring_of(SAMPLE_KINDS)).bytes());
    for (const uint16_t& kind : SAMPLE_KINDS)
        files.add("kind_" + std::to_string(kind), full_ring_of(std::span(&kind, 1)).bytes());
    files.add("formats", formats_file().bytes());
    files.add("formats_32", of_32_bits(formats_file()).bytes());
    files.add("wrapped", wrapped.bytes());
    for (uint8_t startOptions = 1; startOptions <= 5; ++startOptions)
        files.add(
            "start_" + std::to_string(startOptions),
            with_options(wrapped, startOptions, startOptions == 5 ? 1'700'000'000 : 3).bytes());
    files.add("old", old_file().bytes());
    files.add("unfinished", unfinished_file().bytes());
    files.add("only_fillers", fillers_file().bytes());
    files.add("empty", raw_trace(256).bytes());
}

void add_formats(corpus& formats) {
    const std::vector<std::byte> numbers =
        raw_bytes(int32_t{-1}, int32_t{2}, int64_t{-3}, 4.5, 5.5F, int16_t{-6}, "text", '\0',
                  int32_t{1}, "the rest of it");
    const std::vector<std::byte> blocks =
        raw_bytes(int32_t{4}, int32_t{-1}, int32_t{1}, uint8_t{0xFF}, '\0', '\0', '\0', int32_t{2},
                  int16_t{-2}, '\0', '\0', int32_t{5}, "text", '\0', '\0', '\0', '\0', int32_t{8},
                  1.5, int32_t{20}, "twenty bytes of data");
    const std::string_view texts[] = {
        "plain text, 100%%",
        "%d %i %o %u %x %X %c",
        "%hd %hu %ld %lu %lld %llu %p",
        "%f %e %g %E %G %hf %lf %Lf",
        "%s|%S|%10.3s|%-10s|",
        "%r %T %z",
        "%*d %.*d %-*.*d %0*x",
        "%2$*1$d %3$s %1$u",
        "%'d %+d % d %#x %08d %-8d|%BNJd",
        "%2147483647d%.2147483647f",
        "%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d%d",
    };
    size_t uText = 0;
    for (const std::string_view text : texts) {
        ++uText;
        formats.add("packed_" + std::to_string(uText),
                    raw_bytes(text, '\0',
                              std::string_view(reinterpret_cast<const char*>(numbers.data()),
                                               numbers.size())));
        formats.add("blocks_" + std::to_string(uText),
                    raw_bytes(text, '\0',
                              std::string_view(reinterpret_cast<const char*>(blocks.data()),
                                               blocks.size())));
    }
}

} // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: make_corpus DIRECTORY\n");
        return 1;
    }
    const std::filesystem::path directory(argv[1]);
    corpus files(directory / "fuzz_file");
    corpus formats(directory / "fuzz_format");
    add_files(files);
    add_formats(formats);
    if (files.bComplete && formats.bComplete)
        return 0;
    fprintf(stderr, "make_corpus: cannot write to %s\n", directory.c_str());
    return 1;
}
