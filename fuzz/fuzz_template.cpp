// A template file: parsed, compiled, indexed, searched, released.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include "template_file.h"

#include <cstdio>

/// Each entry must be found by its ids, unless a newer one has the same.
static void check_template(const template_file* pTemplate) {
    for (const format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext) {
        check_format(*pEntry);
        const format_entry* const pFound =
            find_format(pTemplate, static_cast<uint32_t>(pEntry->trace_id), pEntry->block_id);
        hostile_check(pFound != nullptr && pFound->trace_id == pEntry->trace_id &&
                          pFound->block_id == pEntry->block_id,
                      "an entry of a template is found by its ids");
        hostile_check(pEntry->pFile == pTemplate, "an entry knows its template");
    }
}

int LLVMFuzzerTestOneInput(const uint8_t* pData, size_t uSize) {
    const template_owner pTemplate = make_template("_FUZ");
    // Opened for reading, so the bytes are not written to.
    const file_owner pFile(fmemopen(const_cast<uint8_t*>(pData), uSize, "r"));
    if (pTemplate == nullptr || pFile == nullptr)
        return 0;
    int insufficient_resources = 0;
    (void)read_template(pTemplate.get(), "_FUZ.tpl", pFile.get(), &insufficient_resources);
    hostile_check(insufficient_resources == 0, "memory lasts");
    check_template(pTemplate.get());
    return 0;
}
