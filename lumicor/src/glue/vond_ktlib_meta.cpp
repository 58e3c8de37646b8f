// The quality section of the photo meta: the similarity, representative and
// colour label frames back to back. The _VondMeta record keeps its own copies
// of the three metas; the Kt library's heap records never outlive a call.
#include <lumicor/vond.h>

#include "common/src/internal/memory.h"
#include "ktlib/src/frame/kt_repm_record.h"
#include "lumicor/src/glue/vond_result.h"

#include <cmath>
#include <cstdio>
#include <cstring>
#include <memory>

namespace {

// Kt records are released by their own dispose functions on every path.
void Dispose(_KtMetaSimilarity* m) { KtSimlDisposeMeta(&m); }
void Dispose(_KtMetaRepresentative* m) { KtRepmDisposeMeta(&m); }
void Dispose(_KtMetaColorLabel* m) { KtClblDisposeMeta(&m); }
struct KtDeleter {
    template <class Meta>
    void operator()(Meta* m) const { Dispose(m); }
};
template <class Meta>
using KtPtr = std::unique_ptr<Meta, KtDeleter>;

// Copies the representative record with arrays of its own: 0, 3 for a
// record that cannot be copied, 4 out of memory (nothing left allocated).
int deepCopyRepm(const _KtMetaRepresentative& src, _KtMetaRepresentative& dst) {
    return ktrepm::DeepCopy(src, &dst);
}

// A Kt call that ran out of memory is reported as such; any other failure
// of a frame is a format error.
uint32_t StatusOf(int ktStatus) {
    return ktStatus == KT_ERR_NO_MEMORY ? VOND_STATUS_OUT_OF_MEMORY : VOND_STATUS_FAILED;
}

// Copies a parsed record into the caller's: the flat records as they are,
// the representative with arrays of its own (which can run out of memory).
template <class Flat>
int CopyOut(const Flat& src, Flat& dst) {
    dst = src;
    return KT_OK;
}
int CopyOut(const _KtMetaRepresentative& src, _KtMetaRepresentative& dst) { return deepCopyRepm(src, dst); }

// Parses the frame at pBuf + consumed, given the bytes up to the end of the
// buffer, into the caller's record, then takes its versions and steps past
// it (a frame is its 16-byte header plus exactly metaBytes of payload). On
// failure *result names the call that failed and nothing else is changed.
template <class Meta>
bool ParseFrame(int (*parse)(const unsigned char*, unsigned int, KtFrameHeader*, Meta**), const char* parseFailed,
                const uint8_t* pBuf, uint32_t bufSize, uint32_t& consumed, _KtEngineVersion& engine,
                _KtMetaVersion& meta, Meta& record, _VondResult* result) {
    KtFrameHeader header;
    Meta* out = nullptr;
    int status = parse(pBuf + consumed, bufSize - consumed, &header, &out);
    if (status != KT_OK) {
        *result = vond::Fail(*result, StatusOf(status), parseFailed);
        return false;
    }
    const KtPtr<Meta> parsed(out);
    status = CopyOut(*parsed, record);
    if (status != KT_OK) {
        // Only the representative's deep copy can fail.
        *result = vond::Fail(*result, StatusOf(status), "deepCopyRepm() failed");
        return false;
    }
    engine = header.engineVersion;
    meta = header.metaVersion;
    consumed += 16 + header.metaBytes;
    return true;
}

bool QualitySizes(const _KtMetaRepresentative& representative, uint32_t* simlSize, uint32_t* repmSize,
                  uint32_t* clblSize, uint32_t* total) {
    unsigned int siml = 0, repm = 0, clbl = 0;
    if (KtSimlGetSerializedSize(&siml) != KT_OK || KtRepmGetSerializedSize(&representative, &repm) != KT_OK ||
        KtClblGetSerializedSize(&clbl) != KT_OK) {
        return false;
    }
    uint32_t sum;
    if (!lmk::CheckedAdd(siml, repm, &sum) || !lmk::CheckedAdd(sum, clbl, &sum)) return false;
    *simlSize = siml;
    *repmSize = repm;
    *clblSize = clbl;
    *total = sum;
    return true;
}

}  // namespace

_VondResult VondKtLibAnalyze(const _zbm_Image* pImage, _KtEngineVersion& simlEngine, _KtMetaVersion& simlMeta,
                             _KtMetaSimilarity& similarity, _KtEngineVersion& repmEngine, _KtMetaVersion& repmMeta,
                             _KtMetaRepresentative& representative, _KtEngineVersion& clblEngine,
                             _KtMetaVersion& clblMeta, _KtMetaColorLabel& colorLabel) {
    _VondResult result = vond::Begin("VondKtLibAnalyze");
    if (pImage == nullptr || pImage->order != ZBM_PIXEL_ORDER_RGB)
        return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "invalid pImage->order");

    // The similarity signature is made from a copy of about 19,200 pixels
    // (160 x 120 for a 4:3 photo), always a fresh copy.
    const double W = pImage->width, H = pImage->height;
    const double smallW = std::sqrt(W * 19200.0 / H), smallH = std::sqrt(H * 19200.0 / W);
    if (!(smallW >= 1.0 && smallH >= 1.0)) return vond::Fail(result, VOND_STATUS_FAILED, "ZbiuCreate(): failed");
    ZbmImagePtr small(ZbiuCreate(static_cast<int32_t>(smallW), static_cast<int32_t>(smallH), pImage->order));
    if (!small) return vond::Fail(result, VOND_STATUS_OUT_OF_MEMORY, "ZbiuCreate(): failed");
    const int resized = ZbiuResize(pImage, small.get());
    if (resized != ZBIU_OK) {
        return vond::Fail(result, resized == ZBIU_ERR_OUT_OF_MEMORY ? VOND_STATUS_OUT_OF_MEMORY : VOND_STATUS_FAILED,
                          "ZbiuResize(): failed");
    }

    // Format 0: RGB, as the working image is.
    if (KtSimlGetVersion(&simlMeta, &simlEngine) != KT_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "KtSimlGetVersion() failed");
    KtPtr<_KtMetaSimilarity> siml;
    {
        _KtMetaSimilarity* out = nullptr;
        const int status = KtSimlExtract(small->pData, static_cast<unsigned int>(small->width),
                                         static_cast<unsigned int>(small->height), small->pitch, 0, &out);
        if (status != KT_OK) return vond::Fail(result, StatusOf(status), "KtSimlExtract() failed");
        siml.reset(out);
    }
    similarity = *siml;

    if (KtRepmGetVersion(&repmMeta, &repmEngine) != KT_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "KtRepmGetVersion() failed");
    KtPtr<_KtMetaRepresentative> repm;
    {
        _KtMetaRepresentative* out = nullptr;
        const int status = KtRepmExtract(pImage->pData, static_cast<unsigned int>(pImage->width),
                                         static_cast<unsigned int>(pImage->height), pImage->pitch, 0, siml.get(), &out);
        if (status != KT_OK) return vond::Fail(result, StatusOf(status), "KtRempExtract() failed");
        repm.reset(out);
    }
    {
        const int status = deepCopyRepm(*repm, representative);
        if (status != KT_OK) return vond::Fail(result, StatusOf(status), "deepCopyRepm() failed");
    }
    // A later failure leaves the caller's record without the copied arrays.
    auto release = lmk::MakeScopeGuard([&representative] { ktrepm::ReleaseArrays(&representative); });

    if (KtClblGetVersion(&clblMeta, &clblEngine) != KT_OK)
        return vond::Fail(result, VOND_STATUS_FAILED, "KtClblGetVersion() failed");
    KtPtr<_KtMetaColorLabel> clbl;
    {
        _KtMetaColorLabel* out = nullptr;
        const int status = KtClblExtract(siml.get(), &out);
        if (status != KT_OK) return vond::Fail(result, StatusOf(status), "KtClblExtract() failed");
        clbl.reset(out);
    }
    colorLabel = *clbl;
    release.Dismiss();
    return result;
}

uint32_t VondKtLibGetSerializedSize(const _KtMetaSimilarity&, const _KtMetaRepresentative& representative,
                                    const _KtMetaColorLabel&) {
    uint32_t siml, repm, clbl, total;
    return QualitySizes(representative, &siml, &repm, &clbl, &total) ? total : 0;
}

_VondResult VondKtLibSerialize(const _KtEngineVersion& simlEngine, const _KtMetaVersion& simlMeta,
                               const _KtMetaSimilarity& similarity, const _KtEngineVersion& repmEngine,
                               const _KtMetaVersion& repmMeta, const _KtMetaRepresentative& representative,
                               const _KtEngineVersion& clblEngine, const _KtMetaVersion& clblMeta,
                               const _KtMetaColorLabel& colorLabel, uint8_t* pBuf, uint32_t bufSize,
                               uint32_t& written) {
    _VondResult result = vond::Begin("VondKtLibSerialize");
    written = 0;
    uint32_t simlSize, repmSize, clblSize, total;
    if (!QualitySizes(representative, &simlSize, &repmSize, &clblSize, &total)) {
        return vond::Fail(result, VOND_STATUS_FAILED,
                          "KtSimlGetSerializedSize() or KtRepmGetSerializedSize() or KtClblGetSerializedSize() failed");
    }
    if (total > bufSize) return vond::Fail(result, VOND_STATUS_INVALID_PARAMETER, "bufSize < simlSize + repmSize + clblSize");

    if (KtSimlSerialize(&simlMeta, &simlEngine, &similarity, pBuf, bufSize) != KT_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "KtSimlSerialize() failed");
    }
    if (KtRepmSerialize(&repmMeta, &repmEngine, &representative, pBuf + simlSize, bufSize - simlSize) != KT_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "KtRempSerialize() failed");
    }
    const uint32_t clblOffset = simlSize + repmSize;
    if (KtClblSerialize(&clblMeta, &clblEngine, &colorLabel, pBuf + clblOffset, bufSize - clblOffset) != KT_OK) {
        return vond::Fail(result, VOND_STATUS_FAILED, "KtClblSerialize() failed");
    }
    written = total;
    return result;
}

_VondResult VondKtLibParse(const uint8_t* pBuf, uint32_t bufSize, _KtEngineVersion& simlEngine,
                           _KtMetaVersion& simlMeta, _KtMetaSimilarity& similarity, _KtEngineVersion& repmEngine,
                           _KtMetaVersion& repmMeta, _KtMetaRepresentative& representative,
                           _KtEngineVersion& clblEngine, _KtMetaVersion& clblMeta, _KtMetaColorLabel& colorLabel,
                           uint32_t& consumed) {
    _VondResult result = vond::Begin("VondKtLibParse");
    consumed = 0;
    // Whatever was copied into the caller's records is released on failure.
    auto release = lmk::MakeScopeGuard([&] { VondKtlibDisposeMeta(similarity, representative, colorLabel); });
    if (!ParseFrame(KtSimlParse, "KtSimlParse() failed", pBuf, bufSize, consumed, simlEngine, simlMeta, similarity,
                    &result) ||
        !ParseFrame(KtRepmParse, "KtRepmParse() failed", pBuf, bufSize, consumed, repmEngine, repmMeta,
                    representative, &result) ||
        !ParseFrame(KtClblParse, "KtClblParse() failed", pBuf, bufSize, consumed, clblEngine, clblMeta, colorLabel,
                    &result)) {
        return result;
    }
    release.Dismiss();
    return result;
}

void VondKtLibDump(const _KtMetaSimilarity& similarity, const _KtMetaRepresentative& representative,
                   const _KtMetaColorLabel& colorLabel) {
    std::printf("\n*** VondKtLibDump() ***\n");
    KtSimlDump(&similarity, stdout);
    KtRepmDump(&representative, stdout);
    KtClblDump(&colorLabel, stdout);
}

void VondKtlibDisposeMeta(_KtMetaSimilarity&, _KtMetaRepresentative& representative, _KtMetaColorLabel&) {
    ktrepm::ReleaseArrays(&representative);
}
