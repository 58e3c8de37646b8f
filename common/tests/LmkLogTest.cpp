#include <gtest/gtest.h>

#include <lumicor/lmk.h>

#include <cstdio>
#include <ctime>
#include <functional>
#include <string>
#include <vector>

#include "testkit/fault.h"
#include "testkit/temp_dir.h"

namespace {

using lumicor::test::FileExists;
using lumicor::test::ReadFileBytes;
using lumicor::test::TempDir;

const char kSource[] = "/src/lumicor/lmc.cpp";
const char kMessage[] = "/src/lumicor/lmc.cpp(434): VondParseMeta(): failed\n";

std::string CaptureStdout(const std::function<void()>& call) {
    std::fflush(stdout);
    testing::internal::CaptureStdout();
    call();
    std::fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

// Logs kMessage the way the front end does: only after ShouldDisplay.
void LogIfShown(LMKLOG_LEVEL level) {
    if (LmkLog::ShouldDisplay("Lumicor", "Lumicor", level))
        LmkLog::Log(kSource, 434, "Lumicor", "Lumicor", level, "%s(%d): VondParseMeta(): failed\n", kSource, 434);
}

class LmkLogTest : public ::testing::Test {
protected:
    void SetUp() override { ASSERT_EQ(LmkConfig::Initialize(), LMK_STATUS_OK); }
    void TearDown() override {
        LmkConfig::UnloadConfig();
        LmkConfig::Finalize();
    }
    // Loads "{Lumicor}\n[Log]\n" + logLines, with @LOG@ standing for the log
    // file in the test's directory.
    void Load(std::string logLines) {
        const std::string marker = "@LOG@";
        for (size_t at; (at = logLines.find(marker)) != std::string::npos;) logLines.replace(at, marker.size(), LogPath());
        ASSERT_EQ(LmkConfig::LoadConfig(dir_.Write("lmc.conf", "{Lumicor}\n[Log]\n" + logLines)), LMK_STATUS_OK);
    }
    std::string LogPath() const { return dir_.File("lumicor.log"); }

    TempDir dir_;
};

struct OutputCase {
    const char* name;
    std::string logLines;
    LMKLOG_LEVEL level;
    bool shown;
    std::string console;
    std::string filePrefix;  // the line after "<time> ", without the message; empty: no file
};

TEST_F(LmkLogTest, LevelAndOutputSettingsDecideWhatIsWrittenWhere) {
    const std::string error = "{e}[Lumicor][Lumicor][lmc.cpp:434]";
    const std::vector<OutputCase> cases = {
        {"WARN threshold shows ERROR with prefix", "UsePrintf=\"true\"\nLevel.Lumicor=\"WARN\"\n", LMKLOG_ERROR, true,
         error + " " + kMessage, ""},
        {"WARN threshold hides PRINT", "UsePrintf=\"true\"\nLevel.Lumicor=\"WARN\"\n", LMKLOG_PRINT, false, "", ""},
        {"PRINT goes to the console bare", "UsePrintf=\"true\"\nLevel.Lumicor=\"PRINT\"\n", LMKLOG_PRINT, true,
         kMessage, ""},
        {"lower-case level inserts nothing", "UsePrintf=\"true\"\nLevel.Lumicor=\"warn\"\n", LMKLOG_ERROR, false, "",
         ""},
        {"no output switched on", "UsePrintf=\"True\"\nUseFile=true\nLevel.Lumicor=\"PRINT\"\n", LMKLOG_ERROR, false,
         "", ""},
        {"UseFile with empty LogFile writes nothing", "UseFile=\"true\"\nLogFile=\"\"\nLevel.Lumicor=\"PRINT\"\n",
         LMKLOG_ERROR, true, "", ""},
        {"file only", "UseFile=\"true\"\nLogFile=\"@LOG@\"\nLevel.Lumicor=\"ERROR\"\n", LMKLOG_ERROR, true, "", error},
        {"file gets PRINT with prefix",
         "UsePrintf=\"true\"\nUseFile=\"true\"\nLogFile=\"@LOG@\"\nLevel.Lumicor=\"PRINT\"\n", LMKLOG_PRINT, true,
         kMessage, "{p}[Lumicor][Lumicor][lmc.cpp:434]"},
    };
    for (const OutputCase& c : cases) {
        SCOPED_TRACE(c.name);
        Load(c.logLines);
        ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);
        EXPECT_EQ(LmkLog::ShouldDisplay("Lumicor", "Lumicor", c.level), c.shown);
        const time_t before = std::time(nullptr);
        EXPECT_EQ(CaptureStdout([&] { LogIfShown(c.level); }), c.console);
        const time_t after = std::time(nullptr);
        LmkLog::Stop();

        if (c.filePrefix.empty()) {
            EXPECT_FALSE(FileExists(LogPath()));
            continue;
        }
        const std::string line = ReadFileBytes(LogPath());
        std::remove(LogPath().c_str());
        const std::string tail = " " + c.filePrefix + " " + kMessage;
        ASSERT_GT(line.size(), tail.size());
        EXPECT_EQ(line.substr(line.size() - tail.size()), tail);
        const std::string timeText = line.substr(0, line.size() - tail.size());
        bool matches = false;
        for (time_t t = before; t <= after && !matches; ++t) {
            struct tm local;
            char text[128];
            ASSERT_EQ(lmk::localtime_s(&local, &t), 0);
            matches = std::strftime(text, sizeof text, "%c", &local) > 0 && timeText == text;
        }
        EXPECT_TRUE(matches) << "time part: " << timeText;
    }
}

TEST_F(LmkLogTest, PrefixNamesLevelModulesAndSourceFile) {
    Load("UsePrintf=\"true\"\n");
    const struct {
        const char* file;
        const char* submodule;
        int level;
        const char* prefix;
    } cases[] = {
        {"a/b/c.cpp", "Sub", LMKLOG_ERROR, "{e}[Lumicor][Sub][c.cpp:5]"},
        {"C:\\src\\x.cpp", "Sub", LMKLOG_WARN, "{w}[Lumicor][Sub][x.cpp:5]"},
        {"a/b\\c.cpp", "Sub", LMKLOG_ERROR, "{e}[Lumicor][Sub][b\\c.cpp:5]"},
        {"plain.cpp", "Sub", LMKLOG_ERROR, "{e}[Lumicor][Sub]"},
        {"a/c.cpp", nullptr, LMKLOG_ERROR, "{e}[c.cpp:5]"},
        {"a/c.cpp", "Sub", 9, "{?}[Lumicor][Sub][c.cpp:5]"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.prefix);
        const std::string out = CaptureStdout([&] {
            LmkLog::Log(c.file, 5, "Lumicor", c.submodule, static_cast<LMKLOG_LEVEL>(c.level), "m %d\n", 1);
        });
        EXPECT_EQ(out, std::string(c.prefix) + " m 1\n");
    }
}

TEST_F(LmkLogTest, LogDoesNotCheckTheLevelAndCutsLongMessages) {
    Load("UsePrintf=\"true\"\n");  // no level configured at all
    const std::string longText(600, 'x');
    const std::string out = CaptureStdout(
        [&] { LmkLog::Log("a/c.cpp", 7, "Lumicor", "Lumicor", LMKLOG_PRINT, "%s", longText.c_str()); });
    EXPECT_EQ(out, std::string(511, 'x'));
}

TEST_F(LmkLogTest, FileIsAppendedOnePerMessageAndMissingDirectoryLosesIt) {
    Load("UseFile=\"true\"\nLogFile=\"@LOG@\"\n");
    dir_.Write("lumicor.log", "earlier\n");
    LmkLog::Log("a/c.cpp", 1, "Lumicor", "Lumicor", LMKLOG_ERROR, "one\n");
    LmkLog::Log("a/c.cpp", 2, "Lumicor", "Lumicor", LMKLOG_WARN, "two\n");
    // Readable at once: the file is closed after every message.
    const std::string text = ReadFileBytes(LogPath());
    EXPECT_EQ(text.rfind("earlier\n", 0), 0u);
    EXPECT_NE(text.find(" {e}[Lumicor][Lumicor][c.cpp:1] one\n"), std::string::npos);
    EXPECT_NE(text.find(" {w}[Lumicor][Lumicor][c.cpp:2] two\n"), std::string::npos);

    const std::string lost = dir_.File("no/such/dir/lumicor.log");
    Load("UseFile=\"true\"\nLogFile=\"" + lost + "\"\n");
    EXPECT_EQ(CaptureStdout([] { LmkLog::Log("a/c.cpp", 3, "Lumicor", "Lumicor", LMKLOG_ERROR, "gone\n"); }), "");
    EXPECT_FALSE(FileExists(lost));
}

TEST_F(LmkLogTest, StartReadsOnlyLevelKeysWithASubmodule) {
    Load("UsePrintf=\"true\"\nLevel.A=\"PRINT\"\nLevel.B.C=\"ERROR\"\nLevel.=\"PRINT\"\nLevel=\"PRINT\"\n"
         "Levelx.D=\"PRINT\"\nLevel.E=PRINT\nLevel.F=\"WARN \"\nlevel.G=\"PRINT\"\n");
    ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);
    const struct {
        const char* submodule;
        LMKLOG_LEVEL level;
        bool shown;
    } cases[] = {
        {"A", LMKLOG_PRINT, true},  {"B.C", LMKLOG_ERROR, true}, {"B.C", LMKLOG_WARN, false},
        {"B", LMKLOG_ERROR, false}, {"", LMKLOG_ERROR, false},   {"D", LMKLOG_ERROR, false},
        {"E", LMKLOG_ERROR, false}, {"F", LMKLOG_ERROR, false},  {"G", LMKLOG_ERROR, false},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.submodule);
        EXPECT_EQ(LmkLog::ShouldDisplay("Lumicor", c.submodule, c.level), c.shown);
    }
    EXPECT_FALSE(LmkLog::ShouldDisplay("Other", "A", LMKLOG_ERROR));
    LmkLog::Stop();
}

// Levels are read at Start and kept until the last Stop; the output switches
// are read for every message.
TEST_F(LmkLogTest, LevelsLiveFromStartToTheLastStop) {
    Load("UsePrintf=\"true\"\nLevel.Lumicor=\"WARN\"\n");
    ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);
    Load("UsePrintf=\"false\"\nLevel.Lumicor=\"ERROR\"\n");
    EXPECT_FALSE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_ERROR));
    Load("UsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n");
    ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);  // a known level is kept
    LmkLog::Stop();
    EXPECT_TRUE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_WARN));
    LmkLog::Stop();
    EXPECT_FALSE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_ERROR));
    EXPECT_EQ(LmkLog::Stop(), LMK_STATUS_OK);  // nothing counted: harmless
    ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);  // a fresh start reads the new level
    EXPECT_FALSE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_WARN));
    LmkLog::Stop();
}

TEST_F(LmkLogTest, StartFailuresLeaveTheCountUnchanged) {
    Load("UsePrintf=\"true\"\nLevel.Lumicor=\"PRINT\"\n");
    EXPECT_EQ(LmkLog::Start(nullptr), LMK_STATUS_INVALID_PARAMETER);
    {
        lumicor::test::FaultScope fail(1);
        EXPECT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OUT_OF_MEMORY);
    }
    EXPECT_FALSE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_ERROR));
    lumicor::test::FaultScope count(0);
    ASSERT_EQ(LmkLog::Start("Lumicor"), LMK_STATUS_OK);
    EXPECT_GE(count.Count(), 1);  // the mutex is created now: the count was still 0
    EXPECT_TRUE(LmkLog::ShouldDisplay("Lumicor", "Lumicor", LMKLOG_PRINT));
    LmkLog::Stop();
}

}  // namespace
