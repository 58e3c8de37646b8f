// CAinterface: the driver of subject detection for one photo. It makes the
// reduced images and the RGB plane, places the host's faces or runs the
// saliency path, and arranges the result (VAArrange).
#ifndef LUMICOR_CALIB_CALIB_CA_INTERFACE_H
#define LUMICOR_CALIB_CALIB_CA_INTERFACE_H

#include <cstdint>

#include <lumicor/calib.h>
#include <lumicor/zbm_image.h>

#include "calib/src/CALib/param_va.h"

class MIPlane;
class VAArrange;

class CAinterface {
public:
    CAinterface();
    virtual ~CAinterface();
    CAinterface(const CAinterface&) = delete;
    CAinterface& operator=(const CAinterface&) = delete;

    // Copy whose longer side is at most `size` (an attached record over the
    // same pixels when the image is small enough); null on failure.
    _zbm_Image* CreateShrinkImage(const _zbm_Image* image, int32_t size);
    // CreateShrinkImage for two sizes at once, giving the same two images;
    // a photo reduced for both is read once. False (with the failure
    // printed) when either cannot be made; *first and *second are then empty.
    bool CreateShrinkImages(const _zbm_Image* image, int32_t size, int32_t secondSize, ZbmImagePtr* first,
                            ZbmImagePtr* second);
    // RGB plane (chroma format 4) of the image; null on failure.
    MIPlane* CreateMIPlane(const _zbm_Image* image);
    // Faces of the host (when given and useFaceInfo) or the saliency path;
    // fills `list` in plane (face) or saliency-map pixels and saliencyMap.
    uint32_t Detect(const MIPlane* plane, const _CAFaceInfoArray* faces, VAArrange* list);
    uint32_t DisposeMIPlane(MIPlane** plane);
    uint32_t ArrangeVa(const _zbm_Image* image, VAArrange* list);

    // Gaze direction code 0..8 of a face.
    static int32_t DirectionCode(float roll, float pitch, float yaw);

    ParamMem param;
    _zbm_Image* saliencyMap;
    uint8_t useFaceInfo;
    uint8_t debugOutput;
    char outputDir[ParamVA::kTextSize];
    uint8_t combineRects;

private:
    uint32_t Do_VA(const MIPlane* plane, ParamMem prm, VAArrange* list);
};

#endif
