// Platform codes of trace files: their display names and byte-order families.
#pragma once

#include <cstdint>

/// Display name of a platform code; "Unknown" for 0 and for codes above 11.
const char* platform_name(uint8_t platform);

int is_LE_linux_platform(uint8_t platform);
int is_BE_linux_platform(uint8_t platform);
int is_BE_unix_platform(uint8_t platform);

/// 1 when a file of that platform can be read here, else 0.
int is_compatible_platform_to_run(uint8_t platform);
