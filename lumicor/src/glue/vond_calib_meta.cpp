// Attention section of the photo meta: the attention library's version, the
// analysed size and the attention areas, written, read, printed and freed.
//
// Section layout (big-endian):
//   16 bytes library version text, 1 byte isFace (0/1), 1 byte area count,
//   2 bytes analysed width, 2 bytes analysed height, then per area the four
//   float fractions (32-bit patterns) and the value in one byte.
#include "lumicor/src/glue/vond_result.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <new>

namespace {

constexpr uint32_t kFixedSize = 22;  // version + isFace + count + width + height
constexpr uint32_t kAreaSize = 17;   // four floats and the value byte
// The count travels in one byte.
constexpr uint32_t kMaxAreas = 255;
// Areas an analysis keeps (the largest), and the smallest working image the
// attention engine is run on.
constexpr uint32_t kMaxKeptAreas = 32;
constexpr int32_t kMinAnalyzedSide = 240;

// Section size for `numAreas` areas; false when it does not fit in 32 bits.
bool SectionSize(uint32_t numAreas, uint32_t* size) {
    uint32_t areaBytes;
    return lmk::CheckedMul(numAreas, kAreaSize, &areaBytes) && lmk::CheckedAdd(kFixedSize, areaBytes, size);
}

}  // namespace

_VondResult VondCALibAnalyze(const _zbm_Image* pImage, const _FaceMeta& faceMeta, _CAAttentionAreaArray& areas,
                             _CALibVersion& version) {
    _VondResult result = vond::Begin("VondCALibAnalyze");
    std::memset(&areas, 0, sizeof areas);
    // The version is recorded also when the areas are skipped or fail.
    version = CAGetLibVersion();
    if (pImage == nullptr || pImage->order != ZBM_PIXEL_ORDER_RGB)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "invalid pImage->order");
    if (pImage->width < kMinAnalyzedSide || pImage->height < kMinAnalyzedSide) {
        // Not a failure: the photo simply has no attention areas.
        result.message = "analyze process is skipped since image size is too small";
        return result;
    }

    // The faces found earlier, as fractions of the photo with the engine's
    // roll, pitch and yaw (the region stores them in reverse order).
    const uint32_t faceCount = faceMeta.regionCount;
    const _FaceRegion* regions = faceMeta.pRegions;
    const float imageWidth = static_cast<float>(faceMeta.imageWidth);
    const float imageHeight = static_cast<float>(faceMeta.imageHeight);
    lmk::UniqueArray<CAFaceInfo> faces;
    if (faceCount != 0 && regions != nullptr) {
        faces = lmk::NewArray<CAFaceInfo>(faceCount);
        if (!faces) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "VOND_NEW failed");
        for (uint32_t i = 0; i < faceCount; ++i) {
            const _FaceRegion& region = regions[i];
            const zbm_Rect box = region.faceArea;  // packed: copied, not referenced
            float rotation[3];                     // yaw, pitch, roll
            std::memcpy(rotation, reinterpret_cast<const uint8_t*>(&region) + offsetof(_FaceRegion, rotation),
                        sizeof rotation);
            CAFaceInfo& face = faces[i];
            face.nx = static_cast<float>(box.x) / imageWidth;
            face.ny = static_cast<float>(box.y) / imageHeight;
            face.nw = static_cast<float>(box.width) / imageWidth;
            face.nh = static_cast<float>(box.height) / imageHeight;
            face.roll = rotation[2];
            face.pitch = rotation[1];
            face.yaw = rotation[0];
        }
    }
    const _CAFaceInfoArray faceList = {faces ? static_cast<int32_t>(faceCount) : 0, faces.get()};

    _CAAttentionAreaArray found;
    std::memset(&found, 0, sizeof found);
    // The library's array is released on every path.
    auto releaseFound = lmk::MakeScopeGuard([&found] { CADisposeAttentionAreaArray(&found); });
    if (CADetectSubject(pImage->pData, static_cast<uint32_t>(pImage->width), static_cast<uint32_t>(pImage->height),
                        pImage->pitch, CA_COLOR_ORDER_RGB, &faceList, &found) != 0 ||
        (found.numAreas != 0 && found.pAreaArray == nullptr)) {
        return vond::Fail(result, VOND_STATUS_FAILED, "CADetectSubject failed");
    }

    // Largest areas first; areas of equal size keep their order. An insertion
    // sort: the list is short, and it needs no memory that could run out.
    CAAttentionArea* list = found.pAreaArray;
    for (uint32_t i = 1; i < found.numAreas; ++i) {
        const CAAttentionArea area = list[i];
        const float size = area.nw * area.nh;
        uint32_t j = i;
        for (; j > 0 && list[j - 1].nw * list[j - 1].nh < size; --j) list[j] = list[j - 1];
        list[j] = area;
    }
    const uint32_t kept = found.numAreas < kMaxKeptAreas ? found.numAreas : kMaxKeptAreas;
    if (kept != 0) {
        CAAttentionArea* records = new (std::nothrow) CAAttentionArea[kept];
        if (records == nullptr)
            return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "VOND_NEW CAAttentionArea[areaArray.numAreas] failed");
        std::memcpy(records, found.pAreaArray, sizeof(CAAttentionArea) * kept);
        areas.pAreaArray = records;
    }
    areas.isFace = found.isFace;
    areas.numAreas = kept;
    return result;
}

uint32_t VondCALibGetSerializedSize(const _CAAttentionAreaArray& areas) {
    uint32_t size = 0;
    return SectionSize(areas.numAreas, &size) ? size : 0;
}

_VondResult VondCALibSerialize(const _CAAttentionAreaArray& areas, const _CALibVersion& version, uint16_t width,
                               uint16_t height, uint8_t* pBuf, uint32_t bufSize, uint32_t& written) {
    _VondResult result = vond::Begin("VondCALibSerialize");
    written = 0;
    if (pBuf == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pBuf == NULL");
    uint32_t size = 0;
    const bool sizeKnown = SectionSize(areas.numAreas, &size);
    if (sizeKnown && size > bufSize) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pBuf < serializedSize");
    if (areas.numAreas > kMaxAreas) return vond::Fail(result, VOND_STATUS_FAILED, "areaArray.numAreas > 255");
    // A count without records cannot be written (it would be read from nowhere).
    if (areas.numAreas != 0 && areas.pAreaArray == nullptr)
        return vond::Fail(result, VOND_STATUS_FAILED, "areaArray.pAreaArray == NULL");

    lmk::ByteWriter out(pBuf, bufSize);
    out.Bytes(version.text, sizeof version.text);
    out.U8(areas.isFace != 0 ? 1 : 0);
    out.U8(static_cast<uint8_t>(areas.numAreas));
    out.U16(width);
    out.U16(height);
    for (uint32_t i = 0; i < areas.numAreas; ++i) {
        const CAAttentionArea& area = areas.pAreaArray[i];
        uint8_t value;
        if (areas.isFace != 0) {
            // Signed compare: a negative direction (e.g. -1 for "unknown") is
            // written as its low byte.
            if (area.val.direction > 255)
                return vond::Fail(result, VOND_STATUS_FAILED, "pArea->val.direction > 255");
            value = static_cast<uint8_t>(area.val.direction & 0xFF);
        } else {
            if (area.val.saliency > 255u)
                return vond::Fail(result, VOND_STATUS_FAILED, "pArea->val.saliency > 255");
            value = static_cast<uint8_t>(area.val.saliency);
        }
        out.F32(area.nx);
        out.F32(area.ny);
        out.F32(area.nw);
        out.F32(area.nh);
        out.U8(value);
    }
    // The size was checked against bufSize above, so the writer cannot have
    // run short; this guards the invariant rather than the input.
    if (!out.ok() || out.position() != size) return vond::Fail(result, VOND_STATUS_FAILED, "pBuf < serializedSize");
    written = out.position();
    return result;
}

_VondResult VondCALibParse(const uint8_t* pBuf, uint32_t bufSize, _CAAttentionAreaArray& areas,
                           _CALibVersion& version, uint16_t& width, uint16_t& height, uint32_t& consumed) {
    _VondResult result = vond::Begin("VondCALibParse");
    std::memset(&areas, 0, sizeof areas);
    width = 0;
    height = 0;
    consumed = 0;
    if (pBuf == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pBuf == NULL");
    if (bufSize < kFixedSize)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "bufSize < VondCALibGetSerializedSizeMax(0)");

    lmk::ByteReader in(pBuf, bufSize);
    in.Bytes(version.text, sizeof version.text);
    const uint8_t isFace = in.U8();
    const uint32_t numAreas = in.U8();
    width = in.U16();
    height = in.U16();
    areas.isFace = isFace;
    // At most 255 areas: the size cannot overflow.
    const uint32_t size = kFixedSize + kAreaSize * numAreas;
    if (bufSize < size)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER,
                          "bufSize < VondCALibGetSerializedSizeMax(areaArray.numAreas)");

    if (numAreas != 0) {
        CAAttentionArea* records = new (std::nothrow) CAAttentionArea[numAreas]();
        if (records == nullptr) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "VOND_NEW failed");
        for (uint32_t i = 0; i < numAreas; ++i) {
            CAAttentionArea& area = records[i];
            area.nx = in.F32();
            area.ny = in.F32();
            area.nw = in.F32();
            area.nh = in.F32();
            area.val.saliency = in.U8();  // the byte widened to 32 bits, for either meaning
        }
        // The count is set together with the records so that the record never
        // claims areas it does not hold.
        areas.pAreaArray = records;
        areas.numAreas = numAreas;
    }
    consumed = size;
    return result;
}

void VondCALibDump(const _CAAttentionAreaArray& areas) {
    std::printf("\n*** VondCALibDump() ***\n");
    std::printf("isFace = %s\n", areas.isFace != 0 ? "true" : "false");
    std::printf("numAreas = %d\n", static_cast<int>(areas.numAreas));
    if (areas.pAreaArray == nullptr) return;
    for (uint32_t i = 0; i < areas.numAreas; ++i) {
        const CAAttentionArea& area = areas.pAreaArray[i];
        std::printf("\t nx = %f\n", static_cast<double>(area.nx));
        std::printf("\t ny = %f\n", static_cast<double>(area.ny));
        std::printf("\t nw = %f\n", static_cast<double>(area.nw));
        std::printf("\t nh = %f\n", static_cast<double>(area.nh));
        if (areas.isFace != 0)
            std::printf("\t direction = %d\n", static_cast<int>(area.val.direction));
        else
            std::printf("\t saliency = %d\n", static_cast<int>(area.val.saliency));
    }
}

void VondCALibDisposeMeta(_CAAttentionAreaArray& areas) {
    delete[] areas.pAreaArray;
    std::memset(&areas, 0, sizeof areas);
}
