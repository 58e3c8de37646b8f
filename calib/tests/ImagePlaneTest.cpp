// ImagePlane, ImagePlaneFloat, MIPlane and the free debug writers.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <string>
#include <vector>

#include "calib/src/plane/image_plane.h"
#include "testkit/fault.h"
#include "testkit/temp_dir.h"

namespace {

void Ramp(ImagePlane& p) {
    for (int y = 0; y < p.height; ++y)
        for (int x = 0; x < p.width; ++x) p.pPixel[y * p.stride + x] = static_cast<uint8_t>(10 * y + x);
}

TEST(ImagePlaneTest, StrideAndPictureSize) {
    ImagePlane p;
    EXPECT_EQ(p.width, -1);
    ASSERT_EQ(p.iInit(17, 5), 0);
    EXPECT_EQ(p.stride, 32);
    EXPECT_EQ(p.bufHeight, 5);
    EXPECT_EQ(p.owned, 1);
    EXPECT_EQ(p.iInit(4, 4), static_cast<int32_t>(IMAGEPLANE_ERR_INIT));  // already has a buffer
    EXPECT_EQ(p.iResetPicSize(32, 5), 0);
    EXPECT_EQ(p.iResetPicSize(33, 5), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    EXPECT_EQ(p.iResetPicSize(4, 6), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    EXPECT_EQ(p.iResetPxlVal(256), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    ImagePlaneFloat f;
    ASSERT_EQ(f.iInit(3, 2), 0);
    EXPECT_EQ(f.stride, 16);
    ASSERT_EQ(f.iResetPxlVal(0), 0);
    EXPECT_EQ(f.pBuf[5], 0.0f);
    ImagePlane zero;
    EXPECT_EQ(zero.iInit(0, 5), static_cast<int32_t>(IMAGEPLANE_ERR_INIT));
    EXPECT_EQ(zero.iInit(1 << 16, 1 << 16), static_cast<int32_t>(IMAGEPLANE_ERR_INIT));  // past 32-bit offsets
}

TEST(ImagePlaneTest, ViewsShareTheBufferAndStayInsideIt) {
    ImagePlane parent;
    ASSERT_EQ(parent.iInit(8, 6), 0);
    Ramp(parent);
    ImagePlane view;
    ASSERT_EQ(view.iInit(3, 2, &parent, 4, 3), 0);
    EXPECT_EQ(view.pConstPixel[0], 34);
    EXPECT_EQ(view.pConstPixel[view.stride + 2], 46);
    view.pPixel[0] = 99;
    EXPECT_EQ(parent.pPixel[3 * parent.stride + 4], 99);
    // A view may not be stretched past the end of the parent's buffer.
    EXPECT_EQ(view.iResetPicSize(12, 3), 0);
    EXPECT_EQ(view.iResetPicSize(13, 3), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    EXPECT_EQ(view.iResetPicSize(3, 4), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    ImagePlane tooBig;
    EXPECT_EQ(tooBig.iInit(5, 2, &parent, 4, 3), static_cast<int32_t>(IMAGEPLANE_ERR_INIT));
    const ImagePlane& constParent = parent;
    ImagePlane readOnly;
    ASSERT_EQ(readOnly.iInit(2, 2, &constParent, 0, 0), 0);
    EXPECT_EQ(readOnly.pPixel, nullptr);
    EXPECT_EQ(readOnly.iResetPxlVal(1), static_cast<int32_t>(IMAGEPLANE_ERR_SIZE));
    uint8_t memory[40] = {};
    ImagePlane caller;
    EXPECT_EQ(caller.iInit(4, 3, memory, 8, 5, 4, 2), 0);
    EXPECT_EQ(caller.pPixel, memory + 20);
    ImagePlane bad;
    EXPECT_EQ(bad.iInit(5, 3, memory, 8, 5, 4, 2), static_cast<int32_t>(IMAGEPLANE_ERR_INIT));
}

TEST(ImagePlaneTest, CopyOfTheOverlapAtAnOffset) {
    ImagePlane src, dst;
    ASSERT_EQ(src.iInit(6, 5), 0);
    ASSERT_EQ(dst.iInit(6, 5), 0);
    Ramp(src);
    ASSERT_EQ(dst.iResetPxlVal(0), 0);
    ASSERT_EQ(dst.iCopyPixel(&src, -3, 2), 0);
    // Source columns 0.. to destination columns 3..; source rows 2.. to rows 0...
    EXPECT_EQ(dst.pPixel[0 * dst.stride + 3], 20);
    EXPECT_EQ(dst.pPixel[2 * dst.stride + 5], 42);
    EXPECT_EQ(dst.pPixel[0 * dst.stride + 2], 0);
    EXPECT_EQ(dst.pPixel[3 * dst.stride + 3], 0);
    EXPECT_EQ(dst.iCopyPixel(&src, 0, 0, 1, 0, 6, 1), static_cast<int32_t>(IMAGEPLANE_ERR_COPY));
    EXPECT_EQ(dst.iCopyPixel(&src, -1, 0, 0, 0, 1, 1), static_cast<int32_t>(IMAGEPLANE_ERR_COPY));
}

TEST(ImagePlaneTest, PaddingReplicatesTheNearestInnerSamples) {
    ImagePlane p;
    ASSERT_EQ(p.iInit(8, 8), 0);
    Ramp(p);
    ASSERT_EQ(p.iPadding(2, 2, 4, 4), 0);
    for (int y = 0; y < 8; ++y) {
        for (int x = 0; x < 8; ++x) {
            const int iy = y < 2 ? 2 : (y > 5 ? 5 : y), ix = x < 2 ? 2 : (x > 5 ? 5 : x);
            EXPECT_EQ(p.pPixel[y * p.stride + x], 10 * iy + ix) << x << "," << y;
        }
    }
    EXPECT_EQ(p.iPadding(3, 2, 4, 4), static_cast<int32_t>(IMAGEPLANE_ERR_FILE));
}

TEST(ImagePlaneTest, MIPlaneFormats) {
    struct Row {
        int w, h, format;
        int32_t code;
        int cw, ch;
    } const rows[] = {
        {641, 480, 0, MIPLANE_ERR_INIT, 0, 0}, {641, 480, 4, 0, 641, 480}, {640, 480, 0, 0, 320, 240},
        {640, 481, 1, 0, 320, 481},           {8, 2, 3, 0, 2, 2},          {6, 2, 3, MIPLANE_ERR_INIT, 0, 0},
        {4, 4, 5, MIPLANE_ERR_INIT, 0, 0},    {4, 4, 2, 0, 4, 4},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(testing::Message() << r.w << "x" << r.h << " format " << r.format);
        MIPlane m;
        EXPECT_EQ(m.iInit(r.w, r.h, r.format), r.code);
        if (r.code == 0) {
            EXPECT_EQ(m.iGetCrmWidth(), r.cw);
            EXPECT_EQ(m.iGetCrmHeight(), r.ch);
            EXPECT_EQ(m.pGetImagePlane(1)->width, r.cw);
        } else {
            EXPECT_EQ(m.pGetImagePlane(0), nullptr);
        }
    }
    MIPlane m;
    ASSERT_EQ(m.iInit(8, 4, 0), 0);
    EXPECT_EQ(m.iResetPicSize(6, 3), static_cast<int32_t>(MIPLANE_ERR_MULTIPLE));
    EXPECT_EQ(m.iResetPicSize(6, 2), 0);
    EXPECT_EQ(m.pGetImagePlane(2)->width, 3);
    EXPECT_EQ(m.iPadding(2, 0, 4, 2), static_cast<int32_t>(MIPLANE_ERR_PADDING));
}

TEST(ImagePlaneTest, PackedRgbGoesToGreenBlueRedAndBackOutAsPpm) {
    MIPlane m;
    ASSERT_EQ(m.iInit(2, 1, 4), 0);
    const uint8_t rgb[6] = {1, 2, 3, 4, 5, 6};
    ASSERT_EQ(m.iCopyPixel(rgb, 2, 1), 0);
    EXPECT_EQ(m.planes[0]->pPixel[1], 5);  // G
    EXPECT_EQ(m.planes[1]->pPixel[1], 6);  // B
    EXPECT_EQ(m.planes[2]->pPixel[1], 4);  // R
    EXPECT_EQ(m.iCopyPixel(rgb, 3, 1), static_cast<int32_t>(MIPLANE_ERR_COPY));
    lumicor::test::TempDir dir;
    ASSERT_EQ(m.iSavePPM(dir.File("m.ppm").c_str()), 0);
    EXPECT_EQ(lumicor::test::ReadFileBytes(dir.File("m.ppm")), std::string("P6\n2 1\n255\n\1\2\3\4\5\6", 17));
    MIPlane yuv;
    ASSERT_EQ(yuv.iInit(2, 2, 0), 0);
    EXPECT_EQ(yuv.iSavePPM(dir.File("y.ppm").c_str()), static_cast<int32_t>(IMAGEPLANE_ERR_FILE));
}

TEST(ImagePlaneTest, FreeWritersAndDumps) {
    lumicor::test::TempDir dir;
    const uint8_t px[6] = {9, 8, 7, 6, 5, 4};
    ASSERT_EQ(save_pgm(px, 3, 2, dir.File("a.pgm").c_str()), 0);
    EXPECT_EQ(lumicor::test::ReadFileBytes(dir.File("a.pgm")), std::string("P5\n3 2\n255\n\t\b\a\6\5\4", 17));
    testing::internal::CaptureStdout();
    EXPECT_NE(save_ppm(px, 2, 1, dir.path().c_str()), 0);  // a directory
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "fopen_s() failed\n");
    testing::internal::CaptureStdout();
    EXPECT_NE(save_pgm(px, 3, 2, (dir.path() + "/missing/a.pgm").c_str()), 0);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "fopen_s() failed\n");

    ImagePlane p;
    ASSERT_EQ(p.iInit(4, 2), 0);
    ASSERT_EQ(p.iResetPxlVal(7), 0);
    const std::string dump = dir.File("d.yuv");
    ASSERT_EQ(p.iDebugDump(dump.c_str(), false), 0);
    ASSERT_EQ(p.iDebugDump(dump.c_str(), true), 0);
    const std::string bytes = lumicor::test::ReadFileBytes(dump);
    ASSERT_EQ(bytes.size(), 2u * (8 + 4));  // picture and two 2 x 1 chroma fillers, twice
    EXPECT_EQ(bytes[8], '\x80');
    testing::internal::CaptureStdout();
    EXPECT_EQ(p.iSavePGM((dir.path() + "/missing/p.pgm").c_str()), static_cast<int32_t>(IMAGEPLANE_ERR_FILE));
    EXPECT_NE(testing::internal::GetCapturedStdout().find(" can not open\n"), std::string::npos);
}

TEST(ImagePlaneTest, AllocationFailuresLeaveAFreshPlane) {
    lumicor::test::ForEachAllocationFailure(
        [] {
            MIPlane m;
            const int32_t status = m.iInit(16, 8, 0);
            if (status != 0) {
                EXPECT_EQ(status, static_cast<int32_t>(MIPLANE_ERR_INIT));
                EXPECT_EQ(m.pGetImagePlane(0), nullptr);
                EXPECT_EQ(m.iGetImgWidth(), -1);
            }
        },
        [](long, bool) {});
}

}  // namespace
