// The records of the profiles other than the story: quick to make, one like the
// other, for measurements and for tests of long and live files.
#pragma once

#include "live.h"
#include "sample_file.h"

/// Records per file when the options name no number.
inline constexpr uint64_t PROFILE_RECORDS = 1000;

/// Makes all files of the profile and adds them, closed, to `*pFiles`; with
/// `pLive` (else null) appends to them for as long as it says. Returns false
/// when the message is printed.
bool make_profile(const sample_options& options, live_pace* pLive, sample_files* pFiles);
