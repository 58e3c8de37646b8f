#include "testkit/meta_builder.h"

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <new>

namespace lumicor {
namespace test {

namespace {

void PutFloat(uint8_t* dst, float v) { std::memcpy(dst, &v, 4); }

void FillSimilarity(_KtMetaSimilarity* s) {
    s->width = 160;
    s->height = 120;
    s->mainColor = {0, 54, 140, 101};
    s->ncol32 = 32;
    for (uint32_t i = 0; i < 32; ++i) {
        s->colHist32[i].lab = {0, static_cast<uint8_t>(3 * i), static_cast<uint8_t>(100 + i),
                               static_cast<uint8_t>(160 - i)};
        s->colHist32[i].count = 600 - 7 * i;
    }
    for (uint32_t i = 0; i < 8; ++i) {
        s->verHist[i] = 1000 + 13 * i;
        s->horHist[i] = 2000 - 17 * i;
    }
    for (uint32_t i = 0; i < 81; ++i) s->edge.value[i] = 0.125f * static_cast<float>(i) - 3.0f;
}

void FillColorLabel(_KtMetaColorLabel* c) {
    c->white = 12;
    c->black = 8;
    c->red = 30;
    c->yellow = 5;
    c->green = 25;
    c->blue = 20;
}

void SetKtVersions(_VondMeta* m) {
    m->simlEngineVersion = {1, 4, 0x13121700u};
    m->simlMetaVersion = {2, 0};
    m->repmEngineVersion = {2, 5, 0x13121700u};
    m->repmMetaVersion = {2, 0};
    m->clblEngineVersion = {1, 2, 0x13121700u};
    m->clblMetaVersion = {1, 0};
}

void SetFaceHeader(_FaceMeta* f, uint16_t faceNum, const char* date) {
    std::memcpy(f->engineVersion, "ORL_3100", 8);
    f->headerValue = 0.0f;
    f->formatVersion = 259;
    f->imageWidth = 1600;
    f->imageHeight = 1200;
    std::snprintf(f->dateTime, sizeof f->dateTime, "%s", date);
    f->faceNum = faceNum;
}

struct FaceSpec {
    zbm_Rect box;
    float yaw, pitch, roll;
    zbm_Pos rightEye, leftEye;
    float part1X, part1Y, part2X, part2Y;
    uint8_t score1, score2;
    uint8_t ageMin, ageMax;
    uint8_t orientation;
    uint8_t featureSeed;
};

bool FillFace(_FaceRegion* r, const FaceSpec& s) {
    if (CreateFaceRegion(2, 2, 255, r) != 0) return false;
    r->faceArea = s.box;
    const float rotation[3] = {s.yaw, s.pitch, s.roll};
    std::memcpy(reinterpret_cast<uint8_t*>(r) + offsetof(_FaceRegion, rotation), rotation, sizeof rotation);
    r->rightEye = s.rightEye;
    r->leftEye = s.leftEye;
    r->orientation = s.orientation;
    r->ageMin = s.ageMin;
    r->ageMax = s.ageMax;
    uint8_t* parts = r->pParts;
    parts[0] = 0x25;
    PutFloat(parts + 1, s.part1X);
    PutFloat(parts + 5, s.part1Y);
    parts[9] = 0x3D;
    PutFloat(parts + 10, s.part2X);
    PutFloat(parts + 14, s.part2Y);
    uint8_t* attributes = r->pAttributes;
    attributes[0] = 1;
    attributes[1] = s.score1;
    attributes[2] = 2;
    attributes[3] = s.score2;
    std::memcpy(r->featureType, "PDEC_C2", 8);
    uint8_t* feature = r->pFeature;
    for (uint32_t i = 0; i < 255; ++i) feature[i] = static_cast<uint8_t>(s.featureSeed + 7 * i);
    return true;
}

bool BuildFaces(_VondMeta* m) {
    SetFaceHeader(&m->faceMeta, 2, "2013:12:17 10:20:30");
    static const FaceSpec kFaces[2] = {
        {{400, 300, 320, 320}, 5.0f, -3.5f, 12.25f, {480, 400}, {620, 402}, 560.5f, 520.25f, 555.0f, 580.75f,
         40, 77, 20, 29, 1, 3},
        {{1100, 500, 200, 210}, -20.0f, 1.5f, -2.0f, {1150, 560}, {1240, 558}, 1195.0f, 620.5f, 1192.25f, 660.0f,
         91, 15, 30, 39, 2, 101},
    };
    m->faceMeta.pRegions = new (std::nothrow) _FaceRegion[2]();
    if (m->faceMeta.pRegions == nullptr) return false;
    m->faceMeta.regionCount = 2;
    for (uint32_t i = 0; i < 2; ++i) {
        if (!FillFace(&m->faceMeta.pRegions[i], kFaces[i])) return false;
    }
    m->clusterSubject = 0x20003u;
    m->faceMetaArray.pScores = new (std::nothrow) _VondOrielScore[2];
    if (m->faceMetaArray.pScores == nullptr) return false;
    m->faceMetaArray.count = 2;
    m->faceMetaArray.pScores[0] = {0.875f, 0.0625f};
    m->faceMetaArray.pScores[1] = {0.5f, 0.25f};
    return true;
}

bool BuildRepresentative(_KtMetaRepresentative* r) {
    r->colorVariation = 0.25f;
    r->badExposure = 0.125f;
    r->fingerOnLens = 0.75f;
    r->outOfFocus = 0.375f;
    r->cameraShake = -1.0f;
    r->motionBlur = 0.0f;
    r->analyzedWidth = 80;
    r->analyzedHeight = 60;
    r->pFingers = new (std::nothrow) _KtFinger[2]();
    if (r->pFingers == nullptr) return false;
    r->numFinger = 2;
    static const uint32_t kPoints[2] = {3, 4};
    for (uint32_t f = 0; f < 2; ++f) {
        _KtFinger& finger = r->pFingers[f];
        finger.score = 0.5f + 0.25f * static_cast<float>(f);
        finger.area = 120 + 40 * f;
        finger.pPoints = new (std::nothrow) _KtFingerPoint[kPoints[f]];
        if (finger.pPoints == nullptr) return false;
        finger.numPoint = kPoints[f];
        for (uint32_t p = 0; p < kPoints[f]; ++p)
            finger.pPoints[p] = {static_cast<uint16_t>(2 + 10 * p + f), static_cast<uint16_t>(59 - 5 * p)};
    }
    r->pBlurMap = new (std::nothrow) uint8_t[20 * 15];
    if (r->pBlurMap == nullptr) return false;
    r->mapWidth = 20;
    r->mapHeight = 15;
    for (uint32_t i = 0; i < 20 * 15; ++i) r->pBlurMap[i] = static_cast<uint8_t>(i * 37 % 251);
    return true;
}

bool BuildAreas(_VondMeta* m) {
    std::memcpy(m->caLibVersion.text, "CALib 2.1.0", 11);
    m->analyzedWidth = 640;
    m->analyzedHeight = 480;
    static const CAAttentionArea kAreas[4] = {
        {0.25f, 0.25f, 0.2f, 0.26666668f, {255}},
        {0.6875f, 0.41666666f, 0.125f, 0.17500001f, {180}},
        {0.05f, 0.7f, 0.1f, 0.1f, {90}},
        {0.9f, 0.05f, 0.05f, 0.0625f, {12}},
    };
    m->attentionAreas.isFace = 0;
    m->attentionAreas.pAreaArray = new (std::nothrow) CAAttentionArea[4];
    if (m->attentionAreas.pAreaArray == nullptr) return false;
    m->attentionAreas.numAreas = 4;
    std::memcpy(m->attentionAreas.pAreaArray, kAreas, sizeof kAreas);
    return true;
}

template <typename T>
bool SameBytes(const T* a, const T* b, uint32_t count) {
    if (count == 0) return true;
    if (a == nullptr || b == nullptr) return a == b;
    return std::memcmp(a, b, sizeof(T) * count) == 0;
}

// Field by field: _KtEngineVersion has padding bytes.
bool SameKtVersions(const _KtEngineVersion& ea, const _KtMetaVersion& ma, const _KtEngineVersion& eb,
                    const _KtMetaVersion& mb) {
    return ea.major == eb.major && ea.minor == eb.minor && ea.build == eb.build && ma.major == mb.major &&
           ma.minor == mb.minor;
}

bool Differ(std::string* why, const char* field) {
    if (why) *why = field;
    return false;
}

// _FaceRegion fields up to pParts (offset 114) are plain bytes; the pointers
// are compared by content.
bool RegionEqual(const _FaceRegion& a, const _FaceRegion& b, std::string* why) {
    if (std::memcmp(&a, &b, offsetof(_FaceRegion, pParts)) != 0) return Differ(why, "faceMeta.pRegions[] fixed fields");
    const uint32_t parts = a.partCount, attributes = a.attributeCount, feature = a.featureSize;
    if (parts != b.partCount || !SameBytes(a.pParts, b.pParts, 9 * parts)) return Differ(why, "faceMeta.pRegions[].pParts");
    if (attributes != b.attributeCount || !SameBytes(a.pAttributes, b.pAttributes, 2 * attributes))
        return Differ(why, "faceMeta.pRegions[].pAttributes");
    if (std::memcmp(a.featureType, b.featureType, sizeof a.featureType) != 0)
        return Differ(why, "faceMeta.pRegions[].featureType");
    if (feature != b.featureSize || !SameBytes(a.pFeature, b.pFeature, feature))
        return Differ(why, "faceMeta.pRegions[].pFeature");
    return true;
}

bool RepresentativeEqual(const _KtMetaRepresentative& a, const _KtMetaRepresentative& b, std::string* why) {
    if (std::memcmp(&a, &b, offsetof(_KtMetaRepresentative, pFingers)) != 0)
        return Differ(why, "representative scores, size or numFinger");
    for (uint32_t i = 0; i < a.numFinger; ++i) {
        const _KtFinger& fa = a.pFingers[i];
        const _KtFinger& fb = b.pFingers[i];
        if (std::memcmp(&fa.score, &fb.score, 4) != 0 || fa.area != fb.area || fa.numPoint != fb.numPoint ||
            !SameBytes(fa.pPoints, fb.pPoints, fa.numPoint))
            return Differ(why, "representative.pFingers[]");
    }
    if (a.mapWidth != b.mapWidth || a.mapHeight != b.mapHeight ||
        !SameBytes(a.pBlurMap, b.pBlurMap, a.mapWidth * a.mapHeight))
        return Differ(why, "representative blur map");
    return true;
}

}  // namespace

void InitMetaHeader(_VondMeta* meta) {
    std::memset(meta, 0, sizeof *meta);
    meta->version = *VondGetVersion();
    meta->faceDetectDicMode = 7;
    meta->faceEngineParam = 1.0f;
    meta->faceRcSize = 76800;
}

bool BuildHandMadeMeta(_VondMeta* meta) {
    InitMetaHeader(meta);
    SetKtVersions(meta);
    FillSimilarity(&meta->similarity);
    FillColorLabel(&meta->colorLabel);
    if (BuildFaces(meta) && BuildRepresentative(&meta->representative) && BuildAreas(meta)) return true;
    VondDisposeMeta(meta);
    return false;
}

bool BuildEmptyMeta(_VondMeta* meta) {
    InitMetaHeader(meta);
    SetKtVersions(meta);
    FillSimilarity(&meta->similarity);
    FillColorLabel(&meta->colorLabel);
    SetFaceHeader(&meta->faceMeta, 0, "");
    meta->representative.colorVariation = 0.5f;
    meta->representative.badExposure = 0.0f;
    meta->representative.fingerOnLens = 0.0f;
    meta->representative.outOfFocus = -1.0f;
    meta->representative.cameraShake = -1.0f;
    meta->representative.motionBlur = 0.0f;
    std::memcpy(meta->caLibVersion.text, "CALib 2.1.0", 11);
    meta->analyzedWidth = 640;
    meta->analyzedHeight = 480;
    return true;
}

bool SetFaceAreas(_VondMeta* meta, uint32_t count, const int32_t* directions) {
    VondCALibDisposeMeta(meta->attentionAreas);
    meta->attentionAreas.isFace = 1;
    if (count == 0) return true;
    CAAttentionArea* areas = new (std::nothrow) CAAttentionArea[count]();
    if (areas == nullptr) return false;
    for (uint32_t i = 0; i < count; ++i) {
        areas[i].nx = 0.1f * static_cast<float>(i);
        areas[i].ny = 0.2f;
        areas[i].nw = 0.15f;
        areas[i].nh = 0.2f;
        areas[i].val.direction = directions[i];
    }
    meta->attentionAreas.pAreaArray = areas;
    meta->attentionAreas.numAreas = count;
    return true;
}

bool MetaEqual(const _VondMeta& a, const _VondMeta& b, std::string* why) {
    if (std::memcmp(&a.version, &b.version, sizeof a.version) != 0) return Differ(why, "version");
    if (a.faceDetectDicMode != b.faceDetectDicMode || std::memcmp(&a.faceEngineParam, &b.faceEngineParam, 4) != 0 ||
        a.faceRcSize != b.faceRcSize)
        return Differ(why, "configuration");
    if (std::memcmp(&a.faceMeta, &b.faceMeta, offsetof(_FaceMeta, pRegions)) != 0) return Differ(why, "faceMeta header");
    for (uint32_t i = 0; i < a.faceMeta.regionCount; ++i) {
        if (!RegionEqual(a.faceMeta.pRegions[i], b.faceMeta.pRegions[i], why)) return false;
    }
    if (a.clusterSubject != b.clusterSubject) return Differ(why, "clusterSubject");
    if (a.faceMetaArray.count != b.faceMetaArray.count ||
        !SameBytes(a.faceMetaArray.pScores, b.faceMetaArray.pScores, a.faceMetaArray.count))
        return Differ(why, "faceMetaArray");
    if (!SameKtVersions(a.simlEngineVersion, a.simlMetaVersion, b.simlEngineVersion, b.simlMetaVersion) ||
        !SameKtVersions(a.repmEngineVersion, a.repmMetaVersion, b.repmEngineVersion, b.repmMetaVersion) ||
        !SameKtVersions(a.clblEngineVersion, a.clblMetaVersion, b.clblEngineVersion, b.clblMetaVersion))
        return Differ(why, "Kt versions");
    if (std::memcmp(&a.similarity, &b.similarity, sizeof a.similarity) != 0) return Differ(why, "similarity");
    if (!RepresentativeEqual(a.representative, b.representative, why)) return false;
    if (std::memcmp(&a.colorLabel, &b.colorLabel, sizeof a.colorLabel) != 0) return Differ(why, "colorLabel");
    if (std::memcmp(&a.caLibVersion, &b.caLibVersion, sizeof a.caLibVersion) != 0) return Differ(why, "caLibVersion");
    if (a.analyzedWidth != b.analyzedWidth || a.analyzedHeight != b.analyzedHeight) return Differ(why, "analyzed size");
    const _CAAttentionAreaArray& x = a.attentionAreas;
    const _CAAttentionAreaArray& y = b.attentionAreas;
    if (x.isFace != y.isFace || x.numAreas != y.numAreas || !SameBytes(x.pAreaArray, y.pAreaArray, x.numAreas))
        return Differ(why, "attentionAreas");
    return true;
}

bool IsZeroMeta(const _VondMeta& meta) {
    const uint8_t* p = reinterpret_cast<const uint8_t*>(&meta);
    for (size_t i = 0; i < sizeof meta; ++i) {
        if (p[i] != 0) return false;
    }
    return true;
}

std::vector<uint8_t> SerializeToBlob(const _VondMeta& meta) {
    uint32_t size = 0;
    std::vector<uint8_t> bytes;
    if (VondGetSerializedSize(&meta, &size).status != VOND_STATUS_OK) return bytes;
    bytes.resize(size);
    if (VondSerializeMeta(&meta, size, bytes.data()).status != VOND_STATUS_OK) bytes.clear();
    return bytes;
}

std::vector<uint8_t> BuildBlob(bool (*build)(_VondMeta*)) {
    _VondMeta meta;
    if (!build(&meta)) return {};
    std::vector<uint8_t> bytes = SerializeToBlob(meta);
    VondDisposeMeta(&meta);
    return bytes;
}

}  // namespace test
}  // namespace lumicor
