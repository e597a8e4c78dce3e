// Prints the options as the list from which the completions are made; its form
// is described in completions/kelvo.options.
#include "option_table.h"

#include <algorithm>
#include <cstdio>

namespace {

/// What stands before the first piece that says more, as one line.
std::string summary_of(std::string_view help) {
    std::string sText(help.substr(0, help.find_first_of(",:;(")));
    std::ranges::replace(sText, '\n', ' ');
    sText.resize(std::min(sText.find(". "), sText.size()));
    sText.resize(sText.find_last_not_of(' ') + 1);
    return sText;
}

} // namespace

int main() {
    for (const option_row& row : option_rows()) {
        std::string sTakes;
        if (row.pChoices != nullptr)
            sTakes.append("words ").append(row.pChoices);
        else if (row.pValue != nullptr && std::string_view(row.pValue) == "DIR")
            sTakes = "dir";
        else if (row.pValue != nullptr)
            sTakes.append("text ").append(row.pExpected);
        const std::string sSays = summary_of(row.pHelp);
        const char letter[] = {row.letter, '\0'};
        printf("%s|%s|%s|%s\n", letter, row.pName, sTakes.c_str(), sSays.c_str());
    }
    return ferror(stdout) != 0 ? 1 : 0;
}
