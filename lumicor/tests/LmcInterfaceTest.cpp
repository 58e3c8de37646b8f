// Start, stop and blob release of the exported interface.
#include "testkit/temp_dir.h"

#include <lumicor/lmc.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <new>
#include <string>

extern "C" uint32_t LmcHeaderCheckDisposeFromC(LmcPhotoMeta* meta);  // lmc_header_check.c

namespace {

using lumicor::test::TempDir;

const char kQuietConfig[] = "{Lumicor}\n[Log]\nLevel.Lumicor=\"ERROR\"\n";
const char kVerboseConfig[] = "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"PRINT\"\n";

TEST(LmcInterfaceTest, InitializeFinalizeLifecycle) {
    TempDir dir;
    const std::string conf = dir.Write("lmc.conf", kQuietConfig);
    EXPECT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
    EXPECT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_FAILED);  // already initialised: nothing changes
    EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
    // Uninitialised again, so a new start succeeds.
    EXPECT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
    EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
    EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);  // also when not initialised
}

TEST(LmcInterfaceTest, InitializeRefusals) {
    TempDir dir;
    const std::string conf = dir.Write("lmc.conf", kQuietConfig);
    struct Case {
        const char* name;
        std::string path;
        bool null;
        uint32_t status;
    };
    const Case cases[] = {
        {"NULL path", "", true, LMC_STATUS_INVALID_PARAMETER},
        {"missing file", dir.File("missing.conf"), false, LMC_STATUS_FILE_ERROR},
        {"directory", dir.path(), false, LMC_STATUS_FILE_ERROR},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        EXPECT_EQ(LmcInitializeLumicor(c.null ? nullptr : c.path.c_str()), c.status);
        // The failure left the library uninitialised.
        EXPECT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
        EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
    }
}

TEST(LmcInterfaceTest, InitializeLogsTheVersionBanner) {
    TempDir dir;
    const std::string conf = dir.Write("lmc.conf", kVerboseConfig);
    testing::internal::CaptureStdout();
    const uint32_t status = LmcInitializeLumicor(conf.c_str());
    std::fflush(stdout);
    const std::string out = testing::internal::GetCapturedStdout();
    EXPECT_EQ(status, LMC_STATUS_OK);
    EXPECT_NE(out.find("Vond 1.5.13121700, metaVersion = 8, flags = 0\n"), std::string::npos) << out;
    EXPECT_NE(out.find("lmc_interface.cpp("), std::string::npos) << out;  // "%s(%d): " prefix
    EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
}

TEST(LmcInterfaceTest, DisposePhotoMeta) {
    TempDir dir;
    const std::string conf = dir.Write("lmc.conf", "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n");
    ASSERT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);

    testing::internal::CaptureStdout();
    const uint32_t nullStatus = LmcDisposePhotoMeta(nullptr);
    std::fflush(stdout);
    const std::string out = testing::internal::GetCapturedStdout();
    EXPECT_EQ(nullStatus, LMC_STATUS_INVALID_PARAMETER);
    EXPECT_NE(out.find("LmcDisposePhotoMeta(): pPhotoMeta == NULL\n"), std::string::npos) << out;
    EXPECT_NE(out.find("{e}[Lumicor][Lumicor]"), std::string::npos) << out;

    LmcPhotoMeta empty = {0, nullptr};
    EXPECT_EQ(LmcDisposePhotoMeta(&empty), LMC_STATUS_OK);

    LmcPhotoMeta blob = {64, new uint8_t[64]()};
    EXPECT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
    // Blobs outlive the library's stop; a C host releases them the same way.
    EXPECT_EQ(LmcHeaderCheckDisposeFromC(&blob), LMC_STATUS_OK);
    EXPECT_EQ(blob.nBufferSize, 0u);
    EXPECT_EQ(blob.pMeta, nullptr);
    EXPECT_EQ(LmcHeaderCheckDisposeFromC(nullptr), LMC_STATUS_INVALID_PARAMETER);
}

}  // namespace
