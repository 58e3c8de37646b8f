// Debug images of an analysed photo, written when lmc.conf asks for them:
//   [Debug] SaveInputImage="true"          -> <SaveInputImageDir>/out_<n>.ppm
//   [Debug] SaveAnalyzeResultImage="true"  -> <SaveAnalyzeResultImageDir>/out_result_<n>.ppm
// where <n> is the debug image counter, so both files of one photo share it.
// The result image is the photo with the face count, the area count, the face
// boxes (red) and the attention areas (blue) drawn on it.
#ifndef LUMICOR_INTERFACE_LMC_DEBUG_OUTPUT_H
#define LUMICOR_INTERFACE_LMC_DEBUG_OUTPUT_H

#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <cstdint>

namespace lmc {

// Current value of the debug image counter (0 at load, never reset).
uint32_t DebugImageCounter();
// Counts one analysed photo, whether or not debug images were written.
void AdvanceDebugImageCounter();

}  // namespace lmc

// Writes the debug images of one successfully analysed photo: pImage is the
// host's photo (already validated), pMeta its analysis result. Does not
// advance the counter. Returns LMC_STATUS_OK (also when both flags are off)
// or LMC_STATUS_FAILED after logging why; the host's pixels are only read.
uint32_t outputPpmImagesForDebug(const LmcImage* pImage, const _VondMeta* pMeta);

#endif
