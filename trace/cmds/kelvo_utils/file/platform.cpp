#include "platform.h"

#include <iterator>

namespace {

/// Display names by platform code.
constexpr const char* platform_map[] = {
    "Unknown",       "Solaris SPARC",   "Linux x86-64",   "Windows x86",
    "Linux PowerPC", "Linux PowerPC64", "Solaris x86-64", "FreeBSD x86-64",
    "macOS x86-64",  "Linux ARM64",     "HP-UX Itanium",  "Linux S390x",
};
static_assert(std::size(platform_map) == 12);

} // namespace

const char* platform_name(uint8_t platform) {
    return platform < std::size(platform_map) ? platform_map[platform] : platform_map[0];
}

int is_LE_linux_platform(uint8_t platform) {
    return platform == 2 || platform == 9;
}

int is_BE_linux_platform(uint8_t platform) {
    return platform == 4 || platform == 5 || platform == 11;
}

int is_BE_unix_platform(uint8_t platform) {
    return platform == 1;
}

int is_compatible_platform_to_run(uint8_t platform) {
    return is_LE_linux_platform(platform); // as the one this program runs on, 2
}
