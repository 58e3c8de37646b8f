// LmcSearchFraming: the crop of a stored blob, and every refusal with its
// status and log line.
#include "testkit/fault.h"
#include "testkit/meta_builder.h"
#include "testkit/temp_dir.h"

#include <lumicor/calib.h>
#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

using lumicor::test::TempDir;

// A serialised blob of a meta built by `build`, analysed at width x height.
std::vector<uint8_t> Blob(bool (*build)(_VondMeta*), uint16_t width = 640, uint16_t height = 480) {
    _VondMeta meta;
    if (!build(&meta)) return {};
    meta.analyzedWidth = width;
    meta.analyzedHeight = height;
    std::vector<uint8_t> bytes = lumicor::test::SerializeToBlob(meta);
    VondDisposeMeta(&meta);
    return bytes;
}

// Errors are printed to standard output so that the test can read them; the
// library is started because the log is (framing itself does not need it).
class LmcSearchFramingTest : public testing::Test {
protected:
    void SetUp() override {
        const std::string conf =
            dir_.Write("lmc.conf", "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n");
        ASSERT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
    }
    void TearDown() override { LmcFinalizeLumicor(); }

    uint32_t Frame(const LmcPhotoMeta* meta, const LmcFramingParam* param, LmcRect* out, std::string* log) {
        testing::internal::CaptureStdout();
        const uint32_t status = LmcSearchFraming(meta, param, out);
        std::fflush(stdout);
        *log = testing::internal::GetCapturedStdout();
        return status;
    }

    TempDir dir_;
};

TEST_F(LmcSearchFramingTest, BlobGivesTheCropOfTheRequestedShape) {
    std::vector<uint8_t> blob = Blob(lumicor::test::BuildHandMadeMeta);
    ASSERT_FALSE(blob.empty());
    const LmcPhotoMeta meta = {static_cast<uint32_t>(blob.size()), blob.data()};

    // The search must see the blob's areas and analysed size, with the host's
    // three values over the defaults: the same call made directly gives the
    // same crop.
    _VondMeta parsed;
    ASSERT_EQ(VondParseMeta(meta.nBufferSize, meta.pMeta, &parsed).status, VOND_STATUS_OK);
    const LmcFramingParam params[] = {{4, 1.0f, 10.0f}, {4, 9.0f / 16.0f, 10.0f}, {1, 16.0f / 9.0f, 2.0f}};
    for (const LmcFramingParam& p : params) {
        SCOPED_TRACE(testing::Message() << "mode " << p.composition_mode << " aspect " << p.aspect_ratio);
        LmcRect crop = {-1, -1, -1, -1};
        std::string log;
        ASSERT_EQ(Frame(&meta, &p, &crop, &log), LMC_STATUS_OK) << log;
        EXPECT_EQ(log, "");
        EXPECT_GE(crop.x, 0.0f);
        EXPECT_GE(crop.y, 0.0f);
        EXPECT_LE(crop.x + crop.width, 1.0001f);
        EXPECT_LE(crop.y + crop.height, 1.0001f);
        // Height over width in pixels of the 640 x 480 analysis.
        EXPECT_NEAR(crop.height * 480.0f / (crop.width * 640.0f), p.aspect_ratio, 0.02f * p.aspect_ratio);

        _CAParam param;
        ASSERT_EQ(CAGetDefaultParam(&param), 0u);
        param.composition_mode = p.composition_mode;
        param.aspect_ratio = p.aspect_ratio;
        param.magnification_limit = p.magnification_limit;
        _CAResult direct;
        ASSERT_EQ(CASearchFraming(640, 480, &param, &parsed.attentionAreas, &direct), 0u);
        EXPECT_EQ(std::memcmp(&direct, &crop, sizeof crop), 0);
    }
    VondDisposeMeta(&parsed);
    // The blob is only read.
    EXPECT_EQ(blob, Blob(lumicor::test::BuildHandMadeMeta));
}

TEST_F(LmcSearchFramingTest, WorksWithoutTheLibraryStarted) {
    std::vector<uint8_t> blob = Blob(lumicor::test::BuildHandMadeMeta);
    ASSERT_FALSE(blob.empty());
    const LmcPhotoMeta meta = {static_cast<uint32_t>(blob.size()), blob.data()};
    const LmcFramingParam param = {4, 1.0f, 10.0f};
    LmcRect crop = {0, 0, 0, 0};
    ASSERT_EQ(LmcFinalizeLumicor(), LMC_STATUS_OK);
    EXPECT_EQ(LmcSearchFraming(&meta, &param, &crop), LMC_STATUS_OK);
    EXPECT_GT(crop.width, 0.0f);
}

TEST_F(LmcSearchFramingTest, RefusalsGiveTheirStatusAndMessage) {
    std::vector<uint8_t> good = Blob(lumicor::test::BuildHandMadeMeta);
    std::vector<uint8_t> badEnd = good;
    badEnd.back() ^= 1;
    // An analysis below the framing search's smallest side.
    std::vector<uint8_t> tiny = Blob(lumicor::test::BuildHandMadeMeta, 200, 150);
    ASSERT_FALSE(good.empty());
    ASSERT_FALSE(tiny.empty());

    const LmcPhotoMeta goodMeta = {static_cast<uint32_t>(good.size()), good.data()};
    const LmcPhotoMeta emptySize = {0, good.data()};
    const LmcPhotoMeta nullBlob = {static_cast<uint32_t>(good.size()), nullptr};
    const LmcPhotoMeta badEndMeta = {static_cast<uint32_t>(badEnd.size()), badEnd.data()};
    const LmcPhotoMeta shortMeta = {static_cast<uint32_t>(good.size() - 1), good.data()};
    const LmcPhotoMeta tinyMeta = {static_cast<uint32_t>(tiny.size()), tiny.data()};
    const LmcFramingParam param = {4, 1.0f, 10.0f};
    const LmcFramingParam flat = {4, 0.05f, 10.0f};    // aspect below the search's range
    const LmcFramingParam noZoom = {4, 1.0f, 0.5f};    // zoom limit below 1
    LmcRect out;

    const char kNullArgs[] = "LmcSearchFraming(): pPhotoMeta == NULL || pParam == NULL || pRectOut == NULL\n";
    const char kEmpty[] = "LmcSearchFraming(): pPhotoMeta->nBufferSize == 0 || pPhotoMeta->pMeta == NULL\n";
    const char kParse[] = "VondParseMeta(): failed\n";
    const char kSearch[] = "CASearchFraming(): failed\n";
    struct Case {
        const char* name;
        const LmcPhotoMeta* meta;
        const LmcFramingParam* param;
        LmcRect* out;
        uint32_t status;
        const char* message;
    } const cases[] = {
        {"null meta", nullptr, &param, &out, LMC_STATUS_INVALID_PARAMETER, kNullArgs},
        {"null param", &goodMeta, nullptr, &out, LMC_STATUS_INVALID_PARAMETER, kNullArgs},
        {"null output", &goodMeta, &param, nullptr, LMC_STATUS_INVALID_PARAMETER, kNullArgs},
        {"size 0", &emptySize, &param, &out, LMC_STATUS_INVALID_PARAMETER, kEmpty},
        {"null blob", &nullBlob, &param, &out, LMC_STATUS_INVALID_PARAMETER, kEmpty},
        {"bad footer", &badEndMeta, &param, &out, LMC_STATUS_FAILED, kParse},
        {"truncated", &shortMeta, &param, &out, LMC_STATUS_FAILED, kParse},
        {"aspect out of range", &goodMeta, &flat, &out, LMC_STATUS_FAILED, kSearch},
        {"zoom limit out of range", &goodMeta, &noZoom, &out, LMC_STATUS_FAILED, kSearch},
        {"analysis too small", &tinyMeta, &param, &out, LMC_STATUS_FAILED, kSearch},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        out = {-2, -2, -2, -2};
        std::string log;
        testing::internal::CaptureStderr();  // the framing search's own diagnostics
        EXPECT_EQ(Frame(c.meta, c.param, c.out, &log), c.status);
        testing::internal::GetCapturedStderr();
        EXPECT_NE(log.find(std::string("lmc_framing.cpp(")), std::string::npos) << log;
        EXPECT_NE(log.find(c.message), std::string::npos) << log;
        EXPECT_EQ(out.x, -2.0f);  // nothing written on failure
        EXPECT_EQ(out.height, -2.0f);
    }
}

TEST_F(LmcSearchFramingTest, AllocationFailuresFailCleanly) {
    std::vector<uint8_t> blob = Blob(lumicor::test::BuildHandMadeMeta);
    ASSERT_FALSE(blob.empty());
    const LmcPhotoMeta meta = {static_cast<uint32_t>(blob.size()), blob.data()};
    const LmcFramingParam param = {4, 9.0f / 16.0f, 10.0f};
    LmcRect expected;
    ASSERT_EQ(LmcSearchFraming(&meta, &param, &expected), LMC_STATUS_OK);

    uint32_t status = 0;
    LmcRect crop;
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    const long allocations = lumicor::test::ForEachAllocationFailure(
        [&] {
            crop = {-2, -2, -2, -2};
            status = LmcSearchFraming(&meta, &param, &crop);
        },
        [&](long n, bool triggered) {
            SCOPED_TRACE(n);
            if (triggered) {
                EXPECT_EQ(status, LMC_STATUS_FAILED);
                EXPECT_EQ(crop.x, -2.0f);
            } else {
                EXPECT_EQ(status, LMC_STATUS_OK);
                EXPECT_EQ(std::memcmp(&crop, &expected, sizeof crop), 0);
            }
        });
    testing::internal::GetCapturedStderr();
    testing::internal::GetCapturedStdout();
    EXPECT_GT(allocations, 0);
}

}  // namespace
