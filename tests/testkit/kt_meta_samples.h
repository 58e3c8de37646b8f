// Hand-made Kt metas and frames for tests of the quality metas and the
// photo meta.
#ifndef LUMICOR_TESTKIT_KT_META_SAMPLES_H
#define LUMICOR_TESTKIT_KT_META_SAMPLES_H

#include <lumicor/ktlib.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

namespace lumicor {
namespace test {

// A similarity record with two palette colours and a few non-zero values in
// every part, including a NaN with payload bits and a negative zero.
_KtMetaSimilarity SampleSimilarity();
_KtMetaColorLabel SampleColorLabel();

// A representative record that owns its arrays (array new) and frees them
// when it goes. Finger i has i + 1 points; the map holds 1, 2, 3, ...
class SampleRepresentative {
public:
    SampleRepresentative(uint32_t fingers, uint32_t mapWidth, uint32_t mapHeight);
    ~SampleRepresentative();
    SampleRepresentative(const SampleRepresentative&) = delete;
    SampleRepresentative& operator=(const SampleRepresentative&) = delete;
    _KtMetaRepresentative meta;
};

// True when both records hold the same values, arrays compared by content
// and floats by their bits.
bool SameRepresentative(const _KtMetaRepresentative& a, const _KtMetaRepresentative& b);

// A frame header with the given fields followed by `payload`.
std::vector<uint8_t> MakeFrame(const char* signature, uint8_t major, uint8_t minor, uint32_t metaBytes,
                               const std::vector<uint8_t>& payload);

// Rewinds, reads and closes f.
std::string ReadBack(FILE* f);

// Everything `print(FILE*)` writes, via a temporary file.
template <typename F>
std::string Printed(F print) {
    FILE* f = std::tmpfile();
    if (!f) return "<tmpfile failed>";
    print(f);
    return ReadBack(f);
}

}  // namespace test
}  // namespace lumicor

#endif
