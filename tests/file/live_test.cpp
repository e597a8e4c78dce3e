// A reader and a writer at work in one mapping at the same time.
#include "first_record.h"
#include "ring.h"
#include "temp_dir.h"
#include "trace_writer.h"
#include "walk.h"

#include <atomic>
#include <gtest/gtest.h>
#include <thread>

namespace {

constexpr uint32_t RECORDS = 200'000;

/// Appends records whose value is their place, of changing lengths, and waits
/// for the reader where it leaves no room.
void write_records(trace_writer& writer) {
    const std::byte block[64]{};
    const trace_origin origin{.compId = "_LIV", .threadId = 1, .timeStamp = 1};
    for (uint32_t i = 0; i < RECORDS; ++i) {
        const trace_bytes value = std::as_bytes(std::span(&i, 1));
        for (;;) {
            const trace_bytes rest(block, i % 16 * 4);
            const uint64_t uDropped = writer.counts().uDropped;
            writer.append(TRC_FUNC_UINT32, origin, {value, rest});
            if (writer.counts().uDropped == uDropped)
                break;
            std::this_thread::yield();
        }
    }
}

/// Reads until the last record came; returns how many came out of their turn.
uint32_t read_records(trace_file& file) {
    uint32_t uNext = 0;
    uint32_t uOutOfTurn = 0;
    trace_record_header header;
    while (uNext < RECORDS) {
        const walk_result here = is_last_record(&file, &header);
        if (here == WALK_CORRUPT)
            return RECORDS;
        if (here == WALK_NO_RECORD) {
            std::this_thread::yield();
            continue;
        }
        if (header.function == TRC_FUNC_UINT32) {
            const trace_bytes record = record_bytes(&file, file.pCurRec, header.length);
            if (load<uint32_t>(record, sizeof(header)) != uNext++)
                ++uOutOfTurn;
        }
        if (step_to_next_record(&file, header) != WALK_RECORD)
            return RECORDS;
    }
    return uOutOfTurn;
}

TEST(Live, reader_sees_every_record_once_and_whole) {
    const temp_dir dir;
    trace_writer writer;
    trace_writer_options options;
    options.uFileSize = 4096; // some thousand turns
    options.bForgetDeadReaders = false;
    ASSERT_EQ(writer.create(dir.file("live.trc").c_str(), options), TRACE_WRITER_OK);

    trace_file file{};
    char name[] = "live.trc";
    file.pName = name;
    file.pHeader = reinterpret_cast<trace_file_header*>(writer.mapping().data());
    file.pMapEnd = ring_position(&file, writer.mapping().size());
    file.pWrap = ring_position(&file, options.uOffset);
    ASSERT_EQ(find_first_record(&file), 0);

    std::thread thread(write_records, std::ref(writer));
    const uint32_t uOutOfTurn = read_records(file);
    if (uOutOfTurn == RECORDS) // a writer must not wait for a reader that gave up
        store_seq_lock(file.pHeader, TRC_SEQ_NO_READER);
    thread.join();
    EXPECT_EQ(uOutOfTurn, 0U);
}

} // namespace
