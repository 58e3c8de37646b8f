// Texture and edge features of the similarity signature. The _texture_s and
// edge_s records and the texture functions a host uses are declared in
// lumicor/ktsimilarity.h.
#ifndef LUMICOR_KTLIB_CBS_TEXTURE_H
#define LUMICOR_KTLIB_CBS_TEXTURE_H

#include <lumicor/ktsimilarity.h>

struct _image_s;

extern "C" {
// Histograms of the dominant horizontal and vertical frequency of every
// row and column of the image's 16 x 16 luma blocks (one count per row or
// column, so 16 per block and direction). An image below 16 pixels in either
// direction yields one count in bin 0 of each histogram. t->bins must be 8.
// -1 on a bad argument or out of memory.
int texture_histogram_t2(_texture_s* t, const _image_s* image);
// Per-block variant: one count per block and direction, from the sum of the
// block's 16 magnitude vectors (flat below 400). Not used by the extraction.
int texture_histogram_t(_texture_s* t, const _image_s* image);
// Absolute Haar detail energy of three scales x 3 x 3 regions x three
// orientations of the image's luma into edge[0..80]. -1 on a bad argument or
// out of memory.
int edge_feature(const _image_s* image, float edge[KT_EDGE_VALUES]);
}

#endif
