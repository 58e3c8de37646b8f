#include "fuzz/kt_frame_round_trip.h"

namespace {
const fuzz::KtFamily<_KtMetaRepresentative> kRepm = {KtRepmParse, KtRepmCloneMeta,         KtRepmDisposeMeta,
                                                      KtRepmDump,  KtRepmGetSerializedSize, KtRepmSerialize};
// Version 1 frames are read only.
bool Writable(const KtFrameHeader& header) { return header.metaVersion.major == 2; }
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    return fuzz::RoundTrip(kRepm, data, size, Writable);
}
