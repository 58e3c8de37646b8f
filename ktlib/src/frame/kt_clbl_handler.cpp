#include "ktlib/src/frame/kt_handlers.h"

#include "common/src/internal/byte_cursor.h"

// The payload is the record's 16 bytes as they are, reserved bytes included.

unsigned int KtMetaColorLabelHandler::Write(unsigned char* buffer, unsigned int length) const {
    if (!readable_ || !buffer || length < kSize) return 0;
    const _KtMetaColorLabel& m = *readable_;
    lmk::ByteWriter w(buffer, length);
    w.U8(m.white);
    w.U8(m.black);
    w.U8(m.red);
    w.U8(m.yellow);
    w.U8(m.green);
    w.U8(m.blue);
    w.Bytes(m.reserved, sizeof m.reserved);
    return w.ok() && w.position() == kSize ? kSize : 0;
}

unsigned int KtMetaColorLabelHandler::Read(const unsigned char* buffer, unsigned int length) {
    if (!meta_ || !buffer || length < kSize) return 0;
    lmk::ByteReader r(buffer, length);
    _KtMetaColorLabel m;
    m.white = r.U8();
    m.black = r.U8();
    m.red = r.U8();
    m.yellow = r.U8();
    m.green = r.U8();
    m.blue = r.U8();
    r.Bytes(m.reserved, sizeof m.reserved);
    if (!r.ok() || r.position() != kSize) return 0;
    *meta_ = m;
    return kSize;
}

void KtMetaColorLabelHandler::Dump(FILE* stream) const {
    if (!readable_ || !stream) return;
    const _KtMetaColorLabel& m = *readable_;
    std::fprintf(stream, "white  = %d\n", m.white);
    std::fprintf(stream, "black  = %d\n", m.black);
    std::fprintf(stream, "red    = %d\n", m.red);
    std::fprintf(stream, "yellow = %d\n", m.yellow);
    std::fprintf(stream, "green  = %d\n", m.green);
    std::fprintf(stream, "blue   = %d\n", m.blue);
}
