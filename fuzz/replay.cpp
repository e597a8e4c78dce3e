// Runs a fuzz target over the files of the directories that are named, without
// libFuzzer: what once broke it must not break it again, with any compiler.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <system_error>
#include <vector>

namespace {

std::vector<char> content_of(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// Runs the files of one directory and returns their number.
size_t replay(const char* pDirectory) {
    std::error_code error;
    size_t uFiles = 0;
    for (const auto& entry : std::filesystem::directory_iterator(pDirectory, error)) {
        if (!entry.is_regular_file(error))
            continue;
        // A breakdown is preceded by the name of its file.
        printf("%s\n", entry.path().c_str());
        fflush(stdout);
        const std::vector<char> content = content_of(entry.path());
        const redirected_output dropped;
        LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(content.data()), content.size());
        ++uFiles;
    }
    return uFiles;
}

} // namespace

int main(int argc, char** argv) {
    set_up_hostile_runs();
    size_t uFiles = 0;
    for (int i = 1; i < argc; ++i)
        uFiles += replay(argv[i]);
    printf("%zu files\n", uFiles);
    return uFiles > 0 ? 0 : 1;
}
