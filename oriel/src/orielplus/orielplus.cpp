// The OrielPlus_* interface: argument checks, the instance mutex, image
// preparation (with the optional cache buffer) and the mapping of engine
// outcomes to status codes. The engine itself is oriel::FaceEngine.
#include <lumicor/orielplus.h>

#include <pthread.h>

#include <cstdlib>
#include <cstring>
#include <new>

#include "common/src/internal/memory.h"
#include "oriel/src/engine/face_engine.h"
#include "oriel/src/orielplus/prepared_image.h"

struct Oriel_Engine {
    pthread_mutex_t mutex;
    oriel::FaceEngine engine;
    oriel::PreparedImage cache;
};

namespace {

const Oriel_verInfo kLibVersion = {1, 5, 0, "1.5.0"};
const Oriel_verInfo kOrielVersion = {1, 0, 0, "1.0.0"};

class Locked {
public:
    explicit Locked(Oriel_Engine* e) : e_(e), ok_(pthread_mutex_lock(&e->mutex) == 0) {}
    ~Locked() {
        if (ok_) pthread_mutex_unlock(&e_->mutex);
    }
    bool ok() const { return ok_; }
    Locked(const Locked&) = delete;
    Locked& operator=(const Locked&) = delete;

private:
    Oriel_Engine* e_;
    bool ok_;
};

bool BadImage(const uint8_t* pixels, int32_t stride, OrielHandle handle) {
    return !pixels || stride == 0 || !handle;
}

// The image of one call: the cache buffer when it was made from the same
// arguments, else a temporary copy released when the call ends.
class CallImage {
public:
    bool Prepare(Oriel_Engine* e, const uint8_t* pixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                 int32_t stride) {
        if (e->cache.Matches(pixels, width, height, mode, stride)) {
            view = e->cache.View();
            return true;
        }
        if (!temp_.Prepare(pixels, width, height, mode, stride)) return false;
        view = temp_.View();
        return true;
    }
    oriel::nn::ImageView view;

private:
    oriel::PreparedImage temp_;
};

void ReleaseArray(Oriel_faceAreaArray* a) {
    std::free(a->pInfo);
    a->pInfo = nullptr;
    a->count = 0;
}

uint32_t Code(bool ok) { return ok ? ORIEL_OK : ORIEL_ERR_FAILED; }

// Shared body of the two candidate-driven detections.
uint32_t DetectAround(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                      int32_t stride, const Oriel_faceAreaArray* pCandidates, Oriel_faceAreaArray* pOut,
                      OrielHandle handle) {
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    ReleaseArray(pOut);
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    return Code(handle->engine.DetectLocal(img.view, pCandidates->pInfo, pCandidates->count, pOut));
}

}  // namespace

extern "C" {

uint32_t OrielPlus_Initialize(OrielHandle* pHandle) {
    if (!pHandle) return ORIEL_ERR_INVALID;
    *pHandle = nullptr;
    Oriel_Engine* e = new (std::nothrow) Oriel_Engine();
    if (!e) return ORIEL_ERR_IMAGE;
    if (pthread_mutex_init(&e->mutex, nullptr) != 0) {
        delete e;
        return ORIEL_ERR_LOCK;
    }
    if (!e->engine.Load()) {
        pthread_mutex_destroy(&e->mutex);
        delete e;
        return ORIEL_ERR_NOT_LOADED;
    }
    if (pthread_mutex_lock(&e->mutex) != 0 || pthread_mutex_unlock(&e->mutex) != 0) {
        pthread_mutex_destroy(&e->mutex);
        delete e;
        return ORIEL_ERR_LOCK;
    }
    *pHandle = e;
    return ORIEL_OK;
}

uint32_t OrielPlus_Finalize(OrielHandle* pHandle) {
    if (!pHandle || !*pHandle) return ORIEL_ERR_INVALID;
    Oriel_Engine* e = *pHandle;
    // A mutex still held by another thread cannot be torn down: report it
    // and keep the instance.
    const int rc = pthread_mutex_destroy(&e->mutex);
    if (rc != 0) return static_cast<uint32_t>(rc);
    delete e;
    *pHandle = nullptr;
    return ORIEL_OK;
}

const Oriel_verInfo* OrielPlus_GetLibVersion(void) { return &kLibVersion; }

const Oriel_verInfo* OrielPlus_GetOrielVersion(void) { return &kOrielVersion; }

uint32_t OrielPlus_SetMaxOmpThreads(int32_t threads, OrielHandle handle) {
    (void)threads;
    (void)handle;
    return ORIEL_ERR_UNSUPPORTED;
}

uint32_t OrielPlus_DetectFace(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                              int32_t stride, Oriel_faceAreaArray* pOut, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pOut) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    ReleaseArray(pOut);
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    return Code(handle->engine.Detect(img.view, nullptr, 0, pOut));
}

uint32_t OrielPlus_DetectFaceSpatial(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, Oriel_areaArray areas,
                                     Oriel_faceAreaArray* pOut, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pOut || (areas.count != 0 && !areas.pAreas)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    ReleaseArray(pOut);
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    return Code(handle->engine.Detect(img.view, areas.pAreas, areas.count, pOut));
}

uint32_t OrielPlus_DetectFaceLocal(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                   int32_t stride, const Oriel_faceAreaArray* pCandidates, Oriel_faceAreaArray* pOut,
                                   OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pCandidates || pCandidates->count == 0 || !pCandidates->pInfo || !pOut)
        return ORIEL_ERR_INVALID;
    return DetectAround(pPixels, width, height, mode, stride, pCandidates, pOut, handle);
}

uint32_t OrielPlus_DetectFaceReferred(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                      Oriel_InputColorMode mode, int32_t stride, const Oriel_faceAreaArray* pCandidates,
                                      Oriel_faceAreaArray* pOut, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pCandidates || pCandidates->count == 0 || !pCandidates->pInfo || !pOut)
        return ORIEL_ERR_INVALID;
    if (mode != ORIEL_COLOR_GRAY) return ORIEL_ERR_UNSUPPORTED;
    return DetectAround(pPixels, width, height, mode, stride, pCandidates, pOut, handle);
}

uint32_t OrielPlus_PartsLocate(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                               int32_t stride, Oriel_faceAreaArray* pFaces, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pFaces || pFaces->count == 0 || !pFaces->pInfo) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_LANDMARKS)) return ORIEL_ERR_NOT_LOADED;
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    bool ok = true;
    for (uint32_t i = 0; i < pFaces->count; ++i) ok = handle->engine.LocateParts(img.view, &pFaces->pInfo[i]) && ok;
    return Code(ok);
}

uint32_t OrielPlus_AllPartsLocate(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                  int32_t stride, const Oriel_faceAreaArray* pFaces, Oriel_faceAllPartsArray* pOut,
                                  OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pFaces || !pOut || pFaces->count != pOut->count ||
        (pFaces->count != 0 && (!pFaces->pInfo || !pOut->pParts)))
        return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_LANDMARKS)) return ORIEL_ERR_NOT_LOADED;
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    bool ok = true;
    for (uint32_t i = 0; i < pFaces->count; ++i) {
        const Oriel_areaInfo& f = pFaces->pInfo[i];
        Oriel_faceAllParts& out = pOut->pParts[i];
        std::memset(&out, 0, sizeof out);
        oriel::Landmarks lm;
        bool located = false;
        if (!handle->engine.LocateLandmarks(img.view, f, &lm, &located) || !located) {
            ok = false;
            continue;
        }
        const float bx = f.x * img.view.w, by = f.y * img.view.h;
        const float bw = f.width * img.view.w, bh = f.height * img.view.h;
        if (!(bw > 0.0f) || !(bh > 0.0f)) {
            ok = false;
            continue;
        }
        out.count = ORIEL_ALL_PARTS;
        for (int k = 0; k < ORIEL_ALL_PARTS; ++k) {
            out.x[k] = (lm.x[k] - bx) / bw;
            out.y[k] = (lm.y[k] - by) / bh;
        }
    }
    return Code(ok);
}

uint32_t OrielPlus_AttributeClassify(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, Oriel_faceAreaArray* pFaces,
                                     OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pFaces || pFaces->count == 0 || !pFaces->pInfo) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    oriel::FaceEngine& engine = handle->engine;
    if (!engine.Has(ORIEL_NET_LANDMARKS) || !engine.Has(ORIEL_NET_EXPRESSION) || !engine.Has(ORIEL_NET_AGE))
        return ORIEL_ERR_NOT_LOADED;
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    // Two steps: parts (where not yet located), then the attributes.
    bool parts = true, attributes = true;
    for (uint32_t i = 0; i < pFaces->count; ++i) {
        Oriel_areaInfo& f = pFaces->pInfo[i];
        if (f.partLevels < 2) parts = engine.LocateParts(img.view, &f) && parts;
    }
    for (uint32_t i = 0; i < pFaces->count; ++i)
        attributes = engine.ClassifyAttributes(img.view, &pFaces->pInfo[i]) && attributes;
    return Code(parts && attributes);
}

uint32_t OrielPlus_MakeFaceVector(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                  int32_t stride, const Oriel_areaInfo* pFace, Oriel_faceVectorData* pOut,
                                  OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || !pFace || !pOut || !pOut->pVector) return ORIEL_ERR_INVALID;
    const Oriel_areaInfo face = *pFace;
    if (face.x + face.y + face.width + face.height == 0.0f) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    return Code(handle->engine.MakeVector(img.view, face, pOut));
}

uint32_t OrielPlus_MakeFaceVectorEx(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                    Oriel_InputColorMode mode, int32_t stride, const Oriel_faceAreaArray* pFaces,
                                    Oriel_faceVectorArray* pVectors, uint8_t** ppBlock, uint32_t minFaceSide,
                                    uint32_t maxFaces, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle) || width == 0 || height == 0 || !pFaces || !pVectors || !ppBlock ||
        pFaces->count == 0 || pFaces->count != pVectors->count || !pFaces->pInfo || !pVectors->pVectors)
        return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    CallImage img;
    if (!img.Prepare(handle, pPixels, width, height, mode, stride)) return ORIEL_ERR_IMAGE;
    const uint32_t words = (ORIEL_VECTOR_BYTES + 3) / 4;
    uint32_t total;
    if (!lmk::CheckedMul(pFaces->count, words * 4u, &total)) return ORIEL_ERR_FAILED;
    uint8_t* block = static_cast<uint8_t*>(std::calloc(total, 1));
    if (!block) return ORIEL_ERR_FAILED;
    bool ok = true;
    for (uint32_t i = 0; i < pFaces->count; ++i) {
        Oriel_faceVectorData& v = pVectors->pVectors[i];
        std::memset(&v, 0, sizeof v);
        v.pVector = reinterpret_cast<uint32_t*>(block) + static_cast<size_t>(i) * words;
        const Oriel_areaInfo& f = pFaces->pInfo[i];
        const float side = f.width * width < f.height * height ? f.width * width : f.height * height;
        if ((maxFaces != 0 && i >= maxFaces) || side < static_cast<float>(minFaceSide)) continue;
        if (f.x + f.y + f.width + f.height == 0.0f) continue;
        if (!handle->engine.MakeVector(img.view, f, &v)) ok = false;
    }
    *ppBlock = block;
    return Code(ok);
}

uint32_t OrielPlus_CreateCacheBuffer(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, OrielHandle handle) {
    if (BadImage(pPixels, stride, handle)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    return handle->cache.Prepare(pPixels, width, height, mode, stride) ? ORIEL_OK : ORIEL_ERR_IMAGE;
}

uint32_t OrielPlus_DisposeCacheBuffer(OrielHandle handle) {
    if (!handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    handle->cache.Reset();
    return ORIEL_OK;
}

uint32_t OrielPlus_CalcSimilarity(const Oriel_faceVectorData* pA, const Oriel_faceVectorData* pB, float* pOut,
                                  OrielHandle handle) {
    if (!pA || !pB || !pOut || !handle) return ORIEL_ERR_INVALID;
    // No lock: only the vectors are read.
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    float a[ORIEL_VECTOR_LENGTH], b[ORIEL_VECTOR_LENGTH];
    if (!oriel::FaceEngine::UnpackVector(*pA, a) || !oriel::FaceEngine::UnpackVector(*pB, b)) return ORIEL_ERR_FAILED;
    *pOut = oriel::FaceEngine::Similarity(a, b);
    return ORIEL_OK;
}

uint32_t OrielPlus_CalcSimilarityArray(const Oriel_faceVectorData* pA, const Oriel_faceVectorArray* pArray,
                                       float* pOut, OrielHandle handle) {
    if (!pA || !pArray || !pOut || !handle || pArray->count == 0 || !pArray->pVectors) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    float a[ORIEL_VECTOR_LENGTH], b[ORIEL_VECTOR_LENGTH];
    if (!oriel::FaceEngine::UnpackVector(*pA, a)) return ORIEL_ERR_FAILED;
    float best = 1.0f;
    bool any = false;
    for (uint32_t i = 0; i < pArray->count; ++i) {
        if (!oriel::FaceEngine::UnpackVector(pArray->pVectors[i], b)) continue;
        const float s = oriel::FaceEngine::Similarity(a, b);
        if (!any || s > best) best = s;
        any = true;
    }
    *pOut = best;
    return ORIEL_OK;
}

uint32_t OrielPlus_AverageFaceVectors(const Oriel_faceVectorData* pA, const Oriel_faceVectorData* pB,
                                      Oriel_faceVectorData* pOut, OrielHandle handle) {
    if (!pA || !pB || !pOut || !pOut->pVector || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    float a[ORIEL_VECTOR_LENGTH], b[ORIEL_VECTOR_LENGTH];
    if (!oriel::FaceEngine::UnpackVector(*pA, a) || !oriel::FaceEngine::UnpackVector(*pB, b)) return ORIEL_ERR_FAILED;
    for (uint32_t i = 0; i < ORIEL_VECTOR_LENGTH; ++i) a[i] += b[i];
    pOut->valid = 0;
    if (!oriel::FaceEngine::PackVector(a, pOut->pVector)) return ORIEL_ERR_FAILED;
    pOut->format = ORIEL_VECTOR_FORMAT;
    pOut->byteSize = ORIEL_VECTOR_BYTES;
    pOut->aligned = (pA->aligned && pB->aligned) ? 1u : 0u;
    pOut->valid = 1;
    return ORIEL_OK;
}

uint32_t OrielPlus_GetFaceVectorDim(uint32_t* pDim, OrielHandle handle) {
    if (!pDim || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    *pDim = (ORIEL_VECTOR_BYTES + 3) / 4;
    return ORIEL_OK;
}

uint32_t OrielPlus_CheckIdentCondition(int32_t imageWidth, int32_t imageHeight, const Oriel_areaInfo* pFace,
                                       int32_t* pSuitable, OrielHandle handle) {
    if (!pFace || !pSuitable || !handle) return ORIEL_ERR_INVALID;
    const Oriel_areaInfo f = *pFace;
    if (f.partLevels == 0 || f.partLevels == -1) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.Has(ORIEL_NET_RECOGNITION)) return ORIEL_ERR_NOT_LOADED;
    const float w = f.width * static_cast<float>(imageWidth), h = f.height * static_cast<float>(imageHeight);
    const float limit = 45.0f * 3.14159265f / 180.0f;
    *pSuitable = (f.partLevels >= 2 && (w < h ? w : h) >= 40.0f && f.yaw <= limit && f.yaw >= -limit &&
                  f.roll <= limit && f.roll >= -limit)
                     ? 1
                     : 0;
    return ORIEL_OK;
}

uint32_t OrielPlus_GetFacialSubjectOfImage(uint32_t width, uint32_t height, const Oriel_faceAreaArray* pFaces,
                                           Oriel_ClusterSubject* pSubject, OrielHandle handle) {
    if (!pFaces || !pSubject || !handle || (pFaces->count != 0 && !pFaces->pInfo)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    *pSubject = oriel::FaceEngine::Cluster(width, height, pFaces->pInfo, pFaces->count, nullptr);
    return ORIEL_OK;
}

uint32_t OrielPlus_GetFacialSubjectOfImageEx(uint32_t width, uint32_t height, const Oriel_faceAreaArray* pFaces,
                                             Oriel_faceSubjectCluster** ppCluster, OrielHandle handle) {
    if (!pFaces || !ppCluster || !handle || (pFaces->count != 0 && !pFaces->pInfo)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    if (*ppCluster) return ORIEL_ERR_CLUSTER_SET;
    Oriel_faceSubjectCluster* c = static_cast<Oriel_faceSubjectCluster*>(std::malloc(sizeof(Oriel_faceSubjectCluster)));
    if (!c) return ORIEL_ERR_FAILED;
    oriel::FaceEngine::Cluster(width, height, pFaces->pInfo, pFaces->count, c);
    *ppCluster = c;
    return ORIEL_OK;
}

uint32_t OrielPlus_DisposeFaceSubjectCluster(Oriel_faceSubjectCluster* pCluster, OrielHandle handle) {
    if (!pCluster || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    std::free(pCluster);
    return ORIEL_OK;
}

uint32_t OrielPlus_GetEngineConfig(Oriel_engineConfig* pConfig, OrielHandle handle) {
    if (!pConfig || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    *pConfig = handle->engine.Config();
    return ORIEL_OK;
}

uint32_t OrielPlus_SetEngineConfig(const Oriel_engineConfig* pConfig, OrielHandle handle) {
    if (!pConfig || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    handle->engine.Config() = *pConfig;
    return ORIEL_OK;
}

uint32_t OrielPlus_GetEngineConfigLayers(const Oriel_engineConfigLayer** ppLayers, uint32_t* pCount,
                                         OrielHandle handle) {
    if (!ppLayers || !pCount || !handle) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    *ppLayers = handle->engine.Layers();
    *pCount = ORIEL_NET_COUNT;
    return ORIEL_OK;
}

uint32_t OrielPlus_SetEngineConfigLayers(const Oriel_engineConfigLayer* pLayers, uint32_t count, OrielHandle handle) {
    if (!handle || (count != 0 && !pLayers)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    handle->engine.SetLayers(pLayers, count);
    return ORIEL_OK;
}

uint32_t OrielPlus_ReleaseArrayMadeByDetectFace(Oriel_faceAreaArray* pArray, OrielHandle handle) {
    if (!pArray || !handle || (pArray->count == 0 && pArray->pInfo)) return ORIEL_ERR_INVALID;
    Locked lock(handle);
    if (!lock.ok()) return ORIEL_ERR_LOCK;
    if (!handle->engine.HasDetector()) return ORIEL_ERR_NOT_LOADED;
    ReleaseArray(pArray);
    return ORIEL_OK;
}

}  // extern "C"
