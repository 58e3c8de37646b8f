// VondAnalyze called directly: checks that the exported interface cannot
// reach, the working-image size and the attention engine's size limit.
#include <lumicor/vond.h>

#include "testkit/images.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

namespace {

_zbm_Image Host(std::vector<uint8_t>& pixels, int w, int h, int pitch, int order) {
    _zbm_Image image;
    std::memset(&image, 0, sizeof image);
    image.pData = pixels.data();
    image.width = w;
    image.height = h;
    image.pitch = pitch;
    image.order = static_cast<_zbm_PixelOrder>(order);  // host numbering
    return image;
}

struct Meta {
    _VondMeta m;
    Meta() { std::memset(&m, 0, sizeof m); }
    ~Meta() { VondDisposeMeta(&m); }
};

bool IsZero(const _VondMeta& m) {
    const uint8_t* p = reinterpret_cast<const uint8_t*>(&m);
    for (size_t i = 0; i < sizeof m; ++i)
        if (p[i] != 0) return false;
    return true;
}

TEST(VondAnalyzeTest, DriverRefusals) {
    std::vector<uint8_t> pixels(64 * 48 * 3, 100);
    const _zbm_Image good = Host(pixels, 64, 48, 64 * 3, 1);
    const _VondFaceRect box = {0.1f, 0.1f, 0.2f, 0.2f};
    const _VondConfig badMode = {16, 1.0f, 76800};
    const _VondConfig noSize = {7, 1.0f, 0};
    struct Case {
        const char* name;
        int32_t count;
        const _VondFaceRect* boxes;
        const _VondConfig* config;
        const char* message;
    } const cases[] = {
        {"automatic with boxes", -1, &box, nullptr,
         "(faceRectCount == -1 || faceRectCount == 0) && pFaceRectArray != NULL"},
        {"none with boxes", 0, &box, nullptr, "(faceRectCount == -1 || faceRectCount == 0) && pFaceRectArray != NULL"},
        {"count -2", -2, nullptr, nullptr, "faceRectCount < -1"},
        {"boxes missing", 1, nullptr, nullptr, "faceRectCount >= 1 && pFaceRectArray == NULL"},
        {"dictionary mode 16", 0, nullptr, &badMode, "pConfig->faceDetectDicMode >= ORIEL_D_MODE_MAX"},
        {"face size 0", 0, nullptr, &noSize, "pConfig->faceRcSize == 0"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        Meta meta;
        std::memset(&meta.m, 0x5A, sizeof meta.m);  // zeroed before anything is checked
        const _VondResult r = VondAnalyze(&good, c.count, c.boxes, c.config, &meta.m);
        EXPECT_EQ(r.status, VOND_STATUS_INVALID_PARAMETER);
        EXPECT_STREQ(r.function, "VondAnalyze");
        EXPECT_STREQ(r.message, c.message);
        EXPECT_TRUE(IsZero(meta.m));
    }
    EXPECT_STREQ(VondAnalyze(&good, 0, nullptr, nullptr, nullptr).message, "pMetaOut == NULL");
    _zbm_Image noData = good;
    noData.pData = nullptr;
    Meta meta;
    EXPECT_STREQ(VondAnalyze(&noData, 0, nullptr, nullptr, &meta.m).message,
                 "pImage == NULL || pImage->pBuf == NULL || pImage->width == 0 || pImage->height == 0 || "
                 "pImage->pitch == 0");
    _zbm_Image order9 = good;
    order9.order = static_cast<_zbm_PixelOrder>(9);
    EXPECT_STREQ(VondAnalyze(&order9, 0, nullptr, nullptr, &meta.m).message,
                 "pImage == NULL || pImage->pBuf == NULL || pImage->width == 0 || pImage->height == 0 || "
                 "pImage->pitch == 0 || pImage->order >= VOND_PIXEL_ORDER_NUM");
}

TEST(VondAnalyzeTest, WorkingImageSize) {
    // Photos within the square root of 307,200 pixels of it are used as they are.
    struct Case {
        int w, h, workW, workH;
    } const cases[] = {
        {640, 480, 640, 480}, {600, 512, 600, 512}, {641, 480, 641, 480},
        {642, 480, 640, 479}, {10, 10, 554, 554},   {1000, 1000, 554, 554},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << c.w << " x " << c.h);
        std::vector<uint8_t> pixels(static_cast<size_t>(c.w) * c.h, 77);
        const _zbm_Image image = Host(pixels, c.w, c.h, c.w, 0);
        Meta meta;
        const _VondResult r = VondAnalyze(&image, 0, nullptr, nullptr, &meta.m);
        ASSERT_EQ(r.status, VOND_STATUS_OK) << r.function << ": " << r.message;
        EXPECT_EQ(meta.m.analyzedWidth, c.workW);
        EXPECT_EQ(meta.m.analyzedHeight, c.workH);
        // A null configuration is the built-in default.
        EXPECT_EQ(meta.m.faceDetectDicMode, 4u);
        EXPECT_EQ(meta.m.faceEngineParam, 0.0f);
        EXPECT_EQ(meta.m.faceRcSize, 307200u);
        EXPECT_EQ(meta.m.version.build, 0x13121700u);
    }
    // 9 pixels wide is refused; so is a working image taller than 65535.
    std::vector<uint8_t> tall(static_cast<size_t>(10) * 200000, 50);
    const struct {
        _zbm_Image image;
        uint32_t status;
        const char* message;
    } refused[] = {
        {Host(tall, 9, 100, 10, 0), VOND_STATUS_INVALID_PARAMETER,
         "pImage->width < MIN_SHORT_SIDE_LENGTH || pImage->height < MIN_SHORT_SIDE_LENGTH"},
        {Host(tall, 10, 200000, 10, 0), VOND_STATUS_FAILED,
         "pImageForFace->width > 0xFFFF || pImageForFace->height > 0xFFFF"},
    };
    for (const auto& c : refused) {
        Meta meta;
        const _VondResult r = VondAnalyze(&c.image, 0, nullptr, nullptr, &meta.m);
        EXPECT_EQ(r.status, c.status);
        EXPECT_STREQ(r.message, c.message);
        EXPECT_TRUE(IsZero(meta.m));
    }
}

TEST(VondAnalyzeTest, PanoramaTooLowForAttentionAreas) {
    // 2000 x 200 is analysed at 1752 x 175: lower than the attention engine's 240.
    ZbmImagePtr noise = lumicor::test::MakeNoiseImage(2000, 200, ZBM_PIXEL_ORDER_RGB);
    ASSERT_TRUE(noise);
    _zbm_Image image = *noise;  // the same pixels, described as the host's RGB (order 1)
    image.order = static_cast<_zbm_PixelOrder>(1);
    image.ownsData = 0;
    Meta meta;
    const _VondResult r = VondAnalyze(&image, 0, nullptr, nullptr, &meta.m);
    ASSERT_EQ(r.status, VOND_STATUS_OK) << r.message;
    EXPECT_EQ(meta.m.analyzedWidth, 1752);
    EXPECT_EQ(meta.m.analyzedHeight, 175);
    EXPECT_EQ(meta.m.attentionAreas.numAreas, 0u);
    EXPECT_STREQ(meta.m.caLibVersion.text, "1.2.2.1217");  // recorded all the same
    EXPECT_EQ(VondCALibGetSerializedSize(meta.m.attentionAreas), 22u);
}

}  // namespace
