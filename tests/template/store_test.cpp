#include "store.h"
#include "template_file.h"

#include "preload.h"
#include "search_path.h"
#include "temp_dir.h"
#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <random>
#include <string>
#include <sys/stat.h>

static int allocationsLeft = -1; // all further ones of the templates fail; below 0: none

static bool allocation_fails() {
    return allocationsLeft == 0 || (allocationsLeft > 0 && allocationsLeft-- == 0);
}

// The linker puts these in the place of the C library's.
extern "C" {
void* __real_malloc(size_t size);
void* __real_calloc(size_t count, size_t size);
void* __real_realloc(void* pBlock, size_t size);

void* __wrap_malloc(size_t size) {
    return allocation_fails() ? nullptr : __real_malloc(size);
}
void* __wrap_calloc(size_t count, size_t size) {
    return allocation_fails() ? nullptr : __real_calloc(count, size);
}
void* __wrap_realloc(void* pBlock, size_t size) {
    return allocation_fails() ? nullptr : __real_realloc(pBlock, size);
}
}

namespace {

/// Works in a directory of its own.
class Store : public testing::Test {
protected:
    void SetUp() override {
        std::filesystem::current_path(temporary.path());
        here = std::filesystem::current_path();
        setPath(".");
    }
    void TearDown() override {
        free_template_info();
        anchor.pTemplatePath = pDefTemplatePath;
        std::filesystem::current_path(before);
    }
    void setPath(const std::string& newPath) {
        path = newPath;
        anchor.pTemplatePath = path.data();
    }
    /// Writes a file here or below, making its directory.
    static void write(const std::filesystem::path& file, std::string_view text) {
        if (file.has_parent_path())
            std::filesystem::create_directories(file.parent_path());
        std::ofstream(file) << text;
    }
    /// The format's text, or "none", or "no memory".
    static std::string lookup(const char* compId, uint32_t trace_id = 1, int block_id = -1) {
        int insufficient_resources = -1;
        const format_entry* const pEntry =
            get_format_from_file(nullptr, compId, trace_id, block_id, &insufficient_resources);
        EXPECT_EQ(pEntry != nullptr && insufficient_resources, false);
        return pEntry ? pEntry->pString : insufficient_resources ? "no memory" : "none";
    }
    std::string lookupIn(const std::string& newPath, const char* compId) {
        free_template_info();
        setPath(newPath);
        return lookup(compId);
    }

    temp_dir temporary;
    const std::filesystem::path before = std::filesystem::current_path();
    std::string here;
    std::string path;
};

TEST_F(Store, InternalFormatsNeedNoFile) {
    write("____.tpl", "0 \"file\" 2 \"file\"");
    for (int round = 0; round < 2; ++round) {
        EXPECT_NE(lookup("____", 0).find("Trace Started"), std::string::npos);
        EXPECT_NE(lookup("____", 1).find("Trace restarting"), std::string::npos);
        EXPECT_EQ(lookup("____", 2), "none");
        EXPECT_EQ(lookup("____", 0xFFFFFFFF), "none");
        free_template_info(); // leaves them
    }
}

TEST_F(Store, FileNamesFollowTheDirectory) {
    const auto name_in = [](const std::string& directory, const char* compId = "ABCD") {
        file_name_text name;
        return build_template_file_name(directory, compId, &name) ? name.text : std::string("none");
    };
    const std::string up = std::filesystem::path(here).parent_path();
    for (const char* directory : {"", ".", "./", "./."})
        EXPECT_EQ(name_in(directory), here + "/ABCD.tpl") << directory;
    for (const char* directory : {"t", "t/", "./t"})
        EXPECT_EQ(name_in(directory), here + "/t/ABCD.tpl") << directory;
    for (const std::string directory : {"..", ".t", "...", "t/../u"})
        EXPECT_EQ(name_in(directory), here + "/" + directory + "/ABCD.tpl");
    for (const char* directory : {"../t", "./.././t"})
        EXPECT_EQ(name_in(directory), up + "/t/ABCD.tpl") << directory;
    for (const std::string directory : {"", "/t", "/t/", "/./../t"})
        EXPECT_EQ(name_in(directory + "/"), directory + "/ABCD.tpl");
    EXPECT_EQ(name_in("/t", "A\0CD"), "/t/A.tpl");

    const std::string fits = "/" + std::string(4095 - 10, 'd');
    EXPECT_EQ(name_in(fits), fits + "/ABCD.tpl");
    EXPECT_EQ(name_in(fits + "d"), "none");
    EXPECT_EQ(name_in(std::string(4090, 'd')), "none");

    std::filesystem::current_path("/");
    EXPECT_EQ(name_in("./t"), "/t/ABCD.tpl");
    EXPECT_EQ(name_in("../t"), "none");
    std::filesystem::create_directory(here + "/gone");
    std::filesystem::current_path(here + "/gone");
    std::filesystem::remove(here + "/gone");
    EXPECT_EQ(name_in("./t"), "none");
    EXPECT_EQ(name_in("/t"), "/t/ABCD.tpl");
}

TEST_F(Store, PathIsSearchedFromLeftToRight) {
    write("ABCD.tpl", "1 \"here\"");
    write("one/ABCD.tpl", "1 \"one\"");
    write("two/ABCD.tpl", "1 \"two\"");
    const std::string tooLong = std::string(5000, 'd');
    EXPECT_EQ(lookupIn("none:two:one", "ABCD"), "two");
    EXPECT_EQ(lookupIn("one/:two", "ABCD"), "one");
    EXPECT_EQ(lookupIn(":two", "ABCD"), "here");
    EXPECT_EQ(lookupIn("none::two", "ABCD"), "here");
    EXPECT_EQ(lookupIn("none:", "ABCD"), "none"); // nothing behind the last colon
    EXPECT_EQ(lookupIn("", "ABCD"), "none");
    EXPECT_EQ(lookupIn(tooLong + ":/" + tooLong + ":one", "ABCD"), "one");
    free_template_info();
    anchor.pTemplatePath = nullptr;
    EXPECT_EQ(lookup("ABCD"), "here");
    std::filesystem::current_path("/");
    EXPECT_EQ(lookupIn("../nowhere:" + here + "/one", "ABCD"), "one");
}

TEST_F(Store, OnlyRegularFilesAreRead) {
    std::filesystem::create_directory("one");
    std::filesystem::create_directory("one/DIRC.tpl");
    ASSERT_EQ(mkfifo("one/FIFO.tpl", 0600), 0);
    std::filesystem::create_symlink("/dev/zero", "one/ZERO.tpl");
    std::filesystem::create_symlink("../two/LINK.tpl", "one/LINK.tpl");
    for (const char* compId : {"DIRC", "FIFO", "ZERO", "LINK"})
        write("two/" + std::string(compId) + ".tpl", "1 \"two\"");
    write("two/sub/bc.tpl", "1 \"slash\"");
    setPath("one:two");
    // What opens ends the search, also where it is not read.
    for (const char* compId : {"DIRC", "FIFO", "ZERO"})
        EXPECT_EQ(lookup(compId), "none") << compId;
    EXPECT_EQ(lookup("LINK"), "two");
    for (const char* compId : {"/../", "../a", "....", "\0\0\0\0", "a/bc", "%s%n", "\xFF\xFE\n\""})
        EXPECT_EQ(lookup(compId), "none");
    free_template_info();
    load_all_template_files();
    for (const char* compId : {"DIRC", "FIFO", "ZERO"})
        EXPECT_EQ(lookup(compId), "none") << compId;
}

TEST_F(Store, NoFileIsTooLarge) {
    write("ABCD.tpl", "1 \"large\" #");
    std::filesystem::resize_file("ABCD.tpl", (1U << 28) + 1); // a hole of 256 MiB
    EXPECT_EQ(lookup("ABCD"), "large");
}

TEST_F(Store, LoadedAndMissingComponentsAreSearchedOnce) {
    write("ABCD.tpl", "1 \"first\" 1:0 \"block\" 2 \"x\" 1 \"last\" 0xFFFFFFFE \"high\"");
    EXPECT_EQ(lookup("ABCD"), "last");
    EXPECT_EQ(lookup("ABCD", 1, 0), "block");
    EXPECT_EQ(lookup("ABCD", 1, 1), "none");
    EXPECT_EQ(lookup("ABCD", 2, 0), "none");
    EXPECT_EQ(lookup("ABCD", 0xFFFFFFFE), "high");
    EXPECT_EQ(lookup("EFGH"), "none");
    std::filesystem::rename("ABCD.tpl", "EFGH.tpl");
    EXPECT_EQ(lookup("ABCD"), "last");
    EXPECT_EQ(lookup("EFGH"), "none");
    free_template_info();
    EXPECT_EQ(lookup("ABCD"), "none");
    EXPECT_EQ(lookup("EFGH"), "last");
}

TEST_F(Store, RefusedFileIsReadAtEveryLookup) {
    // The refused format is compiled, and so reported, when the next trace id begins.
    const std::string refused = "x\n1 \"a\"\n2 \"%q\"\n\n3 x\n";
    write("one/ABCD.tpl", refused);
    write("two/ABCD.tpl", "1 \"two\"");
    setPath("one:two");
    const std::string expected =
        "2625-124 Unrecognized character x found on line 0 of file " + here +
        "/one/ABCD.tpl | 2625-120 Format error on line 4. Invalid data type q specified.";
    for (int round = 0; round < 3; ++round)
        EXPECT_EQ(messages_of([&] { EXPECT_EQ(lookup("ABCD"), "none"); }), expected);
    write("one/ABCD.tpl", "1 \"repaired\"");
    EXPECT_EQ(lookup("ABCD"), "repaired");

    free_template_info();
    write("one/ABCD.tpl", refused);
    EXPECT_NE(messages_of([] { load_all_template_files(); }), "");
    EXPECT_EQ(messages_of([&] { EXPECT_EQ(lookup("ABCD"), "none"); }), "");
}

TEST_F(Store, MemoryFlag) {
    std::free(anchor.pFormatBuffer);
    anchor.pFormatBuffer = nullptr;
    write("ABCD.tpl", "1 \"a\"");
    const auto lookup_with = [](int iAllocations, uint32_t trace_id = 1) {
        allocationsLeft = iAllocations;
        const std::string text = lookup("ABCD", trace_id);
        allocationsLeft = -1;
        return text;
    };
    EXPECT_EQ(lookup_with(0), "no memory"); // the template
    EXPECT_EQ(lookup_with(1), "no memory"); // the format buffer
    EXPECT_EQ(lookup_with(1), "no memory");
    EXPECT_EQ(lookup_with(2), "none"); // the entry
    EXPECT_EQ(lookup("ABCD"), "a");

    free_template_info();
    const std::string longText(4097, 'a');
    write("ABCD.tpl", "1 \"" + longText + "\"");
    EXPECT_EQ(lookup_with(1), "no memory"); // a larger buffer
    EXPECT_EQ(lookup_with(3), longText);

    free_template_info();
    std::string large;
    for (int i = 0; i < 100; ++i)
        large += std::to_string(i) + " \"" + std::to_string(i) + "\"\n";
    write("ABCD.tpl", large);
    EXPECT_EQ(lookup_with(101, 42), "42"); // all but the index
    EXPECT_EQ(anchor.pFirstTemplate->pIndex, nullptr);
    EXPECT_EQ(lookup("ABCD", 99), "99");
}

TEST_F(Store, LargeTemplateAnswersLikeItsList) {
    std::mt19937 random(7);
    std::string text;
    for (int i = 0; i < 3000; ++i) {
        text += std::to_string(random() % 700 * 6000000U);
        if (const auto block_id = random() % 4; block_id != 3)
            text += ":" + std::to_string(block_id);
        text += " \"x\"\n";
    }
    write("ABCD.tpl", text);
    EXPECT_EQ(lookup("ABCD", 1), "none");
    const template_file* const pTemplate = anchor.pFirstTemplate;
    ASSERT_NE(pTemplate->pIndex, nullptr);
    // The newest entry of the ids, or of the trace id.
    const auto in_list = [pTemplate](uint32_t trace_id, std::optional<int> block_id) {
        format_entry* pEntry = pTemplate->pFormats;
        while (pEntry && (static_cast<uint32_t>(pEntry->trace_id) != trace_id ||
                          pEntry->block_id != block_id.value_or(pEntry->block_id)))
            pEntry = pEntry->pNext;
        return pEntry;
    };
    for (uint32_t i = 0; i <= 700; ++i) {
        const uint32_t trace_id = i * 6000000;
        ASSERT_EQ(find_newest_format(pTemplate, static_cast<int32_t>(trace_id)),
                  in_list(trace_id, {}));
        for (int block_id = -1; block_id < 4; ++block_id)
            ASSERT_EQ(find_format(pTemplate, trace_id, block_id), in_list(trace_id, block_id));
    }
}

TEST_F(Store, ManyComponentsAreKeptApart) {
    write("0042.tpl", "1 \"found\"");
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 10000; ++i) {
            const std::string compId = std::to_string(10000 + i).substr(1);
            ASSERT_EQ(lookup(compId.c_str()), i == 42 ? "found" : "none");
        }
        std::filesystem::remove("0042.tpl");
    }
}

TEST_F(Store, PreloadTakesTheFirstDirectoryAndMatchesThreeCharacters) {
    write("ABCD.tpl", "1 \"here\"");
    write("one/ABCD.tpl", "1 \"one\"");
    write("two/ABCD.tpl", "1 \"two\"");
    write("two/XEFG.tpl.old", "1 \"old\"");
    write("two/.BCX.tpl", "1 \"hidden\"");
    write("two/ABX.tpl", "1 \"short\"");
    write("two/LATE.tp", "1 \"no\"");
    write("two/a.b.tpl", "1 \"dots\"");
    setPath(":none:one::two:/" + std::string(5000, 'd') + ":" + std::string(4094, 'd') + ":");
    load_all_template_files();
    for (int round = 0; round < 2; ++round) { // the second from the kept answers
        for (const char* compId : {"ABCD", "XBCD", "\0BCD"})
            EXPECT_EQ(lookup(compId), "one");
        for (const char* compId : {"XEFG", "YEFG"})
            EXPECT_EQ(lookup(compId), "old");
        for (const char* compId :
             {"_.b.", "z.b\0", "ABCX", ".BCX", "ABX.", "LATE", "EFGH", "A\0CD"})
            EXPECT_EQ(lookup(compId), "none") << compId;
    }
    write("one/EFGH.tpl", "1 \"too late\"");
    EXPECT_EQ(lookup("EFGH"), "none");

    free_template_info();
    EXPECT_EQ(lookup("ABCD"), "here"); // the empty directory counts on demand
    EXPECT_EQ(lookup("XBCD"), "none");
    anchor.pTemplatePath = nullptr;
    load_all_template_files();
    EXPECT_EQ(trace_template_files_were_preloaded, 0) << "without a path it stays on demand";
}

} // namespace
