// The list holds one template per component met, also for a component that has
// no file. A trace file may name any number of components, so templates are
// found through a table of chains over the list, not by walking it.
#include "on_demand.h"

#include "search_path.h"
#include "store.h"
#include "template_file.h"

#include <cstring>

namespace {

constexpr int CHAIN_BITS = 12;
template_file* chains[1u << CHAIN_BITS];

template_file*& chain_of(const char* compId) {
    return chains[component_hash(compId, CHAIN_BITS)];
}

/// Reads the first file that the path has for the template's component; the
/// template stays empty when there is none. Returns what parse_template_file does.
int read_first_on_path(template_file* pTemplate, int* p_insufficient_resources) {
    std::string_view path = anchor.pTemplatePath != nullptr ? anchor.pTemplatePath : ".";
    std::string_view directory;
    while (take_first_directory(&path, &directory)) {
        file_name_text name;
        if (!build_template_file_name(directory, pTemplate->compId, &name))
            continue;
        const int iResult = read_template_file(pTemplate, name.text, p_insufficient_resources);
        if (iResult >= 0)
            return iResult;
    }
    return 0;
}

} // namespace

template_file* find_loaded_template(const char* compId) {
    template_file* pTemplate = chain_of(compId);
    while (pTemplate != nullptr &&
           std::memcmp(pTemplate->compId, compId, sizeof(pTemplate->compId)) != 0)
        pTemplate = pTemplate->pNextInChain;
    return pTemplate;
}

template_file* load_template_file(const char* compId, int* p_insufficient_resources) {
    *p_insufficient_resources = 0;
    template_owner pTemplate = make_template(compId);
    if (pTemplate == nullptr) {
        *p_insufficient_resources = 1;
        return nullptr;
    }
    pTemplate->pNext = anchor.pFirstTemplate;
    anchor.pFirstTemplate = pTemplate.get();
    if (read_first_on_path(pTemplate.get(), p_insufficient_resources) != 0) {
        anchor.pFirstTemplate = pTemplate->pNext;
        return nullptr;
    }
    template_file*& pChain = chain_of(compId);
    pTemplate->pNextInChain = pChain;
    pChain = pTemplate.get();
    return pTemplate.release();
}

void free_loaded_templates() {
    std::memset(chains, 0, sizeof(chains));
    while (anchor.pFirstTemplate != nullptr) {
        template_file* const pTemplate = anchor.pFirstTemplate;
        anchor.pFirstTemplate = pTemplate->pNext;
        release_template(pTemplate);
    }
}
