// What libFuzzer, or the replay of a corpus, calls.
#pragma once

#include <cstddef>
#include <cstdint>

extern "C" {

/// Prepares the process; called once, with the program's arguments.
int LLVMFuzzerInitialize(int* pArgc, char*** pArgv);

/// One run over `uSize` bytes. Leaves nothing behind that a later run could
/// see, and no memory that grows with their number. Returns 0.
int LLVMFuzzerTestOneInput(const uint8_t* pData, size_t uSize);
}
