// A debug run of subject detection for people to look at: the saliency,
// gradient and segmentation files of the attention engine and the photo with
// its attention areas drawn. The files go to $LUMICOR_ATTENTION_DEBUG_DIR
// when it is set (and are kept), else to a temporary directory.
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

#include <lumicor/calib.h>

#include "calib/src/CALib/ca_interface.h"
#include "calib/src/arrange/va_arrange.h"
#include "calib/src/plane/image_plane.h"
#include "calib/tests/attention_fixtures.h"
#include "common/src/internal/ppm.h"
#include "testkit/temp_dir.h"

namespace {

TEST(AttentionDebugRunTest, WritesMapsAndAnnotatedPhoto) {
    lumicor::test::TempDir temp;
    const char* env = std::getenv("LUMICOR_ATTENTION_DEBUG_DIR");
    const std::string dir = env != nullptr && env[0] != '\0' ? std::string(env) : temp.path();
    const std::string prefix = dir + "/attention";
    const int w = 1024, h = 768;
    std::vector<uint8_t> photo = attention_test::MakePhoto(w, h);

    // The run of CADetectSubject, step by step, with every debug file on.
    CAinterface ca;
    ca.debugOutput = 1;
    ca.param.OutputDebugDump = 1;
    std::snprintf(ca.outputDir, sizeof ca.outputDir, "%s", prefix.c_str());
    ZbmImagePtr source(ZbiuCreateAttatchData(photo.data(), w, h, w * 3, ZBM_PIXEL_ORDER_RGB));
    ZbmImagePtr image640(ca.CreateShrinkImage(source.get(), 640));
    ASSERT_TRUE(image640);
    MIPlane* plane = ca.CreateMIPlane(image640.get());
    ASSERT_NE(plane, nullptr);
    VAArrange list;
    uint32_t detected;
    {
        // Detect writes "param.txt" into the working directory: keep it with the other files.
        lumicor::test::WorkingDirectory in(dir);
        testing::internal::CaptureStdout();
        detected = ca.Detect(plane, nullptr, &list);
        testing::internal::GetCapturedStdout();
    }
    ca.DisposeMIPlane(&plane);
    ASSERT_EQ(detected, 0u);
    ZbmImagePtr image40(ca.CreateShrinkImage(source.get(), 40));
    ASSERT_EQ(ca.ArrangeVa(image40.get(), &list), 0u);

    for (const char* suffix : {"_saliency.pgm", "_salmap.pgm", "_gradient.pgm", "_gradsalmap.pgm", "_gradcolumn.pgm",
                               "_gradline.pgm", "_LabeledBuffer.pgm", "_salrect.csv", "_resize_in_ycbcr.ppm",
                               "_segidx_hist.csv", "_csmap1_1.pgm", "_featuremap1.pgm"}) {
        EXPECT_TRUE(lumicor::test::FileExists(prefix + suffix)) << suffix;
    }
    // The photo with its areas: red frames, brighter for more salient areas.
    ZbmImagePtr annotated(ZbiuCreateFromData(photo.data(), w, h, w * 3, ZBM_PIXEL_ORDER_RGB));
    ASSERT_TRUE(annotated);
    ASSERT_GT(list.num, 0);
    for (int i = 0; i < list.num; ++i) {
        const zbm_Rect r = {list.x[i] * w / image40->width, list.y[i] * h / image40->height,
                            list.width[i] * w / image40->width, list.height[i] * h / image40->height};
        const uint8_t level = static_cast<uint8_t>(list.val[i]);
        ZbiuDrawRectangle(annotated.get(), r, zbm_PackedUchar{{level, 255, 0, 0}}, 4);
        char label[16];
        std::snprintf(label, sizeof label, "%d:%d", i, list.val[i]);
        ZbiuDrawString(annotated.get(), label, zbm_Pos{r.x + 6, r.y + 6}, ZBM_ALIGNMENT_TOP_LEFT,
                       zbm_PackedUchar{{255, 255, 255, 0}});
    }
    const std::string annotatedPath = prefix + "_areas.ppm";
    EXPECT_EQ(zbiuSaveToPpm(annotatedPath.c_str(), annotated.get()), 0);
    EXPECT_TRUE(lumicor::test::FileExists(annotatedPath));
}

}  // namespace
