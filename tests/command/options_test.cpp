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

/// The usage text by its ends and its size.
auto is_usage() {
    return testing::AllOf(
        testing::StartsWith("kelvo [-fhbrl] [-o <dtic>] [-t <templatepath>]\n"
                            "      [-s \"<start time>\"] filename ...\n\nwhere:\n\n"),
        HasSubstr("      c Component id (e.g.\"_ZPB\")\n"),
        testing::EndsWith("from the beginning (+) or end (-) of the file.\n"),
        testing::SizeIs(1525));
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
        EXPECT_EQ(result.sErr.empty(), *pErrorHas == '\0');
        EXPECT_THAT(result.sErr, HasSubstr(pErrorHas));
    }
}

TEST(CommandLine, EveryUnreadableNameIsReportedAndNothingIsOpened) {
    const command_result result = run_command({"/no/such/a", "/dev/null", "/no/such/b"});
    std::string sMessages;
    for (const std::string sName : {"/no/such/a", "/no/such/b"})
        sMessages += KELVO_PROGRAM ": 2625-101 Filename \"" + sName +
                     "\" is not accessible, No such file or directory\n";
    EXPECT_EQ(result.sErr, sMessages);
    EXPECT_EQ(result.sOut, "");
    EXPECT_EQ(result.status, 1);
}

// ------------------------------------------------------------ what it is read to

/// Reads a command line, followed by a readable file name, into `anchor`, which
/// begins as at the start of a process.
void read_options(std::vector<const char*> arguments) {
    release_template_path();
    free(anchor.pStartRecordOptArg);
    anchor.pStartRecordOptArg = nullptr;
    anchor.bStartRecOpt = anchor.bFollow = anchor.bNoFileLocking = 0;
    anchor.startOptions = START_NONE;
    queue_limit_enabled = 1;
    optind = 0; // begin anew
    arguments.insert(arguments.begin(), "kelvo");
    arguments.insert(arguments.end(), {"/dev/null", nullptr});
    command_line command{};
    EXPECT_TRUE(read_command_line(static_cast<int>(arguments.size()) - 1,
                                  const_cast<char**>(arguments.data()), &command));
    ASSERT_EQ(command.files.size(), 1U);
    EXPECT_STREQ(command.files[0], "/dev/null");
}

TEST(ReadCommandLine, PrefixLettersOnceEachAndTheLastOptionCounts) {
    const struct {
        std::vector<const char*> arguments;
        const char* pLetters;
    } cases[] = {
        {{}, "tic"},
        {{"-o", "ttd"}, "td"},
        {{"-o", "dt", "-oc"}, "c"},
        {{"-o", "dticfsodticfso"}, "dticfso"},
        {{"-o", ""}, ""},
    };
    for (const auto& [arguments, pLetters] : cases) {
        read_options(arguments);
        EXPECT_STREQ(anchor.outputOptions, pLetters);
    }
}

TEST(ReadCommandLine, TemplatePathFromOptionElseEnvironmentElseDefault) {
    const struct {
        std::vector<const char*> arguments;
        const char* pVariable; ///< null: not set
        const char* pPath;
    } cases[] = {
        {{}, nullptr, "/opt/vantor/trctmplts:."},
        {{"-t/a", "-t", "/b:/c"}, nullptr, "/b:/c:/opt/vantor/trctmplts:."},
        {{}, "/b", "/b:/opt/vantor/trctmplts:."},
        {{}, "", ":/opt/vantor/trctmplts:."},
        {{"-t", "/a"}, "/b", "/a:/opt/vantor/trctmplts:."},
    };
    for (const auto& [arguments, pVariable, pPath] : cases) {
        unsetenv("KV_TR_TEMPLATE_PATH");
        if (pVariable != nullptr)
            setenv("KV_TR_TEMPLATE_PATH", pVariable, 1);
        read_options(arguments);
        EXPECT_STREQ(anchor.pTemplatePath, pPath);
    }
}

TEST(ReadCommandLine, FollowModeAndTheOptionsThatEndIt) {
    read_options({"-f"});
    EXPECT_EQ(anchor.bFollow, 1);
    EXPECT_EQ(queue_limit_enabled, 0);
    EXPECT_EQ(anchor.startOptions, START_RECORDS_FROM_END);

    read_options({"-fz"});
    EXPECT_EQ(anchor.bFollow, 0);
    EXPECT_EQ(anchor.bNoFileLocking, 1);
    EXPECT_EQ(queue_limit_enabled, 0) << "-z does not set it again";
    EXPECT_EQ(anchor.startOptions, START_NONE);

    read_options({"-z", "-f", "-s", "+1s", "-s", "-2r"});
    EXPECT_EQ(anchor.bFollow, 1);
    EXPECT_EQ(anchor.bStartRecOpt, 1);
    EXPECT_STREQ(anchor.pStartRecordOptArg, "-2r");
}

} // namespace
