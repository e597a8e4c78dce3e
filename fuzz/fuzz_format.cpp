// A format over a body, both unknown. The input is the format string up to the
// first NUL and, behind that, the body: once as one packed run, once as blocks
// of a data record, each as of a 32-bit and of a 64-bit program.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include "compile.h"
#include "format_text.h"
#include "record_view.h"
#include "template_file.h"

#include <cstring>
#include <memory>
#include <span>

namespace {

/// A heap block of exactly the bytes' size.
std::unique_ptr<std::byte[]> exact_copy(trace_bytes bytes) {
    auto pCopy = std::make_unique<std::byte[]>(bytes.size());
    std::copy(bytes.begin(), bytes.end(), pCopy.get());
    return pCopy;
}

/// What is left must be the end of what was given.
void check_rest(trace_bytes all, trace_bytes rest) {
    hostile_check(rest.empty() || rest.data() + rest.size() == all.data() + all.size(),
                  "what no parameter took is the end of the bytes");
}

void write_packed(const format_entry* pEntry, trace_bytes body, int bAddr64) {
    parm_list parms;
    trace_bytes rest = body;
    bld_parm_list_packed(pEntry, &rest, bAddr64, &parms);
    check_rest(body, rest);
    hostile_check(parms.numParms <= pEntry->numParms, "no more parameters than the format has");
    format_data_block(pEntry, body, bAddr64);
}

void write_unpacked(const format_entry* pEntry, trace_bytes body, int bAddr64) {
    parm_list parms;
    trace_bytes rest = body;
    bld_parm_list_unpacked(pEntry, &rest, UINT32_MAX, &parms);
    check_rest(body, rest);
    hostile_check(parms.numParms <= pEntry->numParms, "no more parameters than the format has");
    format_parms(pEntry, &parms, bAddr64);
}

} // namespace

int LLVMFuzzerTestOneInput(const uint8_t* pData, size_t uSize) {
    const trace_bytes input = std::as_bytes(std::span(pData, uSize));
    const std::string_view text = load_string(input, 0);
    const auto pText = std::make_unique<char[]>(text.size() + 1);
    text.copy(pText.get(), text.size());

    const template_owner pTemplate = make_template("_FUZ");
    if (pTemplate == nullptr)
        return 0;
    format_entry* const pEntry = parse_format_string(pText.get(), pTemplate.get());
    if (pEntry == nullptr) {
        hostile_check(pTemplate->pFormats == nullptr, "a refused string leaves no entry");
        return 0;
    }
    check_format(*pEntry);
    pEntry->trace_id = 1; // for "%T"

    const trace_bytes rest = load_run(input, text.size() + 1);
    const auto pBody = exact_copy(rest);
    const trace_bytes body(pBody.get(), rest.size());
    for (const int bAddr64 : {0, 1}) {
        write_packed(pEntry, body, bAddr64);
        write_unpacked(pEntry, body, bAddr64);
    }
    return 0;
}
