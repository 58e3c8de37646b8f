#include "oriel/src/engine/nn/weights.h"

#include <cstring>

#include "common/src/internal/byte_cursor.h"

extern "C" {
// Bounds of the embedded blob (generated assembly, see the build files).
extern const uint8_t lmk_face_weights_begin[];
extern const uint8_t lmk_face_weights_end[];
}

namespace oriel {
namespace nn {

namespace {
const uint32_t kVersion = 1;
const uint8_t kRaw = 0, kConv = 1, kDepthwise = 2, kDense = 3;
const uint32_t kMaxDim = 1u << 20;
}  // namespace

#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ != __ORDER_LITTLE_ENDIAN__
#error "the face weight blob stores little-endian floats used in place"
#endif

bool WeightBlob::Embedded(const uint8_t** data, uint32_t* size) {
    const uintptr_t b = reinterpret_cast<uintptr_t>(lmk_face_weights_begin);
    const uintptr_t e = reinterpret_cast<uintptr_t>(lmk_face_weights_end);
    if (e <= b || e - b > UINT32_MAX) return false;
    *data = lmk_face_weights_begin;
    *size = static_cast<uint32_t>(e - b);
    return true;
}

bool WeightBlob::Open(const uint8_t* data, uint32_t size) {
    count_ = 0;
    data_ = nullptr;
    if (!data || size < 16 || std::memcmp(data, "LMKFACEW", 8) != 0) return false;
    if ((reinterpret_cast<uintptr_t>(data) & 15u) != 0) return false;
    lmk::ByteReader r(data, size, ZBM_WRITE_ENDIAN_LITTLE);
    r.Skip(8);
    if (r.U32() != kVersion) return false;
    const uint32_t n = r.U32();
    if (n > kMaxEntries) return false;
    for (uint32_t i = 0; i < n; ++i) {
        Entry& e = entries_[i];
        e.nameLength = r.U16();
        e.nameOffset = r.position();
        r.Skip(e.nameLength);
        e.kind = r.U8();
        r.Skip(1);
        uint64_t elements = 1;
        for (int k = 0; k < 4; ++k) {
            e.dims[k] = r.U32();
            if (e.dims[k] > kMaxDim) return false;
        }
        e.dataOffset = r.U32();
        e.count = r.U32();
        if (!r.ok()) return false;
        if ((e.dataOffset & 15u) != 0 || e.dataOffset > size || e.count > (size - e.dataOffset) / 4) return false;
        // The record's shape must account for exactly its floats.
        switch (e.kind) {
            case kConv: {
                const uint64_t blocks = (e.dims[3] + 7u) / 8u;
                elements = blocks * e.dims[0] * e.dims[1] * e.dims[2] * 8u + blocks * 8u;
                if (e.dims[3] == 0) return false;
                break;
            }
            case kDepthwise:
                elements = static_cast<uint64_t>(e.dims[0]) * e.dims[1] * e.dims[2] + e.dims[2];
                break;
            case kDense:
                elements = static_cast<uint64_t>(e.dims[0]) * e.dims[1] + e.dims[1];
                break;
            case kRaw:
                elements = e.count;
                break;
            default:
                return false;
        }
        if (elements != e.count) return false;
    }
    data_ = data;
    size_ = size;
    count_ = n;
    return true;
}

const WeightBlob::Entry* WeightBlob::Find(const char* name, uint8_t kind) const {
    const size_t len = std::strlen(name);
    for (uint32_t i = 0; i < count_; ++i) {
        const Entry& e = entries_[i];
        if (e.kind == kind && e.nameLength == len && std::memcmp(data_ + e.nameOffset, name, len) == 0) return &e;
    }
    return nullptr;
}

bool WeightBlob::Conv(const char* name, ConvWeights* out) const {
    const Entry* e = Find(name, kConv);
    if (!e) return false;
    const float* f = reinterpret_cast<const float*>(data_ + e->dataOffset);
    out->kh = static_cast<int>(e->dims[0]);
    out->kw = static_cast<int>(e->dims[1]);
    out->cin = static_cast<int>(e->dims[2]);
    out->cout = static_cast<int>(e->dims[3]);
    out->w = f;
    out->b = f + static_cast<size_t>((out->cout + 7) / 8) * out->kh * out->kw * out->cin * 8;
    return true;
}

bool WeightBlob::Depthwise(const char* name, DepthwiseWeights* out) const {
    const Entry* e = Find(name, kDepthwise);
    if (!e) return false;
    const float* f = reinterpret_cast<const float*>(data_ + e->dataOffset);
    out->kh = static_cast<int>(e->dims[0]);
    out->kw = static_cast<int>(e->dims[1]);
    out->c = static_cast<int>(e->dims[2]);
    out->w = f;
    out->b = f + static_cast<size_t>(out->kh) * out->kw * out->c;
    return true;
}

bool WeightBlob::Dense(const char* name, DenseWeights* out) const {
    const Entry* e = Find(name, kDense);
    if (!e) return false;
    const float* f = reinterpret_cast<const float*>(data_ + e->dataOffset);
    out->nin = static_cast<int>(e->dims[0]);
    out->nout = static_cast<int>(e->dims[1]);
    out->w = f;
    out->b = f + static_cast<size_t>(out->nin) * out->nout;
    return true;
}

bool WeightBlob::Raw(const char* name, RawTensor* out) const {
    const Entry* e = Find(name, kRaw);
    if (!e) return false;
    out->d = reinterpret_cast<const float*>(data_ + e->dataOffset);
    out->count = e->count;
    for (int k = 0; k < 4; ++k) out->dims[k] = e->dims[k];
    return true;
}

}  // namespace nn
}  // namespace oriel
