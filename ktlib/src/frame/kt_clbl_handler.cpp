#include "ktlib/src/frame/kt_fixed_record.h"

// The payload is the record's 16 bytes as they are, reserved bytes included.
template <>
struct KtRecordLayout<_KtMetaColorLabel> {
    template <class Io, class Meta>
    static void Fields(Io& io, Meta& m) {
        io.U8(m.white);
        io.U8(m.black);
        io.U8(m.red);
        io.U8(m.yellow);
        io.U8(m.green);
        io.U8(m.blue);
        io.Bytes(m.reserved, sizeof m.reserved);
    }

    static void Dump(FILE* stream, const _KtMetaColorLabel& m) {
        std::fprintf(stream, "white  = %d\n", m.white);
        std::fprintf(stream, "black  = %d\n", m.black);
        std::fprintf(stream, "red    = %d\n", m.red);
        std::fprintf(stream, "yellow = %d\n", m.yellow);
        std::fprintf(stream, "green  = %d\n", m.green);
        std::fprintf(stream, "blue   = %d\n", m.blue);
    }
};

template class KtFixedRecordHandler<_KtMetaColorLabel, 16>;
