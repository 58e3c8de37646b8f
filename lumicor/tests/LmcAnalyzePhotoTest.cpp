// LmcAnalyzePhoto end to end: every refusal with its status and log lines,
// the blob of a flat photo, host pixel orders, host face boxes, the framing
// of an analysed blob, the debug images and allocation failures.
#include "lumicor/src/interface/lmc_debug_output.h"
#include "oriel/tests/sample_photos.h"
#include "testkit/fault.h"
#include "testkit/temp_dir.h"

#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

using lumicor::test::FileExists;
using lumicor::test::TempDir;

template <typename T>
T V(T v) {  // packed members are read through a copy
    return v;
}

// An RGB picture with smooth shapes and some texture, so that every engine
// has something to find.
std::vector<uint8_t> Picture(int w, int h) {
    std::vector<uint8_t> rgb(static_cast<size_t>(w) * h * 3);
    uint32_t state = 12345;
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            state = state * 1103515245u + 12345u;
            const int noise = static_cast<int>(state >> 28);
            const bool disc = (x - w / 3) * (x - w / 3) + (y - h / 2) * (y - h / 2) < (h / 5) * (h / 5);
            uint8_t* p = &rgb[(static_cast<size_t>(y) * w + x) * 3];
            p[0] = static_cast<uint8_t>(disc ? 230 : 40 + x * 100 / w + noise);
            p[1] = static_cast<uint8_t>(disc ? 40 : 90 + y * 80 / h + noise);
            p[2] = static_cast<uint8_t>(disc ? 30 : 150 - noise);
        }
    return rgb;
}

// Starts the library with errors printed on standard output, plus `extra`
// configuration lines.
class LmcAnalyzePhotoTest : public testing::Test {
protected:
    void Start(const std::string& extra = "") {
        const std::string conf = config_.Write(
            "lmc.conf", "{Lumicor}\n[Log]\nUsePrintf=\"true\"\nLevel.Lumicor=\"ERROR\"\n" + extra);
        ASSERT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
        started_ = true;
    }
    void TearDown() override {
        if (started_) LmcFinalizeLumicor();
    }
    uint32_t Analyze(const LmcImage* image, int32_t count, const LmcFaceRect* rects, LmcPhotoMeta* out,
                     std::string* log = nullptr) {
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const uint32_t status = LmcAnalyzePhoto(image, count, rects, out);
        std::fflush(stdout);
        const std::string text = testing::internal::GetCapturedStdout();
        testing::internal::GetCapturedStderr();
        if (log) *log = text;
        return status;
    }
    TempDir config_;
    bool started_ = false;
};

TEST_F(LmcAnalyzePhotoTest, NotStartedLeavesTheOutputAlone) {
    const std::vector<uint8_t> rgb = Picture(64, 48);
    const LmcImage image = {rgb.data(), nullptr, 64, 48, 64 * 3, LMC_PIXEL_ORDER_RGB};
    uint8_t marker = 0;
    LmcPhotoMeta meta = {77, &marker};
    EXPECT_EQ(LmcAnalyzePhoto(&image, 0, nullptr, &meta), LMC_STATUS_FAILED);
    EXPECT_EQ(meta.nBufferSize, 77u);
    EXPECT_EQ(meta.pMeta, &marker);
}

TEST_F(LmcAnalyzePhotoTest, RefusalsGiveTheirStatusAndLogLines) {
    Start();
    const std::vector<uint8_t> rgb = Picture(64, 48);
    const uint32_t words[16 * 16] = {};
    const LmcImage good = {rgb.data(), nullptr, 64, 48, 64 * 3, LMC_PIXEL_ORDER_RGB};
    const LmcFaceRect box = {0.1f, 0.1f, 0.2f, 0.2f};
    auto with = [&good](void (*change)(LmcImage&)) {
        LmcImage i = good;
        change(i);
        return i;
    };
    const LmcImage noWidth = with([](LmcImage& i) { i.width = 0; });
    const LmcImage negativeHeight = with([](LmcImage& i) { i.height = -1; });
    const LmcImage noPitch = with([](LmcImage& i) { i.pitch = 0; });
    const LmcImage order8 = with([](LmcImage& i) { i.order = LMC_PIXEL_ORDER_MAX; });
    const LmcImage noBuffer = with([](LmcImage& i) { i.pBuf = nullptr; });
    const LmcImage noWords = with([](LmcImage& i) { i.order = LMC_PIXEL_ORDER_INT32_ARGB; });
    // -1 is written as the 32-bit field a C host may store (not a C++ enumerator).
    const LmcImage orderMinus1 = with([](LmcImage& i) {
        const int32_t minusOne = -1;
        std::memcpy(&i.order, &minusOne, sizeof minusOne);
    });
    const LmcImage narrow = with([](LmcImage& i) { i.width = 9; });
    const LmcImage shortPitch = with([](LmcImage& i) { i.pitch = -(64 * 3 - 1); });
    const LmcImage oddWordPitch = {nullptr, words, 16, 16, 16 * 4 + 2, LMC_PIXEL_ORDER_INT32_ARGB};

    const std::string kImage =
        "LmcAnalyzePhoto(): pImage == NULL || pImage->width <= 0 || pImage->height <= 0 || pImage->pitch == 0 || "
        "pImage->order >= LMC_PIXEL_ORDER_MAX\n";
    const std::string kCount = "LmcAnalyzePhoto(): nFaceRectCount < -1 || nFaceRectCount >= 1 && pFaceRectArray == NULL\n";
    struct Case {
        const char* name;
        const LmcImage* image;
        int32_t count;
        const LmcFaceRect* rects;
        uint32_t status;
        std::string message;
        bool imageFields;  // the driver refused the photo: its six fields are logged
    } const cases[] = {
        {"null image", nullptr, 0, nullptr, 1, kImage, false},
        {"width 0", &noWidth, 0, nullptr, 1, kImage, false},
        {"height -1", &negativeHeight, 0, nullptr, 1, kImage, false},
        {"pitch 0", &noPitch, 0, nullptr, 1, kImage, false},
        {"order 8", &order8, 0, nullptr, 1, kImage, false},
        {"count -2", &good, -2, nullptr, 1, kCount, false},
        {"boxes missing", &good, 2, nullptr, 1, kCount, false},
        {"no byte buffer", &noBuffer, 0, nullptr, 1,
         "LmcAnalyzePhoto(): pImage->order != LMC_PIXEL_ORDER_INT32_ARGB && pImage->pBuf == NULL\n", false},
        {"no word buffer", &noWords, 0, nullptr, 1,
         "LmcAnalyzePhoto(): pImage->order == LMC_PIXEL_ORDER_INT32_ARGB && pImage->pBufInt32 == NULL\n", false},
        {"order -1", &orderMinus1, 0, nullptr, 7, "[VondAnalyze] Invalid pImage->order\n", true},
        {"9 pixels wide", &narrow, 0, nullptr, 7,
         "[VondAnalyze] pImage->width < MIN_SHORT_SIDE_LENGTH || pImage->height < MIN_SHORT_SIDE_LENGTH\n", true},
        {"pitch shorter than a row", &shortPitch, 0, nullptr, 7, "[VondAnalyze] Invalid pImage->pitch\n", true},
        {"word pitch not a multiple of 4", &oddWordPitch, 0, nullptr, 7,
         "[VondAnalyze] invalid pitch for INT32_ARGB\n", true},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        uint8_t marker = 0;
        LmcPhotoMeta meta = {5, &marker};
        std::string log;
        EXPECT_EQ(Analyze(c.image, c.count, c.rects, &meta, &log), c.status);
        EXPECT_EQ(meta.nBufferSize, 0u);
        EXPECT_EQ(meta.pMeta, nullptr);
        EXPECT_NE(log.find("lmc_analyze.cpp("), std::string::npos) << log;
        EXPECT_NE(log.find(c.message), std::string::npos) << log;
        EXPECT_EQ(log.find("result.status = 1\n") != std::string::npos, c.imageFields) << log;
        if (c.imageFields) {
            EXPECT_NE(log.find("width = " + std::to_string(c.image->width) + "\n"), std::string::npos) << log;
            EXPECT_NE(log.find("pitch = " + std::to_string(c.image->pitch) + "\n"), std::string::npos) << log;
            int32_t order;
            std::memcpy(&order, &c.image->order, sizeof order);
            EXPECT_NE(log.find("order = " + std::to_string(order) + "\n"), std::string::npos) << log;
            EXPECT_NE(log.find("pBufInt32 = 0x"), std::string::npos) << log;
        }
    }
    std::string log;
    EXPECT_EQ(Analyze(&good, 0, nullptr, nullptr, &log), LMC_STATUS_INVALID_PARAMETER);
    EXPECT_NE(log.find("LmcAnalyzePhoto(): pMetaOut == NULL\n"), std::string::npos) << log;
    // Boxes with a count that asks for none are not looked at: only a count
    // of 1 or more passes boxes on.
    for (int32_t count : {-1, 0}) {
        LmcPhotoMeta meta = {0, nullptr};
        EXPECT_EQ(Analyze(&good, count, &box, &meta, &log), LMC_STATUS_OK) << log;
        LmcDisposePhotoMeta(&meta);
    }
}

// Sizes of the three sections of a blob, read back through the parser.
struct Sections {
    uint32_t face, quality, attention;
};
Sections SectionSizes(const _VondMeta& meta) {
    return {VondOrielGetSerializedSize(meta.faceMeta),
            VondKtLibGetSerializedSize(meta.similarity, meta.representative, meta.colorLabel),
            VondCALibGetSerializedSize(meta.attentionAreas)};
}

TEST_F(LmcAnalyzePhotoTest, FlatPhotoWithoutFacesGivesTheSmallestSections) {
    Start();
    const std::vector<uint8_t> gray(640 * 480, 128);
    const LmcImage image = {gray.data(), nullptr, 640, 480, 640, LMC_PIXEL_ORDER_GRAY};
    LmcPhotoMeta blob = {0, nullptr};
    std::string log;
    ASSERT_EQ(Analyze(&image, 0, nullptr, &blob, &log), LMC_STATUS_OK) << log;
    _VondMeta meta;
    ASSERT_EQ(VondParseMeta(blob.nBufferSize, blob.pMeta, &meta).status, VOND_STATUS_OK);
    const Sections s = SectionSizes(meta);
    EXPECT_EQ(s.face, 102u);  // subject, count and an OFM header without faces
    EXPECT_EQ(V(meta.faceMeta.regionCount), 0u);
    EXPECT_EQ(meta.clusterSubject, 0u);  // detection not run
    EXPECT_EQ(V(meta.faceMeta.dateTime[0]), 0);
    EXPECT_EQ(V(meta.faceMeta.imageWidth), 640);
    EXPECT_EQ(meta.analyzedWidth, 640);  // 640 x 480 is used as it is
    EXPECT_EQ(meta.analyzedHeight, 480);
    EXPECT_EQ(meta.attentionAreas.numAreas, 0u);  // nothing stands out
    EXPECT_EQ(s.attention, 22u);
    EXPECT_EQ(blob.nBufferSize, 32u + s.face + s.quality + s.attention);
    EXPECT_EQ(meta.faceDetectDicMode, 7u);
    EXPECT_EQ(meta.faceEngineParam, 1.0f);
    EXPECT_EQ(meta.faceRcSize, 76800u);
    VondDisposeMeta(&meta);
    EXPECT_EQ(LmcDisposePhotoMeta(&blob), LMC_STATUS_OK);
}

// The same picture in every host order (and bottom-up) gives the same blob.
TEST_F(LmcAnalyzePhotoTest, EveryPixelOrderGivesTheBlobOfRgb) {
    Start();
    const int w = 200, h = 150;
    std::vector<uint8_t> rgb = Picture(w, h);
    // Gray pictures compare with their RGB form.
    std::vector<uint8_t> grayRgb(rgb.size()), gray(static_cast<size_t>(w) * h);
    for (size_t i = 0; i < gray.size(); ++i) {
        gray[i] = rgb[i * 3 + 1];
        grayRgb[i * 3] = grayRgb[i * 3 + 1] = grayRgb[i * 3 + 2] = gray[i];
    }
    auto analyse = [&](const LmcImage& image, std::vector<uint8_t>* out) {
        LmcPhotoMeta blob = {0, nullptr};
        std::string log;
        ASSERT_EQ(Analyze(&image, 0, nullptr, &blob, &log), LMC_STATUS_OK) << log;
        out->assign(blob.pMeta, blob.pMeta + blob.nBufferSize);
        LmcDisposePhotoMeta(&blob);
    };
    std::vector<uint8_t> reference, grayReference;
    analyse({rgb.data(), nullptr, w, h, w * 3, LMC_PIXEL_ORDER_RGB}, &reference);
    analyse({grayRgb.data(), nullptr, w, h, w * 3, LMC_PIXEL_ORDER_RGB}, &grayReference);
    ASSERT_NE(reference, grayReference);

    // Byte positions of R, G, B (and A) in each host order.
    struct Order {
        LmcPixelOrder order;
        int bytes, r, g, b, a;
    } const orders[] = {
        {LMC_PIXEL_ORDER_BGR, 3, 2, 1, 0, -1},  {LMC_PIXEL_ORDER_ARGB, 4, 1, 2, 3, 0},
        {LMC_PIXEL_ORDER_ABGR, 4, 3, 2, 1, 0},  {LMC_PIXEL_ORDER_RGBA, 4, 0, 1, 2, 3},
        {LMC_PIXEL_ORDER_BGRA, 4, 2, 1, 0, 3},  {LMC_PIXEL_ORDER_RGB, 3, 0, 1, 2, -1},
    };
    for (const Order& o : orders) {
        for (bool bottomUp : {false, true}) {
            SCOPED_TRACE(testing::Message() << "order " << o.order << (bottomUp ? " bottom-up" : ""));
            const int pitch = w * o.bytes + 7;  // padded rows
            std::vector<uint8_t> host(static_cast<size_t>(pitch) * h, 0xEE);
            for (int y = 0; y < h; ++y)
                for (int x = 0; x < w; ++x) {
                    const uint8_t* src = &rgb[(static_cast<size_t>(y) * w + x) * 3];
                    const int row = bottomUp ? h - 1 - y : y;
                    uint8_t* dst = &host[static_cast<size_t>(row) * pitch + x * o.bytes];
                    dst[o.r] = src[0];
                    dst[o.g] = src[1];
                    dst[o.b] = src[2];
                    if (o.a >= 0) dst[o.a] = 0x80;
                }
            const std::vector<uint8_t> before = host;
            const uint8_t* top = bottomUp ? &host[static_cast<size_t>(h - 1) * pitch] : host.data();
            std::vector<uint8_t> blob;
            analyse({top, nullptr, w, h, bottomUp ? -pitch : pitch, o.order}, &blob);
            EXPECT_TRUE(blob == reference);
            EXPECT_TRUE(host == before);  // never written
        }
    }
    // One 32-bit word per pixel, rows padded to a multiple of 4 bytes.
    const int wordPitch = w * 4 + 8;
    std::vector<uint32_t> words(static_cast<size_t>(wordPitch / 4) * h);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            const uint8_t* src = &rgb[(static_cast<size_t>(y) * w + x) * 3];
            words[static_cast<size_t>(y) * (wordPitch / 4) + x] =
                0x7F000000u | (uint32_t{src[0]} << 16) | (uint32_t{src[1]} << 8) | src[2];
        }
    std::vector<uint8_t> blob;
    analyse({nullptr, words.data(), w, h, wordPitch, LMC_PIXEL_ORDER_INT32_ARGB}, &blob);
    EXPECT_TRUE(blob == reference);
    analyse({gray.data(), nullptr, w, h, w, LMC_PIXEL_ORDER_GRAY}, &blob);
    EXPECT_TRUE(blob == grayReference);
}

TEST_F(LmcAnalyzePhotoTest, OversizedPhotoOnlyWorksInPlace) {
    Start();
    // One pixel more than the image model creates: only an RGB buffer, used
    // in place, can be analysed.
    const int w = 4001, h = 4000;
    std::vector<uint8_t> buffer(static_cast<size_t>(w) * h * 4, 90);
    struct Case {
        LmcPixelOrder order;
        int bytes;
        uint32_t status;
    } const cases[] = {
        {LMC_PIXEL_ORDER_RGB, 3, LMC_STATUS_OK},
        {LMC_PIXEL_ORDER_GRAY, 1, LMC_STATUS_OUT_OF_MEMORY},
        {LMC_PIXEL_ORDER_BGRA, 4, LMC_STATUS_OUT_OF_MEMORY},
        {LMC_PIXEL_ORDER_INT32_ARGB, 4, LMC_STATUS_FAILED},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.order);
        const LmcImage image = {c.order == LMC_PIXEL_ORDER_INT32_ARGB ? nullptr : buffer.data(),
                                reinterpret_cast<const uint32_t*>(buffer.data()), w, h, w * c.bytes, c.order};
        LmcPhotoMeta blob = {0, nullptr};
        std::string log;
        EXPECT_EQ(Analyze(&image, 0, nullptr, &blob, &log), c.status) << log;
        if (c.status != LMC_STATUS_OK) {
            EXPECT_NE(log.find("[VondAnalyze] ZbiuCreate() failed"), std::string::npos) << log;
        }
        LmcDisposePhotoMeta(&blob);
    }
}

TEST_F(LmcAnalyzePhotoTest, HostFaceBoxesAndFramingOfTheBlob) {
    const oriel_test::Photo photo = oriel_test::Sample(1);
    if (photo.Empty()) GTEST_SKIP() << "sample photos not available";
    Start();
    const LmcImage image = {photo.rgb.data(), nullptr, photo.w, photo.h, photo.w * 3, LMC_PIXEL_ORDER_RGB};
    LmcPhotoMeta automatic = {0, nullptr};
    std::string log;
    ASSERT_EQ(Analyze(&image, -1, nullptr, &automatic, &log), LMC_STATUS_OK) << log;
    _VondMeta meta;
    ASSERT_EQ(VondParseMeta(automatic.nBufferSize, automatic.pMeta, &meta).status, VOND_STATUS_OK);
    const uint32_t found = meta.faceMeta.regionCount;
    ASSERT_GE(found, 1u);
    EXPECT_EQ(meta.attentionAreas.isFace, 1u);  // faces become the attention areas
    EXPECT_EQ(meta.attentionAreas.numAreas, found);
    const zbm_Rect box = meta.faceMeta.pRegions[0].faceArea;
    VondDisposeMeta(&meta);

    // The crop of each shape lies inside the photo.
    for (float aspect : {1.0f, 9.0f / 16.0f}) {
        const LmcFramingParam param = {4, aspect, 10.0f};
        LmcRect crop;
        ASSERT_EQ(LmcSearchFraming(&automatic, &param, &crop), LMC_STATUS_OK);
        EXPECT_GE(crop.x, 0.0f);
        EXPECT_LE(crop.y + crop.height, 1.0001f);
        EXPECT_NEAR(crop.height * photo.h / (crop.width * photo.w), aspect, 0.03f);
    }
    LmcDisposePhotoMeta(&automatic);

    // The face found and a box where there is none: both are kept, in the
    // host's order, and only the confirmed one has eyes.
    const LmcFaceRect boxes[2] = {
        {static_cast<float>(box.x) / photo.w, static_cast<float>(box.y) / photo.h,
         static_cast<float>(box.width) / photo.w, static_cast<float>(box.height) / photo.h},
        {0.02f, 0.8f, 0.08f, 0.12f}};
    LmcPhotoMeta hosted = {0, nullptr};
    ASSERT_EQ(Analyze(&image, 2, boxes, &hosted, &log), LMC_STATUS_OK) << log;
    ASSERT_EQ(VondParseMeta(hosted.nBufferSize, hosted.pMeta, &meta).status, VOND_STATUS_OK);
    ASSERT_EQ(V(meta.faceMeta.regionCount), 2u);
    const zbm_Rect first = meta.faceMeta.pRegions[0].faceArea;
    EXPECT_NEAR(first.x, box.x, box.width / 4);
    EXPECT_NEAR(first.width, box.width, box.width / 4);
    const zbm_Pos eye = meta.faceMeta.pRegions[0].rightEye;
    EXPECT_GE(eye.x, 0);
    const zbm_Pos none = meta.faceMeta.pRegions[1].rightEye;
    EXPECT_EQ(none.x, -1);
    EXPECT_EQ(meta.attentionAreas.numAreas, 2u);
    VondDisposeMeta(&meta);
    LmcDisposePhotoMeta(&hosted);
}

TEST_F(LmcAnalyzePhotoTest, DebugImagesShareTheCounter) {
    TempDir images;
    const std::string dir = "\"" + images.path() + "\"";
    Start("[Debug]\nSaveInputImage=\"true\"\nSaveInputImageDir=" + dir +
          "\nSaveAnalyzeResultImage=\"true\"\nSaveAnalyzeResultImageDir=" + dir + "\n");
    const std::vector<uint8_t> rgb = Picture(120, 90);
    const LmcImage image = {rgb.data(), nullptr, 120, 90, 120 * 3, LMC_PIXEL_ORDER_RGB};
    const uint32_t n = lmc::DebugImageCounter();
    LmcPhotoMeta blob = {0, nullptr};
    std::string log;
    ASSERT_EQ(Analyze(&image, 0, nullptr, &blob, &log), LMC_STATUS_OK) << log;
    LmcDisposePhotoMeta(&blob);
    EXPECT_TRUE(FileExists(images.File("out_" + std::to_string(n) + ".ppm")));
    EXPECT_TRUE(FileExists(images.File("out_result_" + std::to_string(n) + ".ppm")));
    EXPECT_EQ(lmc::DebugImageCounter(), n + 1);
    // A refused photo does not count.
    EXPECT_EQ(Analyze(&image, -3, nullptr, &blob), LMC_STATUS_INVALID_PARAMETER);
    EXPECT_EQ(lmc::DebugImageCounter(), n + 1);
    LmcFinalizeLumicor();
    started_ = false;

    // Debug output asked for without a folder: every analysis fails, and
    // still counts.
    Start("[Debug]\nSaveInputImage=\"true\"\n");
    EXPECT_EQ(Analyze(&image, 0, nullptr, &blob, &log), LMC_STATUS_FAILED);
    EXPECT_EQ(blob.pMeta, nullptr);
    EXPECT_NE(log.find("outputPpmImagesForDebug() failed\n"), std::string::npos) << log;
    EXPECT_EQ(lmc::DebugImageCounter(), n + 2);
    LmcFinalizeLumicor();
    started_ = false;

    // Off (a capitalised value is not "true"): nothing written, still counted.
    Start("[Debug]\nSaveInputImage=\"True\"\nSaveInputImageDir=" + dir + "\n");
    ASSERT_EQ(Analyze(&image, 0, nullptr, &blob, &log), LMC_STATUS_OK) << log;
    LmcDisposePhotoMeta(&blob);
    EXPECT_FALSE(FileExists(images.File("out_" + std::to_string(n + 2) + ".ppm")));
    EXPECT_EQ(lmc::DebugImageCounter(), n + 3);
}

// Runs LmcAnalyzePhoto with the nth allocation failing for n = 1, 2, ... (or
// every `stride`th n after the first 64) and checks that each failure is
// reported as out of memory or failure with an empty output; the leak
// checker of the sanitizer build sees anything left behind. With `graceful`
// a run may also succeed with a complete blob (the face engine goes on
// without the identity vector it could not make). Returns the allocations of
// a whole run.
long CheckAllocationFailures(const LmcImage& image, int32_t count, const LmcFaceRect* boxes, long stride,
                             bool graceful) {
    LmcPhotoMeta expected = {0, nullptr};
    long total;
    {
        lumicor::test::FaultScope counting(0);
        EXPECT_EQ(LmcAnalyzePhoto(&image, count, boxes, &expected), LMC_STATUS_OK);
        total = counting.Count();
    }
    testing::internal::CaptureStderr();  // the attention library's diagnostics
    for (long n = 1; n <= total; n += (n < 64 ? 1 : stride)) {
        uint32_t status;
        LmcPhotoMeta blob = {0, nullptr};
        bool triggered;
        {
            lumicor::test::FaultScope fault(n);
            status = LmcAnalyzePhoto(&image, count, boxes, &blob);
            triggered = fault.Triggered();
        }
        if (!triggered || (graceful && status == LMC_STATUS_OK)) {
            EXPECT_EQ(status, LMC_STATUS_OK) << n;
            _VondMeta meta;
            EXPECT_EQ(VondParseMeta(blob.nBufferSize, blob.pMeta, &meta).status, VOND_STATUS_OK) << n;
            VondDisposeMeta(&meta);
        } else {
            EXPECT_TRUE(status == LMC_STATUS_OUT_OF_MEMORY || status == LMC_STATUS_FAILED) << n << ": " << status;
            EXPECT_EQ(blob.nBufferSize, 0u) << n;
            EXPECT_EQ(blob.pMeta, nullptr) << n;
        }
        LmcDisposePhotoMeta(&blob);
    }
    testing::internal::GetCapturedStderr();
    LmcDisposePhotoMeta(&expected);
    return total;
}

TEST_F(LmcAnalyzePhotoTest, EveryFailingAllocationFailsCleanly) {
    // Quiet: the log would print a line for every failure.
    const std::string conf = config_.Write("lmc.conf", "{Lumicor}\n");
    ASSERT_EQ(LmcInitializeLumicor(conf.c_str()), LMC_STATUS_OK);
    started_ = true;
    const std::vector<uint8_t> rgb = Picture(160, 120);
    // BGR, so that the conversion to RGB is part of the run.
    std::vector<uint8_t> bgr(rgb.size());
    for (size_t i = 0; i < rgb.size(); i += 3) {
        bgr[i] = rgb[i + 2];
        bgr[i + 1] = rgb[i + 1];
        bgr[i + 2] = rgb[i];
    }
    const LmcImage image = {bgr.data(), nullptr, 160, 120, 160 * 3, LMC_PIXEL_ORDER_BGR};
    // Without faces: every allocation of the run fails once (every few under
    // emulation, where a run is slow).
#if defined(__arm__)
    const long stride = 7;
#else
    const long stride = 1;
#endif
    EXPECT_GT(CheckAllocationFailures(image, 0, nullptr, stride, false), 10);
    // With a host box the face engine runs too; its many allocations are
    // sampled (on the native builds: under emulation one run takes seconds).
#if !defined(__arm__)
    const LmcFaceRect box = {0.3f, 0.3f, 0.2f, 0.25f};
    EXPECT_GT(CheckAllocationFailures(image, 1, &box, 97, true), 10);
#endif
}

// 64-bit FNV-1a of a blob with the analysis date (the only part that depends
// on when the photo was analysed) left out.
uint64_t BlobDigest(const LmcPhotoMeta& blob) {
    _VondMeta meta;
    if (VondParseMeta(blob.nBufferSize, blob.pMeta, &meta).status != VOND_STATUS_OK) return 0;
    // The date sits in the OFM header behind the face section's subject,
    // count and score pairs.
    const uint32_t dateAt = 28 + 8 + 8 * meta.faceMetaArray.count + 6;
    VondDisposeMeta(&meta);
    uint64_t h = 14695981039346656037ull;
    for (uint32_t i = 0; i < blob.nBufferSize; ++i) {
        const uint8_t byte = (i >= dateAt && i < dateAt + 20) ? 0 : blob.pMeta[i];
        h = (h ^ byte) * 1099511628211ull;
    }
    return h;
}

// Every target (x86-64 and 32-bit ARM) must give these very bytes: the
// digests were recorded on one and are checked on all.
TEST_F(LmcAnalyzePhotoTest, SameBlobOnEveryTarget) {
    Start();
    const std::vector<uint8_t> rgb = Picture(800, 600);
    const LmcImage picture = {rgb.data(), nullptr, 800, 600, 800 * 3, LMC_PIXEL_ORDER_RGB};
    LmcPhotoMeta blob = {0, nullptr};
    ASSERT_EQ(Analyze(&picture, 0, nullptr, &blob), LMC_STATUS_OK);
    EXPECT_EQ(BlobDigest(blob), 12867643542856212331ull);
    LmcDisposePhotoMeta(&blob);

    const oriel_test::Photo photo = oriel_test::Sample(1);
    if (photo.Empty()) GTEST_SKIP() << "sample photos not available";
    const LmcImage faces = {photo.rgb.data(), nullptr, photo.w, photo.h, photo.w * 3, LMC_PIXEL_ORDER_RGB};
    ASSERT_EQ(Analyze(&faces, -1, nullptr, &blob), LMC_STATUS_OK);
    EXPECT_EQ(BlobDigest(blob), 14956371840548736949ull);
    LmcDisposePhotoMeta(&blob);
}

}  // namespace
