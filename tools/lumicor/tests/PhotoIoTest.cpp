// Decoding of JPEG and PNG photos (with the EXIF orientation), PNG writing,
// and the refusal of files that are not photos.
#include "photo_io.h"
#include "tool_test_files.h"

#include "testkit/images.h"
#include "testkit/temp_dir.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace {

using lumicor_tool::DecodePhoto;
using lumicor_tool::Photo;
using lumicor_tool_test::Quadrants;

enum Color { kRed, kGreen, kBlue, kWhite };
const uint8_t kRgb[4][3] = {{220, 20, 20}, {20, 200, 20}, {20, 20, 220}, {250, 250, 250}};

// Pixel (x, y) of the photo is within JPEG tolerance of colour c.
::testing::AssertionResult Near(const Photo& photo, int x, int y, Color c) {
    const uint8_t* p = ZbiuGetConstPointer(photo.image.get(), x, y);
    for (int i = 0; i < 3; ++i) {
        if (std::abs(p[i] - kRgb[c][i]) > 16)
            return ::testing::AssertionFailure() << "pixel (" << x << ", " << y << ") is " << int(p[0]) << " "
                                                 << int(p[1]) << " " << int(p[2]) << ", expected colour " << c;
    }
    return ::testing::AssertionSuccess();
}

TEST(PhotoIoTest, DecodesJpegAndPngIntoRgb) {
    const lumicor_tool_test::Rgb image = Quadrants(48, 32);
    Photo jpeg, png;
    std::string error;
    ASSERT_TRUE(DecodePhoto(lumicor_tool_test::EncodeJpeg(image), &jpeg, &error)) << error;
    EXPECT_EQ(jpeg.Width(), 48);
    EXPECT_EQ(jpeg.Height(), 32);
    EXPECT_EQ(jpeg.image->order, ZBM_PIXEL_ORDER_RGB);
    EXPECT_EQ(jpeg.exifOrientation, 1);
    EXPECT_TRUE(Near(jpeg, 4, 4, kRed));
    EXPECT_TRUE(Near(jpeg, 43, 27, kWhite));

    ASSERT_TRUE(DecodePhoto(lumicor_tool_test::EncodePng(image), &png, &error)) << error;
    ASSERT_EQ(png.Width(), 48);
    ASSERT_EQ(png.Height(), 32);
    for (int y = 0; y < 32; ++y)  // lossless
        ASSERT_EQ(std::memcmp(ZbiuGetConstPointer(png.image.get(), 0, y), image.At(0, y), 48 * 3), 0) << "row " << y;

    // Transparency is composed onto white.
    Photo alpha;
    ASSERT_TRUE(DecodePhoto(lumicor_tool_test::EncodePng(image, true), &alpha, &error)) << error;
    const uint8_t* first = ZbiuGetConstPointer(alpha.image.get(), 0, 0);
    EXPECT_EQ(first[0], 255);
    EXPECT_EQ(first[1], 255);
    EXPECT_EQ(first[2], 255);
    EXPECT_TRUE(Near(alpha, 1, 0, kRed));
}

TEST(PhotoIoTest, ExifOrientationTurnsTheJpegUpright) {
    // Corners of the upright photo (top-left, top-right, bottom-left,
    // bottom-right) for a stored 40 x 24 picture with red, green, blue and
    // white quadrants, and whether its sides are exchanged.
    struct Case {
        int orientation;
        Color tl, tr, bl, br;
        bool turned;
    } const cases[] = {
        {1, kRed, kGreen, kBlue, kWhite, false},  {2, kGreen, kRed, kWhite, kBlue, false},
        {3, kWhite, kBlue, kGreen, kRed, false},  {4, kBlue, kWhite, kRed, kGreen, false},
        {5, kRed, kBlue, kGreen, kWhite, true},   {6, kBlue, kRed, kWhite, kGreen, true},
        {7, kWhite, kGreen, kBlue, kRed, true},   {8, kGreen, kWhite, kRed, kBlue, true},
    };
    const lumicor_tool_test::Rgb stored = Quadrants(40, 24);
    for (const Case& c : cases) {
        SCOPED_TRACE(c.orientation);
        Photo photo;
        std::string error;
        ASSERT_TRUE(DecodePhoto(lumicor_tool_test::EncodeJpeg(stored, c.orientation), &photo, &error)) << error;
        EXPECT_EQ(photo.exifOrientation, c.orientation);
        const int w = c.turned ? 24 : 40, h = c.turned ? 40 : 24;
        ASSERT_EQ(photo.Width(), w);
        ASSERT_EQ(photo.Height(), h);
        EXPECT_TRUE(Near(photo, 2, 2, c.tl));
        EXPECT_TRUE(Near(photo, w - 3, 2, c.tr));
        EXPECT_TRUE(Near(photo, 2, h - 3, c.bl));
        EXPECT_TRUE(Near(photo, w - 3, h - 3, c.br));
    }
    // An orientation outside 1..8 is ignored.
    EXPECT_EQ(lumicor_tool::ReadExifOrientation(nullptr, 0), 1);
    Photo odd;
    std::string error;
    ASSERT_TRUE(DecodePhoto(lumicor_tool_test::EncodeJpeg(stored, 9), &odd, &error)) << error;
    EXPECT_EQ(odd.exifOrientation, 1);
    EXPECT_EQ(odd.Width(), 40);
}

TEST(PhotoIoTest, RefusesWhatIsNotAPhotoWithOneLine) {
    const lumicor_tool_test::Rgb image = Quadrants(64, 64);
    const std::vector<uint8_t> jpeg = lumicor_tool_test::EncodeJpeg(image);
    const std::vector<uint8_t> png = lumicor_tool_test::EncodePng(image);
    std::vector<uint8_t> badJpeg = jpeg;
    for (size_t i = 3; i < 40; ++i) badJpeg[i] = 0x5A;
    std::vector<uint8_t> badPng = png;
    for (size_t i = 16; i < badPng.size(); ++i) badPng[i] ^= 0x3C;
    struct Case {
        const char* name;
        std::vector<uint8_t> bytes;
        const char* reason;
    } const cases[] = {
        {"empty", {}, "unsupported format"},
        {"text", {'h', 'e', 'l', 'l', 'o'}, "unsupported format"},
        {"meta", {'V', 'O', 'N', 'D', 0, 0, 0, 32}, "a photo meta, not a photo"},
        {"truncated JPEG", std::vector<uint8_t>(jpeg.begin(), jpeg.end() - 40), "truncated JPEG data"},
        {"JPEG without its scan", std::vector<uint8_t>(jpeg.begin(), jpeg.begin() + 200), "corrupt or unsupported JPEG"},
        {"damaged JPEG header", badJpeg, "corrupt or unsupported JPEG data"},
        {"truncated PNG", std::vector<uint8_t>(png.begin(), png.begin() + png.size() / 2), "PNG data"},
        {"damaged PNG", badPng, "corrupt or unsupported PNG data"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        Photo photo;
        std::string error;
        EXPECT_FALSE(DecodePhoto(c.bytes, &photo, &error));
        EXPECT_NE(error.find(c.reason), std::string::npos) << error;
        EXPECT_EQ(error.find('\n'), std::string::npos) << error;
    }
}

TEST(PhotoIoTest, WritesPngThatReadsBack) {
    lumicor::test::TempDir dir;
    const lumicor_tool_test::Rgb image = Quadrants(21, 13);
    ZbmImagePtr source(ZbiuCreateFromData(image.pixels.data(), 21, 13, 21 * 3, ZBM_PIXEL_ORDER_RGB));
    ASSERT_TRUE(source);
    std::string error;
    const std::string path = dir.File("out.png");
    ASSERT_TRUE(lumicor_tool::WritePng(path, source.get(), &error)) << error;
    std::vector<uint8_t> bytes;
    ASSERT_TRUE(lumicor_tool::ReadFile(path, &bytes, &error)) << error;
    Photo back;
    ASSERT_TRUE(DecodePhoto(bytes, &back, &error)) << error;
    EXPECT_TRUE(lumicor::test::SameImage(source.get(), back.image.get()));

    EXPECT_FALSE(lumicor_tool::WritePng(dir.File("missing/out.png"), source.get(), &error));
    EXPECT_NE(error.find("missing/out.png"), std::string::npos) << error;
}

}  // namespace
