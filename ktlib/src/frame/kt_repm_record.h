// Ownership of the arrays hung on a _KtMetaRepresentative: the finger array,
// each finger's points and the blur map, all allocated with non-throwing
// array new. Used by the Kt entry points and by the photo meta glue, which
// keeps its own deep copies.
#ifndef LUMICOR_KTLIB_FRAME_KT_REPM_RECORD_H
#define LUMICOR_KTLIB_FRAME_KT_REPM_RECORD_H

#include <lumicor/ktlib.h>

#include <cstdint>

namespace ktrepm {

// Frees the finger array, every finger's points and the blur map, and
// clears their pointers and counts. The scores and analysed size stay.
void ReleaseArrays(_KtMetaRepresentative* m);

// Copies src into *dst with arrays of its own. Returns 0; 3 when src cannot
// be copied (more than KT_MAX_FINGERS fingers, a count without its array, a
// map size above 32 bits); 4 out of memory. On failure *dst is untouched.
// *dst must not own arrays (they would be overwritten, not freed).
int DeepCopy(const _KtMetaRepresentative& src, _KtMetaRepresentative* dst);

}  // namespace ktrepm

#endif
