#include "store.h"
#include "template_file.h"

#include "internal_formats.h"
#include "preload.h"
#include "search_path.h"
#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <map>
#include <random>
#include <sys/stat.h>

namespace {

class Store : public testing::Test {
protected:
    void SetUp() override {
        anchor.pProgName = "kelvo";
        setPath(".");
    }
    void TearDown() override {
        free_template_info();
        anchor.pTemplatePath = pDefTemplatePath;
        std::free(anchor.pFormatBuffer);
        anchor.pFormatBuffer = nullptr;
        anchor.lenFormatBuffer = 0;
    }
    void setPath(const std::string& path) {
        path_ = path;
        anchor.pTemplatePath = path_.data();
    }
    /// The format's text, or "none", or "no memory".
    static std::string lookup(const char* compId, uint32_t trace_id = 1, int block_id = -1) {
        int insufficient_resources = -1;
        const format_entry* const pEntry =
            get_format_from_file(nullptr, compId, trace_id, block_id, &insufficient_resources);
        EXPECT_EQ(pEntry != nullptr && insufficient_resources, false);
        return pEntry ? pEntry->pString : insufficient_resources ? "no memory" : "none";
    }
    std::string lookupIn(const std::string& path, const char* compId) {
        free_template_info();
        setPath(path);
        return lookup(compId);
    }

    work_directory dir_;
    std::string path_;
};

TEST_F(Store, InternalFormatsNeedNoFile) {
    dir_.write("____.tpl", "0 \"file\" 2 \"file\"");
    EXPECT_EQ(lookup("____", 0),
              " ******************* Trace Started - Pid = %d **********************");
    EXPECT_EQ(lookup("____", 1),
              " ***** Trace restarting after client core dump -  Pid = %d ***** ");
    EXPECT_EQ(lookup("____", 2), "none");
    EXPECT_EQ(lookup("____", 0xFFFFFFFF), "none");
    ASSERT_NE(internalFormats[0].pEntry, nullptr);
    EXPECT_EQ(dump_format(*internalFormats[0].pEntry), "seq [INT] 43+2:0");
    EXPECT_EQ(internalFormats[0].pEntry->pFile, nullptr);
    free_template_info(); // leaves them
    EXPECT_NE(lookup("____", 0), "none");
}

TEST_F(Store, FileNamesFollowTheDirectory) {
    const std::string here = dir_.name();
    const std::string up = std::filesystem::path(here).parent_path();
    const std::map<std::string, std::string> cases = {
        {"", here + "/ABCD.tpl"},
        {".", here + "/ABCD.tpl"},
        {"./", here + "/ABCD.tpl"},
        {"./.", here + "/ABCD.tpl"},
        {"t", here + "/t/ABCD.tpl"},
        {"t/", here + "/t/ABCD.tpl"},
        {"./t", here + "/t/ABCD.tpl"},
        {"././t/../u", here + "/t/../u/ABCD.tpl"},
        {"../", up + "/ABCD.tpl"},
        {"../t", up + "/t/ABCD.tpl"},
        {"./.././t", up + "/t/ABCD.tpl"},
        {"..", here + "/../ABCD.tpl"},
        {".t", here + "/.t/ABCD.tpl"},
        {"...", here + "/.../ABCD.tpl"},
        {"/t", "/t/ABCD.tpl"},
        {"/t//", "/t//ABCD.tpl"},
        {"/./../t", "/./../t/ABCD.tpl"},
        {"/", "/ABCD.tpl"},
    };
    file_name_text name;
    for (const auto& [directory, expected] : cases) {
        ASSERT_TRUE(build_template_file_name(directory, "ABCD", &name)) << directory;
        EXPECT_STREQ(name.text, expected.c_str()) << directory;
    }
    ASSERT_TRUE(build_template_file_name("/t", "A\0CD", &name));
    EXPECT_STREQ(name.text, "/t/A.tpl");

    const std::string fits = "/" + std::string(4095 - 10, 'd');
    EXPECT_TRUE(build_template_file_name(fits, "ABCD", &name));
    EXPECT_EQ(name.uLength, 4095u);
    EXPECT_FALSE(build_template_file_name(fits + "d", "ABCD", &name));
    EXPECT_FALSE(build_template_file_name("/" + std::string(9000, 'd'), "ABCD", &name));
    EXPECT_FALSE(build_template_file_name(std::string(4090, 'd'), "ABCD", &name));

    std::filesystem::current_path("/");
    EXPECT_TRUE(build_template_file_name("./t", "ABCD", &name));
    EXPECT_STREQ(name.text, "/t/ABCD.tpl");
    EXPECT_FALSE(build_template_file_name("../t", "ABCD", &name));
    EXPECT_FALSE(build_template_file_name("./../", "ABCD", &name));

    const std::string gone = here + "/gone";
    std::filesystem::create_directory(gone);
    std::filesystem::current_path(gone);
    std::filesystem::remove(gone);
    EXPECT_FALSE(build_template_file_name("./t", "ABCD", &name));
    EXPECT_TRUE(build_template_file_name("/t", "ABCD", &name));
}

TEST_F(Store, PathIsSearchedFromLeftToRight) {
    dir_.write("ABCD.tpl", "1 \"here\"");
    dir_.write("one/ABCD.tpl", "1 \"one\"");
    dir_.write("two/ABCD.tpl", "1 \"two\"");
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
    EXPECT_EQ(lookupIn("../nowhere:" + dir_.name() + "/one", "ABCD"), "one");
}

TEST_F(Store, OnlyRegularFilesAreRead) {
    std::filesystem::create_directory("one");
    std::filesystem::create_directory("one/DIRC.tpl");
    ASSERT_EQ(mkfifo("one/FIFO.tpl", 0600), 0);
    std::filesystem::create_symlink("/dev/zero", "one/ZERO.tpl");
    std::filesystem::create_symlink("../two/LINK.tpl", "one/LINK.tpl");
    for (const char* compId : {"DIRC", "FIFO", "ZERO", "LINK"})
        dir_.write("two/" + std::string(compId) + ".tpl", "1 \"two\"");
    dir_.write("two/sub/bc.tpl", "1 \"slash\"");
    setPath("one:two");
    for (const char* compId : {"DIRC", "FIFO", "ZERO", "LINK"})
        EXPECT_EQ(lookup(compId), "two") << compId;
    for (const char* compId : {"/../", "../a", "....", "\0\0\0\0", "a/bc", "%s%n", "\xFF\xFE\n\""})
        EXPECT_EQ(lookup(compId), "none");
    free_template_info();
    load_all_template_files();
    for (const char* compId : {"FIFO", "ZERO"})
        EXPECT_EQ(lookup(compId), "none") << compId; // the file of the first directory counts
}

TEST_F(Store, LoadedAndMissingComponentsAreSearchedOnce) {
    dir_.write("ABCD.tpl", "1 \"first\" 1:0 \"block\" 2 \"x\" 1 \"last\" 0xFFFFFFFE \"high\"");
    EXPECT_EQ(lookup("ABCD"), "last");
    EXPECT_EQ(lookup("ABCD", 1, 0), "block");
    EXPECT_EQ(lookup("ABCD", 1, 1), "none");
    EXPECT_EQ(lookup("ABCD", 2, 0), "none");
    EXPECT_EQ(lookup("ABCD", 0xFFFFFFFE), "high");
    EXPECT_EQ(lookup("EFGH"), "none");
    EXPECT_EQ(anchor.pFirstTemplate->compId[0], 'E');
    EXPECT_EQ(anchor.pFirstTemplate->pNext->compId[0], 'A');
    std::filesystem::rename("ABCD.tpl", "EFGH.tpl");
    EXPECT_EQ(lookup("ABCD"), "last");
    EXPECT_EQ(lookup("EFGH"), "none");
    free_template_info();
    EXPECT_EQ(anchor.pFirstTemplate, nullptr);
    EXPECT_EQ(lookup("ABCD"), "none");
    EXPECT_EQ(lookup("EFGH"), "last");
}

TEST_F(Store, RefusedFileIsReadAtEveryLookup) {
    dir_.write("one/ABCD.tpl", "x\n1 \"a\"\n2 \"%q\"\n");
    dir_.write("two/ABCD.tpl", "1 \"two\"");
    setPath("one:two");
    EXPECT_EQ(lookup("EFGH"), "none");
    const template_file* const pOther = anchor.pFirstTemplate;
    const std::string expected =
        "2625-124 Unrecognized character x found on line 0 of file " + dir_.name() +
        "/one/ABCD.tpl | 2625-120 Format error on line 3. Invalid data type q specified.";
    for (int round = 0; round < 3; ++round) {
        EXPECT_EQ(joined_messages_of([&] { EXPECT_EQ(lookup("ABCD"), "none"); }), expected);
        EXPECT_EQ(anchor.pFirstTemplate, pOther);
    }
    dir_.write("one/ABCD.tpl", "1 \"repaired\"");
    EXPECT_EQ(lookup("ABCD"), "repaired");

    free_template_info();
    dir_.write("one/ABCD.tpl", "x\n1 \"a\"\n2 \"%q\"\n");
    EXPECT_EQ(messages_of([&] { load_all_template_files(); }).size(), 2u);
    EXPECT_EQ(joined_messages_of([&] { EXPECT_EQ(lookup("ABCD"), "none"); }), "");
}

TEST_F(Store, MemoryFlag) {
    dir_.write("ABCD.tpl", "1 \"a\"");
    const auto lookup_with = [](int iAllocations) {
        const allocation_limit limit(iAllocations);
        return lookup("ABCD");
    };
    EXPECT_EQ(lookup_with(0), "no memory"); // the template
    EXPECT_EQ(lookup_with(1), "no memory"); // the format buffer
    EXPECT_EQ(lookup_with(1), "no memory");
    EXPECT_EQ(lookup_with(2), "none"); // the entry
    EXPECT_EQ(anchor.pFirstTemplate, nullptr);
    EXPECT_EQ(lookup("ABCD"), "a");

    free_template_info();
    std::string large;
    for (int i = 0; i < 100; ++i)
        large += std::to_string(i) + " \"" + std::to_string(i) + "\"\n";
    dir_.write("ABCD.tpl", large);
    {
        const allocation_limit limit(101); // all but the index
        EXPECT_EQ(lookup("ABCD", 42), "42");
    }
    EXPECT_EQ(anchor.pFirstTemplate->pIndex, nullptr);
    EXPECT_EQ(lookup("ABCD", 99), "99");

    free_template_info();
    {
        const allocation_limit limit(0);
        load_all_template_files();
    }
    EXPECT_EQ(lookup("ABCD"), "none");
}

TEST_F(Store, LargeTemplateAnswersLikeItsList) {
    std::mt19937 random(7);
    std::string text;
    std::map<std::pair<uint32_t, int>, std::string> last;
    std::map<uint32_t, std::string> newest; // of any block id
    for (int i = 0; i < 3000; ++i) {
        const auto trace_id = static_cast<uint32_t>(random() % 700 * 6000000u);
        const int block_id = static_cast<int>(random() % 4) - 1;
        text += std::to_string(trace_id);
        if (block_id >= 0)
            text += ':' + std::to_string(block_id);
        text += " \"" + std::to_string(i) + "\"\n";
        last[{trace_id, block_id}] = std::to_string(i);
        newest[trace_id] = std::to_string(i);
    }
    dir_.write("ABCD.tpl", text);
    for (uint32_t i = 0; i < 700; ++i) {
        for (int block_id = -1; block_id < 4; ++block_id) {
            const auto found = last.find({i * 6000000u, block_id});
            ASSERT_EQ(lookup("ABCD", i * 6000000u, block_id),
                      found == last.end() ? "none" : found->second);
        }
    }
    for (const auto& [trace_id, sText] : newest) {
        const format_entry* const pEntry =
            find_newest_format(anchor.pFirstTemplate, static_cast<int32_t>(trace_id));
        ASSERT_TRUE(pEntry);
        ASSERT_EQ(pEntry->pString, sText);
    }
    EXPECT_EQ(find_newest_format(anchor.pFirstTemplate, 1), nullptr);
}

TEST_F(Store, ManyComponentsAreKeptApart) {
    dir_.write("0042.tpl", "1 \"found\"");
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 10000; ++i) {
            const std::string compId = std::to_string(10000 + i).substr(1);
            ASSERT_EQ(lookup(compId.c_str()), i == 42 ? "found" : "none");
        }
        std::filesystem::remove("0042.tpl");
    }
}

TEST_F(Store, PreloadTakesTheFirstDirectoryAndMatchesThreeCharacters) {
    dir_.write("ABCD.tpl", "1 \"here\"");
    dir_.write("one/ABCD.tpl", "1 \"one\"");
    dir_.write("two/ABCD.tpl", "1 \"two\"");
    dir_.write("two/XEFG.tpl.old", "1 \"old\"");
    dir_.write("two/.BCX.tpl", "1 \"hidden\"");
    dir_.write("two/ABX.tpl", "1 \"short\"");
    dir_.write("two/LATE.tp", "1 \"no\"");
    dir_.write("two/a.b.tpl", "1 \"dots\"");
    setPath(":none:one::two:/" + std::string(5000, 'd') + ":" + std::string(4094, 'd') + ":");
    load_all_template_files();
    EXPECT_EQ(trace_template_files_were_preloaded, 1);
    for (int round = 0; round < 2; ++round) { // the second from the kept answers
        for (const char* compId : {"ABCD", "XBCD", "\0BCD"})
            EXPECT_EQ(lookup(compId), "one");
        for (const char* compId : {"XEFG", "YEFG"})
            EXPECT_EQ(lookup(compId), "old");
        EXPECT_EQ(lookup("_.b."), "none");
        EXPECT_EQ(lookup("z.b\0"), "none");
        for (const char* compId : {"ABCX", ".BCX", "ABX.", "LATE", "EFGH", "A\0CD"})
            EXPECT_EQ(lookup(compId), "none") << compId;
    }
    EXPECT_EQ(lookup("____", 0).find("Trace Started"), 21u);
    dir_.write("one/EFGH.tpl", "1 \"too late\"");
    EXPECT_EQ(lookup("EFGH"), "none");
    EXPECT_EQ(anchor.pFirstTemplate, nullptr);

    free_template_info();
    EXPECT_EQ(trace_template_files_were_preloaded, 0);
    EXPECT_EQ(preloaded_template_file_tree, nullptr);
    EXPECT_EQ(lookup("ABCD"), "here"); // the empty directory counts on demand
    EXPECT_EQ(lookup("XBCD"), "none");
}

TEST_F(Store, PreloadWithoutAPathStaysOnDemand) {
    anchor.pTemplatePath = nullptr;
    load_all_template_files();
    EXPECT_EQ(trace_template_files_were_preloaded, 0);
}

} // namespace
