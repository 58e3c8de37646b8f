// The photo meta in readable form: every field of a parsed _VondMeta as JSON.
#ifndef LUMICOR_TOOL_META_JSON_H
#define LUMICOR_TOOL_META_JSON_H

#include <lumicor/vond.h>

#include <nlohmann/json.hpp>

#include <cstdint>

namespace lumicor_tool {

// Sections: "version", "analysisConfig", "faces", "similarity", "quality",
// "colorLabels", "attention". Positions keep the units of the meta (face
// boxes in photo pixels, attention areas as fractions, finger outlines in the
// quality analysis' pixels); Lab a and b are shown centred on 0; versions
// and codes stored as hexadecimal numbers are shown as hexadecimal text.
nlohmann::ordered_json MetaToJson(const _VondMeta& meta);

// The face regions of the meta as the annotation and the tool's summary use
// them (the packed record copied into plain fields).
struct FaceView {
    zbm_Rect box;
    zbm_Pos rightEye, leftEye;   // (-1, -1) when not located
    int ageMin, ageMax;          // 255 when unknown
    int smile;                   // attribute 1 (0..100), -1 when absent
};
FaceView ViewFace(const _FaceRegion& region);

}  // namespace lumicor_tool

#endif
