// The table of open catalogues is small and fixed: a lookup is a handful of
// string comparisons, and a trace that names ever new catalogues costs a search
// of NLSPATH per name but no memory. A catalogue that could not be opened keeps
// its place too, or each of its records would search the path again; so one
// that is installed later is found only once its name has left the table.
//
// The name is whatever stands in the trace file. catopen takes a name with a
// '/' as a path, and opens what it finds there before it looks at it: a FIFO
// would stop the program for good, and any file could be offered as a
// catalogue. Without a '/' only the directories of NLSPATH are searched, which
// the user has chosen.

#include "catalogue.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cstring>
#include <mutex>
#include <nl_types.h>
#include <span>

namespace {

struct known_catalogue {
    char name[NAME_MAX + 1]; ///< empty: unused
    nl_catd handle;          ///< missingCatalogue when it could not be opened
    uint64_t uLastUse;       ///< 0: never
};

/// What catopen returns for failure.
const nl_catd missingCatalogue = reinterpret_cast<nl_catd>(-1);

std::mutex cataloguesMutex;
std::array<known_catalogue, 32> knownCatalogues; ///< under cataloguesMutex
uint64_t uUses;                                  ///< under cataloguesMutex

bool is_catalogue_name(const char* pName) {
    if (!pName || !*pName || strnlen(pName, NAME_MAX + 1) > NAME_MAX)
        return false;
    return !strchr(pName, '/');
}

/// Gives the place of the catalogue that was not used for the longest time to
/// `pName` and opens it. Needs cataloguesMutex.
known_catalogue& open_in_place_of_oldest(const char* pName) {
    known_catalogue& place =
        *std::ranges::min_element(knownCatalogues, {}, &known_catalogue::uLastUse);
    if (place.uLastUse != 0 && place.handle != missingCatalogue)
        catclose(place.handle);
    memcpy(place.name, pName, strlen(pName) + 1);
    place.handle = catopen(pName, NL_CAT_LOCALE);
    return place;
}

/// Needs cataloguesMutex.
nl_catd find_catalogue(const char* pName) {
    const auto pKnown = std::ranges::find_if(
        knownCatalogues, [&](const known_catalogue& known) { return !strcmp(known.name, pName); });
    known_catalogue& place =
        pKnown != knownCatalogues.end() ? *pKnown : open_in_place_of_oldest(pName);
    place.uLastUse = ++uUses;
    return place.handle;
}

} // namespace

heap_text copy_catalogue_text(const char* pCatalogue, int32_t iSet, int32_t iMessage) {
    if (!is_catalogue_name(pCatalogue) || iSet < 1 || iSet == INT32_MAX || iMessage < 1)
        return nullptr;
    // The text lies in the open catalogue, which another thread may close as
    // soon as the mutex is free.
    const std::lock_guard lock(cataloguesMutex);
    const nl_catd handle = find_catalogue(pCatalogue);
    if (handle == missingCatalogue)
        return nullptr;
    const char* pText = catgets(handle, iSet, iMessage, nullptr);
    return heap_text(pText ? strdup(pText) : nullptr);
}
