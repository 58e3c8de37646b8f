// VondOrielAnalyze: the face meta it makes from the face engine's records.
// Cases that need real faces use the face networks' sample photos and skip
// when they are absent; the others use boxes the engine cannot confirm.
#include <gtest/gtest.h>
#include <lumicor/vond.h>

#include <cmath>
#include <cstring>
#include <vector>

#include "oriel/tests/sample_photos.h"
#include "tests/testkit/fault.h"

namespace {

struct Analysis {
    _FaceMeta meta;
    Oriel_ClusterSubject subject = 0x55;
    _VondOrielMetaArray scores = {0, nullptr};
    Analysis() { std::memset(static_cast<void*>(&meta), 0, sizeof meta); }
    ~Analysis() { VondOrielDisposeMeta(meta, scores); }
    _VondResult Run(const oriel_test::Photo& p, uint32_t hostW, uint32_t hostH, int32_t n, const _VondFaceRect* boxes,
                    _zbm_PixelOrder order = ZBM_PIXEL_ORDER_RGB) {
        _zbm_Image img;
        img.pData = const_cast<uint8_t*>(p.rgb.data());
        img.width = p.w;
        img.height = p.h;
        img.pitch = p.w * 3;
        img.order = order;
        img.bytesPerPixel = 3;
        img.ownsData = 0;
        return VondOrielAnalyze(&img, hostW, hostH, n, boxes, 7, 0.0f, 76800, meta, subject, scores);
    }
    const _FaceRegion& Region(uint32_t i) const { return meta.pRegions[i]; }
};

// Packed members are read through a copy before gtest binds them.
template <typename T>
T V(T v) {
    return v;
}

oriel_test::Photo Flat(int w, int h) {
    oriel_test::Photo p;
    p.w = w;
    p.h = h;
    p.rgb.assign(static_cast<size_t>(w) * h * 3, 120);
    return p;
}

TEST(VondOrielAnalyzeTest, NoDetectionRequestedGivesAnEmptyFaceMeta) {
    Analysis a;
    const _VondResult r = a.Run(Flat(64, 48), 4000, 70000, 0, nullptr);
    ASSERT_EQ(r.status, 0u);
    EXPECT_EQ(V(a.meta.faceNum), 0);
    EXPECT_EQ(V(a.meta.regionCount), 0u);
    EXPECT_EQ(V(a.meta.formatVersion), 259);
    EXPECT_EQ(V(a.meta.imageWidth), 4000);
    EXPECT_EQ(V(a.meta.imageHeight), 70000 & 0xFFFF);  // the low 16 bits
    char version[16];
    for (int i = 0; i < 16; ++i) version[i] = a.meta.engineVersion[i];
    EXPECT_STREQ(version, "ORL_100");
    EXPECT_EQ(a.meta.dateTime[0], 0);
    EXPECT_EQ(a.subject, 0u);
    EXPECT_EQ(a.scores.count, 0u);
}

TEST(VondOrielAnalyzeTest, RefusesImagesThatAreNotRgb) {
    Analysis a;
    const _VondResult r = a.Run(Flat(64, 48), 64, 48, -1, nullptr, ZBM_PIXEL_ORDER_BGR);
    EXPECT_EQ(r.status, 1u);
    EXPECT_STREQ(r.message, "invalid pImage->order");
    EXPECT_STREQ(r.function, "VondOrielAnalyze");
}

TEST(VondOrielAnalyzeTest, PhotoWithoutFacesGetsTheNoFaceSubject) {
    Analysis a;
    ASSERT_EQ(a.Run(Flat(160, 120), 1600, 1200, -1, nullptr).status, 0u);
    EXPECT_EQ(a.subject, 0x10001u);
    EXPECT_EQ(V(a.meta.regionCount), 0u);
    EXPECT_EQ(a.meta.dateTime[0], 0);
}

// Forty host boxes below the photo, where the engine can confirm nothing
// and make no vector: every box becomes a region from the host box alone,
// the 32 largest are kept, largest first, and a box that starts left of the
// edge gets x = 0.
TEST(VondOrielAnalyzeTest, KeepsTheThirtyTwoLargestHostBoxes) {
    std::vector<_VondFaceRect> boxes;
    for (int i = 0; i < 40; ++i) {
        const float side = 0.002f * (i + 1);
        boxes.push_back(_VondFaceRect{i == 39 ? -0.01f : 0.02f * (i % 10), 1.2f + 0.2f * (i / 10), side, side});
    }
    Analysis a;
    const _VondResult r = a.Run(Flat(64, 48), 6400, 4800, 40, boxes.data());
    ASSERT_EQ(r.status, 0u) << r.message;
    ASSERT_EQ(V(a.meta.regionCount), 32u);
    EXPECT_EQ(V(a.meta.faceNum), 32);
    ASSERT_EQ(a.scores.count, 32u);
    EXPECT_NE(a.meta.dateTime[0], 0);
    for (uint32_t i = 0; i < 32; ++i) {
        const _FaceRegion& g = a.Region(i);
        const zbm_Rect box = g.faceArea;
        const _VondFaceRect& want = boxes[39 - i];  // largest first
        EXPECT_EQ(box.width, static_cast<int32_t>(6400.0f * want.width)) << i;
        EXPECT_EQ(box.y, static_cast<int32_t>(4800.0f * want.y)) << i;
        const zbm_Pos eye = g.rightEye;
        EXPECT_EQ(eye.x, -1);  // nothing located
        EXPECT_EQ(V(g.partCount), 0u);
        EXPECT_EQ(a.scores.pScores[i].detectionScore, 0.0f);
        EXPECT_EQ(V(g.featureSize), 0u);  // no face of the photo has a vector
    }
    EXPECT_EQ(V(a.Region(0).faceArea).x, 0);  // the box left of the edge
    EXPECT_EQ(V(a.Region(1).faceArea).x, static_cast<int32_t>(6400.0f * boxes[38].x));
}

// Host boxes: a real face, a face-less patch of wall and a box outside the
// photo. The face is confirmed and fully described; the wall keeps its host
// box without eyes; the outside box gets no vector, so its feature is the
// zero-filled "na" one while the face's holds its whole vector.
TEST(VondOrielAnalyzeTest, HostBoxesConfirmedOrNotAndAFaceWithoutVector) {
    const oriel_test::Photo full = oriel_test::Sample(3);
    if (full.Empty()) GTEST_SKIP() << "sample photos absent";
#if defined(__arm__)
    GTEST_SKIP() << "runs whole networks: on the native build";
#endif
    const oriel_test::Photo work = oriel_test::Reduce(full, 640);
    const _VondFaceRect boxes[3] = {
        {1075.0f / 1920, 215.0f / 1350, 221.0f / 1920, 299.0f / 1350},  // the middle face
        {0.02f, 0.05f, 0.08f, 0.12f},                                  // wall, top left
        {1.2f, 0.3f, 0.05f, 0.05f}};                                   // outside
    Analysis a;
    const _VondResult r = a.Run(work, 1920, 1350, 3, boxes);
    ASSERT_EQ(r.status, 0u) << r.message;
    ASSERT_EQ(V(a.meta.regionCount), 3u);
    // Sorted by area: the face, then the wall, then the outside box.
    const _FaceRegion& face = a.Region(0);
    const zbm_Rect fa = face.faceArea;
    EXPECT_NEAR(fa.x, 1075, 40);
    EXPECT_NEAR(fa.width, 221, 45);
    const zbm_Pos re = face.rightEye, le = face.leftEye;
    EXPECT_GT(re.x, fa.x);
    EXPECT_LT(re.x, le.x);  // the person's right eye is on the image left
    EXPECT_EQ(V(face.partCount), 2u);
    ASSERT_NE(V(face.pParts), nullptr);
    EXPECT_EQ(face.pParts[0], 0x25);
    EXPECT_EQ(face.pParts[9], 0x3D);
    float noseY, mouthY;
    std::memcpy(&noseY, face.pParts + 5, 4);
    std::memcpy(&mouthY, face.pParts + 14, 4);
    EXPECT_GT(noseY, static_cast<float>(re.y));
    EXPECT_GT(mouthY, noseY);
    EXPECT_LT(face.ageMin, face.ageMax);
    ASSERT_EQ(V(face.attributeCount), 1u);
    EXPECT_EQ(face.pAttributes[0], 1);  // smile score 0..100
    EXPECT_LE(face.pAttributes[1], 100);
    ASSERT_EQ(V(face.featureSize), 255u);
    EXPECT_STREQ(face.featureType, "PDEC_C2");
    EXPECT_EQ(face.pFeature[0], ORIEL_VECTOR_FORMAT);
    for (uint32_t i = ORIEL_VECTOR_BYTES; i < 255; ++i) ASSERT_EQ(face.pFeature[i], 0) << i;
    EXPECT_GT(a.scores.pScores[0].detectionScore, 0.5f);

    const _FaceRegion& wall = a.Region(1);
    const zbm_Rect wa = wall.faceArea;
    EXPECT_EQ(wa.x, static_cast<int32_t>(1920.0f * boxes[1].x));
    EXPECT_EQ(wa.width, static_cast<int32_t>(1920.0f * boxes[1].width));
    const zbm_Pos we = wall.rightEye;
    EXPECT_EQ(we.x, -1);
    EXPECT_EQ(V(wall.partCount), 0u);
    EXPECT_STREQ(wall.featureType, "PDEC_C2");  // a vector of the patch is still made

    const _FaceRegion& outside = a.Region(2);
    ASSERT_EQ(V(outside.featureSize), 255u);
    EXPECT_STREQ(outside.featureType, "na");
    for (uint32_t i = 0; i < 255; ++i) ASSERT_EQ(outside.pFeature[i], 0) << i;
    // The host's boxes count as faces: two main ones (the outside box is small).
    EXPECT_EQ(a.subject, static_cast<uint32_t>(ORIEL_CLUSTER_SUBJECT_COUPLE));
}

TEST(VondOrielAnalyzeTest, DetectsTheFacesOfASamplePhoto) {
    const oriel_test::Photo full = oriel_test::Sample(5);
    if (full.Empty()) GTEST_SKIP() << "sample photos absent";
#if defined(__arm__)
    GTEST_SKIP() << "whole-photo analysis runs on the native build";
#endif
    const oriel_test::Photo work = oriel_test::Reduce(full, 640);
    Analysis a;
    ASSERT_EQ(a.Run(work, full.w, full.h, -1, nullptr).status, 0u);
    ASSERT_EQ(V(a.meta.regionCount), 5u);
    EXPECT_EQ(a.subject, static_cast<uint32_t>(ORIEL_CLUSTER_SUBJECT_GROUP));
    for (uint32_t i = 0; i < 5; ++i) {
        const _FaceRegion& g = a.Region(i);
        EXPECT_STREQ(g.featureType, "PDEC_C2");
        EXPECT_EQ(V(g.partCount), 2u);
        if (i > 0) {
            const zbm_Rect prev = a.Region(i - 1).faceArea, cur = g.faceArea;
            EXPECT_GE(static_cast<int64_t>(prev.width) * prev.height + 4 * (prev.width + prev.height),
                      static_cast<int64_t>(cur.width) * cur.height);  // largest first (within rounding)
        }
        EXPECT_GT(a.scores.pScores[i].detectionScore, 0.5f);
        EXPECT_GE(a.scores.pScores[i].blurScore, 0.0f);
        EXPECT_LE(a.scores.pScores[i].blurScore, 1.0f);
    }
}

// Every allocation of an analysis with host boxes may fail: the result is
// then a failure and the face meta holds no regions and no scores.
TEST(VondOrielAnalyzeTest, AllocationFailuresLeaveNoRegions) {
#if defined(__arm__)
    GTEST_SKIP() << "allocation-failure sweep runs on the native build";
#endif
    const _VondFaceRect boxes[2] = {{0.1f, 0.1f, 0.3f, 0.4f}, {0.5f, 0.2f, 0.004f, 0.004f}};
    const oriel_test::Photo photo = Flat(96, 72);
    lumicor::test::ForEachAllocationFailure(
        [&] {
            Analysis a;
            const _VondResult r = a.Run(photo, 960, 720, 2, boxes);
            if (r.status == 0) {
                EXPECT_EQ(V(a.meta.regionCount), 2u);
                return;
            }
            EXPECT_TRUE(r.status == 2u || r.status == 3u) << r.status << " " << r.message;
            EXPECT_EQ(V(a.meta.regionCount), 0u);
            EXPECT_EQ(V(a.meta.pRegions), nullptr);
            EXPECT_EQ(a.scores.count, 0u);
            EXPECT_EQ(a.scores.pScores, nullptr);
        },
        [](long, bool) {}, 5000);
}

}  // namespace
