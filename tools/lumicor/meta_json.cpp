#include "meta_json.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

namespace lumicor_tool {

using json = nlohmann::ordered_json;

namespace {

// A float as its shortest decimal form (0.3f reads 0.3, not 0.30000001192...);
// a value that is not a number becomes null.
json Num(float v) {
    if (!std::isfinite(v)) return nullptr;
    char text[32];
    std::snprintf(text, sizeof text, "%.7g", static_cast<double>(v));
    return std::strtod(text, nullptr);
}

std::string Hex32(uint32_t v) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%08x", static_cast<unsigned>(v));
    return text;
}

// Fixed-size text fields are NUL-padded, but a damaged blob may fill them.
std::string Text(const char* chars, size_t size) { return std::string(chars, strnlen(chars, size)); }

std::string HexBytes(const uint8_t* data, uint32_t size) {
    static const char kDigits[] = "0123456789abcdef";
    std::string out;
    out.reserve(size * 2u);
    for (uint32_t i = 0; i < size; ++i) {
        out += kDigits[data[i] >> 4];
        out += kDigits[data[i] & 15];
    }
    return out;
}

float FloatAt(const uint8_t* p) {
    float v;
    std::memcpy(&v, p, sizeof v);
    return v;
}

json Rect(const zbm_Rect& r) { return {{"x", r.x}, {"y", r.y}, {"width", r.width}, {"height", r.height}}; }

// (-1, -1) marks a point that was not located.
json Point(const zbm_Pos& p) {
    if (p.x == -1 && p.y == -1) return nullptr;
    return {{"x", p.x}, {"y", p.y}};
}

json Age(int v) { return v == 255 ? json(nullptr) : json(v); }

json KtVersions(const _KtMetaVersion& meta, const _KtEngineVersion& engine) {
    char text[48];
    std::snprintf(text, sizeof text, "%d.%d.%08x", engine.major, engine.minor, static_cast<unsigned>(engine.build));
    return {{"metaVersion", std::to_string(meta.major) + "." + std::to_string(meta.minor)}, {"engineVersion", text}};
}

json Lab(const _KtMetaSimilarity::_Lab& lab) { return {{"L", lab.l}, {"a", lab.a - 128}, {"b", lab.b - 128}}; }

json FaceRegionJson(const _FaceRegion& r, const _VondOrielMetaArray& scores, uint32_t index) {
    // Packed record: every member is copied before it is used.
    const zbm_Rect box = r.faceArea;
    float rotation[3];  // yaw, pitch, roll
    std::memcpy(rotation, reinterpret_cast<const uint8_t*>(&r) + offsetof(_FaceRegion, rotation), sizeof rotation);
    int32_t auxBox[4];
    std::memcpy(auxBox, reinterpret_cast<const uint8_t*>(&r) + offsetof(_FaceRegion, auxBox), sizeof auxBox);
    const _FaceRegionState states[3] = {r.stateA, r.stateB, r.stateC};
    const uint8_t* parts = r.pParts;
    const uint8_t* attributes = r.pAttributes;
    const uint8_t* feature = r.pFeature;
    const uint32_t partCount = r.partCount, attributeCount = r.attributeCount, featureSize = r.featureSize;

    json face;
    face["faceTag"] = static_cast<int>(r.faceTag);
    face["box"] = Rect(box);
    face["auxBox"] = {auxBox[0], auxBox[1], auxBox[2], auxBox[3]};
    face["rotation"] = {{"yaw", Num(rotation[0])}, {"pitch", Num(rotation[1])}, {"roll", Num(rotation[2])}};
    face["auxWord"] = static_cast<uint32_t>(r.auxWord);
    face["auxFlag"] = static_cast<int>(r.auxFlag);
    const zbm_Pos rightEye = r.rightEye, leftEye = r.leftEye;
    const zbm_Pos rightMouthEnd = r.rightMouthEnd, leftMouthEnd = r.leftMouthEnd;
    face["rightEye"] = Point(rightEye);
    face["leftEye"] = Point(leftEye);
    face["rightMouthEnd"] = Point(rightMouthEnd);
    face["leftMouthEnd"] = Point(leftMouthEnd);
    face["code"] = {{"valid", static_cast<int>(r.codeValid)}, {"flag", static_cast<int>(r.codeFlag)},
                    {"value", static_cast<int>(r.code)}};
    face["orientation"] = static_cast<int>(r.orientation);
    face["flags"] = {{"valid", static_cast<int>(r.flagsValid)}, {"a", static_cast<int>(r.flagA)},
                     {"b", static_cast<int>(r.flagB)}};
    json stateJson = {{"valid", static_cast<int>(r.statesValid)}};
    const char* kStateNames[3] = {"a", "b", "c"};
    for (int i = 0; i < 3; ++i) {
        const uint32_t value = states[i].value;
        stateJson[kStateNames[i]] = {{"flag", static_cast<int>(states[i].flag)}, {"value", value}};
    }
    face["states"] = stateJson;
    face["age"] = {{"min", Age(r.ageMin)}, {"max", Age(r.ageMax)}};

    json partList = json::array();
    for (uint32_t i = 0; parts != nullptr && i < partCount; ++i) {
        const uint8_t* item = parts + 9u * i;
        if (item[0] == 0xFF) continue;  // an unused slot
        partList.push_back({{"id", std::string(1, static_cast<char>(item[0]))},
                            {"x", Num(FloatAt(item + 1))},
                            {"y", Num(FloatAt(item + 5))}});
    }
    face["parts"] = partList;

    json attributeList = json::array();
    for (uint32_t i = 0; attributes != nullptr && i < attributeCount; ++i) {
        const uint8_t id = attributes[2u * i], score = attributes[2u * i + 1];
        if (id == 0xFF) continue;
        json a = {{"id", id}, {"score", score}};
        if (id == 1) a["name"] = "smile";
        attributeList.push_back(a);
    }
    face["attributes"] = attributeList;

    face["feature"] = {{"type", Text(r.featureType, sizeof r.featureType)},
                       {"size", featureSize},
                       {"hex", feature != nullptr ? HexBytes(feature, featureSize) : std::string()}};
    if (scores.pScores != nullptr && index < scores.count) {
        face["detectionScore"] = Num(scores.pScores[index].detectionScore);
        face["blurScore"] = Num(scores.pScores[index].blurScore);
    }
    return face;
}

json FacesJson(const _VondMeta& meta) {
    const _FaceMeta& f = meta.faceMeta;
    const uint32_t regionCount = f.regionCount;
    const _FaceRegion* regions = f.pRegions;
    json out;
    out["engineVersion"] = Text(f.engineVersion, sizeof f.engineVersion);
    out["headerValue"] = Num(float(f.headerValue));
    out["formatVersion"] = static_cast<int>(f.formatVersion);
    out["imageWidth"] = static_cast<int>(f.imageWidth);
    out["imageHeight"] = static_cast<int>(f.imageHeight);
    out["dateTime"] = Text(f.dateTime, sizeof f.dateTime);
    out["faceNum"] = static_cast<int>(f.faceNum);
    out["clusterSubject"] = Hex32(meta.clusterSubject);
    json list = json::array();
    for (uint32_t i = 0; regions != nullptr && i < regionCount; ++i)
        list.push_back(FaceRegionJson(regions[i], meta.faceMetaArray, i));
    out["regions"] = list;
    return out;
}

json SimilarityJson(const _VondMeta& meta) {
    const _KtMetaSimilarity& s = meta.similarity;
    json out = KtVersions(meta.simlMetaVersion, meta.simlEngineVersion);
    out["width"] = s.width;
    out["height"] = s.height;
    out["mainColor"] = Lab(s.mainColor);
    out["paletteColors"] = s.ncol32;
    json palette = json::array();
    for (uint32_t i = 0; i < 32 && i < s.ncol32; ++i) {
        json c = Lab(s.colHist32[i].lab);
        c["count"] = s.colHist32[i].count;
        palette.push_back(c);
    }
    out["palette"] = palette;
    out["textureVertical"] = s.verHist;
    out["textureHorizontal"] = s.horHist;
    json edge = json::array();
    for (float v : s.edge.value) edge.push_back(Num(v));
    out["edge"] = edge;
    return out;
}

json QualityJson(const _VondMeta& meta) {
    const _KtMetaRepresentative& r = meta.representative;
    json out = KtVersions(meta.repmMetaVersion, meta.repmEngineVersion);
    // -1 means "not measured".
    out["colorVariation"] = Num(r.colorVariation);
    out["badExposure"] = Num(r.badExposure);
    out["fingerOnLens"] = Num(r.fingerOnLens);
    out["outOfFocus"] = Num(r.outOfFocus);
    out["cameraShake"] = Num(r.cameraShake);
    out["motionBlur"] = Num(r.motionBlur);
    out["analyzedWidth"] = r.analyzedWidth;
    out["analyzedHeight"] = r.analyzedHeight;
    json fingers = json::array();
    for (uint32_t i = 0; r.pFingers != nullptr && i < r.numFinger; ++i) {
        const _KtFinger& finger = r.pFingers[i];
        json outline = json::array();
        for (uint32_t p = 0; finger.pPoints != nullptr && p < finger.numPoint; ++p)
            outline.push_back({finger.pPoints[p].x, finger.pPoints[p].y});
        fingers.push_back({{"score", Num(finger.score)}, {"area", finger.area}, {"outline", outline}});
    }
    out["fingers"] = fingers;
    json rows = json::array();
    for (uint32_t y = 0; r.pBlurMap != nullptr && y < r.mapHeight; ++y) {
        const uint8_t* row = r.pBlurMap + static_cast<size_t>(y) * r.mapWidth;
        rows.push_back(std::vector<int>(row, row + r.mapWidth));
    }
    out["blurMap"] = {{"width", r.mapWidth}, {"height", r.mapHeight}, {"rows", rows}};
    return out;
}

json ColorLabelsJson(const _VondMeta& meta) {
    const _KtMetaColorLabel& c = meta.colorLabel;
    json out = KtVersions(meta.clblMetaVersion, meta.clblEngineVersion);
    out["white"] = c.white;
    out["black"] = c.black;
    out["red"] = c.red;
    out["yellow"] = c.yellow;
    out["green"] = c.green;
    out["blue"] = c.blue;
    return out;
}

json AttentionJson(const _VondMeta& meta) {
    const _CAAttentionAreaArray& a = meta.attentionAreas;
    json out;
    out["libVersion"] = Text(meta.caLibVersion.text, sizeof meta.caLibVersion.text);
    out["analyzedWidth"] = meta.analyzedWidth;
    out["analyzedHeight"] = meta.analyzedHeight;
    out["isFace"] = a.isFace != 0;
    json areas = json::array();
    for (uint32_t i = 0; a.pAreaArray != nullptr && i < a.numAreas; ++i) {
        const CAAttentionArea& area = a.pAreaArray[i];
        json j = {{"x", Num(area.nx)}, {"y", Num(area.ny)}, {"width", Num(area.nw)}, {"height", Num(area.nh)}};
        if (a.isFace != 0)
            j["direction"] = area.val.direction;
        else
            j["saliency"] = area.val.saliency;
        areas.push_back(j);
    }
    out["areas"] = areas;
    return out;
}

}  // namespace

nlohmann::ordered_json MetaToJson(const _VondMeta& meta) {
    json out;
    char build[16];
    std::snprintf(build, sizeof build, "%08x", static_cast<unsigned>(meta.version.build));
    out["version"] = {{"major", meta.version.major},
                      {"minor", meta.version.minor},
                      {"metaVersion", meta.version.metaVersion},
                      {"flags", meta.version.flags},
                      {"build", build}};
    out["analysisConfig"] = {{"faceDetectDicMode", meta.faceDetectDicMode},
                             {"faceEngineParam", Num(meta.faceEngineParam)},
                             {"faceRcSize", meta.faceRcSize}};
    out["faces"] = FacesJson(meta);
    out["similarity"] = SimilarityJson(meta);
    out["quality"] = QualityJson(meta);
    out["colorLabels"] = ColorLabelsJson(meta);
    out["attention"] = AttentionJson(meta);
    return out;
}

FaceView ViewFace(const _FaceRegion& r) {
    // Copy-initialised from the packed record (an assignment would bind a
    // reference to a misaligned member).
    const zbm_Rect box = r.faceArea;
    const zbm_Pos rightEye = r.rightEye, leftEye = r.leftEye;
    FaceView v;
    v.box = box;
    v.rightEye = rightEye;
    v.leftEye = leftEye;
    v.ageMin = r.ageMin;
    v.ageMax = r.ageMax;
    v.smile = -1;
    const uint8_t* attributes = r.pAttributes;
    const uint32_t count = r.attributeCount;
    for (uint32_t i = 0; attributes != nullptr && i < count; ++i)
        if (attributes[2u * i] == 1) v.smile = attributes[2u * i + 1];
    return v;
}

}  // namespace lumicor_tool
