#include <gtest/gtest.h>

#include <lumicor/lmk.h>

#include <climits>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include "testkit/fault.h"
#include "testkit/temp_dir.h"

namespace {

using lumicor::test::FaultScope;
using lumicor::test::TempDir;

class LmkConfigTest : public ::testing::Test {
protected:
    void SetUp() override { ASSERT_EQ(LmkConfig::Initialize(), LMK_STATUS_OK); }
    void TearDown() override {
        LmkConfig::UnloadConfig();
        LmkConfig::Finalize();
    }
    uint32_t Load(const std::string& text) { return LmkConfig::LoadConfig(dir_.Write("lmc.conf", text)); }

    TempDir dir_;
};

std::vector<std::string> Entries(const char* module, const char* section) {
    std::vector<std::string> list;
    LmkConfig::GetEntryList(module, section, list);
    return list;
}

struct SyntaxCase {
    const char* name;
    std::string text;
    const char* module;
    const char* section;
    // The whole expected content of module:section, each in key (byte) order.
    std::vector<std::pair<std::string, std::string>> strings;
    std::vector<std::pair<std::string, int32_t>> ints;
};

std::string Repeat(char c, size_t n) { return std::string(n, c); }

TEST_F(LmkConfigTest, SyntaxRules) {
    const std::string head = "{M}\n[S]\n";
    const std::vector<SyntaxCase> cases = {
        {"example file",
         "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n[Debug]\nSaveInputImage=\"true\"\n"
         "SaveInputImageDir=\"/sdcard/lumicor\"\n",
         "Lumicor", "Debug", {{"SaveInputImage", "true"}, {"SaveInputImageDir", "/sdcard/lumicor"}}, {}},
        {"blanks around equals stay in key and value", head + "Key = \"v\"\n", "M", "S", {}, {{"Key ", 0}}},
        {"unquoted word is the integer 0", head + "SaveInputImage=true\n", "M", "S", {}, {{"SaveInputImage", 0}}},
        {"unterminated last line is ignored", head + "A=1\nB=2", "M", "S", {}, {{"A", 1}}},
        {"comment only in column 1", head + "#A=1\n #B=2\n# C\n", "M", "S", {}, {{" #B", 2}}},
        {"first occurrence wins", head + "A=1\nA=2\nB=\"x\"\nB=\"y\"\n", "M", "S", {{"B", "x"}}, {{"A", 1}}},
        {"CRLF: one CR before LF removed", "{M}\r\n[S]\r\nA=\"x\"\r\nB=5\r\nC=\"y\r\"\r\n", "M", "S",
         {{"A", "x"}, {"C", "y\r"}}, {{"B", 5}}},
        {"module line without closer is ordinary", head + "{X=1\n{Y\nZ=2\n", "M", "S", {}, {{"Z", 2}, {"{X", 1}}},
        {"module and section end at the last closer", "{M}x}\n[S]]tail\nA=1\n", "M}x", "S]", {}, {{"A", 1}}},
        {"empty module stops storing", head + "A=1\n{}\nB=2\n{M}\nC=3\n", "M", "S", {}, {{"A", 1}, {"C", 3}}},
        {"first equals sign splits", head + "A=\"b=c\"\nB=c=1\n", "M", "S", {{"A", "b=c"}}, {{"B", 0}}},
        {"string runs to the last quote", head + "A=\"a\"b\"\nB=\"\nC=\"\"\nD=\"x\"tail\nE= \"y\"\n", "M", "S",
         {{"A", "a\"b"}, {"C", ""}, {"D", "x"}}, {{"B", 0}, {"E", 0}}},
        {"integers as atoi reads them",
         head + "A=12abc\nB= 7\nC=-3\nD=+4\nE=99999999999\nF=-99999999999\nG=\t-0x10\nH=-2147483648\n", "M",
         "S", {}, {{"A", 12}, {"B", 7}, {"C", -3}, {"D", 4}, {"E", INT32_MAX}, {"F", INT32_MIN}, {"G", 0},
                   {"H", INT32_MIN}}},
        {"incomplete entries are not stored", "A=1\n{M}\nB=2\n[S]\n=3\nC=\nD\nE=4\n", "M", "S", {}, {{"E", 4}}},
        {"over-long lines are dropped whole",
         head + "A=" + Repeat('1', 65534) + "\nB=" + Repeat('2', 65535) + "\nC=\"" + Repeat('3', 65532) +
             "\"\r\nD=1\n",
         "M", "S", {{"C", Repeat('3', 65532)}}, {{"A", INT32_MAX}, {"D", 1}}},
    };
    for (const SyntaxCase& c : cases) {
        SCOPED_TRACE(c.name);
        ASSERT_EQ(Load(c.text), LMK_STATUS_OK);
        std::vector<std::string> expectedKeys;
        for (const auto& s : c.strings) {
            expectedKeys.push_back(s.first);
            EXPECT_EQ(LmkConfig::GetValueString(c.module, c.section, s.first.c_str(), "<none>"), s.second)
                << s.first;
        }
        for (const auto& i : c.ints) {
            expectedKeys.push_back(i.first);
            EXPECT_EQ(LmkConfig::GetValueInt(c.module, c.section, i.first.c_str(), -12345), i.second) << i.first;
        }
        EXPECT_EQ(Entries(c.module, c.section), expectedKeys);
    }
}

TEST_F(LmkConfigTest, LookupsAreExactAndFallBackToDefault) {
    ASSERT_EQ(Load("{Lumicor}\n[Debug]\nSaveInputImage=\"true\"\nCount=5\n"), LMK_STATUS_OK);
    EXPECT_EQ(LmkConfig::GetValueString("Lumicor", "Debug", "saveinputimage", "false"), "false");
    EXPECT_EQ(LmkConfig::GetValueString("Lumicor", "Debug", "Count", "none"), "none");  // other map
    EXPECT_EQ(LmkConfig::GetValueString(nullptr, "Debug", "SaveInputImage", nullptr), "");
    EXPECT_EQ(LmkConfig::GetValueInt("Lumicor", "Debug", "SaveInputImage", -1), -1);
}

TEST_F(LmkConfigTest, EntryListAppendsStringKeysThenIntegerKeysInMapOrder) {
    ASSERT_EQ(Load("{M}\n[S]\nb=\"1\"\na=2\nc=3\nA=\"4\"\nx:y=5\n[S:x]\nz=6\n{MM}\n[S]\nq=1\n"), LMK_STATUS_OK);
    std::vector<std::string> list = {"kept"};
    EXPECT_EQ(LmkConfig::GetEntryList("M", "S", list), 5u);
    EXPECT_EQ(list, (std::vector<std::string>{"kept", "A", "b", "a", "c"}));
    // Keys are split at the last ":", so "x:y" of [S] belongs to section "S:x".
    EXPECT_EQ(Entries("M", "S:x"), (std::vector<std::string>{"y", "z"}));
    EXPECT_TRUE(Entries("M", "T").empty());
}

TEST_F(LmkConfigTest, LoadReplacesAndFailuresLeaveItEmpty) {
    ASSERT_EQ(Load("{M}\n[S]\nA=1\nB=\"b\"\n"), LMK_STATUS_OK);
    ASSERT_EQ(Load("{M}\n[S]\nC=3\n"), LMK_STATUS_OK);
    EXPECT_EQ(Entries("M", "S"), std::vector<std::string>{"C"});

    struct {
        const char* name;
        std::string path;
    } failures[] = {{"missing file", dir_.File("missing.conf")}, {"directory", dir_.path()}};
    for (const auto& f : failures) {
        SCOPED_TRACE(f.name);
        ASSERT_EQ(Load("{M}\n[S]\nA=1\n"), LMK_STATUS_OK);
        EXPECT_EQ(LmkConfig::LoadConfig(f.path), LMK_STATUS_FILE_ERROR);
        EXPECT_EQ(LmkConfig::GetValueInt("M", "S", "A", -1), -1);
    }
    EXPECT_EQ(LmkConfig::LoadConfig(static_cast<const char*>(nullptr)), LMK_STATUS_FILE_ERROR);

    ASSERT_EQ(Load("{M}\n[S]\nA=1\n"), LMK_STATUS_OK);
    EXPECT_EQ(LmkConfig::UnloadConfig(), LMK_STATUS_OK);
    EXPECT_TRUE(Entries("M", "S").empty());
}

TEST_F(LmkConfigTest, ReadLineReturnsLengthsAndMinusOneAtTheEnd) {
    const char raw[] = "ab\r\n\n\r\r\nx\0y\nlast";
    const std::string path = dir_.Write("lines", std::string(raw, sizeof raw - 1));
    FILE* fp = std::fopen(path.c_str(), "rb");
    ASSERT_NE(fp, nullptr);
    const std::pair<int32_t, std::string> expected[] = {
        {2, "ab"}, {0, ""}, {1, "\r"}, {3, std::string("x\0y", 3)}, {-1, ""}, {-1, ""}};
    std::string line = "junk";
    for (const auto& e : expected) {
        EXPECT_EQ(LmkConfig::ReadLine(fp, line), e.first);
        EXPECT_EQ(line, e.second);
    }
    std::fclose(fp);
    EXPECT_EQ(LmkConfig::ReadLine(nullptr, line), -1);
}

// The reference count decides when the mutex exists: the first Initialize
// allocates it, later ones do not, and only the last Finalize frees it.
TEST(LmkConfigLifecycleTest, ReferenceCountCreatesAndDeletesTheMutexOnce) {
    auto allocationsOfInitialize = [] {
        FaultScope count(0);
        EXPECT_EQ(LmkConfig::Initialize(), LMK_STATUS_OK);
        return count.Count();
    };
    EXPECT_EQ(LmkConfig::Finalize(), LMK_STATUS_OK);  // nothing counted: harmless
    EXPECT_GE(allocationsOfInitialize(), 1);
    EXPECT_EQ(allocationsOfInitialize(), 0);
    EXPECT_EQ(LmkConfig::Finalize(), LMK_STATUS_OK);
    EXPECT_EQ(LmkConfig::Finalize(), LMK_STATUS_OK);
    EXPECT_GE(allocationsOfInitialize(), 1);  // back at zero: created again
    EXPECT_EQ(LmkConfig::Finalize(), LMK_STATUS_OK);

    {
        FaultScope fail(1);
        EXPECT_EQ(LmkConfig::Initialize(), LMK_STATUS_OUT_OF_MEMORY);
    }
    EXPECT_GE(allocationsOfInitialize(), 1);  // the failed call did not count
    EXPECT_EQ(LmkConfig::Finalize(), LMK_STATUS_OK);
}

}  // namespace
