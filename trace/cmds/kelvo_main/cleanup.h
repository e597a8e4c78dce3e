#pragma once

/// Releases the run's memory: file records, the pre-processing list and, unless
/// `bSigActive`, options, templates and buffers.
void cleanup(int bSigActive);
