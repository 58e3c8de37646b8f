// oriel_dump: runs the face engine on one binary PPM (P6) photo and prints
// JSON.
//
//   oriel_dump photo.ppm            reference pipeline: SSD on a 512 x 512
//                                   canvas, then landmarks, expressions, age
//                                   and descriptor of every face
//   oriel_dump --engine photo.ppm   the OrielPlus interface as the photo
//                                   analysis configures it (records only)
//   oriel_dump --vectors photo.ppm x y w h [x y w h ...]
//                                   identity vectors (unpacked) of the faces
//                                   under the given boxes (fractions)
#include <lumicor/orielplus.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "oriel/src/engine/face_engine.h"

namespace {

bool ReadPpm(const char* path, std::vector<uint8_t>* rgb, int* w, int* h) {
    FILE* f = std::fopen(path, "rb");
    if (!f) return false;
    char magic[3] = {0};
    int maxv = 0;
    bool ok = std::fscanf(f, "%2s %d %d %d", magic, w, h, &maxv) == 4 && std::strcmp(magic, "P6") == 0 &&
              maxv == 255 && *w > 0 && *h > 0;
    if (ok) {
        std::fgetc(f);
        rgb->resize(static_cast<size_t>(*w) * *h * 3);
        ok = std::fread(rgb->data(), 1, rgb->size(), f) == rgb->size();
    }
    std::fclose(f);
    return ok;
}

int Engine(const std::vector<uint8_t>& rgb, int w, int h) {
    OrielHandle e = nullptr;
    if (OrielPlus_Initialize(&e) != 0) return 1;
    Oriel_faceAreaArray faces = {0, nullptr};
    const uint32_t rc = OrielPlus_DetectFace(rgb.data(), w, h, ORIEL_COLOR_RGB, w * 3, &faces, e);
    std::printf("{\"status\": %u, \"faces\": [", rc);
    for (uint32_t i = 0; i < faces.count; ++i) {
        const Oriel_areaInfo& f = faces.pInfo[i];
        std::printf("%s\n {\"box\": [%.2f, %.2f, %.2f, %.2f], \"score\": %.4f, \"blur\": %.3f, \"roll\": %.3f, "
                    "\"pitch\": %.3f, \"yaw\": %.3f, \"smile\": %.2f, \"age\": [%d, %d], \"partLevels\": %d}",
                    i ? "," : "", f.x * w, f.y * h, f.width * w, f.height * h, f.score, f.blur, f.roll, f.pitch, f.yaw,
                    f.attribute1, f.ageMin, f.ageMax, f.partLevels);
    }
    std::printf("]}\n");
    OrielPlus_ReleaseArrayMadeByDetectFace(&faces, e);
    OrielPlus_Finalize(&e);
    return rc == 0 ? 0 : 1;
}

int Reference(const std::vector<uint8_t>& rgb, int w, int h) {
    oriel::FaceEngine* engine = new oriel::FaceEngine();
    if (!engine->Load()) return 1;
    oriel::nn::ImageView img;
    img.p = rgb.data();
    img.w = w;
    img.h = h;
    img.stride = w * 3;
    oriel::nn::WeightBlob blob;
    const uint8_t* data;
    uint32_t size;
    oriel::SsdDetector ssd;
    if (!oriel::nn::WeightBlob::Embedded(&data, &size) || !blob.Open(data, size) || !ssd.Load(blob)) return 1;
    oriel::nn::Crop all;
    all.w = w;
    all.h = h;
    oriel::Detection det[100];
    size_t n = 0;
    // ORIEL_SSD_INPUT="W H" overrides the 512 x 512 canvas (experiments).
    int inW = 512, inH = 512;
    if (const char* env = std::getenv("ORIEL_SSD_INPUT")) std::sscanf(env, "%d %d", &inW, &inH);
    if (!ssd.Detect(img, all, inW, inH, 0.5f, det, 100, &n)) return 1;
    std::printf("{\"faces\": [");
    for (size_t i = 0; i < n; ++i) {
        Oriel_areaInfo f;
        oriel::ResetAreaInfo(&f);
        f.x = det[i].x;
        f.y = det[i].y;
        f.width = det[i].w;
        f.height = det[i].h;
        f.score = det[i].score;
        oriel::Landmarks lm;
        bool located = false;
        engine->LocateLandmarks(img, f, &lm, &located);
        float probs[7] = {0}, age = -1, male = -1, d[128] = {0};
        bool aligned = false;
        if (located) {
            engine->Expressions(img, lm, probs);
            engine->Age(img, lm, &age, &male);
            oriel::FaceEngine::FillParts(img, lm, &f);
        }
        engine->Descriptor(img, f, d, &aligned);
        std::printf("%s\n {\"box\": [%.4f, %.4f, %.4f, %.4f], \"score\": %.5f, \"age\": %.3f, \"male\": %.4f,",
                    i ? "," : "", det[i].x * w, det[i].y * h, det[i].w * w, det[i].h * h, det[i].score, age, male);
        std::printf(" \"expressions\": [");
        for (int k = 0; k < 7; ++k) std::printf("%s%.5f", k ? ", " : "", probs[k]);
        std::printf("], \"landmarks\": [");
        for (int k = 0; k < 68 && located; ++k) std::printf("%s[%.3f, %.3f]", k ? ", " : "", lm.x[k], lm.y[k]);
        std::printf("], \"descriptor\": [");
        for (int k = 0; k < 128; ++k) std::printf("%s%.6f", k ? ", " : "", d[k]);
        std::printf("]}");
    }
    std::printf("]}\n");
    delete engine;
    return 0;
}

int Vectors(const std::vector<uint8_t>& rgb, int w, int h, int argc, char** argv) {
    OrielHandle e = nullptr;
    if (OrielPlus_Initialize(&e) != 0) return 1;
    std::printf("[");
    for (int i = 0; i + 3 < argc; i += 4) {
        Oriel_areaInfo f;
        oriel::ResetAreaInfo(&f);
        f.x = static_cast<float>(std::atof(argv[i]));
        f.y = static_cast<float>(std::atof(argv[i + 1]));
        f.width = static_cast<float>(std::atof(argv[i + 2]));
        f.height = static_cast<float>(std::atof(argv[i + 3]));
        uint32_t words[(ORIEL_VECTOR_BYTES + 3) / 4];
        Oriel_faceVectorData v = {0, 0, 0, 0, 0, words};
        float unit[ORIEL_VECTOR_LENGTH] = {0};
        if (OrielPlus_MakeFaceVector(rgb.data(), w, h, ORIEL_COLOR_RGB, w * 3, &f, &v, e) == 0)
            oriel::FaceEngine::UnpackVector(v, unit);
        std::printf("%s[", i ? ",\n" : "");
        for (uint32_t k = 0; k < ORIEL_VECTOR_LENGTH; ++k) std::printf("%s%.6f", k ? ", " : "", unit[k]);
        std::printf("]");
    }
    std::printf("]\n");
    OrielPlus_Finalize(&e);
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc >= 7 && std::strcmp(argv[1], "--vectors") == 0) {
        std::vector<uint8_t> rgb;
        int w = 0, h = 0;
        if (!ReadPpm(argv[2], &rgb, &w, &h)) return 1;
        return Vectors(rgb, w, h, argc - 3, argv + 3);
    }
    const bool engine = argc == 3 && std::strcmp(argv[1], "--engine") == 0;
    if (argc != 2 && !engine) {
        std::fprintf(stderr, "usage: oriel_dump [--engine] photo.ppm\n");
        return 2;
    }
    std::vector<uint8_t> rgb;
    int w = 0, h = 0;
    if (!ReadPpm(argv[argc - 1], &rgb, &w, &h)) {
        std::fprintf(stderr, "cannot read %s\n", argv[argc - 1]);
        return 1;
    }
    return engine ? Engine(rgb, w, h) : Reference(rgb, w, h);
}
