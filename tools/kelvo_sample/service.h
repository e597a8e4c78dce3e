// The cast of the story: one run of a small service, made of three programs
// that each write a trace file, and the voices of their threads.
#pragma once

#include "bodies.h"
#include "live.h"
#include "sample_file.h"

#include <array>
#include <initializer_list>

enum service_program : unsigned { GATEWAY, ORDERS, STORAGE, PROGRAMS };

/// What a program's texts and files are called.
struct program_part {
    const char* pFileName; ///< of the trace file, without ".trc"
    std::string_view compId;
    sample_program program;
};
extern const program_part PARTS[PROGRAMS];

/// One run of the service. Time passes with every record, by as much as the
/// record says; what a program says that has no file, or a full one, is not
/// written.
class service {
public:
    service(const sample_options& sampleOptions, live_pace* pLivePace, uint64_t uSeed,
            uint64_t uStart)
        : options(sampleOptions), random(uSeed), pLive(pLivePace), uNow(uStart) {}

    /// Gives a program its file, which takes as many records as the options say.
    void join(service_program program, sample_file* pFile) {
        files[program] = pFile;
    }

    sample_file* file(service_program program) const {
        return files[program];
    }

    /// Nothing more can be written.
    bool is_over() const;

    /// Lets `append` write one record, `uDelay` microseconds after the last.
    template <class F> void write(service_program program, std::string_view compId,
                                  uint32_t uThread, uint32_t uDelay, const F& append) {
        uint64_t uTime = 0;
        if (!take_turn(program, uDelay, &uTime))
            return;
        sample_file& to = *files[program];
        if (!to.note(append(to.writer, to.origin(compId, uThread, uTime))))
            bEnd = true;
    }

    uint64_t now() const {
        return uNow;
    }

    const sample_options& options;
    random_numbers random;
    uint32_t uRequests = 0; ///< so far
    uint32_t uFailed = 0;   ///< of these

private:
    bool take_turn(service_program program, uint32_t uDelay, uint64_t* pTime);

    std::array<sample_file*, PROGRAMS> files{};
    live_pace* pLive;
    uint64_t uNow; ///< wall time
    bool bEnd = false;
};

/// One thread of a program. `uDelay` is in microseconds.
class voice {
public:
    voice(service& ofService, service_program ofProgram, uint32_t uThreadId)
        : theService(ofService), program(ofProgram), uThread(uThreadId) {}

    void id(uint32_t uDelay, uint32_t traceId) const;
    void text(uint32_t uDelay, std::string_view text) const;
    void int32(uint32_t uDelay, uint32_t traceId, int32_t value) const;
    void int32_2(uint32_t uDelay, uint32_t traceId, int32_t value1, int32_t value2) const;
    void uint32(uint32_t uDelay, uint32_t traceId, uint32_t value) const;
    void uint32_2(uint32_t uDelay, uint32_t traceId, uint32_t value1, uint32_t value2) const;
    void int64(uint32_t uDelay, uint32_t traceId, int64_t value) const;
    void int64_2(uint32_t uDelay, uint32_t traceId, int64_t value1, int64_t value2) const;
    void uint64(uint32_t uDelay, uint32_t traceId, uint64_t value) const;
    void uint64_2(uint32_t uDelay, uint32_t traceId, uint64_t value1, uint64_t value2) const;
    void values(uint32_t uDelay, uint32_t traceId, std::initializer_list<uint32_t> values) const;
    void values64(uint32_t uDelay, uint32_t traceId, std::initializer_list<uint64_t> values) const;
    void strings(uint32_t uDelay, uint32_t traceId,
                 std::initializer_list<std::string_view> strings) const;
    void data(uint32_t uDelay, uint32_t traceId, std::initializer_list<sample_bytes> blocks) const;
    void error(uint32_t uDelay, const trace_error_content& error) const;
    /// With the time base of the program's file.
    void start(uint32_t uDelay) const;

    // Records of the tracing library itself.
    void restart(uint32_t uDelay, std::string_view why) const;
    void time_calibration(uint32_t uDelay) const;
    void discarded(uint32_t uDelay) const;

private:
    template <class F> void write(uint32_t uDelay, const F& append) const {
        theService.write(program, PARTS[program].compId, uThread, uDelay, append);
    }
    template <class F> void write_internal(uint32_t uDelay, const F& append) const {
        theService.write(program, TRC_COMP_INTERNAL, uThread, uDelay, append);
    }
    cu_timeinfo time_base() const;

    service& theService;
    service_program program;
    uint32_t uThread;
};
