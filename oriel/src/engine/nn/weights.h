// The face engine's weight blob: float32 tensors prepared at build time from
// the published face networks and embedded in the library. The blob is read
// in place; an index check on open makes every later lookup safe.
#ifndef ORIEL_ENGINE_NN_WEIGHTS_H
#define ORIEL_ENGINE_NN_WEIGHTS_H

#include <cstdint>

namespace oriel {
namespace nn {

// Full convolution: weights [ceil(cout/8)][kh][kw][cin][8], bias [ceil(cout/8)*8].
struct ConvWeights {
    const float* w = nullptr;
    const float* b = nullptr;
    int kh = 0, kw = 0, cin = 0, cout = 0;
};
// Depthwise convolution: weights [kh][kw][c], bias [c].
struct DepthwiseWeights {
    const float* w = nullptr;
    const float* b = nullptr;
    int kh = 0, kw = 0, c = 0;
};
// Dense layer: weights [in][out], bias [out].
struct DenseWeights {
    const float* w = nullptr;
    const float* b = nullptr;
    int nin = 0, nout = 0;
};
struct RawTensor {
    const float* d = nullptr;
    uint32_t count = 0;
    uint32_t dims[4] = {0, 0, 0, 0};
};

class WeightBlob {
public:
    // Validates the blob's index; false for a damaged or foreign blob.
    bool Open(const uint8_t* data, uint32_t size);
    // The blob embedded in the library (null when it is absent).
    static bool Embedded(const uint8_t** data, uint32_t* size);

    bool Conv(const char* name, ConvWeights* out) const;
    bool Depthwise(const char* name, DepthwiseWeights* out) const;
    bool Dense(const char* name, DenseWeights* out) const;
    bool Raw(const char* name, RawTensor* out) const;

private:
    struct Entry {
        uint32_t nameOffset;
        uint16_t nameLength;
        uint8_t kind;
        uint32_t dims[4];
        uint32_t dataOffset;
        uint32_t count;
    };
    const Entry* Find(const char* name, uint8_t kind) const;

    static const uint32_t kMaxEntries = 256;
    const uint8_t* data_ = nullptr;
    uint32_t size_ = 0;
    uint32_t count_ = 0;
    Entry entries_[kMaxEntries];
};

}  // namespace nn
}  // namespace oriel

#endif
