// The built-in multi-view dictionary MV09_M2R_X5: a 22-node pose tree over a
// 20 x 20 multi-scale window (root, three pose groups, nine pose nodes, nine
// leaves; the right-looking leaves mirror the learners of their left-looking
// partners).
//
// The element tables are not trained yet: every element table below rejects
// every window at its first element, so the detector finds no face with this
// dictionary. Trained tables replace kRejectAll and kRejectAllMirror without
// changing the tree, the element counts, the offsets, the score scale or the
// bias.
#include "oriel/src/pixdif/pixdif_data.h"

namespace orielcore_VA {

namespace {

constexpr int32_t kLargestPlain = 1828;
constexpr int32_t kLargestMirrored = 1777;

struct PlainTable {
    PixDifElement e[kLargestPlain];
};
struct MirrorTable {
    PixDifMirrorElement e[kLargestMirrored];
};

// Pixel (0, 0) against itself with zero weights: the score stays at its
// start, and a start of 0 (the root, and every restarting leaf) is below the
// rejection threshold 1.
constexpr PlainTable MakeRejectAll() {
    PlainTable t{};
    for (int32_t i = 0; i < kLargestPlain; ++i) t.e[i] = PixDifElement{0, 0, 0, 0, 0, 0, 1};
    return t;
}
constexpr MirrorTable MakeRejectAllMirror() {
    MirrorTable t{};
    // Pixel (0, 0), level 0, mirrors onto pixel (19, 0): 4 * 19 = 76.
    for (int32_t i = 0; i < kLargestMirrored; ++i) t.e[i] = PixDifMirrorElement{0, 0, 76, 76, 0, 0, 0, 0, 1};
    return t;
}

constexpr PlainTable kRejectAll = MakeRejectAll();
constexpr MirrorTable kRejectAllMirror = MakeRejectAllMirror();

const int32_t kChildren0[] = {1, 2, 3};
const int32_t kChildren1[] = {4, 5, 6};
const int32_t kChildren2[] = {7, 8, 9};
const int32_t kChildren3[] = {10, 11, 12};
const int32_t kChild[] = {13, 14, 15, 16, 17, 18, 19, 20, 21};
const int32_t kZeroMargins[] = {0, 0, 0};

constexpr int32_t kNodes = 22;

}  // namespace

const PixDifTreeData* PixDifTreeData_MV09_M2R_X5() {
    static const PixDifWL_2Th_Reject plain(kRejectAll.e);
    static const PixDifWL_2Th_Reject_MirrorOff mirror14(kRejectAllMirror.e);
    static const PixDifWL_2Th_Reject_MirrorOff mirror16(kRejectAllMirror.e);
    static const PixDifWL_2Th_Reject_MirrorOff mirror17(kRejectAllMirror.e);
    static const PixDifWL_2Th_Reject_MirrorOff mirror18(kRejectAllMirror.e);
    static const PixDifWL_2Th_Reject_MirrorOn mirrored15(&mirror14);
    static const PixDifWL_2Th_Reject_MirrorOn mirrored19(&mirror16);
    static const PixDifWL_2Th_Reject_MirrorOn mirrored20(&mirror18);
    static const PixDifWL_2Th_Reject_MirrorOn mirrored21(&mirror17);

    // id, label, parent, child count, children, margins, restart
    static const PixDifTreeNode nodes[kNodes] = {
        {0, 1, -1, 3, kChildren0, kZeroMargins, 0},
        {1, 1, 0, 3, kChildren1, kZeroMargins, 0},
        {2, 2, 0, 3, kChildren2, kZeroMargins, 0},
        {3, 3, 0, 3, kChildren3, kZeroMargins, 0},
        {4, 1, 1, 1, kChild + 0, kZeroMargins, 0},
        {5, 16, 1, 1, kChild + 1, kZeroMargins, 0},
        {6, 31, 1, 1, kChild + 2, kZeroMargins, 0},
        {7, 2, 2, 1, kChild + 3, kZeroMargins, 0},
        {8, 17, 2, 1, kChild + 4, kZeroMargins, 0},
        {9, 32, 2, 1, kChild + 5, kZeroMargins, 0},
        {10, 3, 3, 1, kChild + 6, kZeroMargins, 0},
        {11, 18, 3, 1, kChild + 7, kZeroMargins, 0},
        {12, 33, 3, 1, kChild + 8, kZeroMargins, 0},
        {13, 1, 4, 0, nullptr, nullptr, 1},
        {14, 16, 5, 0, nullptr, nullptr, 1},
        {15, 31, 6, 0, nullptr, nullptr, 1},
        {16, 2, 7, 0, nullptr, nullptr, 1},
        {17, 17, 8, 0, nullptr, nullptr, 1},
        {18, 32, 9, 0, nullptr, nullptr, 1},
        {19, 3, 10, 0, nullptr, nullptr, 1},
        {20, 18, 11, 0, nullptr, nullptr, 1},
        {21, 33, 12, 0, nullptr, nullptr, 1},
    };
    // type, window height, window width, elements, learner, score offset, mirrored learner
    static const PixDifLearnerDesc learners[kNodes] = {
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -22725, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -19903, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -43774, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -37547, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -41854, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -35169, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -51666, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -58277, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -71705, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -34144, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -58735, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -41030, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 64, &plain, -32457, 0},
        {PIXDIF_WL_2TH_REJECT, 20, 20, 1828, &plain, -134364, 0},
        {PIXDIF_WL_2TH_REJECT_MIRROR_OFF, 20, 20, 1777, &mirror14, -152948, 0},
        {PIXDIF_WL_2TH_REJECT_MIRROR_ON, 20, 20, 1777, &mirrored15, -152948, 15},
        {PIXDIF_WL_2TH_REJECT_MIRROR_OFF, 20, 20, 1547, &mirror16, -112008, 0},
        {PIXDIF_WL_2TH_REJECT_MIRROR_OFF, 20, 20, 1463, &mirror17, -129730, 0},
        {PIXDIF_WL_2TH_REJECT_MIRROR_OFF, 20, 20, 1547, &mirror18, -127913, 0},
        {PIXDIF_WL_2TH_REJECT_MIRROR_ON, 20, 20, 1547, &mirrored19, -112008, 17},
        {PIXDIF_WL_2TH_REJECT_MIRROR_ON, 20, 20, 1547, &mirrored20, -127913, 19},
        {PIXDIF_WL_2TH_REJECT_MIRROR_ON, 20, 20, 1463, &mirrored21, -129730, 18},
    };
    static const PixDifTreeData data = {kNodes, nodes, learners, 8192, 45056, 1};
    return &data;
}

}  // namespace orielcore_VA
