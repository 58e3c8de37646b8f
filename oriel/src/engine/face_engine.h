// The face engine behind the OrielPlus interface: detection (SSD MobileNet
// v1, or the tiny face detector), 68-point landmarks, expression and age,
// identity vectors, similarity and the facial-subject clustering.
#ifndef ORIEL_ENGINE_FACE_ENGINE_H
#define ORIEL_ENGINE_FACE_ENGINE_H

#include <lumicor/orielplus.h>

#include <cstddef>
#include <cstdint>

#include "oriel/src/engine/networks.h"
#include "oriel/src/engine/nn/image_input.h"

namespace oriel {

// The 68 landmarks of a face in photo pixels.
struct Landmarks {
    float x[ORIEL_ALL_PARTS];
    float y[ORIEL_ALL_PARTS];
};

class FaceEngine {
public:
    FaceEngine();
    // Binds every network to the embedded weights; false when the blob is
    // missing or damaged.
    bool Load();

    bool Has(Oriel_network net) const { return loaded_ && layers_[net].enabled != 0; }
    bool HasDetector() const { return Has(Fast() ? ORIEL_NET_TINY : ORIEL_NET_SSD); }

    Oriel_engineConfig& Config() { return config_; }
    const Oriel_engineConfigLayer* Layers() const { return layers_; }
    void SetLayers(const Oriel_engineConfigLayer* layers, uint32_t count);

    // Detection over the whole image (nAreas 0) or the given regions.
    // *out is a new malloc'd array (count 0, NULL when nothing was found).
    bool Detect(const nn::ImageView& img, const Oriel_searchArea* areas, uint32_t nAreas, Oriel_faceAreaArray* out);
    // Confirms candidates by searching around each one.
    bool DetectLocal(const nn::ImageView& img, const Oriel_areaInfo* cand, uint32_t n, Oriel_faceAreaArray* out);

    // Landmarks of a face (in pixels), and the record's part fields.
    // False only when out of memory; *located false when the box lies
    // outside the photo.
    bool LocateLandmarks(const nn::ImageView& img, const Oriel_areaInfo& face, Landmarks* lm, bool* located);
    static void FillParts(const nn::ImageView& img, const Landmarks& lm, Oriel_areaInfo* face);
    bool LocateParts(const nn::ImageView& img, Oriel_areaInfo* face);
    // Smile and age (landmarks located first when needed).
    bool ClassifyAttributes(const nn::ImageView& img, Oriel_areaInfo* face);
    // Identity vector into out->pVector (ORIEL_VECTOR_BYTES bytes).
    bool MakeVector(const nn::ImageView& img, const Oriel_areaInfo& face, Oriel_faceVectorData* out);
    // The 128-d descriptor of the network (mirrorAveraged false: as the
    // network gives it; true: the sum of the unit descriptors of the crop
    // and of its mirror image, which identity vectors use so that a face
    // and its mirror image get the same vector).
    bool Descriptor(const nn::ImageView& img, const Oriel_areaInfo& face, float* out, bool* aligned,
                    bool mirrorAveraged = false);

    // Expression probabilities (7: neutral, happy, sad, angry, fearful,
    // disgusted, surprised) and age of a face whose landmarks are known.
    bool Expressions(const nn::ImageView& img, const Landmarks& lm, float* probs);
    bool Age(const nn::ImageView& img, const Landmarks& lm, float* age, float* male);

    static float Blur(const nn::ImageView& img, const Oriel_areaInfo& face);
    static Oriel_ClusterSubject Cluster(uint32_t width, uint32_t height, const Oriel_areaInfo* faces, uint32_t n,
                                        Oriel_faceSubjectCluster* detail);

    // Vector format helpers (no instance needed).
    static bool PackVector(const float* descriptor, uint32_t* words);
    static bool UnpackVector(const Oriel_faceVectorData& v, float* unit);
    static float Similarity(const float* a, const float* b);

private:
    bool Fast() const { return (config_.dictionaryMode & ORIEL_D_MODE_FAST_DETECTOR) != 0; }
    float ScoreThreshold() const;
    float VerifyFloor() const;
    // Runs the configured detector on one crop; boxes relative to the photo.
    bool DetectCrop(const nn::ImageView& img, const nn::Crop& crop, double pixels, float minScore, Detection* out,
                    size_t maxOut, size_t* count);
    // Second look at detections scoring between the verification floor and
    // the threshold: each is searched again at a higher resolution and
    // kept (with the better box) only when confirmed.
    bool Verify(const nn::ImageView& img, Detection* dets, size_t* n);
    // The first n detections as a malloc'd face array in *out (left alone
    // when n is 0), completed as the mode asks.
    bool Publish(const nn::ImageView& img, const Detection* dets, uint32_t n, Oriel_faceAreaArray* out);
    // Fills the remaining fields of detected faces as the mode asks.
    bool Complete(const nn::ImageView& img, Oriel_areaInfo* faces, uint32_t n);

    bool loaded_;
    Oriel_engineConfig config_;
    Oriel_engineConfigLayer layers_[ORIEL_NET_COUNT];
    nn::WeightBlob blob_;
    SsdDetector ssd_;
    TinyDetector tiny_;
    DenseFaceNet landmarks_;
    DenseFaceNet expressions_;
    AgeNet age_;
    RecognitionNet recognition_;
};

// Default field values of a face record (nothing located or estimated).
void ResetAreaInfo(Oriel_areaInfo* face);

}  // namespace oriel

#endif
