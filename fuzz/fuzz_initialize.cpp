// Makes a libFuzzer program drop the output of what it runs: text for standard
// output, and the warnings about damage, which would cost more time than all
// the rest. libFuzzer's own text and the sanitizers' reports still appear.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include <algorithm>
#include <string_view>
#include <vector>

int LLVMFuzzerInitialize(int* pArgc, char*** pArgv) {
    static char dropOutput[] = "-close_fd_mask=3";
    static std::vector<char*> arguments(*pArgv, *pArgv + *pArgc);
    const bool bChosen = std::any_of(arguments.begin(), arguments.end(), [](const char* pArgument) {
        return std::string_view(pArgument).starts_with("-close_fd_mask=");
    });
    if (!bChosen)
        arguments.insert(arguments.begin() + 1, dropOutput);
    *pArgc = static_cast<int>(arguments.size());
    arguments.push_back(nullptr);
    *pArgv = arguments.data();
    set_up_hostile_runs();
    return 0;
}
