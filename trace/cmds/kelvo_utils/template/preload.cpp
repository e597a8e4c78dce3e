#include "preload.h"

#include "search_path.h"
#include "store.h"
#include "template_file.h"

#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <search.h>

int trace_template_files_were_preloaded = 0;
void* preloaded_template_file_tree = nullptr;

namespace {

/// Answers of the tree kept by whole component id, so that a record does not
/// search the tree. They hold until the tree is released.
struct tree_answer {
    bool bKnown;
    char compId[sizeof(template_file::compId)];
    template_file* pTemplate;
};
constexpr int ANSWER_BITS = 8;
tree_answer answers[1u << ANSWER_BITS];

struct directory_closer {
    void operator()(DIR* pDirectory) const {
        closedir(pDirectory);
    }
};

int compare_keys(const char* compId, const char* other) {
    return std::strncmp(compId + 1, other + 1, sizeof(template_file::compId) - 1);
}

/// For insertion and removal: both are template_file records.
int compare_template_file_names(const void* pTemplate, const void* pOther) {
    return compare_keys(static_cast<const template_file*>(pTemplate)->compId,
                        static_cast<const template_file*>(pOther)->compId);
}

/// For search: a component id, or a file name that begins with one, against a
/// template_file.
int compare_template_entry_with_component_string(const void* pComponent, const void* pTemplate) {
    return compare_keys(static_cast<const char*>(pComponent),
                        static_cast<const template_file*>(pTemplate)->compId);
}

template_file* template_of(const void* pNode) {
    return pNode != nullptr ? *static_cast<template_file* const*>(pNode) : nullptr;
}

template_file* find_in_tree(const char* pComponent) {
    return template_of(tfind(pComponent, &preloaded_template_file_tree,
                             compare_template_entry_with_component_string));
}

/// A name such as ABCD.tpl; what follows the suffix does not matter.
bool is_template_file_name(std::string_view name) {
    return !name.starts_with('.') && name.size() >= 8 && name.substr(4, 4) == ".tpl";
}

/// Enters the file into the tree, or into the template that the tree already
/// has for its component. A file for which memory runs out is left out.
void enter_file(const char* pName, const file_name_text& path) {
    template_file* pTemplate = find_in_tree(pName);
    if (pTemplate == nullptr) {
        template_owner pNew = make_template(pName);
        if (pNew == nullptr || tsearch(pNew.get(), &preloaded_template_file_tree,
                                       compare_template_file_names) == nullptr)
            return;
        pTemplate = pNew.release();
    }
    if (char* const pPath = strdup(path.text); pPath != nullptr) {
        std::free(pTemplate->preload_path);
        pTemplate->preload_path = pPath;
    }
}

void enter_directory(std::string_view directory) {
    file_name_text path;
    if (!path.append(directory))
        return;
    const std::unique_ptr<DIR, directory_closer> pDirectory(opendir(path.text));
    if (pDirectory == nullptr || !path.append("/"))
        return;
    const size_t uNameAt = path.uLength;
    while (const dirent* pFound = readdir(pDirectory.get())) {
        const std::string_view name(pFound->d_name);
        path.uLength = uNameAt;
        if (is_template_file_name(name) && path.append(name))
            enter_file(pFound->d_name, path);
    }
}

/// Reads the template's file when the walk meets the node for the one time that
/// counts. A refused file leaves the template empty.
void template_file_init_walk_action(const void* pNode, VISIT visit, int /*depth*/) {
    if (visit != endorder && visit != leaf)
        return;
    template_file* const pTemplate = template_of(pNode);
    pTemplate->pNext = nullptr;
    pTemplate->lineNumber = 0;
    pTemplate->pFormats = nullptr;
    if (pTemplate->preload_path == nullptr)
        return;
    int insufficient_resources = 0;
    if (read_template_file(pTemplate, pTemplate->preload_path, &insufficient_resources) > 0)
        release_formats(pTemplate);
}

/// Releases a template and the tree's node for it.
void template_file_destroy_action(template_file* pTemplate) {
    tdelete(pTemplate, &preloaded_template_file_tree, compare_template_file_names);
    release_template(pTemplate);
}

} // namespace

template_file* find_preloaded_template(const char* compId) {
    tree_answer& answer = answers[component_hash(compId, ANSWER_BITS)];
    if (!answer.bKnown || std::memcmp(answer.compId, compId, sizeof(answer.compId)) != 0) {
        answer.bKnown = true;
        std::memcpy(answer.compId, compId, sizeof(answer.compId));
        answer.pTemplate = find_in_tree(compId);
    }
    return answer.pTemplate;
}

void load_all_template_files() {
    if (anchor.pTemplatePath == nullptr)
        return;
    // From the last directory to the first, each overwriting what the ones
    // behind it entered: so the first directory that has a file wins.
    std::string_view path = anchor.pTemplatePath;
    std::string_view directory;
    while (take_last_directory(&path, &directory)) {
        if (!directory.empty())
            enter_directory(directory);
    }
    twalk(preloaded_template_file_tree, template_file_init_walk_action);
    trace_template_files_were_preloaded = 1;
}

void free_preloaded_templates() {
    // Not from within a walk, which would go on through nodes that are gone.
    while (preloaded_template_file_tree != nullptr)
        template_file_destroy_action(template_of(preloaded_template_file_tree));
    for (tree_answer& answer : answers)
        answer.bKnown = false;
    trace_template_files_were_preloaded = 0;
}
