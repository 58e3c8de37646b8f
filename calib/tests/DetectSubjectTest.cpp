// CADetectSubject and its C interface: argument checks, reduced sizes, the
// face path with direction codes, the saliency path on a fixed photo (the
// same areas on every target), allocation failures, the parameter writer.
#include <gtest/gtest.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstring>
#include <string>
#include <vector>

#include <lumicor/calib.h>

#include "calib/src/CALib/ca_interface.h"
#include "calib/src/arrange/va_arrange.h"
#include "calib/src/plane/image_plane.h"
#include "calib/tests/attention_fixtures.h"
#include "testkit/fault.h"
#include "testkit/images.h"
#include "testkit/temp_dir.h"

namespace {

// Areas of MakePhoto(1024, 768): nx ny nw nh (hex floats) and saliency.
const char kRecordedAreas[] =
    "0x1.e66666p-2 0x1.666666p-1 0x1.99999ap-4 0x1.555556p-3 255\n"
    "0x1.99999ap-4 0x1.dddddep-2 0x1.333334p-3 0x1.555556p-3 150\n"
    "0x1.99999ap-3 0x1.aaaaaap-1 0x1.99999ap-5 0x1.99999ap-4 134\n";

const _CAAttentionAreaArray kUntouched = {7, 9, reinterpret_cast<CAAttentionArea*>(0x10)};

bool Untouched(const _CAAttentionAreaArray& a) {
    return a.isFace == kUntouched.isFace && a.numAreas == kUntouched.numAreas && a.pAreaArray == kUntouched.pAreaArray;
}

TEST(DetectSubjectTest, ArgumentChecksRefuseBeforeAnything) {
    std::vector<uint8_t> buf(300 * 300 * 4, 100);
    CAFaceInfo face = {0.1f, 0.1f, 0.2f, 0.2f, 0, 0, 0};
    _CAFaceInfoArray noRecords = {2, nullptr};
    struct Row {
        const uint8_t* pixels;
        uint32_t w, h;
        int32_t stride;
        const _CAFaceInfoArray* faces;
        bool out;
        const char* condition;
    } const rows[] = {
        {nullptr, 300, 300, 900, nullptr, true, "pBuf == NULL"},
        {buf.data(), 239, 300, 900, nullptr, true, "width < MIN_LENGTH"},
        {buf.data(), 300, 239, 900, nullptr, true, "height < MIN_LENGTH"},
        {buf.data(), 300, 300, 899, nullptr, true, "static_cast<unsigned int>(abs(rowstride)) < width * 3"},
        {buf.data(), 300, 300, -899, nullptr, true, "static_cast<unsigned int>(abs(rowstride)) < width * 3"},
        {buf.data(), 300, 300, 900, &noRecords, true,
         "pFaceInfoArray && pFaceInfoArray->numFaces && pFaceInfoArray->pInfoArray == NULL"},
        {buf.data(), 300, 300, 900, nullptr, false, "pAttentionAreaArray == NULL"},
    };
    (void)face;
    for (const Row& r : rows) {
        SCOPED_TRACE(r.condition);
        _CAAttentionAreaArray out = kUntouched;
        testing::internal::CaptureStderr();
        EXPECT_EQ(CADetectSubject(r.pixels, r.w, r.h, r.stride, CA_COLOR_ORDER_RGB, r.faces, r.out ? &out : nullptr), 3u);
        const std::string err = testing::internal::GetCapturedStderr();
        EXPECT_NE(err.find(std::string("CADetectSubject recieved invalid params ( ") + r.condition + " )\n"),
                  std::string::npos)
            << err;
        EXPECT_TRUE(Untouched(out));
    }
}

// Sizes at the limits, every order, and pitches of both signs.
TEST(DetectSubjectTest, AcceptsSmallestPhotoEveryOrderAndBothPitchSigns) {
    struct Row {
        _CAColorOrder order;
        int bytes;
        bool negative;
        uint32_t code;
    } const rows[] = {
        {CA_COLOR_ORDER_RGB, 3, false, 0}, {CA_COLOR_ORDER_BGR, 3, true, 0}, {CA_COLOR_ORDER_RGBA, 4, false, 0},
        {CA_COLOR_ORDER_BGRA, 4, true, 0}, {CA_COLOR_ORDER_ARGB, 4, false, 0},
        {static_cast<_CAColorOrder>(7), 3, false, 2},  // LAB is no host order: no plane conversion
        {static_cast<_CAColorOrder>(5), 4, false, 2},  // ABGR: no host order either
    };
    const int w = 240, h = 240;
    for (const Row& r : rows) {
        SCOPED_TRACE(static_cast<int>(r.order));
        std::vector<uint8_t> buf(static_cast<size_t>(w) * h * r.bytes);
        for (size_t i = 0; i < buf.size(); ++i) buf[i] = static_cast<uint8_t>((i * 7) % 251);
        const int32_t pitch = w * r.bytes;
        const uint8_t* first = r.negative ? buf.data() + static_cast<size_t>(h - 1) * pitch : buf.data();
        _CAAttentionAreaArray out = {0, 0, nullptr};
        testing::internal::CaptureStderr();
        EXPECT_EQ(CADetectSubject(first, w, h, r.negative ? -pitch : pitch, r.order, nullptr, &out), r.code);
        testing::internal::GetCapturedStderr();
        if (r.code == 0) {
            EXPECT_EQ(out.isFace, 0u);
            EXPECT_LE(out.numAreas, 16u);
            EXPECT_NE(out.pAreaArray, nullptr);
        }
        EXPECT_EQ(CADisposeAttentionAreaArray(&out), 0u);
        EXPECT_EQ(out.pAreaArray, nullptr);
    }
}

TEST(DetectSubjectTest, ShrinkSizes) {
    CAinterface ca;
    struct Row {
        int w, h, size, ew, eh;
        bool attached;
    } const rows[] = {
        {4000, 3000, 640, 640, 480, false}, {4000, 3000, 40, 40, 30, false}, {300, 900, 640, 213, 640, false},
        {300, 900, 40, 13, 40, false},      {640, 480, 640, 640, 480, true},  {480, 640, 640, 480, 640, true},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(testing::Message() << r.w << "x" << r.h << " to " << r.size);
        std::vector<uint8_t> px(static_cast<size_t>(r.w) * r.h * 3, 50);
        ZbmImagePtr src(ZbiuCreateAttatchData(px.data(), r.w, r.h, r.w * 3, ZBM_PIXEL_ORDER_RGB));
        ZbmImagePtr small(ca.CreateShrinkImage(src.get(), r.size));
        ASSERT_TRUE(small);
        EXPECT_EQ(small->width, r.ew);
        EXPECT_EQ(small->height, r.eh);
        EXPECT_EQ(small->ownsData == 0, r.attached);
    }
}

// The pair made at once equals the two images made one by one, attached or
// reduced.
TEST(DetectSubjectTest, ShrinkImagesAtOnceEqualOneByOne) {
    CAinterface ca;
    const struct {
        int w, h;
    } sizes[] = {{1283, 961}, {700, 1500}, {640, 480}, {30, 700}};
    for (const auto& s : sizes) {
        SCOPED_TRACE(testing::Message() << s.w << "x" << s.h);
        const std::vector<uint8_t> px = attention_test::MakePhoto(s.w, s.h);
        ZbmImagePtr src(ZbiuCreateAttatchData(const_cast<uint8_t*>(px.data()), s.w, s.h, s.w * 3, ZBM_PIXEL_ORDER_RGB));
        ZbmImagePtr big, small;
        ASSERT_TRUE(ca.CreateShrinkImages(src.get(), 640, 40, &big, &small));
        ZbmImagePtr bigAlone(ca.CreateShrinkImage(src.get(), 640)), smallAlone(ca.CreateShrinkImage(src.get(), 40));
        EXPECT_TRUE(lumicor::test::SameImage(big.get(), bigAlone.get()));
        EXPECT_TRUE(lumicor::test::SameImage(small.get(), smallAlone.get()));
        EXPECT_EQ(big->ownsData, bigAlone->ownsData);
    }
}

TEST(DetectSubjectTest, DirectionCodes) {
    const float pi = 3.14159265f;
    struct Row {
        float roll, pitch, yaw;
        int32_t code;
    } const rows[] = {
        {0, 0.04f, 0.04f, 0},        // r about 0.036, at most 1/18
        {0, 0, 0.5f, 0},             // phi exactly 0
        {0, 0.01f, 0.5f, 1},         // a small pitch leaves sector 1
        {0, 0.5f, 0, 7},             // pitch alone
        {0, -0.5f, 0, 3},
        {0, 0, -0.5f, 5},
        {3.5f, 0, 0.5f, 5},  // phi 3.5 wraps to about -2.78
        {pi / 4, 0, 0.5f, 2},
        {3 * pi / 4 + 0.01f, 0, 0.5f, 4},
        {-3 * pi / 4 + 0.01f, 0, 0.5f, 6},
        {-pi / 4, 0, 0.5f, 8},
        {std::nanf(""), 0, 0.5f, 0},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(testing::Message() << r.roll << " " << r.pitch << " " << r.yaw);
        EXPECT_EQ(CAinterface::DirectionCode(r.roll, r.pitch, r.yaw), r.code);
    }
}

std::vector<CAFaceInfo> Faces(int n) {
    std::vector<CAFaceInfo> f;
    for (int i = 0; i < n; ++i) {
        f.push_back(CAFaceInfo{0.04f * i, 0.02f * i, 0.05f, 0.06f, 0.0f, 0.5f * (i % 2), 0.0f});
    }
    return f;
}

TEST(DetectSubjectTest, FacePathTakesFirstSixteenFacesWithDirections) {
    const std::vector<uint8_t> photo = attention_test::MakePhoto(800, 600);
    std::vector<CAFaceInfo> info = Faces(20);
    _CAFaceInfoArray faces = {20, info.data()};
    _CAAttentionAreaArray out = {0, 0, nullptr};
    ASSERT_EQ(CADetectSubject(photo.data(), 800, 600, 2400, CA_COLOR_ORDER_RGB, &faces, &out), 0u);
    EXPECT_EQ(out.isFace, 1u);
    ASSERT_EQ(out.numAreas, 16u);
    for (uint32_t i = 0; i < out.numAreas; ++i) {
        EXPECT_TRUE(out.pAreaArray[i].val.direction == 0 || out.pAreaArray[i].val.direction == 7) << i;
    }
    // Face 0 at the corner: enlarged by half around its centre, the quarter
    // outside cut off; on the 40 x 30 reference.
    EXPECT_FLOAT_EQ(out.pAreaArray[0].nx, 0.0f);
    EXPECT_FLOAT_EQ(out.pAreaArray[0].ny, 0.0f);
    CADisposeAttentionAreaArray(&out);

    // No faces announced (0, or a null array): the saliency path.
    faces.numFaces = 0;
    ASSERT_EQ(CADetectSubject(photo.data(), 800, 600, 2400, CA_COLOR_ORDER_RGB, &faces, &out), 0u);
    EXPECT_EQ(out.isFace, 0u);
    EXPECT_GT(out.numAreas, 0u);
    CADisposeAttentionAreaArray(&out);

    // A negative count takes the face path with no face: no areas at all.
    faces.numFaces = -3;
    ASSERT_EQ(CADetectSubject(photo.data(), 800, 600, 2400, CA_COLOR_ORDER_RGB, &faces, &out), 0u);
    EXPECT_EQ(out.isFace, 0u);
    EXPECT_EQ(out.numAreas, 0u);
    EXPECT_NE(out.pAreaArray, nullptr);
    CADisposeAttentionAreaArray(&out);
}

TEST(DetectSubjectTest, FaceMaskMarksTheFaceRectangles) {
    CAinterface ca;
    MIPlane plane;
    ASSERT_EQ(plane.iInit(64, 48, 4), 0);
    CAFaceInfo info[2] = {{0.25f, 0.5f, 0.25f, 0.25f, 0, 0, 0}, {-0.1f, -0.1f, 0.2f, 0.2f, 0, 0, 0}};
    _CAFaceInfoArray faces = {2, info};
    VAArrange list;
    ASSERT_EQ(ca.Detect(&plane, &faces, &list), 0u);
    EXPECT_EQ(list.num, 2);
    EXPECT_EQ(list.x[0], 16);
    EXPECT_EQ(list.y[0], 24);
    EXPECT_EQ(list.width[0], 16);
    EXPECT_EQ(list.height[0], 12);
    EXPECT_EQ(list.x[1], -6);  // truncated toward zero
    ASSERT_NE(ca.saliencyMap, nullptr);
    int32_t on = 0;
    for (int y = 0; y < 48; ++y)
        for (int x = 0; x < 64; ++x) on += ZbiuGetConstPointer(ca.saliencyMap, x, y)[0] == 255;
    EXPECT_EQ(on, 16 * 12 + 6 * 5);  // the second face (-6, -4, 12 x 9) clipped to columns 0..5, rows 0..4
}

// The fixed photo gives these areas on every target; the values were
// recorded once and must not drift.
TEST(DetectSubjectTest, FixedPhotoGivesRecordedAreas) {
    const std::vector<uint8_t> photo = attention_test::MakePhoto(1024, 768);
    _CAAttentionAreaArray out = {0, 0, nullptr};
    ASSERT_EQ(CADetectSubject(photo.data(), 1024, 768, 1024 * 3, CA_COLOR_ORDER_RGB, nullptr, &out), 0u);
    std::string got;
    for (uint32_t i = 0; i < out.numAreas; ++i) {
        char line[96];
        std::snprintf(line, sizeof line, "%a %a %a %a %d\n", static_cast<double>(out.pAreaArray[i].nx),
                      static_cast<double>(out.pAreaArray[i].ny), static_cast<double>(out.pAreaArray[i].nw),
                      static_cast<double>(out.pAreaArray[i].nh), out.pAreaArray[i].val.direction);
        got += line;
    }
    CADisposeAttentionAreaArray(&out);
    EXPECT_EQ(got, kRecordedAreas);
}

TEST(DetectSubjectTest, DisposeAndVersion) {
    testing::internal::CaptureStderr();
    EXPECT_EQ(CADisposeAttentionAreaArray(nullptr), 3u);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("] CAAttentionAreaArray is NULL\n"), std::string::npos);
    _CAAttentionAreaArray empty = {1, 5, nullptr};
    EXPECT_EQ(CADisposeAttentionAreaArray(&empty), 0u);
    EXPECT_EQ(empty.isFace, 1u);
    EXPECT_EQ(empty.numAreas, 5u);
    const _CALibVersion v = CAGetLibVersion();
    EXPECT_STREQ(v.text, "1.2.2.1217");
    for (size_t i = std::strlen(v.text); i < sizeof v.text; ++i) EXPECT_EQ(v.text[i], 0);
}

// Each failing allocation gives one of the documented codes, leaves the
// output as it was (or, for the record array, isFace and numAreas written and
// no records), and leaks nothing.
void CheckAllocationFailures(const _CAFaceInfoArray* faces) {
    const std::vector<uint8_t> photo = attention_test::MakePhoto(320, 256);
    _CAAttentionAreaArray out = kUntouched;
    uint32_t status = 0;
    long failures = 0;
    const long total = lumicor::test::ForEachAllocationFailure(
        [&] {
            out = kUntouched;
            testing::internal::CaptureStderr();
            status = CADetectSubject(photo.data(), 320, 256, 960, CA_COLOR_ORDER_RGB, faces, &out);
            testing::internal::GetCapturedStderr();
        },
        [&](long n, bool triggered) {
            if (!triggered) {
                EXPECT_EQ(status, 0u);
                CADisposeAttentionAreaArray(&out);
                return;
            }
            ++failures;
            EXPECT_TRUE(status == 1 || status == 2 || status == 4) << "allocation " << n << " gave " << status;
            if (out.pAreaArray == nullptr && !Untouched(out)) {
                EXPECT_EQ(status, 4u) << "allocation " << n;
            } else {
                EXPECT_TRUE(Untouched(out)) << "allocation " << n;
            }
        });
    EXPECT_GT(total, 10);
    EXPECT_EQ(failures, total);
}

TEST(DetectSubjectTest, AllocationFailuresOnSaliencyPath) { CheckAllocationFailures(nullptr); }

TEST(DetectSubjectTest, AllocationFailuresOnFacePath) {
    std::vector<CAFaceInfo> info = Faces(3);
    _CAFaceInfoArray faces = {3, info.data()};
    CheckAllocationFailures(&faces);
}

TEST(DetectSubjectTest, DebugOutputWritesParameterFileAndSaliency) {
    lumicor::test::TempDir dir;
    lumicor::test::WorkingDirectory in(dir.path());  // "param.txt" goes to the working directory
    CAinterface ca;
    ca.debugOutput = 1;
    std::strcpy(ca.outputDir, "run");
    const std::vector<uint8_t> photo = attention_test::MakePhoto(320, 240);
    std::vector<uint8_t> copy = photo;
    ZbmImagePtr img(ZbiuCreateAttatchData(copy.data(), 320, 240, 960, ZBM_PIXEL_ORDER_RGB));
    MIPlane* plane = ca.CreateMIPlane(img.get());
    ASSERT_NE(plane, nullptr);
    VAArrange list;
    EXPECT_EQ(ca.Detect(plane, nullptr, &list), 0u);
    const std::string text = lumicor::test::ReadFileBytes("param.txt");
    EXPECT_TRUE(lumicor::test::FileExists("run_saliency.pgm"));
    // A directory in the way of the parameter file: code 11.
    ASSERT_EQ(std::remove("param.txt"), 0);
    ASSERT_EQ(mkdir("param.txt", 0700), 0);
    testing::internal::CaptureStderr();
    EXPECT_EQ(ca.Detect(plane, nullptr, &list), 11u);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "No write file: param.txt\n");
    rmdir("param.txt");
    ca.DisposeMIPlane(&plane);

    EXPECT_EQ(text.rfind(std::string(67, '#') + "\n#   Parameter for Visual Attention \n", 0), 0u);
    EXPECT_NE(text.find("\n#" + std::string(66, '=') + "\n# face parameters\n#" + std::string(66, '=') + "\n"),
              std::string::npos);
    EXPECT_NE(text.find("\nFaceScale                 = 0.841000\n"), std::string::npos);
    EXPECT_NE(text.find("\nInputFile                 = in_filename\n"), std::string::npos);
    EXPECT_NE(text.find("\nOutputCSMap               = true\n"), std::string::npos);
    EXPECT_NE(text.find("\nNormReductionFlag         = true\n#="), std::string::npos);  // no blank line after
    EXPECT_NE(text.find("\nEdgeAlgo                  = 2\n#="), std::string::npos);
    EXPECT_NE(text.find("\nSalRectYPos               = 0\n"), std::string::npos);
}

TEST(DetectSubjectTest, ParameterFileCommentsEmptyTexts) {
    ParamMem p;
    p.InputFile[0] = '\0';
    lumicor::test::TempDir dir;
    const std::string path = dir.File("p.txt");
    FILE* fp = std::fopen(path.c_str(), "w");
    ASSERT_NE(fp, nullptr);
    p.vOutputParam(fp);
    std::fclose(fp);
    EXPECT_NE(lumicor::test::ReadFileBytes(path).find("\n# InputFile                 = \n"), std::string::npos);
}

TEST(DetectSubjectTest, ParameterCheckShiftsLevelsAndRefusesBadSets) {
    ParamMem base;
    // As a file gives them: levels counted from 1.
    base.CSCenterLevelFrom = 2;
    base.CSCenterLevelTo = 4;
    base.CSSaliencyMapLevel = 4;
    {
        ParamMem p = base;
        p.NumCSMap = -1;
        p.WeightLearningFlag = 0;
        p.OutputFeatureMap = 0;
        p.ImgFixFlag = 1;
        p.ImgFixWidth = 80;
        p.ImgFixHeight = 60;
        EXPECT_EQ(p.iPrmCheck(), 1);
        EXPECT_EQ(p.NumCSMap, 6);
        EXPECT_EQ(p.CSCenterLevelFrom, 1);
        EXPECT_EQ(p.CSSaliencyMapLevel, 3);
        EXPECT_EQ(p.OutputFeatureMap, 1);
        EXPECT_EQ(p.ImgMaxSize, 80);
    }
    struct Row {
        const char* what;
        void (*change)(ParamMem&);
    } const rows[] = {
        {"taps", [](ParamMem& p) { p.PyramidNumTap = 4; }},
        {"border", [](ParamMem& p) { p.ConvBndHandle = 5; }},
        {"face scale", [](ParamMem& p) { p.FaceScale = 0; }},
        {"mode", [](ParamMem& p) { p.SalRectThreshMode = 4; }},
        {"mode 0 step", [](ParamMem& p) { p.SalRectThreshMode = 0, p.SalRectThreshStep = 0; }},
        {"mode 1", [](ParamMem& p) { p.SalRectThreshMode = 1, p.SalRectThreshLow = 0.6f; }},
        {"local", [](ParamMem& p) { p.SalRectLocalThreshLow = 0.5f; }},
        {"adjacency", [](ParamMem& p) { p.SalRectAdjacentMode = 6; }},
        {"position", [](ParamMem& p) { p.SalRectPosSpecifyFlag = 1, p.SalRectXPos = -1; }},
        {"saliency level", [](ParamMem& p) { p.CSSaliencyMapLevel = 1; }},
    };
    for (const Row& r : rows) {
        ParamMem p = base;
        r.change(p);
        EXPECT_EQ(p.iPrmCheck(), 0) << r.what;
    }
    ParamMem p = base;
    p.SalRectFlag = 0;
    p.SalRectThreshMode = 9;  // not checked without rectangles
    EXPECT_EQ(p.iPrmCheck(), 1);
}

// Threshold mode 0: the list keeps the rectangles of the last threshold of
// the sweep.
TEST(DetectSubjectTest, ThresholdSweepKeepsTheLastRectangles) {
    CAinterface ca;
    ca.param.SalRectThreshMode = 0;
    ca.param.SalRectThreshStart = 0.2f;
    ca.param.SalRectThreshEnd = 0.3f;
    ca.param.SalRectThreshStep = 0.1f;
    std::vector<uint8_t> photo = attention_test::MakePhoto(320, 240);
    ZbmImagePtr img(ZbiuCreateAttatchData(photo.data(), 320, 240, 960, ZBM_PIXEL_ORDER_RGB));
    MIPlane* plane = ca.CreateMIPlane(img.get());
    ASSERT_NE(plane, nullptr);
    VAArrange list;
    EXPECT_EQ(ca.Detect(plane, nullptr, &list), 0u);
    ca.DisposeMIPlane(&plane);
    EXPECT_GT(list.num, 0);
    for (int i = 0; i < list.num; ++i) EXPECT_GE(list.val[i], 77) << i;  // ceil(0.3 x 255)
}

}  // namespace
