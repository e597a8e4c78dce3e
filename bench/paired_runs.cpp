#include "paired_runs.h"

#include <algorithm>
#include <filesystem>

namespace {

double median_of(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t uHalf = values.size() / 2;
    return values.size() % 2 != 0 ? values[uHalf] : (values[uHalf - 1] + values[uHalf]) / 2;
}

} // namespace

program_pair::program_pair(const std::string& sKelvo, const std::string& sDirectory, bool bRaw) {
    words[0] = {sKelvo, "-t", sDirectory};
    words[1] = {FLOOR_PROGRAM};
    std::vector<std::string> traces;
    for (const auto& entry : std::filesystem::directory_iterator(sDirectory))
        if (entry.path().extension() == ".trc")
            traces.push_back(entry.path());
    std::sort(traces.begin(), traces.end());
    for (command_words& program : words) {
        if (bRaw)
            program.push_back("-r");
        program.insert(program.end(), traces.begin(), traces.end());
    }
}

paired_runs::paired_runs(const run_settings& settings, const program_pair& programs,
                         const std::string& sDirectory) {
    for (unsigned u = 0; u < settings.uRepeat; ++u)
        run_once(settings, programs, sDirectory);
}

void paired_runs::run_once(const run_settings& settings, const program_pair& programs,
                           const std::string& sDirectory) {
    for (size_t i = 0; i < 2; ++i)
        runs[i].push_back(
            run_measured(programs.words[i], settings.target, sDirectory + "/output.txt"));
}

double paired_runs::median(size_t uProgram, double run_cost::*pFigure) const {
    std::vector<double> values;
    for (const run_cost& run : runs[uProgram])
        values.push_back(run.*pFigure);
    return median_of(values);
}

double paired_runs::median_ratio(double run_cost::*pFigure) const {
    std::vector<double> ratios;
    for (size_t i = 0; i < runs[0].size(); ++i)
        ratios.push_back(runs[0][i].*pFigure / std::max(runs[1][i].*pFigure, 1e-6));
    return median_of(ratios);
}

uint64_t make_values(const std::string& sDirectory, uint64_t uFiles, uint64_t uPerFile,
                     const std::string& sTimes) {
    run_quietly({MAKE_VALUES_PROGRAM, sDirectory, std::to_string(uFiles), std::to_string(uPerFile),
                 sTimes});
    return uFiles * uPerFile;
}
