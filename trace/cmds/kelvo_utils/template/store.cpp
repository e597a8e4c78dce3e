#include "store.h"

#include "internal_formats.h"
#include "on_demand.h"
#include "preload.h"
#include "template_file.h"

format_entry* get_format_from_file(trace_file* /*pTraceFile*/, const char* compId,
                                   uint32_t trace_id, int block_id, int* p_insufficient_resources) {
    *p_insufficient_resources = 0;
    if (std::string_view(compId, sizeof(template_file::compId)) == INTERNAL_COMPONENT)
        return get_internal_format(trace_id);
    template_file* pTemplate = nullptr;
    if (trace_template_files_were_preloaded) {
        pTemplate = find_preloaded_template(compId);
    } else {
        pTemplate = find_loaded_template(compId);
        if (pTemplate == nullptr)
            pTemplate = load_template_file(compId, p_insufficient_resources);
    }
    return pTemplate != nullptr ? find_format(pTemplate, trace_id, block_id) : nullptr;
}

void free_template_info() {
    if (trace_template_files_were_preloaded)
        free_preloaded_templates();
    else
        free_loaded_templates();
}
