// The pixel-difference tree detector: mirror indices, weak learners, tree
// descent, the PD30 format, the built-in dictionary, overlap handling,
// stabilisation and the scan of whole images.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "oriel/src/pixdif/pixdif_data.h"
#include "oriel/src/pixdif/pixdif_detector.h"
#include "oriel/tests/pixdif_fixtures.h"
#include "testkit/fault.h"
#include "testkit/temp_dir.h"

namespace {

using namespace orielcore_VA;
using pixdif_test::Dictionary;
using pixdif_test::El;

std::vector<uint8_t> Window(uint8_t fill = 100) { return std::vector<uint8_t>(400, fill); }

TEST(PixDifTest, MirrorIndices) {
    EXPECT_EQ(MirrorIndex(0, 20), 19);
    EXPECT_EQ(MirrorIndex(45, 20), 54);   // (5, 2) -> (14, 2)
    EXPECT_EQ(MirrorIndexMS(173, 20), 221);  // level 1 at (3, 2) -> block starting at x = 15
    EXPECT_EQ(MirrorIndexMS(0, 20), 76);     // level 0 at (0, 0) -> (19, 0)
    EXPECT_EQ(MirrorIndexMS(3, 20), 51);     // level 3 at (0, 0) -> block starting at x = 12
}

TEST(PixDifTest, WeakLearnerScoresByHand) {
    std::vector<uint8_t> w = Window();
    w[5] = 150;  // d(5, 6) = 50
    w[7] = 90;   // d(7, 6) = -10
    const PixDifElement el[3] = {El(5, 6, 10, 3, 0, 20, -100), El(7, 6, 7, 11, -20, -5, -100),
                                 El(6, 5, 1000, 1000, 0, 0, -100)};
    const PixDifWL_2Th_Reject learner(el);
    // 0 + (10 + 3) + (7 + 0) + (0 + 0) = 20, plus offset 5.
    EXPECT_EQ(learner.EvalPixDif(3, 5, w.data(), 0), 25);
    EXPECT_EQ(learner.EvalPixDif(1, 0, w.data(), 100), 113);
    // A running score below an element's threshold rejects at once.
    const PixDifElement reject[2] = {El(5, 6, 10, 3, 0, 20, 14), El(5, 6, 1, 1, 0, 0, 0)};
    EXPECT_EQ(PixDifWL_2Th_Reject(reject).EvalPixDif(2, 0, w.data(), 0), kPixDifRejected);
    EXPECT_EQ(PixDifWL_2Th_Reject(reject).EvalPixDif(2, 0, w.data(), 1), 16);  // 1 + 13 = 14 is not below 14
}

TEST(PixDifTest, MirroredLearnerReadsTheMirroredPixels) {
    Dictionary d(20, false);
    d.AddMirrorOff(1, -1, {1}, {0}, false, {El(0, 1, 10, 0, 0, 0, -100)}, 0);
    d.AddMirrorOn(2, 0, {}, {}, true, 0, 0);
    const PixDifTreeData* data = d.Data();
    ASSERT_TRUE(PixDifTreeData_Validate(data));
    std::vector<uint8_t> w = Window();
    w[19] = 200;  // the mirror of pixel 0
    EXPECT_EQ(data->learners[0].learner->EvalPixDif(1, 0, w.data(), 0), 0);
    EXPECT_EQ(data->learners[1].learner->EvalPixDif(1, 0, w.data(), 0), 10);
}

// Root (label 1) with two leaf children scored from the root's score:
// child A reads pixel pair (1, 0), child B pair (2, 0).
Dictionary TwoLeaves(int32_t marginA, int32_t marginB, bool restartB = false) {
    Dictionary d(20, false);
    d.Add(1, -1, {1, 2}, {marginA, marginB}, false, {El(0, 0, 0, 0, 0, 0, -1000)}, 7);
    d.Add(2, 0, {}, {}, false, {El(1, 0, 30, 0, 0, 0, -1000)}, 0);
    d.Add(3, 0, {}, {}, restartB, {El(2, 0, 20, 0, 0, 0, -1000)}, 0);
    return d;
}

TEST(PixDifTest, TreeDescentWithMargins) {
    std::vector<uint8_t> w = Window();
    w[1] = 120;
    w[2] = 120;  // A: 7 + 30 = 37, B: 7 + 20 = 27
    struct Row {
        int32_t marginA, marginB;
        bool restartB;
        int32_t score, label;
    } const rows[] = {
        {0, 0, false, 37, 2},          // only the best child survives a zero margin
        {20, 0, false, kPixDifRejected, -1},  // A within its margin, B behind: both dropped
        {20, -20, false, 27, 3},       // A beats B by 10 < 20: A is dropped; B trails by 10, within 20
        {-100, -100, false, 27, 3},    // both survive; the lowest-scoring candidate is taken first
        {0, 0, true, 37, 2},           // B restarts from 0: 20
        {100, 100, false, kPixDifRejected, -1},  // neither beats the other by its margin
    };
    for (const Row& r : rows) {
        Dictionary d = TwoLeaves(r.marginA, r.marginB, r.restartB);
        PixDifTreeDetector det;
        ASSERT_TRUE(det.AttachData(d.Data()));
        int32_t score, label;
        EXPECT_EQ(det.EvalPixDifTree(w.data(), &score, &label), r.label != -1) << r.marginA;
        EXPECT_EQ(score, r.score) << r.marginA;
        EXPECT_EQ(label, r.label) << r.marginA;
    }
    // A rejected root rejects the window.
    Dictionary d(20, false);
    d.Add(1, -1, {}, {}, false, {El(0, 0, 0, 0, 0, 0, 1)}, 0);
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AttachData(d.Data()));
    int32_t score, label;
    EXPECT_FALSE(det.EvalPixDifTree(w.data(), &score, &label));
    EXPECT_EQ(score, kPixDifRejected);
    EXPECT_EQ(label, -1);
    EXPECT_EQ(det.GetEndThreshold(0), 1);
    EXPECT_EQ(det.Label2NodeID(1), 0);
    EXPECT_EQ(det.Label2NodeID(2), -1);
}

// Pose labels: 15 head directions times 5 rolls; other labels (they come
// from dictionary files) have no angles.
TEST(PixDifTest, PoseLabelAngles) {
    const float deg = 3.1415927f / 180.0f;
    struct Case {
        int32_t label;
        float roll, pitch, yaw;
    };
    const Case cases[] = {
        {1, 0, 0, 0},
        {2, 0, 0, 47.5f * 0.763f * deg},
        {5, 0, 55 * 1.75f * deg, 0},
        {16, 20 * deg, 0, 0},
        {75, -40 * deg, 55 * 1.75f * deg, -77.5f * deg},
        {0, 0, 0, 0},
        {76, 0, 0, 0},
        {-1, 0, 0, 0},
        {INT32_MIN, 0, 0, 0},
        {INT32_MAX, 0, 0, 0},
    };
    for (const Case& c : cases) {
        float r = 1, p = 1, y = 1;
        Label2FaceAngle4HeadDirectionCalc(c.label, &r, &p, &y);
        EXPECT_FLOAT_EQ(r, c.roll) << c.label;
        EXPECT_FLOAT_EQ(p, c.pitch) << c.label;
        EXPECT_FLOAT_EQ(y, c.yaw) << c.label;
    }
}

TEST(PixDifTest, ValidationRefusesBrokenTrees) {
    struct Row {
        const char* what;
        void (*build)(Dictionary&);
    } const rows[] = {
        {"child listed twice", [](Dictionary& d) {
             d.Add(1, -1, {1, 1}, {0, 0}, false, {El(0, 0, 0, 0, 0, 0, 0)}, 0);
             d.Add(2, 0, {}, {}, false, {El(0, 0, 0, 0, 0, 0, 0)}, 0);
         }},
        {"child with another parent", [](Dictionary& d) {
             d.Add(1, -1, {1}, {0}, false, {El(0, 0, 0, 0, 0, 0, 0)}, 0);
             d.Add(2, 5, {}, {}, false, {El(0, 0, 0, 0, 0, 0, 0)}, 0);
         }},
        {"pixel outside the window", [](Dictionary& d) { d.Add(1, -1, {}, {}, false, {El(400, 0, 0, 0, 0, 0, 0)}, 0); }},
        {"root is a child", [](Dictionary& d) {
             d.Add(1, -1, {0}, {0}, false, {El(0, 0, 0, 0, 0, 0, 0)}, 0);
         }},
    };
    for (const Row& r : rows) {
        Dictionary d(20, false);
        r.build(d);
        EXPECT_FALSE(PixDifTreeData_Validate(d.Data())) << r.what;
        PixDifTreeDetector det;
        EXPECT_FALSE(det.AttachData(d.Data())) << r.what;
    }
    // A multi-scale 8 x 8 block must fit: level 3 at (12, 0) in a 20-wide window is the last one.
    Dictionary ok(20, true);
    ok.Add(1, -1, {}, {}, false, {El(4 * 12 + 3, 0, 0, 0, 0, 0, 0)}, 0);
    EXPECT_TRUE(PixDifTreeData_Validate(ok.Data()));
    Dictionary bad(20, true);
    bad.Add(1, -1, {}, {}, false, {El(4 * 13 + 3, 0, 0, 0, 0, 0, 0)}, 0);
    EXPECT_FALSE(PixDifTreeData_Validate(bad.Data()));
}

std::vector<uint8_t> Serialise(const PixDifTreeData* data) {
    std::vector<uint8_t> bytes(PixDifTreeData_SerializedSize(data));
    EXPECT_FALSE(bytes.empty());
    EXPECT_TRUE(PixDifTreeData_Save(data, bytes.data(), static_cast<uint32_t>(bytes.size())));
    return bytes;
}

TEST(PixDifTest, Pd30FileRoundTrip) {
    Dictionary d(20, true, 8192, 1234);
    d.Add(1, -1, {1, 2}, {5, -6}, false, {El(4, 8, 1, 2, 3, 4, -50), El(12, 0, -5, 6, -7, 8, -60)}, -11);
    d.AddMirrorOff(16, 0, {}, {}, true, {El(173, 9, 10, -20, 30, -40, -70)}, 22);
    d.AddMirrorOn(31, 0, {}, {}, true, 1, 33);
    const std::vector<uint8_t> bytes = Serialise(d.Data());
    lumicor::test::TempDir dir;
    const std::string path = dir.Write("dict.pd3", std::string(bytes.begin(), bytes.end()));
    PixDifTreeData* loaded = PixDifTreeData_LoadFromFile(path.c_str());
    ASSERT_NE(loaded, nullptr);
    EXPECT_EQ(loaded->numNodes, 3);
    EXPECT_EQ(loaded->scoreScale, 8192);
    EXPECT_EQ(loaded->defaultBias, 1234);
    EXPECT_EQ(loaded->multiScale, 1);
    EXPECT_EQ(loaded->nodes[0].margins[1], -6);
    EXPECT_EQ(loaded->nodes[2].restart, 1);
    EXPECT_EQ(loaded->learners[2].mirrorOf, 2);
    const auto* mirrored = static_cast<const PixDifWL_2Th_Reject_MirrorOff*>(loaded->learners[1].learner);
    EXPECT_EQ(mirrored->elements[0].mp1, 221);  // computed while reading
    EXPECT_EQ(mirrored->elements[0].a, 10);
    EXPECT_EQ(mirrored->elements[0].t2, -40);
    EXPECT_EQ(Serialise(loaded), bytes);
    PixDifTreeData_Delete(loaded);

    PixDifTreeDetector det;
    ASSERT_TRUE(det.LoadData(path.c_str()));
    EXPECT_EQ(det.bias(), 1234);
}

TEST(PixDifTest, Pd30FilesThatAreRefused) {
    lumicor::test::TempDir dir;
    Dictionary d(20, false);
    pixdif_test::BrightCentre(d);
    std::vector<uint8_t> bytes = Serialise(d.Data());
    struct Row {
        const char* name;
        std::string content;
        const char* message;
    } rows[] = {
        {"magic.pd3", "PD31" + std::string(bytes.begin() + 4, bytes.end()), "wrong dictionary version.\n"},
        {"short.pd3", std::string(bytes.begin(), bytes.end() - 1), "failed.\n"},
        {"type.pd3", std::string(bytes.begin(), bytes.end()), "failed.\n"},
    };
    rows[2].content[20 + 24 + 0] = 9;  // the learner's type: 9 is none of 8, 11, 12
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AttachData(d.Data()));
    for (const Row& r : rows) {
        const std::string path = dir.Write(r.name, r.content);
        testing::internal::CaptureStderr();
        EXPECT_FALSE(det.LoadData(path.c_str())) << r.name;
        EXPECT_EQ(testing::internal::GetCapturedStderr(),
                  "PixDifTreeData::LoadFromFile(" + path + ") " + r.message);
        EXPECT_EQ(det.data(), d.Data());  // the old dictionary stays
    }
    testing::internal::CaptureStderr();
    EXPECT_EQ(PixDifTreeData_LoadFromFile(dir.File("none").c_str()), nullptr);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("failed.\n"), std::string::npos);
    // Every allocation of the reader may fail; nothing leaks.
    lumicor::test::ForEachAllocationFailure(
        [&] {
            PixDifLoadStatus status;
            PixDifTreeData* p = PixDifTreeData_LoadFromMemory(bytes.data(), static_cast<uint32_t>(bytes.size()), &status);
            EXPECT_EQ(p == nullptr, status == PixDifLoadStatus::kOutOfMemory);
            PixDifTreeData_Delete(p);
        },
        [](long, bool) {});
}

TEST(PixDifTest, BuiltInDictionary) {
    const PixDifTreeData* d = PixDifTreeData_MV09_M2R_X5();
    ASSERT_TRUE(PixDifTreeData_Validate(d));
    EXPECT_EQ(d->numNodes, 22);
    EXPECT_EQ(d->scoreScale, 8192);
    EXPECT_EQ(d->defaultBias, 45056);
    EXPECT_EQ(d->multiScale, 1);
    const int32_t labels[22] = {1, 1, 2, 3, 1, 16, 31, 2, 17, 32, 3, 18, 33, 1, 16, 31, 2, 17, 32, 3, 18, 33};
    const int32_t parents[22] = {-1, 0, 0, 0, 1, 1, 1, 2, 2, 2, 3, 3, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12};
    const int32_t elements[22] = {64,   64,   64,   64,   64,   64,   64,   64,   64,   64,   64,
                                  64,   64,   1828, 1777, 1777, 1547, 1463, 1547, 1547, 1547, 1463};
    const int32_t offsets[22] = {-22725,  -19903,  -43774,  -37547,  -41854,  -35169,  -51666,  -58277,
                                 -71705,  -34144,  -58735,  -41030,  -32457,  -134364, -152948, -152948,
                                 -112008, -129730, -127913, -112008, -127913, -129730};
    const int32_t types[22] = {8, 8, 8, 8, 8, 8, 8, 8, 8, 8, 8, 8, 8, 8, 11, 12, 11, 11, 11, 12, 12, 12};
    for (int i = 0; i < 22; ++i) {
        SCOPED_TRACE(i);
        EXPECT_EQ(d->nodes[i].label, labels[i]);
        EXPECT_EQ(d->nodes[i].parent, parents[i]);
        EXPECT_EQ(d->nodes[i].restart, i >= 13 ? 1 : 0);
        EXPECT_EQ(d->nodes[i].numChildren, i == 0 || (i >= 1 && i <= 3) ? 3 : (i < 13 ? 1 : 0));
        for (int k = 0; k < d->nodes[i].numChildren; ++k) EXPECT_EQ(d->nodes[i].margins[k], 0);
        EXPECT_EQ(d->learners[i].numElements, elements[i]);
        EXPECT_EQ(d->learners[i].scoreOffset, offsets[i]);
        EXPECT_EQ(d->learners[i].type, types[i]);
        EXPECT_EQ(d->learners[i].windowWidth, 20);
    }
    // Mirrored leaves: 15 of 14, 19 of 16, 20 of 18, 21 of 17.
    EXPECT_EQ(d->learners[15].mirrorOf, 15);
    EXPECT_EQ(d->learners[19].mirrorOf, 17);
    EXPECT_EQ(d->learners[20].mirrorOf, 19);
    EXPECT_EQ(d->learners[21].mirrorOf, 18);
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AttachData(d));
    EXPECT_EQ(det.bias(), 45056);
    det.SetEndThresholdBias(3.0f);
    EXPECT_EQ(det.bias(), 24576);
    // Untrained tables: every window is rejected.
    std::vector<uint8_t> img(64 * 48);
    for (size_t i = 0; i < img.size(); ++i) img[i] = static_cast<uint8_t>(i * 37 % 256);
    ASSERT_TRUE(det.AllocateMemory(64, 48, 20, 1024));
    SPooledList list;
    det.CreateEmptyResultHolder(&list);
    EXPECT_EQ(det.EvalPixDifTreeMultiLayer(img.data(), 64, 48, 64, 1.0f, 0.841f, 0.0f, &list), 0);
}

FaceDetectionResult Box(float x, float y, float w, int32_t score) {
    FaceDetectionResult r{};
    r.x = x, r.y = y, r.width = w, r.height = w;
    r.maxScore = r.meanScore = score;
    r.count = 1;
    r.label = 1;
    return r;
}

TEST(PixDifTest, OverlapRemovalAndMerging) {
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AllocateMemory(32, 32, 20, 8));
    SPooledList list;
    det.CreateEmptyResultHolder(&list);
    list.PushBack(Box(0.0f, 0.0f, 0.2f, 10));
    list.PushBack(Box(0.1f, 0.0f, 0.2f, 30));  // half of either box: removed under the better one
    list.PushBack(Box(0.5f, 0.5f, 0.2f, 20));
    list.PushBack(Box(0.26f, 0.0f, 0.2f, 5));  // 20 % of the best: stays
    det.RemoveOverlap(&list);
    ASSERT_EQ(list.Size(), 3);
    EXPECT_EQ(list.Begin()->result.maxScore, 30);
    EXPECT_EQ(list.Begin()->next->result.maxScore, 20);
    EXPECT_EQ(list.Begin()->next->next->result.maxScore, 5);

    SPooledList hits;
    det.CreateEmptyResultHolder(&hits);
    hits.PushBack(Box(0.12f, 0.0f, 0.2f, 50));
    hits.PushBack(Box(0.12f, 0.0f, 0.5f, 90));  // not of a similar size
    FaceDetectionResult r = Box(0.1f, 0.0f, 0.2f, 30);
    det.MergeOverlap(&r, &hits);
    EXPECT_EQ(r.count, 2);
    EXPECT_EQ(r.meanScore, 40);
    EXPECT_EQ(r.maxScore, 50);
    EXPECT_FLOAT_EQ(r.x, (50 * 0.12f + 30 * 0.1f) / 80);
    // The pool is shared: 8 nodes, 5 in use.
    int pushed = 0;
    while (hits.PushBack(Box(0, 0, 0.1f, 1)) != nullptr) ++pushed;
    EXPECT_EQ(pushed, 3);
    list.Clear();
    hits.Clear();
}

// A dark image with bright squares; the test dictionary accepts every window
// whose centre is bright and corner dark.
std::vector<uint8_t> Squares(int w, int h) {
    std::vector<uint8_t> img(static_cast<size_t>(w) * h, 20);
    for (int y = 30; y < 40; ++y)
        for (int x = 40; x < 50; ++x) img[y * w + x] = 230;
    return img;
}

TEST(PixDifTest, ScanAndStabilisation) {
    Dictionary d(20, false);
    pixdif_test::BrightCentre(d);
    const std::vector<uint8_t> img = Squares(100, 80);
    struct Row {
        int mode;
        int expected;
    } const rows[] = {
        // Hits at (30, 20) and (38, 28) overlap by 36 % of a box: both stay.
        {STABILIZE_NONE, 2},
        // Both merged with the raw hits; no second removal.
        {STABILIZE_MERGE_RESULT, 2},
        // The local search pulls both onto the same hits; the second removal keeps one.
        {STABILIZE_LOCAL_SEARCH_MERGE, 1},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(r.mode);
        PixDifTreeDetector det;
        ASSERT_TRUE(det.AttachData(d.Data()));
        ASSERT_TRUE(det.AllocateMemory(100, 80, 20, 1024));
        det.stabilize = r.mode;
        SPooledList list;
        det.CreateEmptyResultHolder(&list);
        ASSERT_EQ(det.EvalPixDifTreeMultiLayer(img.data(), 100, 80, 100, 1.0f, 0.841f, 0.0f, &list), r.expected);
        const FaceDetectionResult& f = list.Begin()->result;
        EXPECT_EQ(f.label, 1);
        // The box's centre lies on the square (40..49 x 30..39), give or take a pixel.
        EXPECT_NEAR((f.x + f.width / 2) * 100, 44.5f, 6.0f);
        EXPECT_NEAR((f.y + f.height / 2) * 80, 34.5f, 6.0f);
        EXPECT_GE(f.count, 1);
        if (r.mode == STABILIZE_MERGE_RESULT) {
            EXPECT_GT(f.count, 1);
        }
        list.Clear();
    }
    // Nothing to scan below one window.
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AttachData(d.Data()));
    ASSERT_TRUE(det.AllocateMemory(19, 19, 20, 16));
    SPooledList list;
    det.CreateEmptyResultHolder(&list);
    EXPECT_EQ(det.EvalPixDifTreeMultiLayer(img.data(), 19, 19, 100, 1.0f, 0.841f, 0.0f, &list), 0);
    // A step that never leaves the first scale is refused.
    EXPECT_EQ(det.EvalPixDifTreeMultiLayer(img.data(), 19, 19, 100, 1.0f, 1.0f, 0.0f, &list), 0);
}

TEST(PixDifTest, MultiScaleWindowsSeeBlockMeans) {
    // Accept when the 8 x 8 mean at (6, 6) exceeds the pixel at (0, 0) by 50:
    // level 3 at index 4 * (6 * 20 + 6) + 3.
    Dictionary d(20, true);
    d.Add(1, -1, {}, {}, false, {El(4 * 126 + 3, 0, 100, 0, 50, 0, 50)}, 0);
    PixDifTreeDetector det;
    ASSERT_TRUE(det.AttachData(d.Data()));
    ASSERT_TRUE(det.AllocateMemory(100, 80, 20, 1024));
    det.stabilize = STABILIZE_NONE;
    const std::vector<uint8_t> img = Squares(100, 80);
    SPooledList list;
    det.CreateEmptyResultHolder(&list);
    ASSERT_GE(det.EvalPixDifTreeMultiLayer(img.data(), 100, 80, 100, 1.0f, 0.841f, 0.0f, &list), 1);
    const FaceDetectionResult& f = list.Begin()->result;
    // The block (x + 6 .. x + 13) overlaps the square (40..49) enough.
    EXPECT_NEAR(f.x * 100 + 6, 40, 8);
    list.Clear();
}

TEST(PixDifTest, AllocationFailures) {
    PixDifTreeDetector det;
    EXPECT_FALSE(det.AllocateMemory(0, 10, 20, 10));
    lumicor::test::ForEachAllocationFailure(
        [&] {
            PixDifTreeDetector d2;
            const bool ok = d2.AllocateMemory(640, 480, 20, 1024);
            SPooledList list;
            d2.CreateEmptyResultHolder(&list);
            EXPECT_EQ(list.PushBack(Box(0, 0, 1, 1)) != nullptr, ok);
        },
        [](long, bool) {});
}

}  // namespace
