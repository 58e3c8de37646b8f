#include "testkit/kt_meta_samples.h"

#include "ktlib/src/frame/kt_repm_record.h"

#include <cstdio>
#include <cstring>

namespace lumicor {
namespace test {

namespace {
float FromBits(uint32_t bits) {
    float f;
    std::memcpy(&f, &bits, 4);
    return f;
}
bool SameBits(float a, float b) { return std::memcmp(&a, &b, 4) == 0; }
}  // namespace

_KtMetaSimilarity SampleSimilarity() {
    _KtMetaSimilarity m;
    std::memset(&m, 0, sizeof m);
    m.width = 160;
    m.height = -120;  // signed on the wire
    m.mainColor = {0, 54, 130, 120};
    m.ncol32 = 2;
    m.colHist32[0] = {{0, 80, 128, 129}, 12000};
    m.colHist32[1] = {{0, 20, 140, 100}, 7200};
    for (int i = 0; i < 8; ++i) {
        m.verHist[i] = 100u * i;
        m.horHist[i] = 0x01020304u + i;
    }
    for (int i = 0; i < 81; ++i) m.edge.value[i] = 0.5f * i;
    m.edge.value[1] = FromBits(0x7FC00001u);  // NaN with payload
    m.edge.value[2] = -0.0f;
    return m;
}

_KtMetaColorLabel SampleColorLabel() {
    _KtMetaColorLabel m = {100, 0, 7, 55, 99, 1, {0, 0, 0, 0, 0, 0, 0, 0, 0, 9}};
    return m;
}

SampleRepresentative::SampleRepresentative(uint32_t fingers, uint32_t mapWidth, uint32_t mapHeight) {
    std::memset(&meta, 0, sizeof meta);
    meta.colorVariation = 0.25f;
    meta.badExposure = -1.0f;
    meta.fingerOnLens = 0.75f;
    meta.outOfFocus = 1.0f;
    meta.cameraShake = FromBits(0xFFC00002u);  // hostile NaN, carried as bits
    meta.motionBlur = 0.0f;
    meta.analyzedWidth = 80;
    meta.analyzedHeight = 60;
    meta.numFinger = fingers;
    if (fingers) meta.pFingers = new _KtFinger[fingers]();
    for (uint32_t i = 0; i < fingers; ++i) {
        _KtFinger& f = meta.pFingers[i];
        f.score = 0.5f + 0.125f * i;
        f.area = 300 + i;
        f.numPoint = i + 1;
        f.pPoints = new _KtFingerPoint[i + 1];
        for (uint32_t j = 0; j <= i; ++j) f.pPoints[j] = {static_cast<uint16_t>(j), static_cast<uint16_t>(0xFF00 + i)};
    }
    meta.mapWidth = mapWidth;
    meta.mapHeight = mapHeight;
    const uint32_t n = mapWidth * mapHeight;
    if (n) meta.pBlurMap = new uint8_t[n];
    for (uint32_t i = 0; i < n; ++i) meta.pBlurMap[i] = static_cast<uint8_t>(i + 1);
}

SampleRepresentative::~SampleRepresentative() { ktrepm::ReleaseArrays(&meta); }

bool SameRepresentative(const _KtMetaRepresentative& a, const _KtMetaRepresentative& b) {
    if (!SameBits(a.colorVariation, b.colorVariation) || !SameBits(a.badExposure, b.badExposure) ||
        !SameBits(a.fingerOnLens, b.fingerOnLens) || !SameBits(a.outOfFocus, b.outOfFocus) ||
        !SameBits(a.cameraShake, b.cameraShake) || !SameBits(a.motionBlur, b.motionBlur) ||
        a.analyzedWidth != b.analyzedWidth || a.analyzedHeight != b.analyzedHeight || a.numFinger != b.numFinger ||
        a.mapWidth != b.mapWidth || a.mapHeight != b.mapHeight) {
        return false;
    }
    for (uint32_t i = 0; i < a.numFinger; ++i) {
        const _KtFinger& fa = a.pFingers[i];
        const _KtFinger& fb = b.pFingers[i];
        if (!SameBits(fa.score, fb.score) || fa.area != fb.area || fa.numPoint != fb.numPoint ||
            (fa.numPoint && std::memcmp(fa.pPoints, fb.pPoints, 4u * fa.numPoint) != 0)) {
            return false;
        }
    }
    const uint32_t n = a.mapWidth * a.mapHeight;
    return n == 0 || std::memcmp(a.pBlurMap, b.pBlurMap, n) == 0;
}

std::vector<uint8_t> MakeFrame(const char* signature, uint8_t major, uint8_t minor, uint32_t metaBytes,
                               const std::vector<uint8_t>& payload) {
    std::vector<uint8_t> frame(signature, signature + 4);
    for (int shift = 24; shift >= 0; shift -= 8) frame.push_back(static_cast<uint8_t>(metaBytes >> shift));
    const uint8_t rest[8] = {major, minor, 1, 4, 0x13, 0x12, 0x17, 0x00};
    frame.insert(frame.end(), rest, rest + 8);
    frame.insert(frame.end(), payload.begin(), payload.end());
    return frame;
}

std::string ReadBack(FILE* f) {
    std::string text;
    std::rewind(f);
    char buf[4096];
    size_t n;
    while ((n = std::fread(buf, 1, sizeof buf, f)) > 0) text.append(buf, n);
    std::fclose(f);
    return text;
}

}  // namespace test
}  // namespace lumicor
