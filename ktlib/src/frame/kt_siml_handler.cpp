#include "ktlib/src/frame/kt_handlers.h"

#include "common/src/internal/byte_cursor.h"

namespace {

// The Lab groups travel as four raw bytes in record order.
void WriteLab(lmk::ByteWriter& w, const _KtMetaSimilarity::_Lab& lab) {
    w.U8(lab.reserved);
    w.U8(lab.l);
    w.U8(lab.a);
    w.U8(lab.b);
}

void ReadLab(lmk::ByteReader& r, _KtMetaSimilarity::_Lab* lab) {
    lab->reserved = r.U8();
    lab->l = r.U8();
    lab->a = r.U8();
    lab->b = r.U8();
}

}  // namespace

unsigned int KtMetaSimilarityHandler::Write(unsigned char* buffer, unsigned int length) const {
    if (!readable_ || !buffer || length < kSize) return 0;
    const _KtMetaSimilarity& m = *readable_;
    lmk::ByteWriter w(buffer, length);
    w.I32(m.width);
    w.I32(m.height);
    WriteLab(w, m.mainColor);
    w.U32(m.ncol32);
    for (const _KtMetaSimilarity::_ColHist& entry : m.colHist32) {
        WriteLab(w, entry.lab);
        w.U32(entry.count);
    }
    for (uint32_t v : m.verHist) w.U32(v);
    for (uint32_t v : m.horHist) w.U32(v);
    for (float v : m.edge.value) w.F32(v);
    return w.ok() && w.position() == kSize ? kSize : 0;
}

unsigned int KtMetaSimilarityHandler::Read(const unsigned char* buffer, unsigned int length) {
    if (!meta_ || !buffer || length < kSize) return 0;
    lmk::ByteReader r(buffer, length);
    _KtMetaSimilarity m;
    m.width = r.I32();
    m.height = r.I32();
    ReadLab(r, &m.mainColor);
    m.ncol32 = r.U32();
    for (_KtMetaSimilarity::_ColHist& entry : m.colHist32) {
        ReadLab(r, &entry.lab);
        entry.count = r.U32();
    }
    for (uint32_t& v : m.verHist) v = r.U32();
    for (uint32_t& v : m.horHist) v = r.U32();
    for (float& v : m.edge.value) v = r.F32();
    if (!r.ok() || r.position() != kSize) return 0;
    *meta_ = m;
    return kSize;
}

void KtMetaSimilarityHandler::Dump(FILE* stream) const {
    if (!readable_ || !stream) return;
    const _KtMetaSimilarity& m = *readable_;
    std::fprintf(stream, "width x height        = %ld x %ld\n", static_cast<long>(m.width), static_cast<long>(m.height));
    std::fprintf(stream, "mainColor (l, a, b)   = (%d, %d, %d)\n", m.mainColor.l, m.mainColor.a, m.mainColor.b);
    std::fprintf(stream, "ncol32                = %ld\n", static_cast<long>(m.ncol32));
    for (long i = 0; i < 32; ++i) {
        const _KtMetaSimilarity::_ColHist& e = m.colHist32[i];
        std::fprintf(stream, "\t colHist32[%ld] = (%d, %d, %d), %d\n", i, e.lab.l, e.lab.a, e.lab.b,
                     static_cast<int>(e.count));
    }
    std::fputs("verHist = {", stream);
    for (uint32_t v : m.verHist) std::fprintf(stream, "%d, ", static_cast<int>(v));
    std::fputs("}\n", stream);
    std::fputs("horHist = {", stream);
    for (uint32_t v : m.horHist) std::fprintf(stream, "%d, ", static_cast<int>(v));
    std::fputs("}\n", stream);
    // 3 scales, each a 3 x 3 grid of regions with 3 orientations.
    std::fputs("edge =\n", stream);
    for (int scale = 0; scale < 3; ++scale) {
        std::fputs("{\n", stream);
        for (int row = 0; row < 3; ++row) {
            std::fputs("\t", stream);
            for (int col = 0; col < 3; ++col) {
                const float* v = &m.edge.value[27 * scale + 3 * (3 * row + col)];
                std::fprintf(stream, "{%10.3f, %10.3f, %10.3f}, ", static_cast<double>(v[0]),
                             static_cast<double>(v[1]), static_cast<double>(v[2]));
            }
            std::fputs("\n", stream);
        }
        std::fputs("},\n", stream);
    }
}
