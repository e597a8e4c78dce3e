// A writer that rewrites every word of the files while the command reads them:
// lengths, offsets, kinds, numbers, times, texts. In a sanitized build a read
// outside a record or a mapping is reported.
//
// Most damage flickers: a word is changed and put right soon after, so that a
// reader gets far into the file and meets the change between two looks at the
// same word. Some of it plays a writer that goes on: the oldest position moves
// to some record, which gets the number that the reader waits for.
#include "faults_support.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <random>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

std::mt19937 random_numbers;

uint32_t random_below(size_t uEnd) {
    return static_cast<uint32_t>(random_numbers() % uEnd);
}

class victim {
public:
    explicit victim(const std::string& path)
        : m_sound(read_file(path)), m_size(static_cast<uint32_t>(m_sound.size())) {
        const int fd = open(path.c_str(), O_RDWR | O_CLOEXEC);
        void* const pMap = mmap(nullptr, m_size, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        if (pMap == MAP_FAILED)
            _exit(1);
        m_pMap = static_cast<std::byte*>(pMap);
        for (uint32_t uAt = sizeof(trace_file_header);
             lies_inside(m_sound, uAt, sizeof(trace_record_header));
             uAt += load<uint32_t>(m_sound, uAt))
            m_records.push_back(uAt);
    }

    void harm() {
        switch (random_below(8)) {
        case 0:
        case 1: // the words that lead to the records, above all the oldest position
            flicker(std::min(random_below(14), 11U) * 4);
            break;
        case 2:
        case 3:
        case 4: // the header of a record, above all its length, kind and number
            flicker(some_record() + random_below(10) % 7 * 4);
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

    uint32_t* word(uint32_t uAt) {
        return reinterpret_cast<uint32_t*>(m_pMap + std::min(uAt, m_size - 4));
    }

    void store_word(uint32_t uAt, uint32_t uValue) {
        __atomic_store_n(word(uAt), uValue, __ATOMIC_RELAXED);
    }

    uint32_t bad_value(uint32_t uAt) {
        constexpr uint32_t FIXED[] = {0,     1,          27,         28,         29,        36,
                                      0xFFF, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFE, 0xFFFFFFFF};
        const uint32_t others[] = {m_size - 1 + random_below(3),
                                   m_size - 28,
                                   m_size - uAt,
                                   some_record(),
                                   random_below(m_size),
                                   random_below(20),
                                   random_below(0x100000000)};
        return random_below(2) == 0 ? FIXED[random_below(std::size(FIXED))]
                                    : others[random_below(std::size(others))];
    }

    void flicker(uint32_t uAt) {
        const auto uSound = load<uint32_t>(m_sound, std::min(uAt, m_size - 4));
        store_word(uAt, bad_value(uAt));
        for (uint32_t uSpins = random_below(2000); uSpins > 0; --uSpins)
            __asm__ volatile("" ::: "memory");
        if (random_below(200) != 0)
            store_word(uAt, uSound);
    }

    void go_on() {
        const uint32_t uRecord = some_record();
        const uint32_t* const pSeqLock = word(offsetof(trace_file_header, uSeqLock));
        store_word(offsetof(trace_file_header, uOldestRecordOffset), uRecord);
        store_word(uRecord + offsetof(trace_record_header, seqNumber),
                   __atomic_load_n(pSeqLock, __ATOMIC_RELAXED) + 2 * random_below(2));
    }

    std::vector<std::byte> m_sound;
    uint32_t m_size;
    std::byte* m_pMap = nullptr;
    std::vector<uint32_t> m_records;
};

[[noreturn]] void harm_files(const std::vector<std::string>& files, uint32_t uSeed) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    random_numbers.seed(uSeed);
    std::vector<victim> victims(files.begin(), files.end());
    for (;;)
        victims[random_below(victims.size())].harm();
}

class HostileWriter : public testing::Test {
protected:
    void SetUp() override {
        m_files =
            make_samples(m_dir.path(), {"-n", "3", "-r", "4000", "-p", "mixed", "-s", "256k"});
        for (const std::string& sFile : m_files)
            m_sound.push_back(read_file(sFile));
    }

    /// Reads the files once while they are harmed; where `bFollow`, until a
    /// signal, else to the end, which comes once the writer is gone at the latest.
    /// Each run has the files as they were: the last one left them in pieces.
    void read_once(uint32_t uSeed, std::vector<std::string> arguments, bool bFollow) {
        for (size_t i = 0; i < m_files.size(); ++i)
            ASSERT_TRUE(write_file(m_files[i], m_sound[i]));
        arguments.insert(arguments.end(), {"-t", m_dir.path()});
        arguments.insert(arguments.end(), m_files.begin(), m_files.end());
        const pid_t writer = fork();
        ASSERT_GE(writer, 0);
        if (writer == 0)
            harm_files(m_files, uSeed);

        command_setup setup;
        setup.sStdout = "/dev/null";
        live_command kelvo(arguments, setup);
        // Its handlers are there before it locks a file, which may take long.
        for (int i = 0; bFollow && i < 10'000 && std::ranges::none_of(m_files, is_locked); ++i)
            usleep(1000);
        usleep(120'000);
        if (bFollow)
            kelvo.send_signal(SIGINT);
        else
            kill(writer, SIGKILL);
        const command_result result = kelvo.wait();
        expect_sound_end(result);
        EXPECT_TRUE(result.status == 0 || !bFollow) << result.sErr;
        kill(writer, SIGKILL);
        int state = 0;
        EXPECT_EQ(waitpid(writer, &state, 0), writer);
        EXPECT_TRUE(WIFSIGNALED(state)) << "the writer ended by itself";
    }

    void read_for_a_while(bool bFollow) {
        const std::vector<std::string> options[] = {
            {},
            {"-r", "-o", "dticfso"},
            {"-b"},
            {"-s", "-20r"},
            {"-s", "+100r"},
            {"-l", "-s", "-1s"},
        };
        using std::chrono::steady_clock;
        const auto until =
            steady_clock::now() + std::chrono::seconds(setting("KELVO_TEST_HOSTILE_SECONDS", 4));
        for (uint32_t uRun = 0; steady_clock::now() < until && !HasFailure(); ++uRun) {
            SCOPED_TRACE(uRun);
            std::vector<std::string> chosen = options[uRun % std::size(options)];
            if (bFollow)
                chosen.push_back("-f");
            read_once(uRun + 1, chosen, bFollow);
        }
    }

    temp_dir m_dir;
    std::vector<std::string> m_files;
    std::vector<std::vector<std::byte>> m_sound;
};

TEST_F(HostileWriter, IsReadToAnEnd) {
    read_for_a_while(false);
}

TEST_F(HostileWriter, IsFollowed) {
    read_for_a_while(true);
}

} // namespace
