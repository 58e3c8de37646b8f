// Debug PPM images of an analysed photo and the PPM writer behind them.
#include "common/src/internal/ppm.h"
#include "lumicor/src/interface/lmc_debug_output.h"
#include "testkit/temp_dir.h"

#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

using lumicor::test::FileExists;
using lumicor::test::TempDir;

std::vector<uint8_t> ReadFile(const std::string& path) {
    const std::string bytes = lumicor::test::ReadFileBytes(path);
    return std::vector<uint8_t>(bytes.begin(), bytes.end());
}

std::vector<uint8_t> Ppm(int w, int h, const std::vector<uint8_t>& rgb) {
    char header[32];
    const int n = std::snprintf(header, sizeof header, "P6\n%d %d\n255\n", w, h);
    std::vector<uint8_t> out(header, header + n);
    out.insert(out.end(), rgb.begin(), rgb.end());
    return out;
}

// Starts the library with a configuration of [Debug] lines; errors are printed.
class LmcDebugOutputTest : public testing::Test {
protected:
    void Start(const std::string& debugLines) {
        const std::string conf = config_.Write(
            "lmc.conf", "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n[Debug]\n" + debugLines);
        ASSERT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
        started_ = true;
    }
    void TearDown() override {
        if (started_) LmcFinalizeLumicor();
    }
    // Runs the debug output, capturing what it logs.
    uint32_t Run(const LmcImage& image, const _VondMeta& meta, std::string* log = nullptr) {
        testing::internal::CaptureStdout();
        const uint32_t status = outputPpmImagesForDebug(&image, &meta);
        std::fflush(stdout);
        const std::string out = testing::internal::GetCapturedStdout();
        if (log) *log = out;
        return status;
    }
    std::string Dir(const TempDir& d) const { return "\"" + d.path() + "\""; }

    TempDir config_;
    TempDir images_;
    bool started_ = false;
};

// A 64 x 48 RGB photo with a 5-byte row padding and a recognisable pattern.
struct HostPhoto {
    static constexpr int kW = 64, kH = 48, kPitch = kW * 3 + 5;
    std::vector<uint8_t> bytes = std::vector<uint8_t>(kPitch * kH);
    LmcImage image{};
    HostPhoto() {
        for (int y = 0; y < kH; ++y)
            for (int x = 0; x < kW; ++x)
                for (int c = 0; c < 3; ++c) bytes[y * kPitch + x * 3 + c] = static_cast<uint8_t>(x * 3 + y * 5 + c * 60);
        image = {bytes.data(), nullptr, kW, kH, kPitch, LMC_PIXEL_ORDER_RGB};
    }
    std::vector<uint8_t> Packed() const {
        std::vector<uint8_t> rgb;
        for (int y = 0; y < kH; ++y) rgb.insert(rgb.end(), &bytes[y * kPitch], &bytes[y * kPitch] + kW * 3);
        return rgb;
    }
};

// One face box and one attention area away from the two text lines at the top.
struct ResultMeta {
    _FaceRegion region{};
    CAAttentionArea area{};
    _VondMeta meta{};
    ResultMeta() {
        region.faceArea = zbm_Rect{40, 24, 12, 10};
        area.nx = 0.125f;
        area.ny = 0.75f;
        area.nw = 0.25f;
        area.nh = 0.125f;
        meta.faceMeta.faceNum = 1;
        meta.faceMeta.regionCount = 1;
        meta.faceMeta.pRegions = &region;
        meta.attentionAreas.numAreas = 1;
        meta.attentionAreas.pAreaArray = &area;
    }
};

TEST_F(LmcDebugOutputTest, FlagsAreOnOnlyWhenExactlyTrue) {
    const char* values[] = {"SaveInputImage=\"True\"", "SaveInputImage=\"true \"", "SaveInputImage=true"};
    HostPhoto photo;
    ResultMeta result;
    for (const char* line : values) {
        SCOPED_TRACE(line);
        Start(std::string(line) + "\nSaveInputImageDir=" + Dir(images_) + "\nSaveAnalyzeResultImageDir=" + Dir(images_) +
              "\n");
        EXPECT_EQ(Run(photo.image, result.meta), LMC_STATUS_OK);
        const std::string n = std::to_string(lmc::DebugImageCounter());
        EXPECT_FALSE(FileExists(images_.File("out_" + n + ".ppm")));
        EXPECT_FALSE(FileExists(images_.File("out_result_" + n + ".ppm")));
        LmcFinalizeLumicor();
        started_ = false;
    }
}

TEST_F(LmcDebugOutputTest, MissingOrUnusableDirectoryFails) {
    HostPhoto photo;
    ResultMeta result;
    const std::string missing = images_.File("missing");
    const uint32_t n = lmc::DebugImageCounter();
    struct Case {
        const char* name;
        std::string lines;
        std::string message;
    };
    const Case cases[] = {
        {"input without directory", "SaveInputImage=\"true\"\n",
         "in lmc.conf, [Debug] SaveInputImageDir == \"\"\n"},
        {"result without directory", "SaveAnalyzeResultImage=\"true\"\nSaveAnalyzeResultImageDir=\"\"\n",
         "in lmc.conf, [Debug] SaveAnalyzeResultImageDir == \"\"\n"},
        {"input directory missing", "SaveInputImage=\"true\"\nSaveInputImageDir=\"" + missing + "\"\n",
         "zbiuSaveToPpm(\"" + missing + "/out_" + std::to_string(n) + ".ppm\"): failed\n"},
        {"result directory missing", "SaveAnalyzeResultImage=\"true\"\nSaveAnalyzeResultImageDir=\"" + missing + "\"\n",
         "zbiuSaveToPpm(\"" + missing + "/out_result_" + std::to_string(n) + ".ppm\"): failed\n"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        Start(c.lines);
        std::string log;
        EXPECT_EQ(Run(photo.image, result.meta, &log), LMC_STATUS_FAILED);
        EXPECT_NE(log.find(c.message), std::string::npos) << log;
        LmcFinalizeLumicor();
        started_ = false;
    }
}

TEST_F(LmcDebugOutputTest, WritesInputAndResultUnderTheSameCounter) {
    Start("SaveInputImage=\"true\"\nSaveInputImageDir=" + Dir(images_) +
          "\nSaveAnalyzeResultImage=\"true\"\nSaveAnalyzeResultImageDir=" + Dir(images_) + "\n");
    HostPhoto photo;
    ResultMeta result;
    const std::vector<uint8_t> hostBefore = photo.bytes;
    const uint32_t n = lmc::DebugImageCounter();
    ASSERT_EQ(Run(photo.image, result.meta), LMC_STATUS_OK);
    EXPECT_EQ(lmc::DebugImageCounter(), n);  // the caller advances it
    EXPECT_EQ(photo.bytes, hostBefore);      // the host's pixels are only read

    const std::string name = std::to_string(n);
    const std::vector<uint8_t> input = ReadFile(images_.File("out_" + name + ".ppm"));
    const std::vector<uint8_t> drawn = ReadFile(images_.File("out_result_" + name + ".ppm"));
    EXPECT_EQ(input, Ppm(HostPhoto::kW, HostPhoto::kH, photo.Packed()));
    ASSERT_EQ(drawn.size(), input.size());

    const size_t header = input.size() - HostPhoto::kW * HostPhoto::kH * 3;
    auto pixel = [&](const std::vector<uint8_t>& f, int x, int y) {
        const uint8_t* p = &f[header + (y * HostPhoto::kW + x) * 3];
        return std::vector<uint8_t>{p[0], p[1], p[2]};
    };
    // Face box outline in red, attention area (8, 36, 16, 6) in blue, insides untouched.
    EXPECT_EQ(pixel(drawn, 40, 24), (std::vector<uint8_t>{255, 0, 0}));
    EXPECT_EQ(pixel(drawn, 8, 36), (std::vector<uint8_t>{0, 0, 255}));
    EXPECT_EQ(pixel(drawn, 45, 28), pixel(input, 45, 28));
    EXPECT_EQ(pixel(drawn, 14, 38), pixel(input, 14, 38));
    // Something was written in the text rows at the top.
    EXPECT_NE(std::vector<uint8_t>(drawn.begin(), drawn.begin() + header + 18 * HostPhoto::kW * 3),
              std::vector<uint8_t>(input.begin(), input.begin() + header + 18 * HostPhoto::kW * 3));

    lmc::AdvanceDebugImageCounter();
    EXPECT_EQ(lmc::DebugImageCounter(), n + 1);
}

TEST_F(LmcDebugOutputTest, HostOrdersBecomeRgbFiles) {
    Start("SaveInputImage=\"true\"\nSaveInputImageDir=" + Dir(images_) + "\n");
    ResultMeta result;
    // The four-byte host orders are numbered differently from the image
    // model's. Two pixels (10, 20, 30) and (200, 100, 50), rows padded.
    struct Case {
        const char* name;
        LmcPixelOrder order;
        std::vector<uint8_t> row;
        std::vector<uint8_t> rgb;
    };
    const Case cases[] = {
        {"ARGB", LMC_PIXEL_ORDER_ARGB, {9, 10, 20, 30, 9, 200, 100, 50}, {10, 20, 30, 200, 100, 50}},
        {"ABGR", LMC_PIXEL_ORDER_ABGR, {9, 30, 20, 10, 9, 50, 100, 200}, {10, 20, 30, 200, 100, 50}},
        {"RGBA", LMC_PIXEL_ORDER_RGBA, {10, 20, 30, 9, 200, 100, 50, 9}, {10, 20, 30, 200, 100, 50}},
        {"BGRA", LMC_PIXEL_ORDER_BGRA, {30, 20, 10, 9, 50, 100, 200, 9}, {10, 20, 30, 200, 100, 50}},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        const int pitch = static_cast<int>(c.row.size()) + 3;
        std::vector<uint8_t> bytes(pitch * 2, 0xEE);
        std::copy(c.row.begin(), c.row.end(), bytes.begin());
        std::copy(c.row.begin(), c.row.end(), bytes.begin() + pitch);
        const LmcImage image = {bytes.data(), nullptr, 2, 2, pitch, c.order};
        ASSERT_EQ(Run(image, result.meta), LMC_STATUS_OK);
        const std::vector<uint8_t> file =
            ReadFile(images_.File("out_" + std::to_string(lmc::DebugImageCounter()) + ".ppm"));
        std::vector<uint8_t> rgb = c.rgb;
        rgb.insert(rgb.end(), c.rgb.begin(), c.rgb.end());
        EXPECT_EQ(file, Ppm(2, 2, rgb));
    }
}

TEST_F(LmcDebugOutputTest, Int32ArgbWordsDropAlpha) {
    Start("SaveInputImage=\"true\"\nSaveInputImageDir=" + Dir(images_) + "\n");
    ResultMeta result;
    // Rows of 2 words with 1 word of padding; negative pitch walks upwards.
    std::vector<uint32_t> words = {0xFF0A141Eu, 0x00C86432u, 0xDEADBEEFu, 0x80010203u, 0x7F040506u, 0u};
    const LmcImage down = {nullptr, words.data(), 2, 2, 12, LMC_PIXEL_ORDER_INT32_ARGB};
    ASSERT_EQ(Run(down, result.meta), LMC_STATUS_OK);
    std::vector<uint8_t> file = ReadFile(images_.File("out_" + std::to_string(lmc::DebugImageCounter()) + ".ppm"));
    EXPECT_EQ(file, Ppm(2, 2, {10, 20, 30, 200, 100, 50, 1, 2, 3, 4, 5, 6}));

    lmc::AdvanceDebugImageCounter();
    const LmcImage up = {nullptr, words.data() + 3, 2, 2, -12, LMC_PIXEL_ORDER_INT32_ARGB};
    ASSERT_EQ(Run(up, result.meta), LMC_STATUS_OK);
    file = ReadFile(images_.File("out_" + std::to_string(lmc::DebugImageCounter()) + ".ppm"));
    EXPECT_EQ(file, Ppm(2, 2, {1, 2, 3, 4, 5, 6, 10, 20, 30, 200, 100, 50}));

    std::string log;
    const LmcImage badPitch = {nullptr, words.data(), 2, 2, 10, LMC_PIXEL_ORDER_INT32_ARGB};
    EXPECT_EQ(Run(badPitch, result.meta, &log), LMC_STATUS_FAILED);
    EXPECT_NE(log.find("pImage->pitch % 4 != 0\n"), std::string::npos) << log;
    EXPECT_NE(log.find("createZbmImage(): failed\n"), std::string::npos) << log;
}

TEST(LmcPpmWriterTest, WritesEveryPixelOrderAsRgb) {
    TempDir dir;
    struct Case {
        const char* name;
        _zbm_PixelOrder order;
        int32_t bpp;
        std::vector<uint8_t> pixels;  // one row of two pixels
        std::vector<uint8_t> rgb;
    };
    const Case cases[] = {
        {"GRAY", ZBM_PIXEL_ORDER_GRAY, 1, {7, 250}, {7, 7, 7, 250, 250, 250}},
        {"RGB", ZBM_PIXEL_ORDER_RGB, 3, {1, 2, 3, 4, 5, 6}, {1, 2, 3, 4, 5, 6}},
        {"BGRA", ZBM_PIXEL_ORDER_BGRA, 4, {3, 2, 1, 99, 6, 5, 4, 99}, {1, 2, 3, 4, 5, 6}},
        {"YUV as stored", ZBM_PIXEL_ORDER_YUV, 3, {9, 8, 7, 6, 5, 4}, {9, 8, 7, 6, 5, 4}},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        std::vector<uint8_t> pixels = c.pixels;
        const _zbm_Image image = {pixels.data(), 2, 1, 2 * c.bpp, c.order, c.bpp, 0};
        const std::string path = dir.File(std::string(c.name) + ".ppm");
        ASSERT_EQ(zbiuSaveToPpm(path.c_str(), &image), 0);
        EXPECT_EQ(ReadFile(path), Ppm(2, 1, c.rgb));
    }
}

TEST(LmcPpmWriterTest, Refusals) {
    TempDir dir;
    uint8_t pixels[8] = {};
    const _zbm_Image unsupported = {pixels, 2, 1, 8, static_cast<_zbm_PixelOrder>(ZBM_PIXEL_ORDER_NUM), 4, 0};
    EXPECT_EQ(zbiuSaveToPpm(dir.File("order.ppm").c_str(), &unsupported), 3);
    EXPECT_FALSE(FileExists(dir.File("order.ppm")));  // refused before anything was opened
    const _zbm_Image rgb = {pixels, 2, 1, 6, ZBM_PIXEL_ORDER_RGB, 3, 0};
    EXPECT_EQ(zbiuSaveToPpm(dir.File("no/such/dir.ppm").c_str(), &rgb), 1);
    EXPECT_EQ(zbiuSaveToPpm(dir.path().c_str(), &rgb), 1);  // a directory cannot be opened for writing
    EXPECT_EQ(zbiuSaveToPpm(nullptr, &rgb), 3);
    EXPECT_EQ(zbiuSaveToPpm(dir.File("x.ppm").c_str(), nullptr), 3);
}

}  // namespace
