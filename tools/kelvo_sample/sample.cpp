#include "sample.h"

#include "damage.h"
#include "live.h"
#include "profiles.h"
#include "story.h"
#include "templates.h"

#include <cstdio>
#include <filesystem>
#include <optional>

namespace {

/// The directory as a shell takes it.
std::string quoted(const std::string& text) {
    constexpr std::string_view PLAIN = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                       "0123456789/._-+,@%:=";
    if (text.find_first_not_of(PLAIN) == std::string::npos)
        return text;
    std::string sResult = "'";
    for (const char c : text)
        sResult += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return sResult + "'";
}

std::string kelvo_command(const sample_options& options, const char* pLetters) {
    const std::string sDirectory = quoted(options.directory);
    return std::string("kelvo ") + pLetters + "-t " + sDirectory + " " + sDirectory + "/*.trc";
}

bool make_directory(const std::string& path) {
    std::error_code error;
    std::filesystem::create_directories(path, error);
    if (!error && !std::filesystem::is_directory(path, error) && !error)
        error = std::make_error_code(std::errc::not_a_directory);
    if (error)
        fprintf(stderr, "kelvo_sample: cannot make the directory %s: %s\n", path.c_str(),
                error.message().c_str());
    return !error;
}

/// Other traces in the directory would be printed along.
void warn_of_others(const sample_options& options, size_t uOwn) {
    size_t uTraces = 0;
    std::error_code error;
    for (std::filesystem::directory_iterator it(options.directory, error), end; !error && it != end;
         it.increment(error))
        uTraces += it->path().extension() == ".trc";
    if (uTraces > uOwn)
        fprintf(stderr, "kelvo_sample: note: %s holds %zu other trace%s, which are left alone\n",
                options.directory.c_str(), uTraces - uOwn, uTraces - uOwn == 1 ? "" : "s");
}

const char* plural(uint64_t uNumber) {
    return uNumber == 1 ? "" : "s";
}

void tell_what_was_made(const sample_options& options, const sample_files& files) {
    uint64_t uRecords = 0;
    uint64_t uLost = 0;
    for (const auto& pFile : files) {
        uRecords += pFile->uGiven;
        uLost += pFile->counts.uGivenUp;
    }
    const size_t uTemplates = templates_of(options.profile).size();
    printf("Made %zu trace%s (%llu record%s, %llu of them overwritten since) and %zu template%s; "
           "print with: %s\n",
           files.size(), plural(files.size()), static_cast<unsigned long long>(uRecords),
           plural(uRecords), static_cast<unsigned long long>(uLost), uTemplates, plural(uTemplates),
           kelvo_command(options, "").c_str());
}

} // namespace

int make_sample(const sample_options& options) {
    if (!make_directory(options.directory) || !write_templates(options.directory, options.profile))
        return 1;
    std::optional<live_pace> pace;
    if (options.bLive)
        pace.emplace(options, "Appending to " + std::to_string(options.uFiles) + " trace" +
                                  plural(options.uFiles) +
                                  "; watch with: " + kelvo_command(options, "-f ") + "\n");
    sample_files files;
    live_pace* const pLive = pace ? &*pace : nullptr;
    const bool bGood = options.profile == sample_profile::STORY
                           ? make_story(options, pLive, &files)
                           : make_profile(options, pLive, &files);
    if (!bGood)
        return 1;
    const bool bDamage = options.damage != sample_damage::NONE;
    if (bDamage && !damage_file(options.directory + "/" + files[0]->name, options.damage))
        return 1;
    warn_of_others(options, files.size());
    if (options.bLive)
        report_live(files);
    else
        tell_what_was_made(options, files);
    if (bDamage)
        printf("%s is damaged.\n", files[0]->name.c_str());
    return 0;
}
