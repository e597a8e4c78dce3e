// Texts of the system's message catalogues. Catalogues stay open between calls,
// since a trace may hold many error records of one program. Any thread.
#pragma once

#include <cstdint>
#include <cstdlib>
#include <memory>

struct free_deleter {
    void operator()(void* pBlock) const {
        free(pBlock);
    }
};
using heap_text = std::unique_ptr<char, free_deleter>;

/// A copy of message `iMessage` of set `iSet` of the catalogue that NLSPATH and
/// the locale choose for `pCatalogue`; null when there is none or memory ran
/// out. The name comes from a trace file: one that is null, empty, longer than
/// a file name or holds a '/' has no catalogue.
heap_text copy_catalogue_text(const char* pCatalogue, int32_t iSet, int32_t iMessage);
