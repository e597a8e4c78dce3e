// The command line of kelvo_sample.
#pragma once

#include <cstdint>
#include <string>

/// What the records of the traces are, in the order of --profile.
enum class sample_profile { STORY, PLAIN, NUMBERS, STRINGS, DATA, MIXED };

/// What becomes of the first file when it is complete, in the order of --damage.
enum class sample_damage { NONE, GAP, TORN, FUNCTION, FILLERS, HEADER };

/// What was asked for. Times are nanoseconds, sizes bytes.
struct sample_options {
    std::string directory = "kelvo-samples";
    sample_profile profile = sample_profile::STORY;
    bool bNumbered = false; ///< records carry a running number per file instead of random ones

    uint32_t uFiles = 3;
    uint64_t uRecords = 0;      ///< per file; 0: the profile's own number, without end when live
    uint64_t uFileSize = 0;     ///< 0: what holds all records; 1 MiB when live
    uint32_t uRecordSize = 128; ///< of the records whose length is free
    uint32_t uThreads = 4;      ///< per file
    unsigned uAddrBits = 64;    ///< addressing mode in the file headers: 32 or 64
    uint64_t uSeed = 1;
    sample_damage damage = sample_damage::NONE;

    uint64_t uStart = 0;         ///< time of the first record, since the epoch
    uint64_t uStep = 10'000;     ///< from one record to the next
    bool bSequential = false;    ///< the files' times follow each other, not interleaved
    bool bDistinctBases = false; ///< every file counts time from a moment of its own
    int32_t iMinutesWest = -60;  ///< time zone in the file headers

    bool bLive = false;
    uint64_t uRate = 5;    ///< live: records per second and file; 0: as fast as can be
    uint64_t uSeconds = 0; ///< live: stop after this long; 0: until a signal
};

enum class options_result {
    RUN,     ///< make what the options say
    DONE,    ///< the help was printed
    INVALID, ///< the message is printed
};

/// Reads the command line into `*pOptions`. Prints help on standard output and
/// messages on standard error.
options_result parse_options(int argc, char** argv, sample_options* pOptions);
