// VondOrielAnalyze: runs the face engine (OrielPlus interface) on the
// working image and turns its normalised face records into the face meta
// in host pixels, with the facial-subject code and one score pair per face.
#include "lumicor/src/glue/vond_result.h"

#include "common/src/internal/memory.h"

#include <lumicor/ofm.h>
#include <lumicor/orielplus.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <new>

namespace {

const uint32_t kMaxFaces = 32;
const uint32_t kFeatureBytes = 255;
const uint8_t kPart1Id = 0x25;  // '%': the engine's first part point
const uint8_t kPart2Id = 0x3D;  // '=': the second
const uint32_t kEngineFlags = 0x107E01F1u;
const char kAllocationFailed[] = "VOND_NEW failed";

// Host-pixel value: truncated toward zero, negative values as 0.
int32_t ToPixel(float v) {
    if (!(v > 0.0f)) return 0;
    if (v >= 2147483520.0f) return INT32_MAX;
    return static_cast<int32_t>(v);
}

// Everything the analysis holds on the engine side; released on every path.
struct EngineSession {
    OrielHandle engine = nullptr;
    Oriel_faceAreaArray faces = {0, nullptr};
    Oriel_faceSubjectCluster* cluster = nullptr;
    Oriel_faceVectorData* vectors = nullptr;
    uint32_t vectorCount = 0;

    ~EngineSession() {
        if (engine) OrielPlus_ReleaseArrayMadeByDetectFace(&faces, engine);
        if (vectors) {
            for (uint32_t i = 0; i < vectorCount; ++i) delete[] vectors[i].pVector;
            delete[] vectors;
        }
        if (cluster && engine) OrielPlus_DisposeFaceSubjectCluster(cluster, engine);
        if (engine) OrielPlus_Finalize(&engine);
    }
};

// Photo-wide presence of the optional items over the kept faces.
struct Presence {
    bool part1 = false, part2 = false, attribute1 = false, attribute2 = false, feature = false;
};

void SetText(_FaceMeta& meta, const char (&text)[16]) {
    for (int i = 0; i < 16; ++i) meta.engineVersion[i] = text[i];
}

void SetDateNow(_FaceMeta& meta) {
    char date[64];
    std::memset(date, 0, sizeof date);
    const time_t now = std::time(nullptr);
    struct tm t;
    if (localtime_r(&now, &t)) {
        std::snprintf(date, sizeof date, "%04d:%02d:%02d %02d:%02d:%02d", t.tm_year + 1900, t.tm_mon + 1, t.tm_mday,
                      t.tm_hour, t.tm_min, t.tm_sec);
    }
    date[19] = '\0';
    for (int i = 0; i < 20; ++i) meta.dateTime[i] = date[i];
}

void ClearDate(_FaceMeta& meta) {
    for (int i = 0; i < 20; ++i) meta.dateTime[i] = 0;
}

void PutPart(uint8_t* item, uint8_t id, float x, float y) {
    item[0] = id;
    std::memcpy(item + 1, &x, 4);
    std::memcpy(item + 5, &y, 4);
}

// One engine face into one region (convertToFaceRegion). False when a
// buffer cannot be allocated.
bool ConvertToFaceRegion(const Oriel_areaInfo& f, const Oriel_faceVectorData* vector, uint32_t vectorBytes,
                         const Presence& photo, float w0, float h0, _FaceRegion& r) {
    if (CreateFaceRegion(0, 0, 0, &r) != OFM_OK) return false;
    r.faceTag = static_cast<uint8_t>(f.tag & 0xFF);
    r.faceArea = zbm_Rect{ToPixel(w0 * f.x), ToPixel(h0 * f.y), ToPixel(w0 * f.width), ToPixel(h0 * f.height)};
    // Stored in reverse order: yaw, pitch, roll.
    r.rotation[0] = f.yaw;
    r.rotation[1] = f.pitch;
    r.rotation[2] = f.roll;
    r.auxWord = 0;
    r.auxFlag = 0;
    if (f.partLevels >= 1) {
        r.rightEye = zbm_Pos{ToPixel(w0 * (f.x + f.width * f.rightEyeX)), ToPixel(h0 * (f.y + f.height * f.rightEyeY))};
        r.leftEye = zbm_Pos{ToPixel(w0 * (f.x + f.width * f.leftEyeX)), ToPixel(h0 * (f.y + f.height * f.leftEyeY))};
        if (f.partLevels > 1) {
            const uint32_t kinds = (photo.part1 ? 1u : 0u) + (photo.part2 ? 1u : 0u);
            r.partCount = kinds;
            if (kinds != 0) {
                uint8_t* parts = new (std::nothrow) uint8_t[9 * kinds];
                if (!parts) return false;
                std::memset(parts, 0xFF, 9 * kinds);
                r.pParts = parts;
                uint32_t k = 0;
                if (photo.part1)
                    PutPart(parts + 9 * k++, kPart1Id, w0 * (f.x + f.width * f.part1X), h0 * (f.y + f.height * f.part1Y));
                if (photo.part2)
                    PutPart(parts + 9 * k++, kPart2Id, w0 * (f.x + f.width * f.part2X), h0 * (f.y + f.height * f.part2Y));
            }
        }
        r.ageMin = f.ageMin;
        r.ageMax = f.ageMax;
        if (photo.attribute1 || photo.attribute2) {
            const bool a1 = photo.attribute1 && f.attribute1 >= 0.0;
            const bool a2 = photo.attribute2 && f.attribute2 >= 0.0;
            const uint32_t count = (a1 ? 1u : 0u) + (a2 ? 1u : 0u);
            r.attributeCount = count;
            if (count != 0) {
                uint8_t* attributes = new (std::nothrow) uint8_t[2 * count];
                if (!attributes) return false;
                std::memset(attributes, 0xFF, 2 * count);
                r.pAttributes = attributes;
                uint32_t k = 0;
                if (a1) {
                    attributes[2 * k] = 1;
                    attributes[2 * k + 1] = static_cast<uint8_t>(static_cast<int32_t>(f.attribute1));
                    ++k;
                }
                if (a2) {
                    attributes[2 * k] = 2;
                    attributes[2 * k + 1] = static_cast<uint8_t>(static_cast<int32_t>(f.attribute2));
                }
            }
        }
    }
    if (photo.feature) {
        uint8_t* feature = new (std::nothrow) uint8_t[kFeatureBytes]();
        if (!feature) return false;
        r.featureSize = kFeatureBytes;
        r.pFeature = feature;
        static const char kMade[8] = "PDEC_C2";
        static const char kNone[3] = "na";
        if (vector && vector->valid && vector->pVector) {
            for (int i = 0; i < 8; ++i) r.featureType[i] = kMade[i];
            // Copy only the bytes of the vector buffer (GetFaceVectorDim
            // words), which may be shorter than the feature.
            std::memcpy(feature, vector->pVector, vectorBytes < kFeatureBytes ? vectorBytes : kFeatureBytes);
        } else {
            for (int i = 0; i < 3; ++i) r.featureType[i] = kNone[i];
        }
    }
    return true;
}

void FreeRegionBuffers(_FaceRegion* regions, uint32_t n) {
    for (uint32_t i = 0; i < n; ++i) {
        delete[] regions[i].pParts;
        regions[i].pParts = nullptr;
        regions[i].partCount = 0;
        delete[] regions[i].pAttributes;
        regions[i].pAttributes = nullptr;
        regions[i].attributeCount = 0;
        delete[] regions[i].pFeature;
        regions[i].pFeature = nullptr;
        regions[i].featureSize = 0;
    }
}

}  // namespace

_VondResult VondOrielAnalyze(const _zbm_Image* pImage, uint32_t width, uint32_t height, int32_t faceRectCount,
                             const _VondFaceRect* pFaceRectArray, Oriel_DetectDictionaryMode dicMode,
                             float faceEngineParam, uint32_t faceRcSize, _FaceMeta& faceMeta,
                             Oriel_ClusterSubject& subject, _VondOrielMetaArray& metaArray) {
    _VondResult result = vond::Begin("VondOrielAnalyze");

    // 1. Engine version: "ORL_" and the engine's version text without dots.
    char version[16] = {'O', 'R', 'L', '_'};
    uint32_t index = 4;
    const Oriel_verInfo* info = OrielPlus_GetOrielVersion();
    for (uint32_t k = 0; info && index < 16 && info->version[k] != '\0' && k < sizeof info->version; ++k)
        if (info->version[k] != '.') version[index++] = info->version[k];
    for (uint32_t k = index; k < 16; ++k) version[k] = 0;

    // 2. Reset the face meta and the scores (also when the version is refused).
    if (faceMeta.pRegions) ReleaseFaceRegionArray(&faceMeta);
    faceMeta.pRegions = nullptr;
    faceMeta.regionCount = 0;
    faceMeta.faceNum = 0;
    faceMeta.formatVersion = OFM_FORMAT_VERSION_CURRENT;
    faceMeta.headerValue = 0.0f;
    faceMeta.imageWidth = static_cast<uint16_t>(width & 0xFFFFu);
    faceMeta.imageHeight = static_cast<uint16_t>(height & 0xFFFFu);
    ClearDate(faceMeta);
    subject = 0;
    delete[] metaArray.pScores;
    metaArray.pScores = nullptr;
    metaArray.count = 0;
    if (index > 14) {
        SetText(faceMeta, version);
        return vond::Fail(result, VOND_STATUS_FAILED, "invalid version info");
    }
    SetText(faceMeta, version);

    // 3.-4.
    if (faceRectCount == 0) return result;
    if (!pImage || !pImage->pData || pImage->order != ZBM_PIXEL_ORDER_RGB)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "invalid pImage->order");
    if (faceRectCount > 0 && !pFaceRectArray) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pFaceRectArray == NULL");
    const uint32_t W = static_cast<uint32_t>(pImage->width), H = static_cast<uint32_t>(pImage->height);
    const uint8_t* pixels = pImage->pData;
    const int32_t pitch = pImage->pitch;

    // 5.-6. Engine and its configuration.
    EngineSession s;
    if (OrielPlus_Initialize(&s.engine) != ORIEL_OK) return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_Initialize() failed");
    Oriel_engineConfig config;
    if (OrielPlus_GetEngineConfig(&config, s.engine) != ORIEL_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_GetEngineConfig() failed");
    const uint64_t P = static_cast<uint64_t>(W) * H;
    config.workPixels = P >= faceRcSize ? faceRcSize : static_cast<uint32_t>(P > 400 ? P : 400);
    config.scoreThreshold = faceEngineParam;
    config.minFacePercent = 2;
    config.localScales = 2;
    config.dictionaryMode = dicMode;
    config.flags = kEngineFlags;
    if (OrielPlus_SetEngineConfig(&config, s.engine) != ORIEL_OK)
        return vond::Fail(result, VOND_STATUS_ENGINE_CONFIG, "OrielPlus_SetEngineConfig() failed");

    // 7. Detection.
    if (faceRectCount < 0) {
        if (OrielPlus_DetectFace(pixels, W, H, ORIEL_COLOR_RGB, pitch, &s.faces, s.engine) != ORIEL_OK)
            return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_DetectFace() failed");
    } else {
        const uint32_t n = static_cast<uint32_t>(faceRectCount);
        Oriel_areaInfo* host = new (std::nothrow) Oriel_areaInfo[n]();
        if (!host) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
        for (uint32_t i = 0; i < n; ++i) {
            host[i].x = pFaceRectArray[i].x;
            host[i].y = pFaceRectArray[i].y;
            host[i].width = pFaceRectArray[i].width;
            host[i].height = pFaceRectArray[i].height;
        }
        const Oriel_faceAreaArray candidates = {n, host};
        const uint32_t rc = OrielPlus_DetectFaceLocal(pixels, W, H, ORIEL_COLOR_RGB, pitch, &candidates, &s.faces, s.engine);
        if (rc != ORIEL_OK) {
            delete[] host;
            return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_DetectFaceLocal() failed");
        }
        if (s.faces.count < n) {
            // One record per host box, in host order: the first confirmed
            // face within a quarter of the box in position and size, else
            // the box alone. Made like the engine's arrays (one malloc
            // block) so that the engine's release call frees it.
            Oriel_areaInfo* list = static_cast<Oriel_areaInfo*>(std::calloc(n, sizeof(Oriel_areaInfo)));
            if (!list) {
                delete[] host;
                return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
            }
            for (uint32_t i = 0; i < n; ++i) {
                const Oriel_areaInfo& b = host[i];
                const Oriel_areaInfo* match = nullptr;
                for (uint32_t j = 0; j < s.faces.count && !match; ++j) {
                    const Oriel_areaInfo& f = s.faces.pInfo[j];
                    if (std::fabs(b.x - f.x) <= 0.25f * b.width && std::fabs(b.y - f.y) <= 0.25f * b.height &&
                        std::fabs(b.width - f.width) <= 0.25f * b.width && std::fabs(b.height - f.height) <= 0.25f * b.height)
                        match = &f;
                }
                list[i] = match ? *match : b;
            }
            OrielPlus_ReleaseArrayMadeByDetectFace(&s.faces, s.engine);
            s.faces.count = n;
            s.faces.pInfo = list;
        }
        delete[] host;
    }

    // 8. No face.
    if (s.faces.count == 0) {
        subject = ORIEL_CLUSTER_SUBJECT_NO_FACE;
        return result;
    }

    // 9. Largest faces first.
    std::stable_sort(s.faces.pInfo, s.faces.pInfo + s.faces.count, [](const Oriel_areaInfo& a, const Oriel_areaInfo& b) {
        return a.width * a.height > b.width * b.height;
    });

    // 10. Facial subject.
    if (OrielPlus_GetFacialSubjectOfImageEx(W, H, &s.faces, &s.cluster, s.engine) != ORIEL_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_GetFacialSubjectOfImageEx() failed");
    if (s.cluster) subject = s.cluster->subject;

    // 11.-12. Identity vectors of the faces that are kept.
    const uint32_t kept = s.faces.count < kMaxFaces ? s.faces.count : kMaxFaces;
    uint32_t dim = 0;
    if (OrielPlus_GetFaceVectorDim(&dim, s.engine) != ORIEL_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_GetFaceVectorDim() failed");
    uint32_t vectorBytes = 0;
    if (!lmk::CheckedMul(dim, 4u, &vectorBytes)) return vond::Fail(result, VOND_STATUS_FAILED, "OrielPlus_GetFaceVectorDim() failed");
    s.vectors = new (std::nothrow) Oriel_faceVectorData[kept]();
    if (!s.vectors) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
    s.vectorCount = kept;
    for (uint32_t i = 0; i < kept; ++i) {
        s.vectors[i].pVector = new (std::nothrow) uint32_t[dim]();
        if (!s.vectors[i].pVector) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
    }
    for (uint32_t i = 0; i < kept; ++i) {
        Oriel_areaInfo& f = s.faces.pInfo[i];
        if (f.roll == 0.0f) f.roll = 0.0f;  // -0.0 becomes +0.0
        if (f.pitch == 0.0f) f.pitch = 0.0f;
        if (f.yaw == 0.0f) f.yaw = 0.0f;
        if (OrielPlus_MakeFaceVector(pixels, W, H, ORIEL_COLOR_RGB, pitch, &f, &s.vectors[i], s.engine) != ORIEL_OK) {
            delete[] s.vectors[i].pVector;
            s.vectors[i].pVector = nullptr;
            s.vectors[i].valid = 0;
        }
    }

    // 13. Regions.
    _FaceRegion* regions = new (std::nothrow) _FaceRegion[kept]();
    if (!regions) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);

    // 14. Optional items present in this photo.
    Presence photo;
    for (uint32_t i = 0; i < kept; ++i) {
        const Oriel_areaInfo& f = s.faces.pInfo[i];
        photo.part1 = photo.part1 || (f.part1X > 0.0f && f.part1Y > 0.0f);
        photo.part2 = photo.part2 || (f.part2X > 0.0f && f.part2Y > 0.0f);
        photo.attribute1 = photo.attribute1 || f.attribute1 >= 0.0;
        photo.attribute2 = photo.attribute2 || f.attribute2 >= 0.0;
        photo.feature = photo.feature || (s.vectors[i].valid != 0 && s.vectors[i].pVector);
    }

    // 15. Conversion to host pixels.
    const float w0 = static_cast<float>(width), h0 = static_cast<float>(height);
    for (uint32_t i = 0; i < kept; ++i) {
        if (!ConvertToFaceRegion(s.faces.pInfo[i], &s.vectors[i], vectorBytes, photo, w0, h0, regions[i])) {
            FreeRegionBuffers(regions, kept);
            delete[] regions;
            return vond::Fail(result, VOND_STATUS_FAILED, "convertToFaceRegion() failed");
        }
    }

    // 16. Scores.
    _VondOrielScore* scores = new (std::nothrow) _VondOrielScore[kept];
    if (!scores) {
        FreeRegionBuffers(regions, kept);
        delete[] regions;
        return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
    }
    for (uint32_t i = 0; i < kept; ++i) {
        scores[i].detectionScore = s.faces.pInfo[i].score;
        scores[i].blurScore = s.faces.pInfo[i].blur;
    }

    faceMeta.pRegions = regions;
    faceMeta.regionCount = kept;
    faceMeta.faceNum = static_cast<uint16_t>(kept);
    SetDateNow(faceMeta);
    metaArray.pScores = scores;
    metaArray.count = kept;
    // 17. The session releases the engine's arrays, the vectors, the cluster
    // and the engine.
    return result;
}
