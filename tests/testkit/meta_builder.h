// Hand-made photo metas for tests, tools and fuzz seeds, and a deep
// comparison of two _VondMeta records.
//
//   _VondMeta meta;
//   if (!lumicor::test::BuildHandMadeMeta(&meta)) { ... out of memory ... }
//   ... VondSerializeMeta / VondParseMeta ...
//   VondDisposeMeta(&meta);
//
// Every heap block is allocated the way the library's own readers allocate
// it, so VondDisposeMeta releases a built record. The builders do not use
// gtest and may be linked into tools.
#ifndef LUMICOR_TESTKIT_META_BUILDER_H
#define LUMICOR_TESTKIT_META_BUILDER_H

#include <lumicor/vond.h>

#include <cstdint>
#include <string>
#include <vector>

namespace lumicor {
namespace test {

// Zeroes *meta and fills the header fields: the library's version and the
// configuration {7, 1.0, 76800} that the exported interface uses.
void InitMetaHeader(_VondMeta* meta);

// The full hand-made meta: two faces (box, rotation, eyes, two part points,
// two attributes, age, a 255-byte feature) with scores and a cluster subject;
// similarity, colour label and a representative meta with two fingers and a
// 20 x 15 blur map; four saliency attention areas on a 640 x 480 analysis.
// False (with *meta disposed) when an allocation fails.
bool BuildHandMadeMeta(_VondMeta* meta);

// A meta as an analysis without faces and attention areas leaves it: face
// section with 0 faces, representative meta without fingers or blur map, no
// attention areas.
bool BuildEmptyMeta(_VondMeta* meta);

// Replaces the attention areas of *meta with `count` face areas whose
// directions are `directions[i]` (isFace set). False when out of memory.
bool SetFaceAreas(_VondMeta* meta, uint32_t count, const int32_t* directions);

// The blob of a meta (VondGetSerializedSize + VondSerializeMeta); empty when
// either fails.
std::vector<uint8_t> SerializeToBlob(const _VondMeta& meta);

// The blob of the meta made by `build` (one of the builders above), or empty.
std::vector<uint8_t> BuildBlob(bool (*build)(_VondMeta*));

// Compares every field and every owned array. On a difference returns false
// and, when `why` is given, names the first field that differs.
bool MetaEqual(const _VondMeta& a, const _VondMeta& b, std::string* why = nullptr);

// True when every byte of the record is zero (a disposed record).
bool IsZeroMeta(const _VondMeta& meta);

}  // namespace test
}  // namespace lumicor

#endif
