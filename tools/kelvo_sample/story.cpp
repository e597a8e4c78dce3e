#include "story.h"

#include "scenes.h"
#include "templates.h"

namespace {

constexpr uint64_t SECOND_NS = 1'000'000'000;
constexpr uint64_t LIVE_FILE_SIZE = 1 << 20;
/// In the story as it is told the storage daemon has written more than its ring
/// holds.
constexpr uint64_t TOLD_FILE_SIZE = 8192;
constexpr uint64_t TOLD_WRAPPED_SIZE = 1856;
constexpr int TOLD_SEGMENTS = 48;
constexpr int SHORT_SEGMENTS = 3;
/// More than records take on the average, and than the longest ones add.
constexpr uint64_t BYTES_PER_RECORD = 112;
constexpr uint64_t BYTES_FOR_LONG_ONES = 2048;

/// How far the storage daemon's clock is behind until it is calibrated.
constexpr uint64_t CLOCK_ERROR_NS = 1'800'000;
/// How long the machines have been up, by program. The gateway's clock counts
/// from the epoch.
constexpr uint64_t UPTIME_NS[PROGRAMS] = {0, 5 * 3600 * SECOND_NS, 19 * 86400 * SECOND_NS};

struct telling {
    const sample_options& options;
    live_pace* pLive;
    sample_files* pFiles;

    bool is_as_told() const {
        return options.uRecords == 0 && pLive == nullptr;
    }

    uint64_t file_size(service_program program) const {
        if (options.uFileSize != 0)
            return options.uFileSize;
        if (pLive != nullptr)
            return LIVE_FILE_SIZE;
        if (options.uRecords == 0)
            return program == STORAGE ? TOLD_WRAPPED_SIZE : TOLD_FILE_SIZE;
        if (options.uRecords > UINT32_MAX / BYTES_PER_RECORD)
            return UINT64_MAX;
        return (BYTES_FOR_LONG_ONES + options.uRecords * BYTES_PER_RECORD) & ~uint64_t{3};
    }

    /// The scenes from the opening on, number `uScene`, for as long as the
    /// story is told.
    void play(service& s, uint64_t uScene) const {
        if (is_as_told()) {
            play_opening(s, TOLD_SEGMENTS);
            play_order(s, true);
            play_refusal(s);
            play_order(s, false);
            play_totals(s);
        } else if (uScene == 0) {
            play_opening(s, SHORT_SEGMENTS);
        } else if (uScene % 16 == 0) {
            play_totals(s);
        } else if (s.random.below(6) == 0) {
            play_refusal(s);
        } else {
            play_order(s, s.random.below(3) == 0);
        }
    }
};

/// Opens the files of run `uRun` of the service and gives them to it.
bool open_files(const telling& t, uint32_t uRun, service* pService, uint64_t uStart) {
    for (unsigned i = 0; i < PROGRAMS && uRun * PROGRAMS + i < t.options.uFiles; ++i) {
        const auto program = static_cast<service_program>(i);
        const uint64_t uSize = t.file_size(program);
        if (uSize > UINT32_MAX) {
            fputs("kelvo_sample: so many records need more than the 4 GiB of a trace file; choose a"
                  " --file-size, so that the ring wraps\n",
                  stderr);
            return false;
        }
        const program_part& part = PARTS[i];
        const std::string sRun = uRun != 0 ? "-" + std::to_string(uRun + 1) : "";
        sample_program traced = part.program;
        traced.uPid += uRun;
        traced.uNode = static_cast<uint16_t>(uRun + 1);
        const cu_timeinfo base =
            i == GATEWAY ? cu_timeinfo{0, 0} : cu_timeinfo{uStart, UPTIME_NS[i] + uRun};
        cu_timeinfo headerBase = base;
        if (i == STORAGE)
            headerBase.timeinfo1 -= CLOCK_ERROR_NS;
        t.pFiles->push_back(std::make_unique<sample_file>());
        sample_file* const pFile = t.pFiles->back().get();
        if (!pFile->open(t.options, part.pFileName + sRun + ".trc", traced, uSize, base,
                         headerBase))
            return false;
        pService->join(program, pFile);
        if (t.pLive != nullptr)
            t.pLive->add(pFile);
    }
    return true;
}

bool close_files(const sample_files& files) {
    bool bGood = true;
    for (const auto& pFile : files)
        if (pFile->writer.is_open())
            bGood = pFile->close() && bGood;
    return bGood;
}

uint32_t runs_of(const sample_options& options) {
    return (options.uFiles + PROGRAMS - 1) / PROGRAMS;
}

uint64_t seed_of(const sample_options& options, uint32_t uRun) {
    return options.uSeed * 0x10001 + uRun;
}

/// One run of the service after the other.
bool tell(const telling& t) {
    uint64_t uStart = t.options.uStart;
    for (uint32_t uRun = 0; uRun < runs_of(t.options); ++uRun) {
        service s(t.options, nullptr, seed_of(t.options, uRun), uStart);
        if (!open_files(t, uRun, &s, uStart))
            return false;
        for (uint64_t uScene = 0; !s.is_over() && (uScene == 0 || !t.is_as_told()); ++uScene)
            t.play(s, uScene);
        if (!close_files(*t.pFiles))
            return false;
        uStart = t.options.bSequential ? s.now() : uStart + 137'000;
    }
    return true;
}

/// All runs of the service at the same time, scene by scene.
bool tell_live(const telling& t) {
    const uint64_t uStart = time_of_day();
    std::vector<std::unique_ptr<service>> services;
    for (uint32_t uRun = 0; uRun < runs_of(t.options); ++uRun) {
        services.push_back(
            std::make_unique<service>(t.options, t.pLive, seed_of(t.options, uRun), uStart));
        if (!open_files(t, uRun, services.back().get(), uStart))
            return false;
    }
    bool bGoOn = true;
    for (uint64_t uScene = 0; bGoOn; ++uScene) {
        bGoOn = false;
        for (const auto& pService : services) {
            if (pService->is_over())
                continue;
            t.play(*pService, uScene);
            bGoOn = true;
        }
    }
    return close_files(*t.pFiles);
}

} // namespace

bool make_story(const sample_options& options, live_pace* pLive, sample_files* pFiles) {
    const telling t{options, pLive, pFiles};
    return pLive != nullptr ? tell_live(t) : tell(t);
}
