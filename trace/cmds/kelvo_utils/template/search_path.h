// The template search path: its directories, and the names of the files in them.
#pragma once

#include "kelvo.h"

#include <string_view>

/// Room for the name of a template file, with its NUL.
inline constexpr size_t FILE_NAME_ROOM = 4096;

/// A file name that is put together from parts, always NUL-terminated.
struct file_name_text {
    char text[FILE_NAME_ROOM] = "";
    size_t uLength = 0;

    /// Appends `part`; false, with the name unchanged, when it does not fit.
    bool append(std::string_view part);

    /// Appends a "/" unless the name ends in one; false when it does not fit.
    bool append_slash();
};

/// Takes the first directory off `*pPath`. It may be empty (the current working
/// directory). False when nothing is left.
bool take_first_directory(std::string_view* pPath, std::string_view* pDirectory);

/// Takes the last directory off `*pPath`. It may be empty. False when nothing
/// is left.
bool take_last_directory(std::string_view* pPath, std::string_view* pDirectory);

/// Puts the name of the component's template file in `directory` into `*pName`.
/// False when there is none: the directory lies above the root, the name is too
/// long, or the current working directory is needed and cannot be determined.
bool build_template_file_name(std::string_view directory, const char* compId,
                              file_name_text* pName);
