// The face section of the photo meta: the facial-subject code, one score
// pair per face and the face meta in an OFM container, always big-endian.
#include "lumicor/src/glue/vond_result.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstdio>
#include <cstring>

namespace {

constexpr uint32_t kPrefixSize = 8;      // subject, score count
constexpr uint32_t kScorePairSize = 8;  // detectionScore, blurScore

const char kBufferNotAllocated[] = "Buffer size is not correctly allocated.";
const char kReadBufferTooSmall[] = "Read buffer size is too small.";
const char kAllocationFailed[] = "VOND_NEW failed";

void ClearFaceSection(_FaceMeta& faceMeta, Oriel_ClusterSubject& subject, _VondOrielMetaArray& metaArray) {
    VondOrielDisposeMeta(faceMeta, metaArray);
    std::memset(static_cast<void*>(&faceMeta), 0, sizeof faceMeta);
    subject = 0;
}

}  // namespace

uint32_t VondOrielGetSerializedSize(const _FaceMeta& faceMeta) {
    const uint32_t count = faceMeta.regionCount;
    if (faceMeta.faceNum != count) return 0;
    uint32_t containerSize = 0, scores = 0, total = 0;
    if (OFM_GetOfmBufferSize(faceMeta.pRegions, count, OFM_FORMAT_VERSION_CURRENT, &containerSize) != OFM_OK) return 0;
    if (!lmk::CheckedMul(count, kScorePairSize, &scores) || !lmk::CheckedAdd(kPrefixSize, scores, &total) ||
        !lmk::CheckedAdd(total, containerSize, &total)) {
        return 0;
    }
    return total;
}

_VondResult VondOrielSerialize(const _FaceMeta& faceMeta, Oriel_ClusterSubject subject,
                               const _VondOrielMetaArray& metaArray, uint8_t* pBuf, uint32_t bufSize,
                               uint32_t& written) {
    _VondResult result = vond::Begin("VondOrielSerialize");
    written = 0;
    if (bufSize <= 3) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kBufferNotAllocated);
    if (!pBuf) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pBuf == NULL");
    const uint32_t count = metaArray.count;
    if (count != 0 && !metaArray.pScores) {
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "metaArray.pScores == NULL");
    }
    // One score pair per face: the section size is computed from the regions.
    if (count != faceMeta.regionCount) {
        return vond::Fail(result, VOND_STATUS_FAILED, "metaArray.count != faceMeta.regionCount");
    }

    lmk::ByteWriter w(pBuf, bufSize, ZBM_WRITE_ENDIAN_BIG);
    w.U32(subject);
    w.U32(count);
    for (uint32_t i = 0; i < count; ++i) {
        w.F32(metaArray.pScores[i].detectionScore);
        w.F32(metaArray.pScores[i].blurScore);
    }
    if (!w.ok()) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kBufferNotAllocated);

    uint32_t containerSize = 0;
    if (OFM_SerializeOfm(OFM_BYTE_ORDER_BIG, w.current(), w.remaining(), &faceMeta, &containerSize) != OFM_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "OFM_SerializeOfm() failed");
    }
    written = w.position() + containerSize;
    return result;
}

_VondResult VondOrielParse(const uint8_t* pBuf, uint32_t bufSize, _FaceMeta& faceMeta, Oriel_ClusterSubject& subject,
                           _VondOrielMetaArray& metaArray, uint32_t& consumed) {
    _VondResult result = vond::Begin("VondOrielParse");
    ClearFaceSection(faceMeta, subject, metaArray);
    consumed = 0;
    if (bufSize < kPrefixSize) return vond::Fail(result, VOND_STATUS_FAILED, kReadBufferTooSmall);
    if (!pBuf) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pBuf == NULL");

    // Whatever fails below leaves the section empty.
    auto clear = lmk::MakeScopeGuard([&] { ClearFaceSection(faceMeta, subject, metaArray); });

    lmk::ByteReader r(pBuf, bufSize, ZBM_WRITE_ENDIAN_BIG);
    const Oriel_ClusterSubject readSubject = r.U32();
    const uint32_t count = r.U32();
    uint32_t scoreBytes = 0;
    if (!lmk::CheckedMul(count, kScorePairSize, &scoreBytes) || scoreBytes > r.remaining()) {
        return vond::Fail(result, VOND_STATUS_FAILED, kReadBufferTooSmall);
    }
    lmk::UniqueArray<_VondOrielScore> scores = lmk::NewArray<_VondOrielScore>(count);
    if (count != 0 && !scores) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
    for (uint32_t i = 0; i < count; ++i) {
        scores[i].detectionScore = r.F32();
        scores[i].blurScore = r.F32();
    }

    OfmHeader header;
    if (OFM_GetOfmHeader(OFM_BYTE_ORDER_BIG, r.current(), r.remaining(), &header) != OFM_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "OFM_GetOfmHeader() failed");
    }
    const uint16_t faceNum = header.faceNum;
    if (faceNum != count) return vond::Fail(result, VOND_STATUS_FAILED, "metaArray.count != faceNum");
    r.Skip(header.headerSize);
    const uint8_t* entries = r.current();
    const uint32_t entriesLen = r.remaining();

    if (faceNum != 0) {
        uint8_t fixedBits[16], varBits[16];
        for (int i = 0; i < 16; ++i) {
            fixedBits[i] = header.fixedBits[i];
            varBits[i] = header.varBits[i];
        }
        uint16_t maxAttributes = 0, maxParts = 0, maxFeature = 0;
        if (OFM_GetOfmSize(OFM_BYTE_ORDER_BIG, header.entrySize, header.fixedSize, faceNum, fixedBits, 16, varBits, 16,
                           entries, entriesLen, &maxAttributes, &maxParts, &maxFeature) != OFM_OK) {
            return vond::Fail(result, VOND_STATUS_FAILED, "OFM_GetOfmSize() failed");
        }
        _FaceRegion* regions = lmk::NewArray<_FaceRegion>(faceNum).release();
        if (!regions) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
        faceMeta.pRegions = regions;
        faceMeta.regionCount = faceNum;
        for (uint32_t i = 0; i < faceNum; ++i) {
            if (CreateFaceRegion(maxAttributes, maxParts, maxFeature, &regions[i]) != OFM_OK) {
                return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, kAllocationFailed);
            }
        }
    }
    if (OFM_ParseOfm(&header, entries, entriesLen, &faceMeta) != OFM_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "OFM_ParseOfmData() failed");
    }

    clear.Dismiss();
    subject = readSubject;
    metaArray.count = count;
    metaArray.pScores = scores.release();
    consumed = kPrefixSize + scoreBytes + header.headerSize + static_cast<uint32_t>(faceNum) * header.entrySize;
    return result;
}

void VondOrielDump(const _FaceMeta& faceMeta, Oriel_ClusterSubject subject, const _VondOrielMetaArray& metaArray) {
    const uint32_t count = faceMeta.regionCount;
    const _FaceRegion* regions = faceMeta.pRegions;
    std::printf("\n*** VondOrielDump() ***\n");
    std::printf("subject : %d\n", static_cast<int>(subject));
    std::printf("faceNum : %d\n", static_cast<int>(count));
    for (uint32_t i = 0; regions && i < count; ++i) {
        const _FaceRegion& r = regions[i];
        const zbm_Rect area = r.faceArea;
        const zbm_Pos leftEye = r.leftEye, rightEye = r.rightEye;
        const zbm_Pos leftMouth = r.leftMouthEnd, rightMouth = r.rightMouthEnd;
        std::printf("cnt  : %d\n", static_cast<int>(i));
        std::printf("face area : x=%d, y=%d, w=%d, h=%d\n", area.x, area.y, area.width, area.height);
        std::printf("left  eye : x=%d, y=%d\n", leftEye.x, leftEye.y);
        std::printf("right eye : x=%d, y=%d\n", rightEye.x, rightEye.y);
        std::printf("left  mouth end : x=%d, y=%d\n", leftMouth.x, leftMouth.y);
        std::printf("right mouth end : x=%d, y=%d\n", rightMouth.x, rightMouth.y);
        std::printf("orientation : %d\n", r.orientation);
        // Printed in the engine's order (roll, pitch, yaw); the region stores them reversed.
        std::printf("rotation : %f %f %f\n", static_cast<double>(r.rotation[2]), static_cast<double>(r.rotation[1]),
                    static_cast<double>(r.rotation[0]));
        std::printf("age : min=%d, max=%d\n", r.ageMin, r.ageMax);
        const uint8_t* attributes = r.pAttributes;
        const uint32_t attributeCount = attributes ? r.attributeCount : 0;
        for (uint32_t k = 0; k < attributeCount; ++k) {
            std::printf("attribute : id=%d, score=%d\n", attributes[2 * k], attributes[2 * k + 1]);
        }
        // featureType comes from the blob and need not be terminated.
        char featureType[17];
        for (int k = 0; k < 16; ++k) featureType[k] = r.featureType[k];
        featureType[16] = '\0';
        std::printf("feature : size=%d type=%s\n", static_cast<int>(r.featureSize), featureType);
        if (metaArray.pScores && i < metaArray.count) {
            std::printf("blurScore: %f\n", static_cast<double>(metaArray.pScores[i].blurScore));
            std::printf("detectionScore: %f\n", static_cast<double>(metaArray.pScores[i].detectionScore));
        }
        std::printf("\n\n");
    }
}

void VondOrielDisposeMeta(_FaceMeta& faceMeta, _VondOrielMetaArray& metaArray) {
    if (faceMeta.pRegions) ReleaseFaceRegionArray(&faceMeta);
    delete[] metaArray.pScores;
    metaArray.pScores = nullptr;
    metaArray.count = 0;
}
