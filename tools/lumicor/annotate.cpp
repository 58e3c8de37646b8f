#include "annotate.h"

#include "meta_json.h"

#include <algorithm>
#include <cmath>
#include <string>

namespace lumicor_tool {

namespace {

const zbm_PackedUchar kFaceColor = {{255, 40, 40, 0}};
const zbm_PackedUchar kEyeColor = {{255, 230, 0, 0}};
const zbm_PackedUchar kAreaColor = {{40, 120, 255, 0}};
const zbm_PackedUchar kFaceAreaColor = {{0, 220, 220, 0}};
const zbm_PackedUchar kFingerColor = {{255, 0, 255, 0}};
const zbm_PackedUchar kTextColor = {{255, 255, 255, 0}};
const zbm_PackedUchar kShadow = {{0, 0, 0, 0}};

// Text with a dark rim, readable on any background, drawn `scale` times the
// size of the built-in font (single line, top-left at pos).
void Label(_zbm_Image* image, const std::string& text, zbm_Pos pos, int scale, zbm_PackedUchar color) {
    const int w = ZBIU_FONT_ADVANCE * static_cast<int>(text.size()) + 1, h = ZBIU_FONT_LINE_HEIGHT + 1;
    // Drawn at the font's size on a key colour, then copied up pixel by pixel.
    const zbm_PackedUchar kKey = {{1, 2, 3, 0}};
    ZbmImagePtr small(ZbiuCreate(w + 1, h + 1, ZBM_PIXEL_ORDER_RGB, kKey));
    if (!small) return;
    for (int dy = 0; dy <= 2; ++dy)
        for (int dx = 0; dx <= 2; ++dx)
            if (dx != 1 || dy != 1) ZbiuDrawString(small.get(), text.c_str(), {dx, dy}, ZBM_ALIGNMENT_TOP_LEFT, kShadow);
    ZbiuDrawString(small.get(), text.c_str(), {1, 1}, ZBM_ALIGNMENT_TOP_LEFT, color);
    for (int y = 0; y < small->height; ++y) {
        for (int x = 0; x < small->width; ++x) {
            const zbm_PackedUchar p = ZbiuGetPixel(small.get(), x, y);
            if (p.v[0] == kKey.v[0] && p.v[1] == kKey.v[1] && p.v[2] == kKey.v[2]) continue;
            for (int sy = 0; sy < scale; ++sy)
                for (int sx = 0; sx < scale; ++sx) ZbiuSetPixel(image, pos.x + x * scale + sx, pos.y + y * scale + sy, p);
        }
    }
}

// A line `width` pixels thick (square pen).
void ThickLine(_zbm_Image* image, zbm_Pos a, zbm_Pos b, int width, zbm_PackedUchar color) {
    const int lo = -(width - 1) / 2, hi = width / 2;
    for (int dy = lo; dy <= hi; ++dy)
        for (int dx = lo; dx <= hi; ++dx) ZbiuDrawLine(image, {a.x + dx, a.y + dy}, {b.x + dx, b.y + dy}, color);
}

int Scale(double v, double factor) { return static_cast<int>(std::lround(v * factor)); }

}  // namespace

ZbmImagePtr Annotate(const _zbm_Image* photo, const _VondMeta& meta) {
    if (photo == nullptr || photo->order != ZBM_PIXEL_ORDER_RGB) return ZbmImagePtr();
    const int W = photo->width, H = photo->height;
    const double factor = std::min(1.0, static_cast<double>(kAnnotateMaxSide) / std::max(W, H));
    const int w = std::max(1, Scale(W, factor)), h = std::max(1, Scale(H, factor));
    ZbmImagePtr out(ZbiuCreate(w, h, ZBM_PIXEL_ORDER_RGB));
    if (!out || ZbiuResize(photo, out.get()) != 0) return ZbmImagePtr();
    _zbm_Image* image = out.get();
    const int pen = std::max(1, std::min(w, h) / 300);
    const int textScale = std::max(1, std::min(w, h) / 500);

    // Attention areas first, so that face boxes stay on top.
    const _CAAttentionAreaArray& areas = meta.attentionAreas;
    for (uint32_t i = 0; areas.pAreaArray != nullptr && i < areas.numAreas; ++i) {
        const CAAttentionArea& a = areas.pAreaArray[i];
        const zbm_Rect r = {Scale(a.nx, w), Scale(a.ny, h), Scale(a.nw, w), Scale(a.nh, h)};
        const zbm_PackedUchar color = areas.isFace != 0 ? kFaceAreaColor : kAreaColor;
        ZbiuDrawRectangle(image, r, color, pen);
        const std::string text = areas.isFace != 0 ? "dir " + std::to_string(a.val.direction)
                                                   : "sal " + std::to_string(a.val.saliency);
        Label(image, "#" + std::to_string(i + 1) + " " + text, {r.x + pen + 2, r.y + pen + 2}, textScale, color);
    }

    // Face boxes are in photo pixels.
    const double fx = static_cast<double>(w) / W, fy = static_cast<double>(h) / H;
    const _FaceMeta& faces = meta.faceMeta;
    const uint32_t faceCount = faces.regionCount;
    for (uint32_t i = 0; faces.pRegions != nullptr && i < faceCount; ++i) {
        const FaceView f = ViewFace(faces.pRegions[i]);
        const zbm_Rect r = {Scale(f.box.x, fx), Scale(f.box.y, fy), Scale(f.box.width, fx), Scale(f.box.height, fy)};
        ZbiuDrawRectangle(image, r, kFaceColor, pen);
        const int eyeRadius = std::max(2, pen + 1);
        for (const zbm_Pos& eye : {f.rightEye, f.leftEye})
            if (eye.x >= 0 && eye.y >= 0) ZbiuDrawDot(image, {Scale(eye.x, fx), Scale(eye.y, fy)}, eyeRadius, kEyeColor);
        std::string text = "face " + std::to_string(i + 1);
        if (f.ageMin != 255 && f.ageMax != 255)
            text += " age " + std::to_string(f.ageMin) + "-" + std::to_string(f.ageMax);
        if (f.smile >= 0) text += " smile " + std::to_string(f.smile);
        Label(image, text, {r.x, r.y + r.height + pen + 2}, textScale, kFaceColor);
    }

    // Finger outlines are in the pixels of the quality analysis' small copy.
    const _KtMetaRepresentative& repm = meta.representative;
    if (repm.analyzedWidth > 0 && repm.analyzedHeight > 0) {
        const double gx = static_cast<double>(w) / repm.analyzedWidth, gy = static_cast<double>(h) / repm.analyzedHeight;
        for (uint32_t i = 0; repm.pFingers != nullptr && i < repm.numFinger; ++i) {
            const _KtFinger& finger = repm.pFingers[i];
            if (finger.pPoints == nullptr || finger.numPoint == 0) continue;
            for (uint32_t p = 0; p < finger.numPoint; ++p) {
                const _KtFingerPoint& a = finger.pPoints[p];
                const _KtFingerPoint& b = finger.pPoints[(p + 1) % finger.numPoint];
                ThickLine(image, {Scale(a.x, gx), Scale(a.y, gy)}, {Scale(b.x, gx), Scale(b.y, gy)}, pen, kFingerColor);
            }
        }
    }

    const std::string summary = std::to_string(faceCount) + " faces, " + std::to_string(areas.numAreas) +
                                (areas.isFace != 0 ? " face areas, " : " salient areas, ") +
                                std::to_string(repm.numFinger) + " fingers";
    Label(image, summary, {3, h - 3 - (ZBIU_FONT_LINE_HEIGHT + 2) * textScale}, textScale, kTextColor);
    return out;
}

}  // namespace lumicor_tool
