#include "options.h"

#include "kelvo.h"
#include "run_command.h"

#include <cstdlib>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

using testing::HasSubstr;

namespace {

constexpr size_t USAGE_SIZE = 1525;

/// The usage text by its ends and its size.
auto is_usage() {
    return testing::AllOf(
        testing::StartsWith("kelvo [-fhbrl] [-o <dtic>] [-t <templatepath>]\n"
                            "      [-s \"<start time>\"] filename ...\n\nwhere:\n\n"),
        HasSubstr("      c Component id (e.g.\"_ZPB\")\n"),
        testing::EndsWith("from the beginning (+) or end (-) of the file.\n"),
        testing::SizeIs(USAGE_SIZE));
}

// ------------------------------------------------------- the command as a whole

TEST(CommandLine, UsageAndItsStatus) {
    const struct {
        std::vector<std::string> arguments;
        int status;
        const char* pErrorHas; ///< "": nothing on standard error
    } cases[] = {
        {{}, 0, ""},
        {{"-h"}, 0, ""},
        {{"-h", "/no/such/file"}, 0, ""},
        {{"-bz", "--"}, 0, ""},
        {{"-x", "/dev/null"}, 1, "x"},
        {{"-hx"}, 1, "x"},
        {{"-o"}, 1, "o"},
        {{"-ox", "/dev/null"}, 1, ""},
        {{"-o", "tdx", "-o", "t", "/dev/null"}, 1, ""},
    };
    for (const auto& [arguments, status, pErrorHas] : cases) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        const command_result result = run_command(arguments);
        EXPECT_THAT(result.sOut, is_usage());
        EXPECT_EQ(result.status, status);
        if (*pErrorHas == '\0')
            EXPECT_EQ(result.sErr, "");
        else
            EXPECT_THAT(result.sErr, HasSubstr(pErrorHas));
    }
}

TEST(CommandLine, EveryUnreadableNameIsReportedAndNothingIsOpened) {
    const command_result result = run_command({"/no/such/a", "/dev/null", "/no/such/b"});
    const std::string sProgram = KELVO_PROGRAM;
    EXPECT_EQ(result.sErr, sProgram +
                               ": 2625-101 Filename \"/no/such/a\" is not accessible, No such file "
                               "or directory\n" +
                               sProgram +
                               ": 2625-101 Filename \"/no/such/b\" is not accessible, No such file "
                               "or directory\n");
    EXPECT_EQ(result.sOut, "");
    EXPECT_EQ(result.status, 1);
}

// ------------------------------------------------------------ what it is read to

/// Reads a command line into `anchor`, which begins as at the start of a process.
class ReadCommandLine : public testing::Test {
protected:
    void SetUp() override {
        reset();
    }
    void TearDown() override {
        reset();
    }

    static void reset() {
        release_template_path();
        free(anchor.pStartRecordOptArg);
        anchor.pStartRecordOptArg = nullptr;
        anchor.bStartRecOpt = anchor.bFollow = anchor.bNoFileLocking = 0;
        anchor.startOptions = START_NONE;
        queue_limit_enabled = 1;
        unsetenv("KV_TR_TEMPLATE_PATH");
    }

    /// The arguments are followed by a readable file name.
    void read(std::vector<std::string> arguments) {
        m_words = std::move(arguments);
        m_words.insert(m_words.begin(), "kelvo");
        m_words.emplace_back("/dev/null");
        m_pointers.clear();
        for (std::string& sWord : m_words)
            m_pointers.push_back(sWord.data());
        m_pointers.push_back(nullptr);
        optind = 0; // begin anew
        m_command = {};
        EXPECT_TRUE(
            read_command_line(static_cast<int>(m_words.size()), m_pointers.data(), &m_command));
        ASSERT_EQ(m_command.files.size(), 1U);
        EXPECT_STREQ(m_command.files[0], "/dev/null");
    }

    command_line m_command;
    std::vector<std::string> m_words;
    std::vector<char*> m_pointers;
};

TEST_F(ReadCommandLine, PrefixLettersOnceEachAndTheLastOptionCounts) {
    const struct {
        std::vector<std::string> arguments;
        const char* pLetters;
    } cases[] = {
        {{}, "tic"},
        {{"-o", "ttd"}, "td"},
        {{"-o", "dt", "-oc"}, "c"},
        {{"-o", "dticfsodticfso"}, "dticfso"},
        {{"-o", ""}, ""},
    };
    for (const auto& [arguments, pLetters] : cases) {
        read(arguments);
        EXPECT_STREQ(anchor.outputOptions, pLetters);
    }
}

TEST_F(ReadCommandLine, TemplatePathFromOptionElseEnvironmentElseDefault) {
    const struct {
        std::vector<std::string> arguments;
        const char* pVariable; ///< null: not set
        const char* pPath;
    } cases[] = {
        {{}, nullptr, "/opt/vantor/trctmplts:."},
        {{"-t", "/a:/b"}, nullptr, "/a:/b:/opt/vantor/trctmplts:."},
        {{"-t/a", "-t", "/c"}, nullptr, "/c:/opt/vantor/trctmplts:."},
        {{}, "/b", "/b:/opt/vantor/trctmplts:."},
        {{}, "", ":/opt/vantor/trctmplts:."},
        {{"-t", "/a"}, "/b", "/a:/opt/vantor/trctmplts:."},
    };
    for (const auto& [arguments, pVariable, pPath] : cases) {
        reset();
        if (pVariable != nullptr)
            setenv("KV_TR_TEMPLATE_PATH", pVariable, 1);
        read(arguments);
        EXPECT_STREQ(anchor.pTemplatePath, pPath);
    }
}

TEST_F(ReadCommandLine, FollowModeAndTheOptionsThatEndIt) {
    read({"-f"});
    EXPECT_EQ(anchor.bFollow, 1);
    EXPECT_EQ(queue_limit_enabled, 0);
    EXPECT_EQ(anchor.startOptions, START_RECORDS_FROM_END);
    EXPECT_EQ(anchor.startRecords, 0);

    reset();
    read({"-fz"});
    EXPECT_EQ(anchor.bFollow, 0);
    EXPECT_EQ(anchor.bNoFileLocking, 1);
    EXPECT_EQ(queue_limit_enabled, 0) << "-z does not set it again";
    EXPECT_EQ(anchor.startOptions, START_NONE);

    reset();
    read({"-z", "-f", "-s", "+1s", "-s", "-2r"});
    EXPECT_EQ(anchor.bFollow, 1);
    EXPECT_EQ(anchor.bStartRecOpt, 1);
    EXPECT_STREQ(anchor.pStartRecordOptArg, "-2r");
}

} // namespace
