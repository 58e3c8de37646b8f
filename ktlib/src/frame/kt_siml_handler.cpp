#include "ktlib/src/frame/kt_fixed_record.h"

namespace {

// The Lab groups travel as four raw bytes in record order.
template <class Io, class Lab>
void LabFields(Io& io, Lab& lab) {
    io.U8(lab.reserved);
    io.U8(lab.l);
    io.U8(lab.a);
    io.U8(lab.b);
}

}  // namespace

template <>
struct KtRecordLayout<_KtMetaSimilarity> {
    template <class Io, class Meta>
    static void Fields(Io& io, Meta& m) {
        io.I32(m.width);
        io.I32(m.height);
        LabFields(io, m.mainColor);
        io.U32(m.ncol32);
        for (auto& entry : m.colHist32) {
            LabFields(io, entry.lab);
            io.U32(entry.count);
        }
        for (auto& v : m.verHist) io.U32(v);
        for (auto& v : m.horHist) io.U32(v);
        for (auto& v : m.edge.value) io.F32(v);
    }

    static void Dump(FILE* stream, const _KtMetaSimilarity& m) {
        std::fprintf(stream, "width x height        = %ld x %ld\n", static_cast<long>(m.width),
                     static_cast<long>(m.height));
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
};

template class KtFixedRecordHandler<_KtMetaSimilarity, 660>;
