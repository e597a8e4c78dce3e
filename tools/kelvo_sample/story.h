// The story: a shop's gateway, order service and storage daemon at work.
#pragma once

#include "live.h"
#include "sample_file.h"

/// Makes the story's files and adds them, closed, to `*pFiles`; with `pLive`
/// (else null) goes on telling for as long as it says. Returns false when the
/// message is printed.
bool make_story(const sample_options& options, live_pace* pLive, sample_files* pFiles);
