// Templates: reading a file of many entries, and finding formats again.
#include "store.h"
#include "template_file.h"

#include "../temp_directory.h"
#include "records.h"

#include <benchmark/benchmark.h>

#include <string>

namespace {

/// The text of a template with ids from 1 to `uEntries`.
std::string template_text(int64_t iEntries) {
    std::string sText = "# A component that has much to say.\n";
    for (int64_t i = 1; i <= iEntries; ++i)
        sText += std::to_string(i) + " \"item %u, %d units at %08x cents, from %s\" # entry\n";
    return sText;
}

struct file_closer {
    void operator()(FILE* pFile) const {
        fclose(pFile);
    }
};

/// A template made from `sText`; empty when that failed.
template_owner read_text(std::string& sText) {
    const std::unique_ptr<FILE, file_closer> pFile(fmemopen(sText.data(), sText.size(), "r"));
    template_owner pTemplate = make_template("_VAL");
    int bInsufficient = 0;
    if (pFile == nullptr || pTemplate == nullptr ||
        read_template(pTemplate.get(), "_VAL.tpl", pFile.get(), &bInsufficient) != 0)
        return {};
    return pTemplate;
}

void parse_template(benchmark::State& state) {
    std::string sText = template_text(state.range(0));
    for (auto _ : state)
        if (!read_text(sText))
            state.SkipWithError("the template was refused");
    state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(parse_template)->ArgName("entries")->Arg(10)->Arg(1000)->Arg(100'000);

/// One format after the other, in an order that is not that of the file.
void look_up_entry(benchmark::State& state) {
    std::string sText = template_text(state.range(0));
    const template_owner pTemplate = read_text(sText);
    if (!pTemplate) {
        state.SkipWithError("the template was refused");
        return;
    }
    const auto uEntries = static_cast<uint32_t>(state.range(0));
    uint32_t uId = 0;
    for (auto _ : state) {
        uId = (uId + 7919) % uEntries;
        benchmark::DoNotOptimize(find_format(pTemplate.get(), uId + 1, -1));
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(look_up_entry)->ArgName("entries")->Arg(10)->Arg(1000)->Arg(100'000);

/// The way from a record's component, one of so many, to its format.
void look_up_component(benchmark::State& state) {
    const temp_directory directory;
    const int64_t iComponents = state.range(0);
    std::string sIds;
    for (int64_t i = 0; i < iComponents; ++i) {
        char id[8];
        snprintf(id, sizeof id, "C%03d", static_cast<int>(i));
        sIds += id;
        FILE* const pFile = fopen((directory.path() + "/" + id + ".tpl").c_str(), "w");
        if (pFile == nullptr || fputs("1 \"%u\"\n", pFile) < 0 || fclose(pFile) != 0)
            state.SkipWithError("no template could be written");
    }
    std::string sPath = directory.path();
    char* const pKept = anchor.pTemplatePath;
    anchor.pTemplatePath = sPath.data();
    trace_file file{};
    int64_t i = 0;
    bool bFound = true;
    for (auto _ : state) {
        i = (i + 7) % iComponents;
        int bInsufficient = 0;
        bFound = get_format_from_file(&file, &sIds[static_cast<size_t>(4 * i)], 1, -1,
                                      &bInsufficient) != nullptr &&
                 bFound;
    }
    if (!bFound)
        state.SkipWithError("a format was not found");
    free_template_info();
    anchor.pTemplatePath = pKept;
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(look_up_component)->ArgName("components")->Arg(1)->Arg(10)->Arg(500);

} // namespace
