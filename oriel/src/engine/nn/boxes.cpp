#include "oriel/src/engine/nn/boxes.h"

#include <algorithm>
#include <cmath>

#include "common/src/internal/portable_math.h"

namespace oriel {
namespace nn {

size_t SsdAnchorCount(const int* gridH, const int* gridW, int maps) {
    size_t n = 0;
    for (int m = 0; m < maps; ++m) n += static_cast<size_t>(gridH[m]) * gridW[m] * (m == 0 ? 3 : 6);
    return n;
}

void SsdAnchors(const int* gridH, const int* gridW, int maps, int inW, int inH, float* out) {
    // The detector was trained on 512 x 512 inputs: anchor sizes and cell
    // spacing are kept in those pixels whatever the input size, so that a
    // face of a given pixel size meets the anchors it was trained with.
    const double minScale = 0.2, maxScale = 0.95, trainedSide = 512.0;
    size_t k = 0;
    double stride = 16.0;
    for (int m = 0; m < maps; ++m, stride *= 2.0) {
        const double s = minScale + (maxScale - minScale) * m / (maps - 1);
        const double sNext = m + 1 < maps ? minScale + (maxScale - minScale) * (m + 1) / (maps - 1) : 1.0;
        double boxes[6][2];  // height, width (fractions of the trained side)
        int nb = 0;
        if (m == 0) {
            const double spec[3][2] = {{0.1, 1.0}, {s, 2.0}, {s, 0.5}};
            for (int i = 0; i < 3; ++i) {
                const double r = std::sqrt(spec[i][1]);
                boxes[nb][0] = spec[i][0] / r;
                boxes[nb][1] = spec[i][0] * r;
                ++nb;
            }
        } else {
            const double ratios[5] = {1.0, 2.0, 0.5, 3.0, 1.0 / 3.0};
            for (int i = 0; i < 5; ++i) {
                const double r = std::sqrt(ratios[i]);
                boxes[nb][0] = s / r;
                boxes[nb][1] = s * r;
                ++nb;
                if (i == 0) {
                    const double si = std::sqrt(s * sNext);
                    boxes[nb][0] = si;
                    boxes[nb][1] = si;
                    ++nb;
                }
            }
        }
        // Cell spacing: the map's stride in pixels, or the map's share of
        // the input when the map is smaller than the stride suggests.
        const double sy = gridH[m] * stride >= inH ? stride : static_cast<double>(inH) / gridH[m];
        const double sx = gridW[m] * stride >= inW ? stride : static_cast<double>(inW) / gridW[m];
        for (int y = 0; y < gridH[m]; ++y) {
            const double cy = (y + 0.5) * sy / inH;
            for (int x = 0; x < gridW[m]; ++x) {
                const double cx = (x + 0.5) * sx / inW;
                for (int b = 0; b < nb; ++b) {
                    const double h = boxes[b][0] * trainedSide / inH, w = boxes[b][1] * trainedSide / inW;
                    out[k++] = static_cast<float>(cy - h / 2);
                    out[k++] = static_cast<float>(cx - w / 2);
                    out[k++] = static_cast<float>(cy + h / 2);
                    out[k++] = static_cast<float>(cx + w / 2);
                }
            }
        }
    }
}

Box SsdDecode(const float* anchor, const float* enc) {
    const float ah = anchor[2] - anchor[0];
    const float aw = anchor[3] - anchor[1];
    const float cy = anchor[0] + ah / 2.0f;
    const float cx = anchor[1] + aw / 2.0f;
    const float hh = lmk::ExpF(enc[2] / 5.0f) * ah / 2.0f;
    const float hw = lmk::ExpF(enc[3] / 5.0f) * aw / 2.0f;
    const float y = enc[0] / 10.0f * ah + cy;
    const float x = enc[1] / 10.0f * aw + cx;
    Box b;
    b.ymin = y - hh;
    b.xmin = x - hw;
    b.ymax = y + hh;
    b.xmax = x + hw;
    return b;
}

float Sigmoid(float x) { return 1.0f / (1.0f + lmk::ExpF(-x)); }

float IoU(const Box& a, const Box& b) {
    const float ay0 = std::min(a.ymin, a.ymax), ay1 = std::max(a.ymin, a.ymax);
    const float ax0 = std::min(a.xmin, a.xmax), ax1 = std::max(a.xmin, a.xmax);
    const float by0 = std::min(b.ymin, b.ymax), by1 = std::max(b.ymin, b.ymax);
    const float bx0 = std::min(b.xmin, b.xmax), bx1 = std::max(b.xmin, b.xmax);
    const float areaA = (ay1 - ay0) * (ax1 - ax0);
    const float areaB = (by1 - by0) * (bx1 - bx0);
    if (areaA <= 0.0f || areaB <= 0.0f) return 0.0f;
    const float ih = std::max(std::min(ay1, by1) - std::max(ay0, by0), 0.0f);
    const float iw = std::max(std::min(ax1, bx1) - std::max(ax0, bx0), 0.0f);
    const float inter = ih * iw;
    return inter / (areaA + areaB - inter);
}

size_t NonMaxSuppression(Candidate* c, size_t n, float iouThreshold, size_t maxOut) {
    std::stable_sort(c, c + n, [](const Candidate& a, const Candidate& b) { return a.score > b.score; });
    size_t kept = 0;
    for (size_t i = 0; i < n && kept < maxOut; ++i) {
        bool keep = true;
        for (size_t j = 0; j < kept; ++j) {
            if (IoU(c[i].box, c[j].box) > iouThreshold) {
                keep = false;
                break;
            }
        }
        if (keep) c[kept++] = c[i];
    }
    return kept;
}

}  // namespace nn
}  // namespace oriel
