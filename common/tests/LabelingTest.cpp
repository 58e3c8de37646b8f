#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include <algorithm>
#include <string>
#include <vector>

#include "testkit/images.h"

namespace {

// '#' is 255, anything else 0.
ZbmImagePtr Mask(const std::vector<std::string>& rows) {
    ZbmImagePtr image(ZbiuCreate(static_cast<int32_t>(rows[0].size()), static_cast<int32_t>(rows.size()),
                                 ZBM_PIXEL_ORDER_GRAY));
    for (size_t y = 0; y < rows.size(); ++y)
        for (size_t x = 0; x < rows[y].size(); ++x)
            if (rows[y][x] == '#') ZbiuSetPixel(image.get(), int32_t(x), int32_t(y), lumicor::test::Pixel(255));
    return image;
}

// Labels as text: '.' for 0, else the digit.
std::vector<std::string> Label(const std::vector<std::string>& rows, int32_t* count) {
    ZbmImagePtr image = Mask(rows);
    std::vector<int32_t> labels(rows.size() * rows[0].size(), -1);
    EXPECT_EQ(ZbiuLabeling(image.get(), labels.data(), count), ZBIU_OK);
    std::vector<std::string> out(rows.size(), std::string(rows[0].size(), '.'));
    for (size_t y = 0; y < rows.size(); ++y)
        for (size_t x = 0; x < rows[0].size(); ++x) {
            const int32_t l = labels[y * rows[0].size() + x];
            if (l != 0) out[y][x] = static_cast<char>('0' + l);
        }
    return out;
}

TEST(LabelingTest, ComponentsAreNumberedByTheirFirstPixel) {
    const struct {
        std::vector<std::string> mask, labels;
        int32_t count;
    } cases[] = {
        // A U opens two provisional labels that meet at the bottom.
        {{"#...#", "#...#", "#####"}, {"1...1", "1...1", "11111"}, 1},
        // Diagonal neighbours are separate under 4-adjacency.
        {{"#.#", ".#.", "#.#"}, {"1.2", ".3.", "4.5"}, 5},
        // Two arms joined below count as one; the region found later is 2.
        {{"..#..#", "..#..#", "#.####", "#....."}, {"..1..1", "..1..1", "2.1111", "2....."}, 2},
        // Label 3 meets 1 on the left and later 2 on the right: all one
        // region, so the second meeting must not undo the first.
        {{"#......#", "#.####.#", "###..###"}, {"1......1", "1.1111.1", "111..111"}, 1},
        {{"....", "...."}, {"....", "...."}, 0},
    };
    for (const auto& c : cases) {
        int32_t count = -1;
        EXPECT_EQ(Label(c.mask, &count), c.labels);
        EXPECT_EQ(count, c.count);
    }
}

TEST(LabelingTest, TooManyProvisionalLabelsIsAnError) {
    // Isolated pixels on every other row and column: one label each.
    for (const int32_t rows : {200, 201}) {
        ZbmImagePtr image(ZbiuCreate(200, rows, ZBM_PIXEL_ORDER_GRAY));
        for (int32_t y = 0; y < rows; y += 2)
            for (int32_t x = 0; x < 200; x += 2) ZbiuSetPixel(image.get(), x, y, lumicor::test::Pixel(1));
        std::vector<int32_t> labels(200 * rows, -1);
        int32_t count = -1;
        const int status = ZbiuLabeling(image.get(), labels.data(), &count);
        if (rows == 200) {  // exactly 10,000 labels
            EXPECT_EQ(status, ZBIU_OK);
            EXPECT_EQ(count, 10000);
            EXPECT_EQ(labels[198 * 200 + 198], 10000);
        } else {
            EXPECT_EQ(status, ZBIU_ERR_UNSUPPORTED_VALUE);
            EXPECT_EQ(count, 0);
            EXPECT_EQ(std::count(labels.begin(), labels.end(), 0), static_cast<long>(labels.size()));
        }
    }
}

TEST(LabelingTest, RefusesInvalidInput) {
    ZbmImagePtr rgb(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB)), gray(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_GRAY));
    int32_t labels[4], count;
    EXPECT_EQ(ZbiuLabeling(rgb.get(), labels, &count), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuLabeling(gray.get(), nullptr, &count), ZBIU_ERR_INVALID_ARGUMENT);
    EXPECT_EQ(ZbiuLabeling(gray.get(), labels, nullptr), ZBIU_ERR_INVALID_ARGUMENT);
}

std::vector<std::pair<int, int>> Contour(const std::vector<std::string>& rows) {
    ZbmImagePtr image = Mask(rows);
    zbmvector<zbm_Pos> points;
    EXPECT_EQ(ZbiuGetContour(image.get(), points), ZBIU_OK);
    std::vector<std::pair<int, int>> out;
    for (const zbm_Pos& p : points) out.emplace_back(p.x, p.y);
    points.Clear();
    return out;
}

TEST(LabelingTest, ContourFollowsTheFirstRegionClockwise) {
    typedef std::vector<std::pair<int, int>> Path;
    EXPECT_EQ(Contour({"....", ".##.", ".##.", "...."}), (Path{{1, 1}, {2, 1}, {2, 2}, {1, 2}}));
    EXPECT_EQ(Contour({"...", ".#.", "..."}), (Path{{1, 1}}));
    EXPECT_EQ(Contour({"##"}), (Path{{0, 0}, {1, 0}}));
    // A one-pixel-wide diagonal is walked there and back.
    EXPECT_EQ(Contour({"#..", ".#.", "..#"}), (Path{{0, 0}, {1, 1}, {2, 2}, {1, 1}}));
    // Only the region holding the first set pixel; the hole is not traced.
    EXPECT_EQ(Contour({"###..#", "#.#...", "###..."}),
              (Path{{0, 0}, {1, 0}, {2, 0}, {2, 1}, {2, 2}, {1, 2}, {0, 2}, {0, 1}}));
    EXPECT_TRUE(Contour({"...", "..."}).empty());

    ZbmImagePtr rgb(ZbiuCreate(2, 2, ZBM_PIXEL_ORDER_RGB));
    zbmvector<zbm_Pos> points;
    EXPECT_EQ(ZbiuGetContour(rgb.get(), points), ZBIU_ERR_INVALID_ARGUMENT);
}

}  // namespace
