#include "live_support.h"

#include <chrono>
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace {

std::string text_of(unsigned int uFile, uint64_t uNumber) {
    return ' ' + std::to_string(uFile) + ' ' + std::to_string(uNumber) + ' ' +
           std::string(uNumber % 47, 'x');
}

} // namespace

void wait_for_reader(trace_writer& writer) {
    const auto& header = *reinterpret_cast<const trace_file_header*>(writer.mapping().data());
    for (int i = 0; i < 60'000; ++i) {
        writer.poll();
        if (__atomic_load_n(&header.uSeqLock, __ATOMIC_ACQUIRE) != TRC_SEQ_NO_READER &&
            __atomic_load_n(&header.uTailReq, __ATOMIC_ACQUIRE) == 0)
            return;
        usleep(1000);
    }
    ADD_FAILURE() << "nobody reads the file";
}

live_files::live_files(const std::string& sFirst, const std::string& sSecond, uint32_t uFileSize) {
    EXPECT_EQ(writers[0].create(sFirst.c_str(), {.uFileSize = uFileSize}), TRACE_WRITER_OK);
    EXPECT_EQ(writers[1].create(sSecond.c_str(), {.uFileSize = uFileSize}), TRACE_WRITER_OK);
}

void live_files::write(uint64_t uCount, bool bRetry) {
    for (uint64_t uNumber = 1; uNumber <= uCount; ++uNumber)
        for (unsigned int uFile = 0; uFile < 2; ++uFile) {
            const std::string sText = text_of(uFile, uNumber);
            const std::chrono::nanoseconds now =
                std::chrono::steady_clock::now().time_since_epoch();
            const trace_origin origin{"_LIV", uFile, static_cast<uint64_t>(now.count())};
            int status;
            while ((status = writers[uFile].append_string(origin, sText)) == TRACE_WRITER_DROPPED &&
                   (bRetry || uNumber == uCount))
                usleep(100);
            if (status == TRACE_WRITER_OK)
                ++uWritten;
            else
                dropped.emplace(uFile, uNumber);
        }
}

live_writer::live_writer(const std::string& sFirst, const std::string& sSecond) {
    int ready[2];
    EXPECT_EQ(pipe2(ready, O_CLOEXEC), 0);
    m_pid = fork();
    if (m_pid == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        live_files files(sFirst, sSecond, 262144);
        (void)!::write(ready[1], "", 1);
        files.write(UINT64_MAX, true);
    }
    close(ready[1]);
    char cReady;
    EXPECT_EQ(::read(ready[0], &cReady, 1), 1);
    close(ready[0]);
}

void live_writer::kill() {
    if (m_pid > 0) {
        ::kill(m_pid, SIGKILL);
        waitpid(m_pid, nullptr, 0);
    }
    m_pid = -1;
}

bool record_stream::next() {
    for (std::string sLine; !(sLine = m_command.read_line()).empty();) {
        unsigned int uSeqNumber, uFile;
        unsigned long long uNumber;
        if (sscanf(sLine.c_str(), "[%*u] 0x%x %u %llu", &uSeqNumber, &uFile, &uNumber) != 3) {
            if (uCount != 0 || (!sLine.starts_with('\t') && sLine.find("Filename: ") == sLine.npos))
                ADD_FAILURE() << "no record: " << sLine;
            continue;
        }
        uint64_t& uLast = last.at(uFile);
        EXPECT_TRUE(sLine.ends_with(text_of(uFile, uNumber))) << sLine;
        EXPECT_GT(uNumber, uLast) << sLine;
        // Only the last record of a killed writer may be left without its number.
        EXPECT_FALSE(m_lacksNumber.at(uFile)) << uLast << " was taken before it had its number";
        for (uint64_t uMissing = uLast + 1; uLast != 0 && uMissing < uNumber; ++uMissing)
            missing.emplace(uFile, uMissing);
        m_lacksNumber[uFile] = uSeqNumber % 2 != 0;
        uLast = uNumber;
        ++uCount;
        return true;
    }
    return false;
}

void record_stream::finish() {
    read(UINT64_MAX);
    const command_result result = m_command.wait();
    EXPECT_EQ(result.status, 0) << "signal " << result.signo;
    EXPECT_EQ(result.sErr, "");
}
