#include "oriel/src/engine/face_engine.h"

#include <cmath>
#include <cstdlib>
#include <cstring>

#include <lumicor/zbm_image.h>

#include "common/src/internal/memory.h"
#include "common/src/internal/portable_math.h"

namespace oriel {

namespace {

const size_t kMaxPerCrop = 100;   // detections kept per detector run
const size_t kMaxDetections = 256;
const int kLocalInput = 192;      // detector input side of the local search
const int kVerifyInput = 160;     // detector input side of the second look
const size_t kMaxVerify = 4;      // second looks per detection call

float Clamp(float v, float lo, float hi) { return v < lo ? lo : (v > hi ? hi : v); }

// Region of the photo under a box given in pixels: clipped to the photo
// and truncated to whole pixels (the crop the face networks were trained
// with). Empty when nothing of the box lies inside.
nn::Crop ClipBox(double x, double y, double w, double h, int imgW, int imgH) {
    nn::Crop c;
    const double cx = x > 0 ? x : 0, cy = y > 0 ? y : 0;
    double cw = (x + w) - cx, ch = (y + h) - cy;
    if (cw > imgW - cx) cw = imgW - cx;
    if (ch > imgH - cy) ch = imgH - cy;
    c.x = static_cast<int>(std::floor(cx));
    c.y = static_cast<int>(std::floor(cy));
    c.w = static_cast<int>(std::floor(cw));
    c.h = static_cast<int>(std::floor(ch));
    if (c.w <= 0 || c.h <= 0 || c.x >= imgW || c.y >= imgH) c.w = c.h = 0;
    if (c.x + c.w > imgW) c.w = imgW - c.x;
    if (c.y + c.h > imgH) c.h = imgH - c.y;
    return c;
}

void Mean(const Landmarks& lm, int from, int to, float* x, float* y) {
    float sx = 0.0f, sy = 0.0f;
    for (int i = from; i < to; ++i) {
        sx += lm.x[i];
        sy += lm.y[i];
    }
    *x = sx / static_cast<float>(to - from);
    *y = sy / static_cast<float>(to - from);
}

// Crop of the expression and age networks: the landmarks' bounding box
// grown by 20 %.
nn::Crop LandmarkCrop(const Landmarks& lm, int imgW, int imgH) {
    float x0 = lm.x[0], x1 = lm.x[0], y0 = lm.y[0], y1 = lm.y[0];
    for (int i = 1; i < ORIEL_ALL_PARTS; ++i) {
        x0 = std::fmin(x0, lm.x[i]);
        x1 = std::fmax(x1, lm.x[i]);
        y0 = std::fmin(y0, lm.y[i]);
        y1 = std::fmax(y1, lm.y[i]);
    }
    const double w = x1 - x0, h = y1 - y0;
    return ClipBox(x0 - w * 0.1, y0 - h * 0.1, w * 1.2, h * 1.2, imgW, imgH);
}

// Crop of the recognition network from the eye centres and the mouth
// centre: a square of side (mean eye-to-mouth distance) / 0.45 placed so
// that the three points' centroid sits at (0.5, 0.43) of it.
nn::Crop AlignedCrop(float ex1, float ey1, float ex2, float ey2, float mx, float my, int imgW, int imgH) {
    const float d1 = std::sqrt((mx - ex1) * (mx - ex1) + (my - ey1) * (my - ey1));
    const float d2 = std::sqrt((mx - ex2) * (mx - ex2) + (my - ey2) * (my - ey2));
    const double size = std::floor(((d1 + d2) / 2.0f) / 0.45f);
    const float cx = (ex1 + ex2 + mx) / 3.0f, cy = (ey1 + ey2 + my) / 3.0f;
    const double x = std::floor(std::fmax(0.0, cx - 0.5 * size));
    const double y = std::floor(std::fmax(0.0, cy - 0.43 * size));
    return ClipBox(x, y, size, size, imgW, imgH);
}

}  // namespace

void ResetAreaInfo(Oriel_areaInfo* f) {
    std::memset(f, 0, sizeof *f);
    f->rightEyeX = f->rightEyeY = f->leftEyeX = f->leftEyeY = -1.0f;
    f->part1X = f->part1Y = f->part2X = f->part2Y = -1.0f;
    f->attribute1 = -1.0;
    f->attribute2 = -1.0;
    f->ageMin = f->ageMax = 255;
    f->male = 255;
}

FaceEngine::FaceEngine() : loaded_(false) {
    std::memset(&config_, 0, sizeof config_);
    config_.workPixels = 76800;
    config_.scoreThreshold = 0.5f;
    config_.minFacePercent = 2;
    config_.localScales = 2;
    config_.maxFaces = 64;
    config_.nmsPercent = 50;
    config_.dictionaryMode = ORIEL_D_MODE_PARTS | ORIEL_D_MODE_ATTRIBUTES | ORIEL_D_MODE_RECOGNITION;
    SetLayers(nullptr, 0);
}

bool FaceEngine::Load() {
    const uint8_t* data = nullptr;
    uint32_t size = 0;
    loaded_ = nn::WeightBlob::Embedded(&data, &size) && blob_.Open(data, size) && ssd_.Load(blob_) &&
              tiny_.Load(blob_) && landmarks_.Load(blob_, "lm68") && landmarks_.Outputs() == 2 * ORIEL_ALL_PARTS &&
              expressions_.Load(blob_, "expr") && expressions_.Outputs() == 7 && age_.Load(blob_) &&
              recognition_.Load(blob_);
    return loaded_;
}

void FaceEngine::SetLayers(const Oriel_engineConfigLayer* layers, uint32_t count) {
    if (count == 0) {
        for (uint32_t i = 0; i < ORIEL_NET_COUNT; ++i) {
            layers_[i].network = i;
            layers_[i].enabled = 1;
        }
        return;
    }
    for (uint32_t i = 0; i < count; ++i)
        if (layers[i].network < ORIEL_NET_COUNT) layers_[layers[i].network].enabled = layers[i].enabled ? 1 : 0;
}

float FaceEngine::VerifyFloor() const { return ScoreThreshold() * 0.3f; }

float FaceEngine::ScoreThreshold() const {
    const float t = config_.scoreThreshold;
    return (t > 0.0f && t < 1.0f) ? t : 0.5f;
}

bool FaceEngine::DetectCrop(const nn::ImageView& img, const nn::Crop& crop, double pixels, float minScore,
                            Detection* out, size_t maxOut, size_t* count) {
    *count = 0;
    double s = std::sqrt(pixels / (static_cast<double>(crop.w) * crop.h));
    if (s > 2.0) s = 2.0;
    size_t n = 0;
    if (!Fast()) {
        // Sides in multiples of 32 keep every stride-2 layer on even sizes,
        // the layout the detector was trained with.
        int inW = static_cast<int>(std::lround(crop.w * s / 32.0)) * 32;
        int inH = static_cast<int>(std::lround(crop.h * s / 32.0)) * 32;
        if (inW < 64) inW = 64;
        if (inH < 64) inH = 64;
        if (!ssd_.Detect(img, crop, inW, inH, minScore, out, maxOut, &n)) return false;
    } else {
        // Two square scales, the second 1.5 times the first, merged.
        const int longer = crop.w > crop.h ? crop.w : crop.h;
        int side = static_cast<int>(std::lround(longer * s / 32.0)) * 32;
        if (side < 128) side = 128;
        if (side > 1024) side = 1024;
        Detection both[2 * kMaxPerCrop];
        size_t n1 = 0, n2 = 0;
        if (!tiny_.Detect(img, crop, side, minScore, both, kMaxPerCrop, &n1)) return false;
        const int side2 = static_cast<int>(std::lround(side * 1.5 / 32.0)) * 32;
        if (!tiny_.Detect(img, crop, side2 > 1024 ? 1024 : side2, minScore, both + n1, kMaxPerCrop, &n2))
            return false;
        nn::Candidate cand[2 * kMaxPerCrop];
        for (size_t i = 0; i < n1 + n2; ++i) {
            cand[i].box = {both[i].y, both[i].x, both[i].y + both[i].h, both[i].x + both[i].w};
            cand[i].score = both[i].score;
            cand[i].index = static_cast<int>(i);
        }
        n = nn::NonMaxSuppression(cand, n1 + n2, 0.4f, maxOut);
        for (size_t i = 0; i < n; ++i) out[i] = both[cand[i].index];
    }
    // Crop-relative to photo-relative.
    for (size_t i = 0; i < n; ++i) {
        out[i].x = (crop.x + out[i].x * crop.w) / img.w;
        out[i].y = (crop.y + out[i].y * crop.h) / img.h;
        out[i].w = out[i].w * crop.w / img.w;
        out[i].h = out[i].h * crop.h / img.h;
    }
    *count = n;
    return true;
}

bool FaceEngine::Verify(const nn::ImageView& img, Detection* dets, size_t* n) {
    const float threshold = ScoreThreshold();
    size_t checked = 0, kept = 0;
    Detection local[kMaxPerCrop];
    for (size_t i = 0; i < *n; ++i) {
        Detection d = dets[i];
        if (d.score < threshold) {
            // Candidates come sorted by score: only the best few are
            // looked at again, the rest are dropped.
            if (checked >= kMaxVerify) continue;
            ++checked;
            const double bw = static_cast<double>(d.w) * img.w, bh = static_cast<double>(d.h) * img.h;
            const double side = 2.0 * (bw > bh ? bw : bh);
            const nn::Crop c = ClipBox(static_cast<double>(d.x) * img.w + bw / 2 - side / 2,
                                       static_cast<double>(d.y) * img.h + bh / 2 - side / 2, side, side, img.w, img.h);
            if (c.w < 8 || c.h < 8) continue;
            size_t got = 0;
            if (!DetectCrop(img, c, static_cast<double>(kVerifyInput) * kVerifyInput, threshold, local, kMaxPerCrop, &got))
                return false;
            const nn::Box target = {d.y, d.x, d.y + d.h, d.x + d.w};
            int best = -1;
            for (size_t k = 0; k < got; ++k) {
                const nn::Box b = {local[k].y, local[k].x, local[k].y + local[k].h, local[k].x + local[k].w};
                if (nn::IoU(b, target) >= 0.3f && (best < 0 || local[k].score > local[best].score)) best = static_cast<int>(k);
            }
            if (best < 0) continue;
            d = local[best];
        }
        dets[kept++] = d;
    }
    // A confirmed box may now coincide with another one: keep the better.
    nn::Candidate cand[kMaxDetections];
    for (size_t i = 0; i < kept; ++i) {
        cand[i].box = {dets[i].y, dets[i].x, dets[i].y + dets[i].h, dets[i].x + dets[i].w};
        cand[i].score = dets[i].score;
        cand[i].index = static_cast<int>(i);
    }
    const size_t unique = nn::NonMaxSuppression(cand, kept, 0.5f, kMaxDetections);
    Detection sorted[kMaxDetections];
    for (size_t i = 0; i < unique; ++i) sorted[i] = dets[cand[i].index];
    for (size_t i = 0; i < unique; ++i) dets[i] = sorted[i];
    *n = unique;
    return true;
}

bool FaceEngine::Detect(const nn::ImageView& img, const Oriel_searchArea* areas, uint32_t nAreas,
                        Oriel_faceAreaArray* out) {
    out->count = 0;
    out->pInfo = nullptr;
    lmk::UniqueArray<Detection> dets = lmk::NewArray<Detection>(kMaxDetections);
    if (!dets) return false;
    size_t n = 0;
    const double work = config_.workPixels < 400 ? 400.0 : static_cast<double>(config_.workPixels);
    if (nAreas == 0) {
        nn::Crop all;
        all.w = img.w;
        all.h = img.h;
        if (!DetectCrop(img, all, work, VerifyFloor(), dets.get(), kMaxPerCrop, &n)) return false;
    } else {
        const double fullPixels = static_cast<double>(img.w) * img.h;
        for (uint32_t i = 0; i < nAreas && n < kMaxDetections; ++i) {
            const Oriel_searchArea& a = areas[i];
            const nn::Crop c = ClipBox(static_cast<double>(a.x) * img.w, static_cast<double>(a.y) * img.h,
                                       static_cast<double>(a.width) * img.w, static_cast<double>(a.height) * img.h,
                                       img.w, img.h);
            if (c.w < 8 || c.h < 8) continue;
            size_t k = 0;
            const size_t room = kMaxDetections - n < kMaxPerCrop ? kMaxDetections - n : kMaxPerCrop;
            if (!DetectCrop(img, c, work * (static_cast<double>(c.w) * c.h) / fullPixels, VerifyFloor(), dets.get() + n,
                            room, &k))
                return false;
            n += k;
        }
        // Regions may overlap: merge their detections.
        lmk::UniqueArray<nn::Candidate> cand = lmk::NewArray<nn::Candidate>(n ? n : 1);
        lmk::UniqueArray<Detection> merged = lmk::NewArray<Detection>(n ? n : 1);
        if (!cand || !merged) return false;
        for (size_t i = 0; i < n; ++i) {
            const Detection& d = dets[i];
            cand[i].box = {d.y, d.x, d.y + d.h, d.x + d.w};
            cand[i].score = d.score;
            cand[i].index = static_cast<int>(i);
        }
        const float iou = Clamp(config_.nmsPercent / 100.0f, 0.05f, 1.0f);
        const size_t kept = nn::NonMaxSuppression(cand.get(), n, iou, kMaxDetections);
        for (size_t i = 0; i < kept; ++i) merged[i] = dets[cand[i].index];
        for (size_t i = 0; i < kept; ++i) dets[i] = merged[i];
        n = kept;
    }
    if (!Verify(img, dets.get(), &n)) return false;
    // Drop faces below the minimum size, keep the best maxFaces.
    const uint32_t minPercent = config_.minFacePercent > 100 ? 100 : config_.minFacePercent;
    const double minSide = (img.w < img.h ? img.w : img.h) * (minPercent / 100.0);
    uint32_t maxFaces = config_.maxFaces == 0 ? 1 : (config_.maxFaces > 256 ? 256 : config_.maxFaces);
    size_t kept = 0;
    for (size_t i = 0; i < n && kept < maxFaces; ++i) {
        const double w = static_cast<double>(dets[i].w) * img.w, h = static_cast<double>(dets[i].h) * img.h;
        if (w <= 0.0 || h <= 0.0 || (w < h ? w : h) < minSide) continue;
        dets[kept++] = dets[i];
    }
    return Publish(img, dets.get(), static_cast<uint32_t>(kept), out);
}

bool FaceEngine::DetectLocal(const nn::ImageView& img, const Oriel_areaInfo* cand, uint32_t n,
                             Oriel_faceAreaArray* out) {
    out->count = 0;
    out->pInfo = nullptr;
    const uint32_t scales = config_.localScales < 1 ? 1 : (config_.localScales > 4 ? 4 : config_.localScales);
    lmk::UniqueArray<Detection> dets = lmk::NewArray<Detection>(kMaxPerCrop * scales);
    lmk::UniqueArray<Detection> found = lmk::NewArray<Detection>(n);
    if (!dets || !found) return false;
    const float nms = Clamp(config_.nmsPercent / 100.0f, 0.05f, 1.0f);
    uint32_t nFound = 0;
    for (uint32_t i = 0; i < n; ++i) {
        const double bx = static_cast<double>(cand[i].x) * img.w, by = static_cast<double>(cand[i].y) * img.h;
        const double bw = static_cast<double>(cand[i].width) * img.w, bh = static_cast<double>(cand[i].height) * img.h;
        if (!(bw > 0.0) || !(bh > 0.0)) continue;
        const nn::Box target = {cand[i].y, cand[i].x, cand[i].y + cand[i].height, cand[i].x + cand[i].width};
        const double longer = bw > bh ? bw : bh;
        size_t nd = 0;
        for (uint32_t k = 0; k < scales; ++k) {
            double side = 2.0 * longer / std::pow(1.5, static_cast<double>(k));
            if (side < 1.2 * longer) side = 1.2 * longer;
            const nn::Crop c = ClipBox(bx + bw / 2 - side / 2, by + bh / 2 - side / 2, side, side, img.w, img.h);
            if (c.w < 8 || c.h < 8) continue;
            size_t got = 0;
            if (!DetectCrop(img, c, static_cast<double>(kLocalInput) * kLocalInput, ScoreThreshold(), dets.get() + nd,
                            kMaxPerCrop, &got))
                return false;
            nd += got;
        }
        // The best-scoring detection that overlaps the candidate confirms it.
        int best = -1;
        for (size_t d = 0; d < nd; ++d) {
            const nn::Box b = {dets[d].y, dets[d].x, dets[d].y + dets[d].h, dets[d].x + dets[d].w};
            if (nn::IoU(b, target) < 0.3f) continue;
            if (best < 0 || dets[d].score > dets[best].score) best = static_cast<int>(d);
        }
        if (best < 0) continue;
        const Detection& d = dets[best];
        const nn::Box b = {d.y, d.x, d.y + d.h, d.x + d.w};
        bool duplicate = false;
        for (uint32_t f = 0; f < nFound && !duplicate; ++f) {
            const nn::Box o = {found[f].y, found[f].x, found[f].y + found[f].h, found[f].x + found[f].w};
            duplicate = nn::IoU(b, o) > nms;
        }
        if (!duplicate) found[nFound++] = d;
    }
    return Publish(img, found.get(), nFound, out);
}

bool FaceEngine::Publish(const nn::ImageView& img, const Detection* dets, uint32_t n, Oriel_faceAreaArray* out) {
    if (n == 0) return true;
    Oriel_areaInfo* faces = static_cast<Oriel_areaInfo*>(std::malloc(n * sizeof(Oriel_areaInfo)));
    if (!faces) return false;
    for (uint32_t i = 0; i < n; ++i) {
        ResetAreaInfo(&faces[i]);
        faces[i].x = dets[i].x;
        faces[i].y = dets[i].y;
        faces[i].width = dets[i].w;
        faces[i].height = dets[i].h;
        faces[i].score = dets[i].score;
        faces[i].tag = static_cast<int32_t>(i);
    }
    if (!Complete(img, faces, n)) {
        std::free(faces);
        return false;
    }
    out->count = n;
    out->pInfo = faces;
    return true;
}

bool FaceEngine::Complete(const nn::ImageView& img, Oriel_areaInfo* faces, uint32_t n) {
    const uint32_t mode = config_.dictionaryMode;
    const bool parts = (mode & (ORIEL_D_MODE_PARTS | ORIEL_D_MODE_ATTRIBUTES)) != 0 && Has(ORIEL_NET_LANDMARKS);
    for (uint32_t i = 0; i < n; ++i) {
        Oriel_areaInfo& f = faces[i];
        f.blur = Blur(img, f);
        if (f.blur < 0.0f) return false;
        if (!parts) continue;
        Landmarks lm;
        bool located = false;
        if (!LocateLandmarks(img, f, &lm, &located)) return false;
        if (!located) continue;
        FillParts(img, lm, &f);
        if ((mode & ORIEL_D_MODE_ATTRIBUTES) == 0) continue;
        if (Has(ORIEL_NET_EXPRESSION)) {
            float p[7];
            if (!Expressions(img, lm, p)) return false;
            f.attribute1 = std::floor(p[1] * 100.0f * 1000.0f + 0.5f) / 1000.0;
        }
        if (Has(ORIEL_NET_AGE)) {
            float age = 0.0f, male = 0.0f;
            if (!Age(img, lm, &age, &male)) return false;
            const float band = 4.0f + age / 10.0f;
            f.ageMin = static_cast<uint8_t>(Clamp(std::floor(age - band), 0.0f, 99.0f));
            f.ageMax = static_cast<uint8_t>(Clamp(std::ceil(age + band), 0.0f, 99.0f));
            f.male = static_cast<uint8_t>(Clamp(std::floor(male * 100.0f + 0.5f), 0.0f, 100.0f));
        }
    }
    return true;
}

bool FaceEngine::LocateLandmarks(const nn::ImageView& img, const Oriel_areaInfo& face, Landmarks* lm,
                                 bool* located) {
    *located = false;
    const double bx = static_cast<double>(face.x) * img.w, by = static_cast<double>(face.y) * img.h;
    const double bw = static_cast<double>(face.width) * img.w, bh = static_cast<double>(face.height) * img.h;
    const nn::Crop c = ClipBox(bx, by, bw, bh, img.w, img.h);
    if (c.w <= 0 || c.h <= 0) return true;
    float o[2 * ORIEL_ALL_PARTS];
    if (!landmarks_.Run(img, c, o)) return false;
    *located = true;
    // Outputs are fractions of the 112-pixel square on which the crop was
    // centred; undo the padding and scale to the crop, then shift by the box.
    const float scale = 112.0f / static_cast<float>(c.w > c.h ? c.w : c.h);
    const float w = c.w * scale, h = c.h * scale;
    const float padX = w < h ? (h - w) / 2.0f : 0.0f;
    const float padY = h < w ? (w - h) / 2.0f : 0.0f;
    for (int i = 0; i < ORIEL_ALL_PARTS; ++i) {
        lm->x[i] = (o[2 * i] * 112.0f - padX) / w * c.w + static_cast<float>(bx);
        lm->y[i] = (o[2 * i + 1] * 112.0f - padY) / h * c.h + static_cast<float>(by);
    }
    return true;
}

void FaceEngine::FillParts(const nn::ImageView& img, const Landmarks& lm, Oriel_areaInfo* f) {
    const float bx = f->x * img.w, by = f->y * img.h, bw = f->width * img.w, bh = f->height * img.h;
    float rx, ry, lx, ly, mx, my;
    Mean(lm, 36, 42, &rx, &ry);
    Mean(lm, 42, 48, &lx, &ly);
    Mean(lm, 48, 68, &mx, &my);
    const float nx = lm.x[30], ny = lm.y[30];
    if (bw > 0.0f && bh > 0.0f) {
        f->rightEyeX = (rx - bx) / bw;
        f->rightEyeY = (ry - by) / bh;
        f->leftEyeX = (lx - bx) / bw;
        f->leftEyeY = (ly - by) / bh;
        f->part1X = (nx - bx) / bw;
        f->part1Y = (ny - by) / bh;
        f->part2X = (mx - bx) / bw;
        f->part2Y = (my - by) / bh;
    }
    f->partLevels = 2;
    // The angles go into stored metas: portable atan2 and asin, and the eye
    // line's direction from the vector itself, so every device agrees.
    const float eyeDx = lx - rx, eyeDy = ly - ry;
    f->roll = static_cast<float>(lmk::Atan2(eyeDy, eyeDx));
    const float eyeLen = std::sqrt(eyeDx * eyeDx + eyeDy * eyeDy);
    const float ux = eyeLen > 0.0f ? eyeDx / eyeLen : 1.0f, uy = eyeLen > 0.0f ? eyeDy / eyeLen : 0.0f;
    const float dl = (nx - lm.x[0]) * ux + (ny - lm.y[0]) * uy;
    const float dr = (lm.x[16] - nx) * ux + (lm.y[16] - ny) * uy;
    f->yaw = (dl + dr) > 0.0f ? static_cast<float>(lmk::Asin(Clamp((dl - dr) / (dl + dr), -1.0f, 1.0f))) : 0.0f;
    const float ex = (rx + lx) / 2.0f, ey = (ry + ly) / 2.0f;
    const float vx = -uy, vy = ux;
    const float noseDown = (nx - ex) * vx + (ny - ey) * vy;
    const float mouthDown = (mx - ex) * vx + (my - ey) * vy;
    f->pitch = mouthDown > 0.0f ? static_cast<float>(lmk::Asin(Clamp(2.0f * (0.55f - noseDown / mouthDown), -1.0f, 1.0f)))
                                : 0.0f;
}

bool FaceEngine::LocateParts(const nn::ImageView& img, Oriel_areaInfo* face) {
    Landmarks lm;
    bool located = false;
    if (!LocateLandmarks(img, *face, &lm, &located) || !located) return false;
    FillParts(img, lm, face);
    face->blur = Blur(img, *face);
    return face->blur >= 0.0f;
}

bool FaceEngine::ClassifyAttributes(const nn::ImageView& img, Oriel_areaInfo* face) {
    Landmarks lm;
    bool located = false;
    if (!LocateLandmarks(img, *face, &lm, &located) || !located) return false;
    FillParts(img, lm, face);
    float p[7];
    if (!Expressions(img, lm, p)) return false;
    face->attribute1 = std::floor(p[1] * 100.0f * 1000.0f + 0.5f) / 1000.0;
    float age = 0.0f, male = 0.0f;
    if (!Age(img, lm, &age, &male)) return false;
    const float band = 4.0f + age / 10.0f;
    face->ageMin = static_cast<uint8_t>(Clamp(std::floor(age - band), 0.0f, 99.0f));
    face->ageMax = static_cast<uint8_t>(Clamp(std::ceil(age + band), 0.0f, 99.0f));
    face->male = static_cast<uint8_t>(Clamp(std::floor(male * 100.0f + 0.5f), 0.0f, 100.0f));
    return true;
}

bool FaceEngine::Expressions(const nn::ImageView& img, const Landmarks& lm, float* probs) {
    const nn::Crop c = LandmarkCrop(lm, img.w, img.h);
    if (c.w <= 0 || c.h <= 0) return false;
    float logits[7];
    if (!expressions_.Run(img, c, logits)) return false;
    float mx = logits[0];
    for (int i = 1; i < 7; ++i) mx = std::fmax(mx, logits[i]);
    float sum = 0.0f;
    for (int i = 0; i < 7; ++i) {
        probs[i] = lmk::ExpF(logits[i] - mx);
        sum += probs[i];
    }
    for (int i = 0; i < 7; ++i) probs[i] /= sum;
    return true;
}

bool FaceEngine::Age(const nn::ImageView& img, const Landmarks& lm, float* age, float* male) {
    const nn::Crop c = LandmarkCrop(lm, img.w, img.h);
    if (c.w <= 0 || c.h <= 0) return false;
    return age_.Run(img, c, age, male);
}

bool FaceEngine::Descriptor(const nn::ImageView& img, const Oriel_areaInfo& face, float* out, bool* aligned,
                            bool mirrorAveraged) {
    const float bx = face.x * img.w, by = face.y * img.h, bw = face.width * img.w, bh = face.height * img.h;
    Oriel_areaInfo f = face;
    const bool hasParts = f.partLevels >= 2 && f.part2X > 0.0f && f.part2Y > 0.0f && f.rightEyeX >= 0.0f &&
                          f.leftEyeX >= 0.0f;
    nn::Crop c;
    *aligned = false;
    if (!hasParts && Has(ORIEL_NET_LANDMARKS)) {
        Landmarks lm;
        bool located = false;
        if (!LocateLandmarks(img, face, &lm, &located)) return false;
        if (located) FillParts(img, lm, &f);
    }
    if (f.partLevels >= 2 && bw > 0.0f && bh > 0.0f) {
        c = AlignedCrop(bx + f.rightEyeX * bw, by + f.rightEyeY * bh, bx + f.leftEyeX * bw, by + f.leftEyeY * bh,
                        bx + f.part2X * bw, by + f.part2Y * bh, img.w, img.h);
        *aligned = c.w > 0 && c.h > 0;
    }
    if (!*aligned) c = ClipBox(bx, by, bw, bh, img.w, img.h);
    if (c.w <= 0 || c.h <= 0) return false;
    if (!recognition_.Run(img, c, out)) return false;
    if (!mirrorAveraged) return true;
    float m[RecognitionNet::kDim];
    if (!recognition_.Run(img, c, m, true)) return false;
    double na = 0.0, nm = 0.0;
    for (int i = 0; i < RecognitionNet::kDim; ++i) {
        na += static_cast<double>(out[i]) * out[i];
        nm += static_cast<double>(m[i]) * m[i];
    }
    if (!(na > 0.0) || !(nm > 0.0)) return false;
    const float fa = static_cast<float>(1.0 / std::sqrt(na)), fm = static_cast<float>(1.0 / std::sqrt(nm));
    for (int i = 0; i < RecognitionNet::kDim; ++i) out[i] = out[i] * fa + m[i] * fm;
    return true;
}

bool FaceEngine::MakeVector(const nn::ImageView& img, const Oriel_areaInfo& face, Oriel_faceVectorData* out) {
    out->valid = 0;
    if ((config_.dictionaryMode & ORIEL_D_MODE_RECOGNITION) == 0) return false;
    float d[RecognitionNet::kDim];
    bool aligned = false;
    if (!Descriptor(img, face, d, &aligned, true)) return false;
    if (!PackVector(d, out->pVector)) return false;
    out->format = ORIEL_VECTOR_FORMAT;
    out->byteSize = ORIEL_VECTOR_BYTES;
    out->aligned = aligned ? 1u : 0u;
    out->valid = 1;
    return true;
}

bool FaceEngine::PackVector(const float* d, uint32_t* words) {
    double norm = 0.0;
    for (int i = 0; i < RecognitionNet::kDim; ++i) norm += static_cast<double>(d[i]) * d[i];
    norm = std::sqrt(norm);
    if (!(norm > 0.0) || !std::isfinite(norm)) return false;
    double maxAbs = 0.0;
    for (int i = 0; i < RecognitionNet::kDim; ++i) maxAbs = std::fmax(maxAbs, std::fabs(d[i] / norm));
    const float scale = static_cast<float>(maxAbs / 127.0);
    uint8_t* b = reinterpret_cast<uint8_t*>(words);
    std::memset(b, 0, ORIEL_VECTOR_BYTES);
    b[0] = ORIEL_VECTOR_FORMAT;
    b[1] = ORIEL_VECTOR_LENGTH;
    zbm_Write32LE(b + 4, &scale);
    for (int i = 0; i < RecognitionNet::kDim; ++i) {
        long q = std::lround((d[i] / norm) / scale);
        if (q > 127) q = 127;
        if (q < -127) q = -127;
        b[8 + i] = static_cast<uint8_t>(static_cast<int8_t>(q));
    }
    return true;
}

bool FaceEngine::UnpackVector(const Oriel_faceVectorData& v, float* unit) {
    if (!v.valid || !v.pVector || v.format != ORIEL_VECTOR_FORMAT) return false;
    const uint8_t* b = reinterpret_cast<const uint8_t*>(v.pVector);
    if (b[0] != ORIEL_VECTOR_FORMAT || b[1] != ORIEL_VECTOR_LENGTH) return false;
    float scale;
    zbm_Write32LE(&scale, b + 4);
    if (!(scale > 0.0f) || !std::isfinite(scale)) return false;
    for (uint32_t i = 0; i < ORIEL_VECTOR_LENGTH; ++i) unit[i] = static_cast<int8_t>(b[8 + i]) * scale;
    return true;
}

float FaceEngine::Similarity(const float* a, const float* b) {
    double dot = 0.0, na = 0.0, nb = 0.0;
    for (uint32_t i = 0; i < ORIEL_VECTOR_LENGTH; ++i) {
        dot += static_cast<double>(a[i]) * b[i];
        na += static_cast<double>(a[i]) * a[i];
        nb += static_cast<double>(b[i]) * b[i];
    }
    if (!(na > 0.0) || !(nb > 0.0)) return 0.0f;
    const double cosine = dot / std::sqrt(na * nb);
    return static_cast<float>(cosine < 0.0 ? 0.0 : (cosine > 1.0 ? 1.0 : cosine));
}

float FaceEngine::Blur(const nn::ImageView& img, const Oriel_areaInfo& face) {
    const int kSide = 64;
    const nn::Crop c = ClipBox(static_cast<double>(face.x) * img.w, static_cast<double>(face.y) * img.h,
                               static_cast<double>(face.width) * img.w, static_cast<double>(face.height) * img.h,
                               img.w, img.h);
    if (c.w < 4 || c.h < 4) return 1.0f;
    lmk::UniqueArray<float> rgb = lmk::NewArray<float>(kSide * kSide * 3);
    if (!rgb) return -1.0f;
    nn::Canvas cv;
    cv.w = c.w;
    cv.h = c.h;
    const float zero[3] = {0.0f, 0.0f, 0.0f};
    nn::SampleCanvas(img, c, cv, kSide, kSide, zero, 1.0f, rgb.get());
    float* g = rgb.get();  // grey values overwrite the first third
    double sum = 0.0, sum2 = 0.0;
    for (int i = 0; i < kSide * kSide; ++i) {
        const float v = 0.299f * rgb[3 * i] + 0.587f * rgb[3 * i + 1] + 0.114f * rgb[3 * i + 2];
        g[i] = v;
        sum += v;
        sum2 += static_cast<double>(v) * v;
    }
    const double n = kSide * kSide;
    const double var = sum2 / n - (sum / n) * (sum / n);
    const double sd = var > 0.0 ? std::sqrt(var) : 0.0;
    double lap = 0.0;
    for (int y = 1; y < kSide - 1; ++y)
        for (int x = 1; x < kSide - 1; ++x) {
            const float* p = g + y * kSide + x;
            lap += std::fabs(4.0f * p[0] - p[-1] - p[1] - p[-kSide] - p[kSide]);
        }
    lap /= static_cast<double>((kSide - 2) * (kSide - 2));
    const double r = lap / (sd + 4.0);
    return Clamp(static_cast<float>(1.0 - r / 0.55), 0.0f, 1.0f);
}

Oriel_ClusterSubject FaceEngine::Cluster(uint32_t width, uint32_t height, const Oriel_areaInfo* faces, uint32_t n,
                                         Oriel_faceSubjectCluster* detail) {
    Oriel_faceSubjectCluster d;
    std::memset(&d, 0, sizeof d);
    d.faceCount = n;
    (void)width;
    (void)height;
    if (n == 0) {
        d.subject = ORIEL_CLUSTER_SUBJECT_NO_FACE;
    } else {
        float largest = -1.0f;
        for (uint32_t i = 0; i < n; ++i) {
            const float a = faces[i].width * faces[i].height;
            if (a > largest) {
                largest = a;
                d.largest = i;
            }
        }
        bool background = true;
        for (uint32_t i = 0; i < n; ++i) {
            const Oriel_areaInfo& f = faces[i];
            if (f.width * f.height >= 0.25f * largest) ++d.mainFaces;
            const float cx = f.x + f.width / 2.0f, cy = f.y + f.height / 2.0f;
            const bool central = cx >= 1.0f / 3.0f && cx <= 2.0f / 3.0f && cy >= 1.0f / 3.0f && cy <= 2.0f / 3.0f;
            if (f.height >= 0.06f || central) background = false;
        }
        if (background)
            d.subject = ORIEL_CLUSTER_SUBJECT_BACKGROUND_ONLY;
        else if (d.mainFaces == 1)
            d.subject = faces[d.largest].height >= 0.25f ? ORIEL_CLUSTER_SUBJECT_PORTRAIT : ORIEL_CLUSTER_SUBJECT_SINGLE;
        else if (d.mainFaces == 2)
            d.subject = ORIEL_CLUSTER_SUBJECT_COUPLE;
        else if (d.mainFaces < 10)
            d.subject = ORIEL_CLUSTER_SUBJECT_GROUP;
        else
            d.subject = ORIEL_CLUSTER_SUBJECT_CROWD;
    }
    if (detail) *detail = d;
    return d.subject;
}

}  // namespace oriel
