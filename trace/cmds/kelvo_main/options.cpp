#include "options.h"

#include "broken_pipe.h"
#include "kelvo.h"
#include "messages.h"
#include "usage.h"

#include <cerrno>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <unistd.h>

namespace {

constexpr char OPTION_STRING[] = "Bhift:bro:s:lzk";
constexpr char PREFIX_LETTERS[] = "dticfso";
static_assert(sizeof PREFIX_LETTERS == sizeof anchor.outputOptions, "each letter once and a NUL");

/// Puts `pDirectories` before the default path. The path is the default one
/// alone when memory runs out.
void set_template_path(const char* pDirectories) {
    release_template_path();
    char* pPath;
    if (asprintf(&pPath, "%s:%s", pDirectories, pDefTemplatePath) >= 0)
        anchor.pTemplatePath = pPath;
}

/// Takes each of `pLetters` once, in order of appearance. Returns false, and
/// changes nothing, when one of them is unknown.
bool set_prefix_letters(const char* pLetters) {
    char chosen[sizeof anchor.outputOptions] = {};
    size_t uCount = 0;
    for (; *pLetters != '\0'; ++pLetters) {
        if (strchr(PREFIX_LETTERS, *pLetters) == nullptr)
            return false;
        if (strchr(chosen, *pLetters) == nullptr)
            chosen[uCount++] = *pLetters;
    }
    memcpy(anchor.outputOptions, chosen, sizeof chosen);
    return true;
}

/// The argument is parsed when the first file is open, in that file's time zone.
void keep_start_argument(const char* pArgument) {
    anchor.bStartRecOpt = 1;
    free(anchor.pStartRecordOptArg);
    anchor.pStartRecordOptArg = strdup(pArgument);
}

void refuse(command_line* pCommand) {
    pCommand->bUsage = 1;
    pCommand->bError = 1;
}

void take_option(int letter, command_line* pCommand) {
    switch (letter) {
    case 'f':
        anchor.bFollow = 1;
        queue_limit_enabled = 0;
        break;
    case 'z': // leaves queue_limit_enabled as it is
        anchor.bNoFileLocking = 1;
        anchor.bFollow = 0;
        break;
    case 'h':
        pCommand->bUsage = 1;
        break;
    case 'b':
        anchor.bBrief = 1;
        break;
    case 'r':
        anchor.bRaw = 1;
        break;
    case 'k':
        anchor.bLocalTZ = 1;
        break;
    case 'i':
        bShowProgress = 1;
        break;
    case 'l':
        pCommand->preLoadTemplateFiles = 1;
        break;
    case 'B':
        pCommand->bPrBaseProgName = 1;
        break;
    case 'o':
        if (!set_prefix_letters(optarg))
            refuse(pCommand);
        break;
    case 't':
        set_template_path(optarg);
        break;
    case 's':
        keep_start_argument(optarg);
        break;
    default: // getopt has said what is wrong
        refuse(pCommand);
    }
}

/// As getopt, which writes to standard error itself.
int next_option(int argc, char** argv) {
    const broken_pipe_guard quiet;
    return getopt(argc, argv, OPTION_STRING);
}

/// Reports every file that cannot be read. Returns 0, or 1 when there was one.
int check_files(std::span<char*> files) {
    int bError = 0;
    for (const char* pName : files) {
        if (access(pName, R_OK) == 0)
            continue;
        output_sys_message("%s: 2625-101 Filename \"%s\" is not accessible,", errno,
                           anchor.pProgName, pName);
        bError = 1;
    }
    return bError;
}

} // namespace

void release_template_path() {
    if (anchor.pTemplatePath != pDefTemplatePath)
        free(anchor.pTemplatePath);
    anchor.pTemplatePath = pDefTemplatePath;
}

bool read_command_line(int argc, char** argv, command_line* pCommand) {
    anchor.pProgName = argc > 0 ? argv[0] : "";
    memory_is_restricted = getenv("KELVO_USE_LOWMEM") != nullptr;

    for (int letter; (letter = next_option(argc, argv)) != -1;)
        take_option(letter, pCommand);
    if (optind < argc)
        pCommand->files = {argv + optind, argv + argc};
    if (pCommand->bUsage || pCommand->files.empty()) {
        output_usage();
        return false;
    }
    pCommand->bError = check_files(pCommand->files);
    if (pCommand->bError)
        return false;

    setlocale(LC_ALL, "");
    if (anchor.bFollow && anchor.startOptions == START_NONE) {
        anchor.startRecords = 0;
        anchor.startOptions = START_RECORDS_FROM_END;
    }
    const char* const pDirectories = getenv("KV_TR_TEMPLATE_PATH");
    if (pDirectories != nullptr && anchor.pTemplatePath == pDefTemplatePath)
        set_template_path(pDirectories);
    return true;
}
