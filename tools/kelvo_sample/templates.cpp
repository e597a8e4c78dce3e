#include "templates.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

namespace {

// In the story a text has 43 columns on a terminal of 80, two less for each
// level of nesting.

constexpr char GATEWAY[] = R"tpl(# Gateway: takes the requests of the shops and passes them on.
#
# '>>' at the start of a text enters a call, '<<' leaves it.

0x00 "gateway up, pid %d"
0x01 "listening on %s, port %s"
0x02 "%u workers, %u kB each, timeout %u ms"

# A request and what comes of it. %T takes its text from the entry of that id.
0x10 ">>%s %s"
0x11 "request %08x, %u bytes"
0x12 "from %s, class %c, %.1hf ms away"
0x13 "<<status %d, %T"
0x20 "created"
0x21 "try again later"
0x22 "all is well"

0x14 ">>ask the %s"
0x15 "<<answered after %.3f ms"

# Health
0x18 ">>GET /health"
0x19 "oldest request is %lld us old"
0x1a "%llu requests, %llu failed, %llu bytes"
0x1b "clock skew %+lld ns (was %+lld ns)"
)tpl";

constexpr char ORDERS[] = R"tpl(# Order service: checks orders, reserves stock, has them stored.

0x00 "order service restarted, pid %d"
0x02 "shop \"%s\", prices in %s"

0x10 ">>order %u"
0x11 "customer %s, no. %ld"
0x12 "%d x %-13s at %6.2f"
0x13 "<<complete, %.2f"
0x14 "<<refused, reason %d"

0x20 ">>reserve %s"
0x21 "<<stock %+d, %d left"
0x22 ">>store it"
0x23 "<<stored as revision %llu"
0x24 "<<not stored"
0x25 "gave back %d of %s"
)tpl";

constexpr char STORAGE[] = R"tpl(# Storage daemon: keeps pages and a journal.

0x00 "storage daemon up, pid %d"
0x01 "scrub: segment %2d of %d is clean"
0x02 "scrub done: %llu pages, %llu repaired"

0x10 ">>read %s"
0x11 "page %#llx, %llu bytes"
0x12 "<<found, version %lld"

# The blocks of a journal record: the first gives the parameter of its text,
# blocks 1 and 2 have texts of their own, block 3 is shown as it is.
0x20 ">>write %s"
0x21 "journal entry %u"
0x21:1 "  order %u, %hd pcs, class %c, %.2f"
0x21:2 "  note \"%s\""
0x22 "volume %u%% full"
0x23 "<<written, checksum %016llx"
0x24 "<<nothing written"
0x25 "volume %s grown by %*d pages\n"   # value, then width
     "%r"
0x26 "%u reads, %u writes, %u failed"

# Errors have six parameters: number, function, line, file, message, FFDC id.
# By number they may stand in any order. Strings behind each other are one text.
0x30 "error %1$d in %2$s\n"
     "  (%4$s:%3$d)\n"
     "  %5$s\n"
     "  FFDC id %6$s"
)tpl";

constexpr char PLAIN[] = R"tpl(1 "number %u"
)tpl";

constexpr char NUMBERS[] = R"tpl(1 "item %u, %d units at %d cents, from %s"
)tpl";

constexpr char STRINGS[] = R"tpl(1 "%s: %s"
)tpl";

constexpr char DATA[] = R"tpl(1 "packet %u from %s"
1:2 "  page %u, %hu slots, class %c, load %.3f"
)tpl";

constexpr char MIXED[] = R"tpl(# One entry for each kind of record.

0x00 "program started, pid %d"
0x01 ">>enter"
0x02 "<<leave"
0x04 "signed %d"
0x05 "signed %d and %i"
0x06 "unsigned %u"
0x07 "hexadecimal %#x, octal %o"
0x08 "long %lld"
0x09 "long %lld and %+lld"
0x0a "long, unsigned %llu"
0x0b "long, hexadecimal %016llx %llX"
0x0c "values %u %u %u %u"
0x0d "long values %llu %llu %llu"
0x0e "error %1$d in %2$s (%4$s:%3$d): %5$s (FFDC %6$s)"
0x0f "strings \"%s\" and \"%.20s\""
0x10 "data %d %ld %hd %c %s %.3f %.1hf %p"
0x10:8 "block %d %hd %s"
0x11 "handle %r"
)tpl";

constexpr template_text STORY_FILES[] = {{"_GWY", GATEWAY}, {"_ORD", ORDERS}, {"_STO", STORAGE}};
constexpr template_text PLAIN_FILES[] = {{"_PLN", PLAIN}};
constexpr template_text NUMBERS_FILES[] = {{"_NUM", NUMBERS}};
constexpr template_text STRINGS_FILES[] = {{"_STR", STRINGS}};
constexpr template_text DATA_FILES[] = {{"_DAT", DATA}};
constexpr template_text MIXED_FILES[] = {{"_MIX", MIXED}};

} // namespace

std::span<const template_text> templates_of(sample_profile profile) {
    switch (profile) {
    case sample_profile::STORY:
        return STORY_FILES;
    case sample_profile::PLAIN:
        return PLAIN_FILES;
    case sample_profile::NUMBERS:
        return NUMBERS_FILES;
    case sample_profile::STRINGS:
        return STRINGS_FILES;
    case sample_profile::DATA:
        return DATA_FILES;
    case sample_profile::MIXED:
        return MIXED_FILES;
    }
    return {};
}

bool write_templates(const std::string& directory, sample_profile profile) {
    for (const template_text& file : templates_of(profile)) {
        const std::string sPath = directory + "/" + std::string(file.compId) + ".tpl";
        // Replaced, not overwritten: the old name may be a link to somewhere else.
        const bool bRemoved = unlink(sPath.c_str()) == 0 || errno == ENOENT;
        const int fd =
            bRemoved ? open(sPath.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644) : -1;
        FILE* const pFile = fd >= 0 ? fdopen(fd, "w") : nullptr;
        const bool bWritten =
            pFile != nullptr && fwrite(file.text.data(), file.text.size(), 1, pFile) == 1;
        if (pFile == nullptr || fclose(pFile) != 0 || !bWritten) {
            fprintf(stderr, "kelvo_sample: cannot write %s: %s\n", sPath.c_str(), strerror(errno));
            return false;
        }
    }
    return true;
}
