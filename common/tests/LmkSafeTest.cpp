#include <gtest/gtest.h>

#include <lumicor/lmk.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <string>

#include "testkit/temp_dir.h"

namespace {

using lumicor::test::TempDir;

TEST(LmkSafeTest, FopenRefusesNullArgumentsAndDirectories) {
    TempDir dir;
    const std::string file = dir.Write("f.txt", "abc");
    const std::string missing = dir.File("missing.txt");
    const struct {
        const char* name;
        bool nullFp;
        const char* path;
        const char* mode;
        int expected;
    } cases[] = {
        {"null fp", true, file.c_str(), "r", EINVAL},
        {"null path", false, nullptr, "r", EINVAL},
        {"null mode", false, file.c_str(), nullptr, EINVAL},
        {"directory", false, dir.path().c_str(), "r", EISDIR},
        {"missing file", false, missing.c_str(), "r", ENOENT},
        {"existing file", false, file.c_str(), "r", 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        FILE* const sentinel = stdin;  // *fp must be overwritten either way
        FILE* fp = sentinel;
        errno = 12345;
        EXPECT_EQ(lmk::fopen_s(c.nullFp ? nullptr : &fp, c.path, c.mode), c.expected);
        EXPECT_EQ(errno, c.expected);
        if (c.nullFp) continue;
        EXPECT_EQ(fp != nullptr, c.expected == 0);
        if (fp && fp != sentinel) std::fclose(fp);
    }
}

TEST(LmkSafeTest, FprintfWritesOrRefusesNull) {
    FILE* fp = std::tmpfile();
    ASSERT_NE(fp, nullptr);
    EXPECT_EQ(lmk::fprintf_s(fp, "%s-%d", "ab", 42), 5);
    EXPECT_EQ(std::ftell(fp), 5);
    std::fclose(fp);
    errno = 0;
    EXPECT_EQ(lmk::fprintf_s(nullptr, "%d", 1), -1);
    EXPECT_EQ(errno, EINVAL);
}

TEST(LmkSafeTest, MemcpyChecksPointersAndRoom) {
    const char src[] = "abcdef";
    const struct {
        const char* name;
        bool nullDst;
        bool nullSrc;
        size_t dstSize;
        size_t count;
        int expected;
        const char* after;  // dst afterwards
    } cases[] = {
        {"fits", false, false, 8, 6, 0, "abcdef.."},
        {"exact", false, false, 3, 3, 0, "abc....."},
        {"too small: nothing copied", false, false, 5, 6, ERANGE, "........"},
        {"null source", false, true, 8, 1, EINVAL, "........"},
        {"null destination", true, false, 8, 1, EINVAL, "........"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        char dst[9] = "........";
        errno = 12345;
        EXPECT_EQ(lmk::memcpy_s(c.nullDst ? nullptr : dst, c.dstSize, c.nullSrc ? nullptr : src, c.count),
                  c.expected);
        EXPECT_EQ(errno, c.expected);
        EXPECT_STREQ(dst, c.after);
    }
}

TEST(LmkSafeTest, SprintfNeedsRoomForTheTerminator) {
    const struct {
        const char* name;
        size_t size;
        int expected;
        int expectedErrno;
        const char* after;
    } cases[] = {
        {"roomy", 16, 6, 0, "ab-123"},
        {"exact with terminator", 7, 6, 0, "ab-123"},
        {"no room for the terminator", 6, -1, ERANGE, ""},
        {"size 1", 1, -1, ERANGE, ""},
        {"size 0 leaves the buffer alone", 0, -1, ERANGE, "zzzzzzzzzzzzzzz"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        char buf[16] = "zzzzzzzzzzzzzzz";
        errno = 12345;
        EXPECT_EQ(lmk::sprintf_s(buf, c.size, "%s-%d", "ab", 123), c.expected);
        EXPECT_EQ(errno, c.expectedErrno);
        EXPECT_STREQ(buf, c.after);
    }
    errno = 0;
    EXPECT_EQ(lmk::sprintf_s(nullptr, 4, "x"), -1);
    EXPECT_EQ(errno, EINVAL);
}

TEST(LmkSafeTest, LocaltimeRefusesNullAndNegativeTimes) {
    struct tm result;
    const time_t negative = -1;
    const time_t some = 1700000000;  // 2023-11-14 in every time zone
    errno = 0;
    EXPECT_EQ(lmk::localtime_s(nullptr, &some), EINVAL);
    EXPECT_EQ(lmk::localtime_s(&result, nullptr), EINVAL);
    EXPECT_EQ(lmk::localtime_s(&result, &negative), EINVAL);
    EXPECT_EQ(errno, EINVAL);
    ASSERT_EQ(lmk::localtime_s(&result, &some), 0);
    EXPECT_EQ(errno, 0);
    EXPECT_EQ(result.tm_year, 123);
    EXPECT_EQ(result.tm_mon, 10);
}

}  // namespace
