#include "search_path.h"

#include <cstring>
#include <unistd.h>

namespace {

constexpr std::string_view TEMPLATE_SUFFIX = ".tpl";
constexpr size_t MAX_WORKING_DIRECTORY = 4094; // leaves room for a "/"

/// Cuts the last name off a directory name that ends in "/". False at the root.
bool cut_last_name(file_name_text* pName) {
    const std::string_view name(pName->text, pName->uLength - 1);
    const size_t uSlash = name.rfind('/');
    if (uSlash == std::string_view::npos)
        return false;
    pName->uLength = uSlash + 1;
    pName->text[pName->uLength] = '\0';
    return true;
}

/// Puts the absolute name of the relative `directory` into `*pName`. Only "./"
/// and "../" at its beginning are resolved.
bool resolve_directory(std::string_view directory, file_name_text* pName) {
    if (getcwd(pName->text, MAX_WORKING_DIRECTORY + 1) == nullptr || pName->text[0] != '/')
        return false;
    pName->uLength = std::strlen(pName->text);
    if (!pName->append_slash())
        return false;
    for (;;) {
        if (directory.starts_with("./")) {
            directory.remove_prefix(2);
        } else if (directory.starts_with("../")) {
            directory.remove_prefix(3);
            if (!cut_last_name(pName))
                return false;
        } else {
            break;
        }
    }
    return directory == "." || pName->append(directory);
}

} // namespace

bool file_name_text::append(std::string_view part) {
    if (part.size() > sizeof(text) - 1 - uLength)
        return false;
    part.copy(text + uLength, part.size());
    uLength += part.size();
    text[uLength] = '\0';
    return true;
}

bool file_name_text::append_slash() {
    return std::string_view(text, uLength).ends_with('/') || append("/");
}

bool take_first_directory(std::string_view* pPath, std::string_view* pDirectory) {
    if (pPath->empty())
        return false;
    const size_t uColon = pPath->find(':');
    *pDirectory = pPath->substr(0, uColon);
    pPath->remove_prefix(uColon == std::string_view::npos ? pPath->size() : uColon + 1);
    return true;
}

bool take_last_directory(std::string_view* pPath, std::string_view* pDirectory) {
    if (pPath->empty())
        return false;
    const size_t uColon = pPath->rfind(':');
    const size_t uBegin = uColon == std::string_view::npos ? 0 : uColon + 1;
    *pDirectory = pPath->substr(uBegin);
    *pPath = pPath->substr(0, uBegin == 0 ? 0 : uColon);
    return true;
}

bool build_template_file_name(std::string_view directory, const char* compId,
                              file_name_text* pName) {
    *pName->text = '\0';
    pName->uLength = 0;
    const bool bAbsolute = directory.starts_with('/');
    if (!(bAbsolute ? pName->append(directory) : resolve_directory(directory, pName)))
        return false;
    // A component id comes from the trace file and may hold any character, "/"
    // included. Four characters and the suffix reach no further than one level
    // around the directory, and only a regular file is ever read.
    const std::string_view component(compId, strnlen(compId, sizeof(template_file::compId)));
    return pName->append_slash() && pName->append(component) && pName->append(TEMPLATE_SUFFIX);
}
