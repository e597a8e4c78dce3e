// The command line.
#pragma once

#include <span>

/// What the run needs of the command line beside `anchor`.
struct command_line {
    int bError = 0;               ///< exit status so far
    int bUsage = 0;               ///< print the usage and end
    int bPrBaseProgName = 0;      ///< -B
    int preLoadTemplateFiles = 0; ///< -l
    std::span<char*> files;       ///< the file arguments, in order; they lie in argv
};

/// Reads options and environment into `anchor`, checks that every file is
/// readable, takes the locale from the environment, builds the template path.
/// Returns true when the run goes on; false when it ends here with bError (the
/// usage or the messages are written). Main thread, once.
bool read_command_line(int argc, char** argv, command_line* pCommand);

/// Releases anchor.pTemplatePath unless it is the default path, which it then
/// is. Main thread.
void release_template_path();
