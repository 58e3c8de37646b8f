// The part every fixed-size Kt record shares. A record states its payload
// once, as a field list both directions walk (KtRecordLayout<R>::Fields with
// a FieldWriter or a FieldReader), so the written and the read layout cannot
// drift apart; the handler template adds the length and completeness checks.
#ifndef LUMICOR_KTLIB_FRAME_KT_FIXED_RECORD_H
#define LUMICOR_KTLIB_FRAME_KT_FIXED_RECORD_H

#include "ktlib/src/frame/kt_handlers.h"

#include "common/src/internal/byte_cursor.h"

namespace ktframe {

// Sends each field named by a layout to the writer; a short buffer shows in
// the writer's ok().
class FieldWriter {
public:
    explicit FieldWriter(lmk::ByteWriter& w) : w_(w) {}
    void U8(uint8_t v) { w_.U8(v); }
    void U16(uint16_t v) { w_.U16(v); }
    void U32(uint32_t v) { w_.U32(v); }
    void I32(int32_t v) { w_.I32(v); }
    void F32(float v) { w_.F32(v); }
    void Bytes(const void* src, uint32_t n) { w_.Bytes(src, n); }

private:
    lmk::ByteWriter& w_;
};

// Fills each field named by a layout from the reader; a short payload shows
// in the reader's ok() (the fields read past the end are zero).
class FieldReader {
public:
    explicit FieldReader(lmk::ByteReader& r) : r_(r) {}
    void U8(uint8_t& v) { v = r_.U8(); }
    void U16(uint16_t& v) { v = r_.U16(); }
    void U32(uint32_t& v) { v = r_.U32(); }
    void I32(int32_t& v) { v = r_.I32(); }
    void F32(float& v) { v = r_.F32(); }
    void Bytes(void* dst, uint32_t n) { r_.Bytes(dst, n); }

private:
    lmk::ByteReader& r_;
};

}  // namespace ktframe

template <class Record, unsigned int kBytes>
unsigned int KtFixedRecordHandler<Record, kBytes>::Write(unsigned char* buffer, unsigned int length) const {
    if (!readable_ || !buffer || length < kSize) return 0;
    lmk::ByteWriter w(buffer, length);
    ktframe::FieldWriter io(w);
    KtRecordLayout<Record>::Fields(io, *readable_);
    return w.ok() && w.position() == kSize ? kSize : 0;
}

template <class Record, unsigned int kBytes>
unsigned int KtFixedRecordHandler<Record, kBytes>::Read(const unsigned char* buffer, unsigned int length) {
    if (!record_ || !buffer || length < kSize) return 0;
    lmk::ByteReader r(buffer, length);
    ktframe::FieldReader io(r);
    Record m;
    KtRecordLayout<Record>::Fields(io, m);
    if (!r.ok() || r.position() != kSize) return 0;
    *record_ = m;
    return kSize;
}

template <class Record, unsigned int kBytes>
void KtFixedRecordHandler<Record, kBytes>::Dump(FILE* stream) const {
    if (!readable_ || !stream) return;
    KtRecordLayout<Record>::Dump(stream, *readable_);
}

#endif
