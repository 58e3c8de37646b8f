// CMapSegmentIndex and CMapLabeling: thresholds of every mode, survival at
// the second threshold, ranking, merging labels, the block filter.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "calib/src/CALib/param_va.h"
#include "calib/src/segmentation/map_segment_index.h"

namespace {

// A map from rows of characters: '.' 0, digits d -> 25 d, '#' 255.
struct Map {
    int w = 0, h = 0;
    std::vector<uint8_t> px;
    explicit Map(const std::vector<std::string>& rows) {
        h = static_cast<int>(rows.size());
        w = static_cast<int>(rows[0].size());
        for (const std::string& r : rows) {
            for (char c : r) px.push_back(c == '.' ? 0 : c == '#' ? 255 : static_cast<uint8_t>(25 * (c - '0')));
        }
    }
};

ParamMem Mode1(float low, float high) {
    ParamMem p;
    p.SalRectThreshMode = 1;
    p.SalRectThreshLow = low;
    p.SalRectThreshHigh = high;
    p.SalRectLocalThreshFlag = 0;
    return p;
}

std::vector<tagVA_RECT> Segment(const ParamMem& p, const Map& m, int32_t expectStatus = 0) {
    CMapSegmentIndex seg;
    EXPECT_EQ(seg.Initialize(m.w, m.h, m.w, &p), 0);
    EXPECT_EQ(seg.Indexing(m.px.data(), m.w, m.h, m.w), expectStatus);
    tagVA_RECT* rects = nullptr;
    int32_t count = -1;
    seg.GetSegmentIndex(&rects, &count);
    if (count < 1) {
        EXPECT_EQ(rects, nullptr);
        return {};
    }
    return std::vector<tagVA_RECT>(rects, rects + count);
}

TEST(SegmentationTest, NothingAboveTheFirstThreshold) {
    const Map m({"111", "222", "111"});
    EXPECT_TRUE(Segment(Mode1(0.5f, 0.5f), m).empty());
}

TEST(SegmentationTest, RegionNeedsMoreThanMinAreaPixelsAtTheSecondThreshold) {
    ParamMem p = Mode1(0.1f, 0.9f);  // T1 26, T2 230
    // Left region: three pixels of 255; right region: two.
    const Map m({"##.....#", "#......#", "........"});
    const std::vector<tagVA_RECT> r = Segment(p, m);
    ASSERT_EQ(r.size(), 1u);
    EXPECT_EQ(r[0].x, 0);
    EXPECT_EQ(r[0].width, 2);
    EXPECT_EQ(r[0].height, 2);
    EXPECT_EQ(r[0].value, 255);
}

TEST(SegmentationTest, EqualKeysRankInRasterOrderAndKeysFollowTheSortMode) {
    const Map m({"....9999", "99......", "99..5555", "....5555"});
    ParamMem p = Mode1(0.1f, 0.1f);
    p.SalRectMinArea = 0;
    struct Row {
        int mode;
        int firstX, firstY, firstValue;
    } const rows[] = {
        {0, 4, 0, 225},  // max 225 twice: the region met first in raster order wins
        {1, 4, 0, 225},  // mean: same
        {2, 4, 2, 1000},  // sum: 8 x 125
        {3, 4, 2, 8},     // size
    };
    for (const Row& row : rows) {
        p.SalRectSortMode = row.mode;
        const std::vector<tagVA_RECT> r = Segment(p, m);
        ASSERT_EQ(r.size(), 3u) << row.mode;
        EXPECT_EQ(r[0].x, row.firstX) << row.mode;
        EXPECT_EQ(r[0].y, row.firstY) << row.mode;
        EXPECT_EQ(r[0].value, row.firstValue) << row.mode;
    }
    p.SalRectSortMode = 0;
    const std::vector<tagVA_RECT> r = Segment(p, m);
    EXPECT_EQ(r[1].x, 0);  // the second 225 region, then the 125 region
    EXPECT_EQ(r[1].y, 1);
    EXPECT_EQ(r[2].value, 125);
}

TEST(SegmentationTest, UShapedRegionEndsWithTheSmallerLabel) {
    ParamVA p = Mode1(0.5f, 0.5f);
    p.SalRectAdjacentMode = 4;
    CMapLabeling lab;
    ASSERT_EQ(lab.Initialize(5, 4, 5, &p), 0);
    const Map m({"#.#.#", "#.#.#", "###.#", "....#"});
    ASSERT_EQ(lab.Labeling(m.px.data(), 128, 5, 4, 5), 0);
    const int32_t* l = lab.GetLabelBuffer();
    EXPECT_EQ(lab.GetLabelCount(), 3);  // merges do not give labels back
    for (int i : {0, 2, 5, 7, 10, 11, 12}) EXPECT_EQ(l[i], 0) << i;
    for (int i : {4, 9, 14, 19}) EXPECT_EQ(l[i], 2) << i;
    EXPECT_EQ(l[1], -1);
    // With 8-adjacency the diagonal joins too.
    ParamMem p8 = Mode1(0.5f, 0.5f);
    CMapLabeling lab8;
    ASSERT_EQ(lab8.Initialize(3, 2, 3, &p8), 0);
    const Map d({"#..", ".#."});
    ASSERT_EQ(lab8.Labeling(d.px.data(), 128, 3, 2, 3), 0);
    EXPECT_EQ(lab8.GetLabelBuffer()[4], 0);
}

TEST(SegmentationTest, BlockFilterUsesEachBlocksMean) {
    ParamMem p = Mode1(0.5f, 0.5f);
    p.SalRectAvgFilterStep = 2;
    CMapLabeling lab;
    ASSERT_EQ(lab.Initialize(5, 3, 5, &p), 0);
    // Blocks: (0..1, 0..1) mean 127 -> off; (2..3, 0..1) mean 191 -> on;
    // right remainder (4, 0..1) 255 -> on; bottom row blocks of one row.
    const Map m({"#.##.", "..#.#", "##..#"});
    ASSERT_EQ(lab.Labeling(m.px.data(), 128, 5, 3, 5), 0);
    const uint8_t* fg = lab.GetForeground();
    const uint8_t expected[15] = {0, 0, 1, 1, 0, 0, 0, 1, 1, 0, 1, 1, 0, 0, 1};
    for (int i = 0; i < 15; ++i) EXPECT_EQ(fg[i], expected[i]) << i;
    EXPECT_EQ(lab.Labeling(m.px.data(), 128, 1, 3, 5), static_cast<int32_t>(VA_LABELING_ERR_CALL));  // narrower than a block
}

TEST(SegmentationTest, ThresholdsOfEachMode) {
    // Mode 0 with 0.5: ceil(127.5) = 128 for both.
    {
        ParamMem p;
        p.SalRectThreshMode = 0;
        const Map m({"#."});
        CMapSegmentIndex seg;
        ASSERT_EQ(seg.Initialize(2, 1, 2, &p), 0);
        ASSERT_EQ(seg.Indexing(0.5f, m.px.data(), 2, 1, 2), 0);
        EXPECT_EQ(seg.Threshold1(), 128);
        EXPECT_EQ(seg.Threshold2(), 128);
    }
    // Mode 2: T1 from the top 12 % of 100 pixels, T2 248 with fewer than 18
    // non-empty bins.
    {
        ParamMem p;
        std::vector<std::string> rows(10, std::string(10, '.'));
        rows[0] = "##########";
        rows[1] = "##########";
        const Map m(rows);
        CMapSegmentIndex seg;
        ASSERT_EQ(seg.Initialize(10, 10, 10, &p), 0);
        ASSERT_EQ(seg.Indexing(m.px.data(), 10, 10, 10), 0);
        // 20 pixels in bin 99: inv[0] = 20 >= 12, j = 0: ceil(0.97 * 255) = 248.
        EXPECT_EQ(seg.Threshold1(), 248);
        EXPECT_EQ(seg.Threshold2(), 248);
    }
    // Mode 2 with a ramp: every bin filled; T2 at the 18th non-empty bin
    // from the top (j = 17): ceil(0.80 * 255) = 204.
    {
        ParamMem p;
        Map m({"."});
        m.w = 256;
        m.h = 1;
        m.px.resize(256);
        for (int i = 0; i < 256; ++i) m.px[i] = static_cast<uint8_t>(i);
        CMapSegmentIndex seg;
        ASSERT_EQ(seg.Initialize(256, 1, 256, &p), 0);
        ASSERT_EQ(seg.Indexing(m.px.data(), 256, 1, 256), 0);
        EXPECT_EQ(seg.Threshold2(), 204);
        // floor(256 x 0.12) = 30 pixels from the top are reached at j = 11:
        // ceil(0.86 x 255) = 220.
        EXPECT_EQ(seg.Threshold1(), 220);
    }
    // Mode 3 with HistTop2 0: j = 0 always, T2 = 248.
    {
        ParamMem p;
        p.SalRectThreshMode = 3;
        const Map m({"5.#"});
        CMapSegmentIndex seg;
        ASSERT_EQ(seg.Initialize(3, 1, 3, &p), 0);
        ASSERT_EQ(seg.Indexing(m.px.data(), 3, 1, 3), 0);
        EXPECT_EQ(seg.Threshold2(), 248);
    }
}

TEST(SegmentationTest, LocalThresholdSplitsARegion) {
    // Two bright peaks joined by a weak bridge: one region at T1, split in
    // two by the local threshold (85 for a region whose maximum reaches 102).
    ParamMem p = Mode1(0.05f, 0.9f);  // T1 13, T2 230
    p.SalRectLocalThreshFlag = 1;
    const Map m({"##11##", "##11##", "......"});
    const std::vector<tagVA_RECT> r = Segment(p, m);
    ASSERT_EQ(r.size(), 2u);
    EXPECT_EQ(r[0].x, 0);
    EXPECT_EQ(r[0].width, 2);
    EXPECT_EQ(r[1].x, 4);
    EXPECT_EQ(r[1].width, 2);
}

TEST(SegmentationTest, RefusesCallsBeyondItsSizes) {
    ParamMem p;
    CMapSegmentIndex seg;
    EXPECT_EQ(seg.Initialize(4, 4, 3, &p), static_cast<int32_t>(VA_SEGIDX_ERR_INIT));
    EXPECT_EQ(seg.Initialize(4, 4, 4, nullptr), static_cast<int32_t>(VA_SEGIDX_ERR_INIT));
    ASSERT_EQ(seg.Initialize(4, 4, 4, &p), 0);
    std::vector<uint8_t> map(25, 0);
    EXPECT_EQ(seg.Indexing(map.data(), 5, 4, 5), static_cast<int32_t>(VA_SEGIDX_ERR_CALL));
    EXPECT_EQ(seg.Indexing(map.data(), 4, 4, 3), static_cast<int32_t>(VA_SEGIDX_ERR_CALL));
}

}  // namespace
