// Runs a fuzz target over the files of the directories that are named, without
// libFuzzer: what once broke it must not break it again, with any compiler. Also
// over copies of them that are changed in a few places, the same in every run.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <system_error>
#include <vector>

namespace {

std::vector<char> content_of(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

constexpr unsigned int CHANGED_COPIES = 100;

void run(const std::vector<char>& content) {
    LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(content.data()), content.size());
}

/// Up to eight bytes set anew, half of them to one that stands elsewhere in the
/// input, and now and then the end cut off.
std::vector<char> changed(std::vector<char> content, std::mt19937& random) {
    const auto below = [&random](size_t uLimit) { return random() % uLimit; };
    for (size_t uChanges = 1 + below(8); uChanges > 0 && !content.empty(); --uChanges)
        content[below(content.size())] =
            below(2) == 0 ? content[below(content.size())] : static_cast<char>(random());
    if (below(4) == 0)
        content.resize(below(content.size() + 1));
    return content;
}

/// Runs the files of one directory and returns their number.
size_t replay(const char* pDirectory) {
    std::error_code error;
    size_t uFiles = 0;
    std::mt19937 random(20240229);
    for (const auto& entry : std::filesystem::directory_iterator(pDirectory, error)) {
        if (!entry.is_regular_file(error))
            continue;
        // A breakdown is preceded by the name of its file.
        printf("%s\n", entry.path().c_str());
        fflush(stdout);
        const std::vector<char> content = content_of(entry.path());
        const redirected_output dropped;
        run(content);
        for (unsigned int i = 0; i < CHANGED_COPIES; ++i)
            run(changed(content, random));
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
