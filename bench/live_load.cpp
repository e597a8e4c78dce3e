#include "live_load.h"

#include "trace_writer.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <ctime>
#include <fstream>
#include <memory>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using clock_type = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr uint32_t RECORD_LENGTH = 64;
constexpr uint32_t VALUES = 7; // of 4 bytes: they fill the record
constexpr auto PATIENCE = 60s; // for kelvo, before the first record and behind the last

class loaded_files {
public:
    loaded_files(const std::string& sDirectory, const live_load& load)
        : m_writers(std::make_unique<trace_writer[]>(load.uFiles)), m_load(load) {
        std::ofstream(sDirectory + "/_VAL.tpl")
            << "1 \"job %u: %u bytes in %d us, state %08x%z\"\n";
        trace_writer_options options;
        options.uFileSize =
            MIN_HDR_SIZE_FOR_TZ + RECORD_LENGTH * (load.uRate * load.uRoomMs / 1000 + 2);
        for (unsigned u = 0; u < load.uFiles; ++u) {
            paths.push_back(sDirectory + "/live-" + std::to_string(u) + ".trc");
            if (m_writers[u].create(paths.back().c_str(), options) != TRACE_WRITER_OK)
                give_up("cannot make " + paths.back());
        }
    }

    /// Answers the readers until each has found its first record.
    void wait_for_readers() {
        wait_until("not every file is read", [](trace_writer& writer, const auto& header) {
            writer.poll();
            return load(header.uSeqLock) != TRC_SEQ_NO_READER && load(header.uTailReq) == 0;
        });
    }
    /// Waits until the readers have passed all records.
    void wait_until_read() {
        wait_until("the readers do not come to the end",
                   [](trace_writer& writer, const auto& header) {
                       return load(header.uSeqLock) == writer.next_seq_number();
                   });
    }

    /// Appends what is due, evenly spread, for the seconds asked for. Returns the
    /// longest time for which this process itself did not get round to it, seconds.
    double write() {
        const auto begin = clock_type::now();
        const uint64_t uAll = uint64_t{m_load.uRate} * m_load.uSeconds;
        double longest = 0, last = 0;
        for (uint64_t uDone = 0; uDone < uAll;) {
            const double now = std::chrono::duration<double>(clock_type::now() - begin).count();
            longest = std::max(longest, now - last);
            last = now;
            const uint64_t uDue = std::min(uAll, static_cast<uint64_t>(now * m_load.uRate));
            for (; uDone < uDue; ++uDone)
                append_to_all(static_cast<uint32_t>(uDone));
            std::this_thread::sleep_for(1ms);
        }
        return longest;
    }

    trace_writer_counts counts() const {
        trace_writer_counts sum;
        for (unsigned u = 0; u < m_load.uFiles; ++u) {
            sum.uAppended += m_writers[u].counts().uAppended;
            sum.uDropped += m_writers[u].counts().uDropped;
        }
        return sum;
    }

    std::vector<std::string> paths;

private:
    static uint32_t load(const uint32_t& uWord) {
        return __atomic_load_n(&uWord, __ATOMIC_ACQUIRE);
    }

    template <class done> void wait_until(const char* pFailure, done isDone) {
        const auto end = clock_type::now() + PATIENCE;
        for (unsigned u = 0; u < m_load.uFiles; ++u) {
            const auto& header =
                *reinterpret_cast<const trace_file_header*>(m_writers[u].mapping().data());
            while (!isDone(m_writers[u], header)) {
                if (clock_type::now() > end)
                    give_up(pFailure);
                for (unsigned uOther = u; uOther < m_load.uFiles; ++uOther)
                    m_writers[uOther].poll();
                std::this_thread::sleep_for(1ms);
            }
        }
    }

    void append_to_all(uint32_t uNumber) {
        timespec now{};
        clock_gettime(CLOCK_REALTIME, &now);
        uint64_t uTime =
            static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
        const uint32_t values[VALUES] = {uNumber, uNumber % 1000, uNumber % 77,
                                         uNumber * 2654435761U};
        for (unsigned u = 0; u < m_load.uFiles; ++u)
            if (m_writers[u].append_values({"_VAL", 1, uTime++}, 1, values) < TRACE_WRITER_OK)
                give_up("cannot append a record");
    }

    std::unique_ptr<trace_writer[]> m_writers;
    live_load m_load;
};

/// Takes what comes through a pipe for as long as there is somebody to write it.
void take_output(int fd) {
    if (fd >= 0)
        std::thread([fd = dup(fd)] {
            char buffer[65536];
            while (read(fd, buffer, sizeof buffer) > 0)
                ;
            close(fd);
        }).detach();
}

} // namespace

void measure_live_load(const std::string& sKelvo, const std::string& sDirectory,
                       output_target target, const live_load& load) {
    loaded_files files(sDirectory, load);
    command_words words{sKelvo, "-f", "-t", sDirectory};
    words.insert(words.end(), files.paths.begin(), files.paths.end());
    const auto begin = clock_type::now();
    const auto since = [](clock_type::time_point from) {
        return std::chrono::duration<double>(clock_type::now() - from).count();
    };
    const std::string sFile = target == output_target::PIPE          ? ""
                              : target == output_target::NULL_DEVICE ? "/dev/null"
                                                                     : sDirectory + "/output.txt";
    piped_child kelvo(words, sFile);
    take_output(kelvo.descriptor());
    files.wait_for_readers();
    const double taken = since(begin);
    const auto writing = clock_type::now();
    const uint64_t uCpu = kelvo.cpu_time();
    const double longest = files.write();
    const double wall = since(writing);
    const double cpu = static_cast<double>(kelvo.cpu_time() - uCpu) / 1e9;
    const auto written = clock_type::now();
    kelvo.look();
    files.wait_until_read();
    const double behind = since(written);
    const trace_writer_counts counts = files.counts();
    printf("\nFollowing %u files that get %u records a second each, for %.1f s, and hold %u ms:\n"
           "%llu records written (the longest break of their writer was %.1f ms), %llu dropped\n"
           "all files taken after %.2f s; %.1f %% of a processor, %.0f ns a record; %llu threads; "
           "%.1f MiB private; the readers were through %.1f ms after the last record\n",
           load.uFiles, load.uRate, wall, load.uRoomMs,
           static_cast<unsigned long long>(counts.uAppended), 1000 * longest,
           static_cast<unsigned long long>(counts.uDropped), taken, 100 * cpu / wall,
           cpu * 1e9 / static_cast<double>(counts.uAppended),
           static_cast<unsigned long long>(kelvo.threads()),
           static_cast<double>(kelvo.private_memory()) / (1024.0 * 1024), 1000 * behind);
    kelvo.terminate();
}
