#include "fuzz/kt_frame_round_trip.h"

namespace {
int Size(const _KtMetaColorLabel*, unsigned int* size) { return KtClblGetSerializedSize(size); }
const fuzz::KtFamily<_KtMetaColorLabel> kClbl = {KtClblParse, KtClblCloneMeta, KtClblDisposeMeta,
                                                  KtClblDump,  Size,            KtClblSerialize};
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    return fuzz::RoundTrip(kClbl, data, size, fuzz::AlwaysWritable);
}
