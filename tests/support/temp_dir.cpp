#include "temp_dir.h"

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <system_error>

temp_dir::temp_dir() {
    const char* const pBase = getenv("TMPDIR");
    directory = std::string(pBase != nullptr && *pBase != '\0' ? pBase : "/tmp") + "/kelvo.XXXXXX";
    if (mkdtemp(directory.data()) == nullptr) {
        perror(directory.c_str());
        abort();
    }
}

temp_dir::~temp_dir() {
    std::error_code error;
    std::filesystem::remove_all(directory, error);
}

std::string temp_dir::file(std::string_view name) const {
    return directory + "/" + std::string(name);
}
