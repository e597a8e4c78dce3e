// A writer that rewrites every word of the files while the command reads them.
// In a sanitized build a read outside a record or a mapping is reported.
#include "faults_support.h"

#include <chrono>
#include <csignal>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using clock_type = std::chrono::steady_clock;

constexpr unsigned int READ_US = 120'000;

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
    void read_once(uint64_t uSeed, const std::vector<std::string>& options, bool bFollow) {
        for (size_t i = 0; i < m_files.size(); ++i)
            ASSERT_TRUE(write_file(m_files[i], m_sound[i]));
        std::vector<std::string> arguments = options;
        arguments.insert(arguments.end(), {"-t", m_dir.path()});
        arguments.insert(arguments.end(), m_files.begin(), m_files.end());
        std::vector<std::string> victims{std::to_string(uSeed)};
        victims.insert(victims.end(), m_files.begin(), m_files.end());

        command_setup writer_setup;
        writer_setup.sProgram = KELVO_HOSTILE_WRITER;
        live_command writer(victims, writer_setup);
        ASSERT_EQ(writer.read_line(), "ready");
        command_setup setup;
        setup.sStdout = "/dev/null";
        live_command kelvo(arguments, setup);
        usleep(READ_US);
        if (bFollow)
            kelvo.send_signal(SIGINT);
        else
            writer.send_signal(SIGKILL);
        const command_result result = kelvo.wait();
        expect_sound_end(result);
        EXPECT_TRUE(result.status == 0 || !bFollow) << result.sErr;
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
        const auto until =
            clock_type::now() + std::chrono::seconds(setting("KELVO_TEST_HOSTILE_SECONDS", 4));
        for (uint64_t uRun = 0; clock_type::now() < until && !HasFailure(); ++uRun) {
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
