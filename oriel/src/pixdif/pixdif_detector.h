// The pixel-difference tree face detector of the attention library: scans
// every 20 x 20 window of a scale pyramid of a gray image with a PixDifTreeData
// dictionary, then suppresses and merges overlapping hits. Results are kept in
// lists whose nodes come from a fixed pool owned by the detector.
#ifndef LUMICOR_ORIEL_PIXDIF_PIXDIF_DETECTOR_H
#define LUMICOR_ORIEL_PIXDIF_PIXDIF_DETECTOR_H

#include <cstdint>

#include "oriel/src/pixdif/pixdif_data.h"

namespace orielcore_VA {

struct FaceDetectionResult {
    float x, y, width, height;  // fractions of the scanned image
    float roll, pitch, yaw;     // radians
    int32_t maxScore;
    int32_t label;
    int32_t meanScore;
    int32_t count;              // raw hits merged into this one
};

struct SPooledListNode {
    SPooledListNode* prev;
    SPooledListNode* next;
    FaceDetectionResult result;
};

// Circular doubly linked list whose head is itself a node; other nodes come
// from a detector's pool (a node with two null links is free). A list must be
// emptied or destroyed before the detector that lends it nodes.
class SPooledList {
public:
    SPooledList();
    ~SPooledList();
    SPooledList(const SPooledList&) = delete;
    SPooledList& operator=(const SPooledList&) = delete;

    void Bind(SPooledListNode* pool, int32_t poolSize);
    SPooledListNode* Begin() { return head_.next; }
    SPooledListNode* End() { return &head_; }
    bool Empty() const { return head_.next == &head_; }
    int32_t Size() const;
    // Takes the first free pool node; null when the pool is exhausted.
    SPooledListNode* PushBack(const FaceDetectionResult& r);
    // Unlinks a node (its links become null); returns the node that followed.
    SPooledListNode* Erase(SPooledListNode* node);
    void Clear();

private:
    SPooledListNode head_;
    SPooledListNode* pool_;
    int32_t poolSize_;
};

enum {
    STABILIZE_NONE = 0,
    STABILIZE_MERGE_RESULT = 1,
    STABILIZE_LOCAL_SEARCH_MERGE = 2
};

// Head angles of a pose label (radians) as used for head direction.
void Label2FaceAngle4HeadDirectionCalc(int32_t label, float* roll, float* pitch, float* yaw);

class PixDifTreeDetector {
public:
    PixDifTreeDetector();
    ~PixDifTreeDetector();
    PixDifTreeDetector(const PixDifTreeDetector&) = delete;
    PixDifTreeDetector& operator=(const PixDifTreeDetector&) = delete;

    // Uses a dictionary it does not own (freeing an owned one first); the
    // bias becomes the dictionary's default. False (nothing changed) for a
    // dictionary that fails PixDifTreeData_Validate.
    bool AttachData(const PixDifTreeData* data);
    // Loads a PD30 file into an owned dictionary; on failure keeps the old one.
    bool LoadData(const char* path);
    // bias = integer part of (0.5 + f * score scale).
    void SetEndThresholdBias(float f);
    // Buffers for images up to width x height and windows up to windowWidth
    // wide, and a pool of poolSize result nodes. False (nothing allocated)
    // when memory runs out or a size is not positive.
    bool AllocateMemory(int32_t width, int32_t height, int32_t windowWidth, int32_t poolSize);
    void CreateEmptyResultHolder(SPooledList* list);

    // Detection entry: scans the pyramid from startScale down by scaleStep to
    // minScale, appends the hits to list and stabilises them. Returns the
    // number of results in the list.
    int32_t EvalPixDifTreeMultiLayer(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                                     float startScale, float scaleStep, float minScale, SPooledList* list);

    // Scores one window (row pitch = window width, 4 bytes per pixel for a
    // multi-scale dictionary); false when rejected.
    bool EvalPixDifTree(const uint8_t* window, int32_t* score, int32_t* label) const;
    // Rejection threshold of the node learner's last element + its score offset.
    int64_t GetEndThreshold(int32_t node) const;
    int32_t Label2NodeID(int32_t label) const;
    void RemoveOverlap(SPooledList* list) const;
    void MergeOverlap(FaceDetectionResult* r, SPooledList* list) const;
    void RemoveByScore(SPooledList* list) const;
    static bool CheckOverlap(const FaceDetectionResult& a, const FaceDetectionResult& b, float t);
    static bool CheckSimilarSize(const FaceDetectionResult& a, const FaceDetectionResult& b);

    const PixDifTreeData* data() const { return data_; }
    int32_t bias() const { return bias_; }

    int32_t stepX;
    int32_t stepY;
    int32_t stabilize;

private:
    void FreeData();
    void FreeMemory();
    void EvalPixDifTreeMultiLayerCore(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                                      float startScale, float scaleStep, float minScale, SPooledList* list);
    void EvalPixDifTreeImage(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                             SPooledList* list);
    void EvalPixDifTreeStripOfImage(const uint8_t* pixels, int32_t height, int32_t stride, int32_t x,
                                    int32_t fresh);
    void MakeMultiScaleWindow(int32_t x, int32_t height, int32_t fresh);
    void EvalPixDifTreeLocal(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                             const FaceDetectionResult& r, SPooledList* hits);

    const PixDifTreeData* data_;
    bool ownsData_;
    int32_t bias_;
    int32_t bufWidth_;
    int32_t bufHeight_;
    int32_t bufWindowWidth_;
    uint8_t* fullBuf_;
    uint8_t* quarterBuf_;
    uint8_t* stripBuf_;
    SPooledListNode* pool_;
    int32_t poolSize_;
};

}  // namespace orielcore_VA

#endif
