#include "ktlib/src/frame/kt_handlers.h"
#include "ktlib/src/frame/kt_repm_record.h"

#include "ktlib/src/frame/kt_fixed_record.h"

#include "common/src/internal/memory.h"

namespace {

const unsigned int kFingerFixedBytes = 12;  // score, area, numPoint
const unsigned int kPointBytes = 4;         // x, y

// The six scores and the analysed size open the payload.
template <class Io, class Meta>
void ScoreFields(Io& io, Meta& m) {
    io.F32(m.colorVariation);
    io.F32(m.badExposure);
    io.F32(m.fingerOnLens);
    io.F32(m.outOfFocus);
    io.F32(m.cameraShake);
    io.F32(m.motionBlur);
    io.U32(m.analyzedWidth);
    io.U32(m.analyzedHeight);
}

}  // namespace

unsigned int KtMetaRepresentativeHandler::Size() const {
    if (!readable_) return 0;
    const _KtMetaRepresentative& m = *readable_;
    if (m.numFinger > KT_MAX_FINGERS || (m.numFinger != 0 && !m.pFingers)) return 0;
    uint32_t size = kFixedSize + kFingerFixedBytes * m.numFinger;
    for (uint32_t i = 0; i < m.numFinger; ++i) {
        const _KtFinger& f = m.pFingers[i];
        uint32_t pointBytes;
        if (!lmk::CheckedMul(f.numPoint, kPointBytes, &pointBytes) || (pointBytes != 0 && !f.pPoints) ||
            !lmk::CheckedAdd(size, pointBytes, &size)) {
            return 0;
        }
    }
    uint32_t mapBytes;
    if (!lmk::CheckedMul(m.mapWidth, m.mapHeight, &mapBytes) || (mapBytes != 0 && !m.pBlurMap) ||
        !lmk::CheckedAdd(size, mapBytes, &size)) {
        return 0;
    }
    // The whole frame, header included, must stay addressable in 32 bits.
    if (size > UINT32_MAX - KtFrameHeaderHandler::kSize) return 0;
    return size;
}

unsigned int KtMetaRepresentativeHandler::Write(unsigned char* buffer, unsigned int length) const {
    const unsigned int size = Size();
    if (size == 0 || !buffer || length < size) return 0;
    const _KtMetaRepresentative& m = *readable_;
    lmk::ByteWriter w(buffer, length);
    ktframe::FieldWriter fields(w);
    ScoreFields(fields, m);
    w.U32(m.numFinger);
    for (uint32_t i = 0; i < m.numFinger; ++i) {
        const _KtFinger& f = m.pFingers[i];
        w.F32(f.score);
        w.U32(f.area);
        w.U32(f.numPoint);
        for (uint32_t j = 0; j < f.numPoint; ++j) {
            w.U16(f.pPoints[j].x);
            w.U16(f.pPoints[j].y);
        }
    }
    w.U32(m.mapWidth);
    w.U32(m.mapHeight);
    w.Bytes(m.pBlurMap, m.mapWidth * m.mapHeight);  // product checked by Size
    return w.ok() && w.position() == size ? size : 0;
}

unsigned int KtMetaRepresentativeHandler::Read(const unsigned char* buffer, unsigned int length) {
    outOfMemory_ = false;
    if (!meta_ || !buffer) return 0;
    lmk::ByteReader r(buffer, length);

    // Built aside and committed only when the whole payload was read.
    _KtMetaRepresentative m = {};
    auto release = lmk::MakeScopeGuard([&m] { ktrepm::ReleaseArrays(&m); });

    ktframe::FieldReader fields(r);
    ScoreFields(fields, m);
    const uint32_t numFinger = r.U32();
    if (!r.ok() || numFinger > KT_MAX_FINGERS || !r.Has(kFingerFixedBytes * numFinger)) return 0;

    if (numFinger != 0) {
        m.pFingers = lmk::NewArray<_KtFinger>(numFinger).release();
        if (!m.pFingers) {
            outOfMemory_ = true;
            return 0;
        }
        m.numFinger = numFinger;
    }
    for (uint32_t i = 0; i < numFinger; ++i) {
        _KtFinger& f = m.pFingers[i];
        f.score = r.F32();
        f.area = r.U32();
        const uint32_t numPoint = r.U32();
        uint32_t pointBytes;
        if (!r.ok() || !lmk::CheckedMul(numPoint, kPointBytes, &pointBytes) || !r.Has(pointBytes)) return 0;
        if (numPoint != 0) {
            f.pPoints = lmk::NewArray<_KtFingerPoint>(numPoint).release();
            if (!f.pPoints) {
                outOfMemory_ = true;
                return 0;
            }
            f.numPoint = numPoint;
        }
        for (uint32_t j = 0; j < numPoint; ++j) {
            f.pPoints[j].x = r.U16();
            f.pPoints[j].y = r.U16();
        }
    }

    const uint32_t mapWidth = r.U32();
    const uint32_t mapHeight = r.U32();
    uint32_t mapBytes;
    if (!r.ok() || !lmk::CheckedMul(mapWidth, mapHeight, &mapBytes) || !r.Has(mapBytes)) return 0;
    if (mapBytes != 0) {
        m.pBlurMap = lmk::NewArray<uint8_t>(mapBytes).release();
        if (!m.pBlurMap) {
            outOfMemory_ = true;
            return 0;
        }
        r.Bytes(m.pBlurMap, mapBytes);
    }
    m.mapWidth = mapWidth;
    m.mapHeight = mapHeight;
    if (!r.ok()) return 0;

    release.Dismiss();
    *meta_ = m;
    return r.position();
}

void KtMetaRepresentativeHandler::Dump(FILE* stream) const {
    if (!readable_ || !stream) return;
    const _KtMetaRepresentative& m = *readable_;
    std::fputs("# scores\n", stream);
    std::fprintf(stream, "\t color variation = %.3f\n", static_cast<double>(m.colorVariation));
    std::fprintf(stream, "\t bad exposure    = %.3f\n", static_cast<double>(m.badExposure));
    std::fprintf(stream, "\t finger on lens  = %.3f\n", static_cast<double>(m.fingerOnLens));
    std::fprintf(stream, "\t out of focus    = %.3f\n", static_cast<double>(m.outOfFocus));
    std::fprintf(stream, "\t camera shake    = %.3f\n", static_cast<double>(m.cameraShake));
    std::fprintf(stream, "\t motion blur     = %.3f\n", static_cast<double>(m.motionBlur));
    std::fputs("\n", stream);
    std::fputs("# finger\n", stream);
    std::fprintf(stream, "\t analyzedWidth   = %u\n", static_cast<unsigned int>(m.analyzedWidth));
    std::fprintf(stream, "\t analyzedHeight  = %u\n", static_cast<unsigned int>(m.analyzedHeight));
    std::fprintf(stream, "\t numFinger       = %u\n", static_cast<unsigned int>(m.numFinger));
    for (uint32_t i = 0; m.pFingers && i < m.numFinger; ++i) {
        const _KtFinger& f = m.pFingers[i];
        std::fprintf(stream, "\t detection score = %.3f\n", static_cast<double>(f.score));
        std::fprintf(stream, "\t area            = %u\n", static_cast<unsigned int>(f.area));
        std::fprintf(stream, "\t numPoint        = %u\n", static_cast<unsigned int>(f.numPoint));
        std::fputs("\t ", stream);
        for (uint32_t j = 0; f.pPoints && j < f.numPoint; ++j) {
            std::fprintf(stream, "(%u,%u), ", static_cast<unsigned int>(f.pPoints[j].x),
                         static_cast<unsigned int>(f.pPoints[j].y));
        }
        std::fputs("\n", stream);
    }
    std::fputs("\n", stream);
    std::fputs("# blurMap\n", stream);
    std::fprintf(stream, "\t mapWidth        = %u\n", static_cast<unsigned int>(m.mapWidth));
    std::fprintf(stream, "\t mapHeight       = %u\n", static_cast<unsigned int>(m.mapHeight));
    for (uint32_t y = 0; m.pBlurMap && y < m.mapHeight; ++y) {
        std::fputs("\t ", stream);
        const uint8_t* row = m.pBlurMap + static_cast<size_t>(y) * m.mapWidth;
        for (uint32_t x = 0; x < m.mapWidth; ++x) std::fprintf(stream, "%u ", static_cast<unsigned int>(row[x]));
        std::fputs("\n", stream);
    }
    std::fputs("\n", stream);
}

unsigned int KtMetaRepresentativeLegacyHandler::Write(unsigned char*, unsigned int) const {
    std::fputs("Write method is not supported in this meta version\n", stderr);
    return 0;
}

unsigned int KtMetaRepresentativeLegacyHandler::Read(const unsigned char* buffer, unsigned int length) {
    if (!meta_ || !buffer || length < kSize) return 0;
    lmk::ByteReader r(buffer, length);
    // Byte 0 is colour variation x 255, byte 1 is (1 - out of focus) x 255;
    // the rest of the payload carried nothing this version reads.
    const uint8_t variation = r.U8();
    const uint8_t sharpness = r.U8();
    if (!r.Skip(kSize - 2)) return 0;
    _KtMetaRepresentative m = {};
    m.colorVariation = static_cast<float>(variation) / 255.0f;
    m.badExposure = -1.0f;
    m.fingerOnLens = -1.0f;
    m.outOfFocus = 1.0f - static_cast<float>(sharpness) / 255.0f;
    m.cameraShake = -1.0f;
    m.motionBlur = -1.0f;
    *meta_ = m;
    return kSize;
}

void KtMetaRepresentativeLegacyHandler::Dump(FILE*) const {
    std::fputs("Dump method is not supported in this meta version\n", stderr);
}
