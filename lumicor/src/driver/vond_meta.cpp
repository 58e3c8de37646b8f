// The photo meta blob: version constant, size, writer, reader, dump and
// release of a _VondMeta record.
//
// Blob layout (big-endian): "VOND", total size, major, minor, metaVersion,
// flags, build, faceDetectDicMode, faceEngineParam bits, faceRcSize (28 bytes),
// then the face, quality and attention sections, then the signature reversed
// ("DNOV") as a 4-byte footer.
#include "lumicor/src/driver/vond_meta_sections.h"
#include "lumicor/src/glue/vond_result.h"

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

#include <cstring>

namespace {

const uint8_t kSignature[4] = {'V', 'O', 'N', 'D'};
constexpr uint32_t kHeaderSize = 28;
constexpr uint32_t kFooterSize = 4;
// getSerializedHeaderFooterSize(): the smallest possible blob.
constexpr uint32_t kHeaderFooterSize = kHeaderSize + kFooterSize;

const _VondVersion kVersion = {1, 5, 8, 0, 0x13121700u};

bool IsSupportedMetaVersion(uint8_t metaVersion) { return metaVersion >= 6 && metaVersion <= 8; }

uint32_t FaceSize(const _VondMeta& m) { return VondOrielGetSerializedSize(m.faceMeta); }
uint32_t QualitySize(const _VondMeta& m) {
    return VondKtLibGetSerializedSize(m.similarity, m.representative, m.colorLabel);
}
uint32_t AttentionSize(const _VondMeta& m) { return VondCALibGetSerializedSize(m.attentionAreas); }

_VondResult FaceWrite(const _VondMeta& m, uint8_t* p, uint32_t n, uint32_t& written) {
    return VondOrielSerialize(m.faceMeta, m.clusterSubject, m.faceMetaArray, p, n, written);
}
_VondResult QualityWrite(const _VondMeta& m, uint8_t* p, uint32_t n, uint32_t& written) {
    return VondKtLibSerialize(m.simlEngineVersion, m.simlMetaVersion, m.similarity, m.repmEngineVersion,
                              m.repmMetaVersion, m.representative, m.clblEngineVersion, m.clblMetaVersion,
                              m.colorLabel, p, n, written);
}
_VondResult AttentionWrite(const _VondMeta& m, uint8_t* p, uint32_t n, uint32_t& written) {
    return VondCALibSerialize(m.attentionAreas, m.caLibVersion, m.analyzedWidth, m.analyzedHeight, p, n, written);
}

// The section readers, in blob order.
using SectionReader = _VondResult (*)(_VondMeta& m, const uint8_t* p, uint32_t n, uint32_t& consumed);
_VondResult FaceRead(_VondMeta& m, const uint8_t* p, uint32_t n, uint32_t& consumed) {
    return VondOrielParse(p, n, m.faceMeta, m.clusterSubject, m.faceMetaArray, consumed);
}
_VondResult QualityRead(_VondMeta& m, const uint8_t* p, uint32_t n, uint32_t& consumed) {
    return VondKtLibParse(p, n, m.simlEngineVersion, m.simlMetaVersion, m.similarity, m.repmEngineVersion,
                          m.repmMetaVersion, m.representative, m.clblEngineVersion, m.clblMetaVersion, m.colorLabel,
                          consumed);
}
_VondResult AttentionRead(_VondMeta& m, const uint8_t* p, uint32_t n, uint32_t& consumed) {
    return VondCALibParse(p, n, m.attentionAreas, m.caLibVersion, m.analyzedWidth, m.analyzedHeight, consumed);
}

const vond::MetaSections kDefaultSections = {
    {FaceSize, FaceWrite, "VondOrielGetSerializedSize() failed"},
    {QualitySize, QualityWrite, "VondKtLibGetSerializedSize() failed"},
    {AttentionSize, AttentionWrite, "VondCALibGetSerializedSize() failed"},
};

// Total blob size: header, footer and the three sections. A section that
// cannot be sized, or whose size would carry the total past 32 bits, fails
// with that section's message.
_VondResult TotalSize(const vond::MetaSections& sections, const _VondMeta& meta, uint32_t* total) {
    _VondResult result = vond::Begin("VondGetSerializedSize");
    *total = 0;
    uint32_t sum = kHeaderFooterSize;
    for (const vond::MetaSectionWriter* s : {&sections.face, &sections.quality, &sections.attention}) {
        const uint32_t size = s->size(meta);
        if (size == 0 || !lmk::CheckedAdd(sum, size, &sum))
            return vond::Fail(result, VOND_STATUS_FAILED, s->sizeFailedMessage);
    }
    *total = sum;
    return result;
}

}  // namespace

const vond::MetaSections& vond::DefaultSections() { return kDefaultSections; }

const _VondVersion* VondGetVersion() { return &kVersion; }

_VondResult VondGetSerializedSize(const _VondMeta* pMeta, uint32_t* pSizeOut) {
    if (pMeta == nullptr || pSizeOut == nullptr)
        return vond::Fail(vond::Begin("VondGetSerializedSize"), VOND_STATUS_INVALID_PARAMETER,
                          "pMeta == NULL || pSizeOut == NULL");
    return TotalSize(kDefaultSections, *pMeta, pSizeOut);
}

_VondResult vond::SerializeMetaWith(const MetaSections& sections, const _VondMeta* pMeta, uint32_t bufSize,
                                    uint8_t* pBuf) {
    _VondResult result = Begin("VondSerializeMeta");
    if (pMeta == nullptr || bufSize == 0 || pBuf == nullptr)
        return Fail(result, VOND_STATUS_INVALID_PARAMETER, "pMeta == NULL || bufSize == 0 || pBuf == NULL");

    std::memset(pBuf, 0, bufSize);
    // Whatever fails from here on, the caller gets an all-zero buffer back.
    auto zeroOnFailure = lmk::MakeScopeGuard([pBuf, bufSize] { std::memset(pBuf, 0, bufSize); });

    uint32_t total = 0;
    _VondResult sized = TotalSize(sections, *pMeta, &total);
    if (sized.status != VOND_STATUS_OK) return sized;
    if (bufSize < total) return Fail(result, VOND_STATUS_FAILED, "bufSize < totalSize");
    if (bufSize < kHeaderFooterSize) return Fail(result, VOND_STATUS_FAILED, "getSerializedHeaderFooterSize() > bufSize");

    lmk::ByteWriter header(pBuf, kHeaderSize);
    header.Bytes(kSignature, 4);
    header.U32(total);
    header.U8(pMeta->version.major);
    header.U8(pMeta->version.minor);
    header.U8(pMeta->version.metaVersion);
    header.U8(pMeta->version.flags);
    header.U32(pMeta->version.build);
    header.U32(pMeta->faceDetectDicMode);
    header.F32(pMeta->faceEngineParam);
    header.U32(pMeta->faceRcSize);

    const uint32_t footer = total - kFooterSize;
    for (uint32_t i = 0; i < 4; ++i) pBuf[total - 1 - i] = kSignature[i];

    // Each section gets the bytes between its start and the footer, so a
    // writer that respects its buffer size cannot reach the footer at all.
    uint32_t offset = kHeaderSize;
    for (const MetaSectionWriter* s : {&sections.face, &sections.quality, &sections.attention}) {
        const uint32_t size = s->size(*pMeta);
        if (size == 0) return Fail(result, VOND_STATUS_FAILED, s->sizeFailedMessage);
        const uint32_t remaining = footer - offset;
        if (size > remaining) return Fail(result, VOND_STATUS_FAILED, "serializedSize > remainingBufSize");
        uint32_t written = 0;
        _VondResult sectionResult = s->serialize(*pMeta, pBuf + offset, remaining, written);
        if (sectionResult.status != VOND_STATUS_OK) return sectionResult;
        if (written != size) return Fail(result, VOND_STATUS_FAILED, "serializedSize != wroteSize");
        offset += size;
    }
    if (bufSize - offset < kFooterSize) return Fail(result, VOND_STATUS_FAILED, "serializedSize > remainingBufSize");

    // A section that wrote past the size it reported shows here.
    for (uint32_t i = 0; i < 4; ++i) {
        if (pBuf[total - 1 - i] != kSignature[i]) return Fail(result, VOND_STATUS_FAILED, "*pWriteBufPtr != SIGNATURE[i]");
    }
    zeroOnFailure.Dismiss();
    return result;
}

_VondResult VondSerializeMeta(const _VondMeta* pMeta, uint32_t bufSize, uint8_t* pBuf) {
    return vond::SerializeMetaWith(kDefaultSections, pMeta, bufSize, pBuf);
}

_VondResult VondParseMeta(uint32_t bufSize, const uint8_t* pBuf, _VondMeta* pMeta) {
    _VondResult result = vond::Begin("VondParseMeta");
    if (pMeta == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pMeta == NULL");
    std::memset(pMeta, 0, sizeof *pMeta);
    if (bufSize == 0 || pBuf == nullptr)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "bufSize == 0 || pBuf == NULL");
    if (bufSize < kHeaderFooterSize)
        return vond::Fail(result, VOND_STATUS_FAILED, "getSerializedHeaderFooterSize() > bufSize");

    lmk::ByteReader in(pBuf, bufSize);
    uint8_t signature[4];
    in.Bytes(signature, 4);
    if (std::memcmp(signature, kSignature, 4) != 0)
        return vond::Fail(result, VOND_STATUS_FAILED, "invalid signature at the begining");
    const uint32_t total = in.U32();
    if (bufSize < total) return vond::Fail(result, VOND_STATUS_FAILED, "bufSize < totalSize");
    // A total below header plus footer would put the footer inside the header
    // (or, below 4, before the buffer).
    if (total < kHeaderFooterSize)
        return vond::Fail(result, VOND_STATUS_FAILED, "getSerializedHeaderFooterSize() > totalSize");
    for (uint32_t i = 0; i < 4; ++i) {
        if (pBuf[total - 1 - i] != kSignature[i])
            return vond::Fail(result, VOND_STATUS_FAILED, "invalid signature at the end");
    }

    _VondVersion version;
    version.major = in.U8();
    version.minor = in.U8();
    version.metaVersion = in.U8();
    version.flags = in.U8();
    version.build = in.U32();
    if (!IsSupportedMetaVersion(version.metaVersion)) {
        // The caller learns which version it met; nothing else is kept.
        pMeta->version = version;
        return vond::Fail(result, VOND_STATUS_UNSUPPORTED_VERSION, "invalid meta version");
    }
    pMeta->version = version;
    pMeta->faceDetectDicMode = in.U32();
    pMeta->faceEngineParam = in.F32();
    pMeta->faceRcSize = in.U32();

    // Every section is told the bytes up to the end of the buffer (not to the
    // footer), as blobs have always been read; what it consumes is not
    // compared with the total.
    auto disposeOnFailure = lmk::MakeScopeGuard([pMeta] { VondDisposeMeta(pMeta); });
    uint32_t offset = kHeaderSize;
    for (SectionReader read : {FaceRead, QualityRead, AttentionRead}) {
        uint32_t consumed = 0;
        const _VondResult section = read(*pMeta, pBuf + offset, bufSize - offset, consumed);
        if (section.status != VOND_STATUS_OK) return section;
        // A reader never reports more than it was given; the next section
        // would start outside the buffer if one did.
        if (consumed > bufSize - offset)
            return vond::Fail(result, VOND_STATUS_FAILED, "consumedSize > remainingBufSize");
        offset += consumed;
    }
    disposeOnFailure.Dismiss();
    return result;
}

_VondResult VondDisposeMeta(_VondMeta* pMeta) {
    _VondResult result = vond::Begin("VondDisposeMeta");
    if (pMeta == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pMeta == NULL");
    VondOrielDisposeMeta(pMeta->faceMeta, pMeta->faceMetaArray);
    VondKtlibDisposeMeta(pMeta->similarity, pMeta->representative, pMeta->colorLabel);
    VondCALibDisposeMeta(pMeta->attentionAreas);
    std::memset(pMeta, 0, sizeof *pMeta);
    return result;
}

_VondResult VondDumpMeta(const _VondMeta* pMeta) {
    _VondResult result = vond::Begin("VondDumpMeta");
    if (pMeta == nullptr) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "pMeta == NULL");
    VondOrielDump(pMeta->faceMeta, pMeta->clusterSubject, pMeta->faceMetaArray);
    VondKtLibDump(pMeta->similarity, pMeta->representative, pMeta->colorLabel);
    VondCALibDump(pMeta->attentionAreas);
    return result;
}
