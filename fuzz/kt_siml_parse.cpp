#include "fuzz/kt_frame_round_trip.h"

namespace {
int Size(const _KtMetaSimilarity*, unsigned int* size) { return KtSimlGetSerializedSize(size); }
const fuzz::KtFamily<_KtMetaSimilarity> kSiml = {KtSimlParse, KtSimlCloneMeta, KtSimlDisposeMeta,
                                                  KtSimlDump,  Size,            KtSimlSerialize};
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    return fuzz::RoundTrip(kSiml, data, size, fuzz::AlwaysWritable);
}
