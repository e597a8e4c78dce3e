// hostile_writer SEED FILE...: maps trace files and rewrites their words for as
// long as it lives: lengths, offsets, kinds, numbers, times, texts.
//
// Most damage flickers: a word is changed and put right soon after, so that a
// reader gets far into the file and meets the change between two looks at the
// same word. Some of it plays a writer that goes on: the oldest position moves
// to some record, which gets the number that the reader waits for.
#include "trace_file_fmt.h"
#include "trace_load.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <random>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

std::mt19937 random_numbers;

uint32_t random_below(size_t uEnd) {
    return static_cast<uint32_t>(random_numbers() % uEnd);
}

constexpr uint32_t HEADER_WORDS[] = {offsetof(trace_file_header, uProperties),
                                     offsetof(trace_file_header, uFlags),
                                     offsetof(trace_file_header, uOffset),
                                     offsetof(trace_file_header, uSeqLock),
                                     offsetof(trace_file_header, uTailReq),
                                     offsetof(trace_file_header, uActualFileSize),
                                     offsetof(trace_file_header, timeInfo),
                                     offsetof(trace_file_header, uOldestRecordOffset),
                                     offsetof(trace_file_header, uOldestRecordOffset),
                                     offsetof(trace_file_header, uOldestRecordOffset),
                                     offsetof(trace_file_header, program),
                                     offsetof(trace_file_header, tz_offset)};

constexpr uint32_t RECORD_WORDS[] = {
    offsetof(trace_record_header, length),    offsetof(trace_record_header, length),
    offsetof(trace_record_header, length),    offsetof(trace_record_header, function),
    offsetof(trace_record_header, function),  offsetof(trace_record_header, seqNumber),
    offsetof(trace_record_header, compId),    offsetof(trace_record_header, threadId),
    offsetof(trace_record_header, timeStamp), offsetof(trace_record_header, timeStamp) + 4};

class victim {
public:
    bool open(const char* pPath) {
        const int fd = ::open(pPath, O_RDWR | O_CLOEXEC);
        struct stat status {};
        if (fd < 0 || fstat(fd, &status) != 0)
            return false;
        m_size = static_cast<uint32_t>(status.st_size);
        void* const pMap = mmap(nullptr, m_size, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        close(fd);
        if (pMap == MAP_FAILED)
            return false;
        m_pMap = static_cast<std::byte*>(pMap);
        m_sound.assign(m_pMap, m_pMap + m_size);
        const trace_bytes sound(m_sound);
        uint32_t uLength;
        for (uint32_t uAt = sizeof(trace_file_header); m_size - uAt >= sizeof(trace_record_header);
             uAt += uLength) {
            m_records.push_back(uAt);
            uLength = load<uint32_t>(sound, uAt);
            if (uLength < sizeof(trace_record_header) || uLength > m_size - uAt)
                break;
        }
        return true;
    }

    void harm() {
        switch (random_below(8)) {
        case 0:
        case 1:
            flicker(HEADER_WORDS[random_below(std::size(HEADER_WORDS))]);
            break;
        case 2:
        case 3:
        case 4:
            flicker(some_record() + RECORD_WORDS[random_below(std::size(RECORD_WORDS))]);
            break;
        case 5:
            flicker(random_below(m_size / 4) * 4);
            break;
        case 6:
            go_on();
            break;
        default:
            if (random_below(500) == 0)
                memcpy(m_pMap, m_sound.data(), m_size);
        }
    }

private:
    uint32_t some_record() {
        return m_records[random_below(m_records.size())];
    }

    uint32_t load_word(uint32_t uAt) const {
        return __atomic_load_n(reinterpret_cast<const uint32_t*>(m_pMap + uAt), __ATOMIC_RELAXED);
    }

    void store_word(uint32_t uAt, uint32_t uValue) {
        if (uAt <= m_size - sizeof(uValue))
            __atomic_store_n(reinterpret_cast<uint32_t*>(m_pMap + uAt), uValue, __ATOMIC_RELAXED);
    }

    uint32_t bad_value(uint32_t uAt) {
        const uint32_t values[] = {0,
                                   1,
                                   27,
                                   28,
                                   29,
                                   36,
                                   m_size - 1,
                                   m_size,
                                   m_size + 1,
                                   m_size - 28,
                                   m_size - uAt,
                                   0x7FFFFFFF,
                                   0x80000000,
                                   0xFFFFFFFE,
                                   0xFFFFFFFF,
                                   0xFFF,
                                   some_record(),
                                   random_below(m_size),
                                   random_below(20),
                                   random_below(0x100000000)};
        return values[random_below(std::size(values))];
    }

    void flicker(uint32_t uAt) {
        uint32_t uSound;
        memcpy(&uSound, m_sound.data() + std::min<size_t>(uAt, m_size - 4), sizeof uSound);
        store_word(uAt, bad_value(uAt));
        for (uint32_t uSpins = random_below(2000); uSpins > 0; --uSpins)
            __asm__ volatile("" ::: "memory");
        if (random_below(200) != 0)
            store_word(uAt, uSound);
    }

    void go_on() {
        const uint32_t uRecord = some_record();
        store_word(offsetof(trace_file_header, uOldestRecordOffset), uRecord);
        store_word(uRecord + offsetof(trace_record_header, seqNumber),
                   load_word(offsetof(trace_file_header, uSeqLock)) + 2 * random_below(2));
    }

    std::byte* m_pMap = nullptr;
    uint32_t m_size = 0;
    std::vector<std::byte> m_sound;
    std::vector<uint32_t> m_records;
};

} // namespace

int main(int argc, char** argv) {
    if (argc < 3)
        return 2;
    random_numbers.seed(static_cast<uint32_t>(strtoul(argv[1], nullptr, 10)));
    std::vector<victim> victims(static_cast<size_t>(argc - 2));
    for (size_t i = 0; i < victims.size(); ++i)
        if (!victims[i].open(argv[i + 2]))
            return 1;
    puts("ready");
    fflush(stdout);
    for (;;)
        victims[random_below(victims.size())].harm();
}
