// Dictionary of the pixel-difference tree face detector: a tree of boosted
// weak learners that compare the brightness of pixel pairs in a window, with
// the PD30 file reader and writer and the built-in dictionary MV09_M2R_X5.
#ifndef LUMICOR_ORIEL_PIXDIF_PIXDIF_DATA_H
#define LUMICOR_ORIEL_PIXDIF_PIXDIF_DATA_H

#include <cstdint>

namespace orielcore_VA {

// Score of a rejected window.
constexpr int32_t kPixDifRejected = INT32_MIN;

// Limits of a dictionary this library accepts (the built-in one is far below).
constexpr int32_t kPixDifMaxNodes = 1024;
constexpr int32_t kPixDifMaxElements = 16384;
constexpr int32_t kPixDifMaxWindow = 64;

// Learner types.
enum { PIXDIF_WL_2TH_REJECT = 8, PIXDIF_WL_2TH_REJECT_MIRROR_OFF = 11, PIXDIF_WL_2TH_REJECT_MIRROR_ON = 12 };

// Type 8 element (16 bytes).
struct PixDifElement {
    uint16_t p1, p2;
    int16_t a, b, t1, t2;
    int32_t rt;
};

// Type 11 element (20 bytes): also the mirrored pixel indices.
struct PixDifMirrorElement {
    uint16_t p1, p2, mp1, mp2;
    int16_t a, b, t1, t2;
    int32_t rt;
};

// A weak learner: scores a window from a start score, element by element,
// and rejects it as soon as the running score drops below an element's
// rejection threshold.
class PixDifWeakLearner {
public:
    virtual ~PixDifWeakLearner();
    // s = start; per element d = window[p1] - window[p2],
    // s += (d > t1 ? a : 0) + (d > t2 ? b : 0), rejected when s < rt.
    // Returns s + offset, or kPixDifRejected.
    virtual int32_t EvalPixDif(int32_t m, int32_t offset, const uint8_t* window, int32_t start) const = 0;
    // Rejection threshold of element m - 1.
    virtual int32_t LastRejectThreshold(int32_t m) const = 0;
};

class PixDifWL_2Th_Reject : public PixDifWeakLearner {
public:
    explicit PixDifWL_2Th_Reject(const PixDifElement* elements, bool owned = false);
    ~PixDifWL_2Th_Reject() override;
    int32_t EvalPixDif(int32_t m, int32_t offset, const uint8_t* window, int32_t start) const override;
    int32_t LastRejectThreshold(int32_t m) const override { return elements[m - 1].rt; }
    const PixDifElement* elements;
    bool owned;
};

class PixDifWL_2Th_Reject_MirrorOff : public PixDifWeakLearner {
public:
    explicit PixDifWL_2Th_Reject_MirrorOff(const PixDifMirrorElement* elements, bool owned = false);
    ~PixDifWL_2Th_Reject_MirrorOff() override;
    int32_t EvalPixDif(int32_t m, int32_t offset, const uint8_t* window, int32_t start) const override;
    int32_t LastRejectThreshold(int32_t m) const override { return elements[m - 1].rt; }
    const PixDifMirrorElement* elements;
    bool owned;
};

// Evaluates the elements of an earlier type-11 learner through their
// mirrored indices.
class PixDifWL_2Th_Reject_MirrorOn : public PixDifWeakLearner {
public:
    explicit PixDifWL_2Th_Reject_MirrorOn(const PixDifWL_2Th_Reject_MirrorOff* source);
    int32_t EvalPixDif(int32_t m, int32_t offset, const uint8_t* window, int32_t start) const override;
    int32_t LastRejectThreshold(int32_t m) const override { return source->elements[m - 1].rt; }
    const PixDifWL_2Th_Reject_MirrorOff* source;
};

struct PixDifTreeNode {
    int32_t id;              // equal to its index
    int32_t label;           // pose label of a leaf
    int32_t parent;          // -1 for the root
    int32_t numChildren;     // 0 marks a leaf
    const int32_t* children;
    const int32_t* margins;
    uint8_t restart;         // the learner starts from 0, not the parent's score
};

struct PixDifLearnerDesc {
    int32_t type;
    int32_t windowHeight;
    int32_t windowWidth;
    int32_t numElements;
    const PixDifWeakLearner* learner;
    int32_t scoreOffset;
    int32_t mirrorOf;        // type 12: 1-based index of the mirrored learner (0 otherwise)
};

struct PixDifTreeData {
    int32_t numNodes;
    const PixDifTreeNode* nodes;
    const PixDifLearnerDesc* learners;
    int32_t scoreScale;
    int32_t defaultBias;
    uint8_t multiScale;
};

// Mirror of pixel index i in a window of width w: (i / w) w + (w - 1 - i mod w).
uint16_t MirrorIndex(int32_t i, int32_t w);
// Multi-scale index (4 bytes per pixel, byte s the mean of the 2^s block):
// the block mirrors onto the block that ends at the mirrored position.
uint16_t MirrorIndexMS(int32_t i, int32_t w);

// Structural checks every dictionary must pass before use: node 0 is the only
// root, each other node is the child of its parent exactly once, child and
// learner references are in range, every learner has the same window, at
// least one element, and pixel indices (mirrored ones too) inside the window.
bool PixDifTreeData_Validate(const PixDifTreeData* data);

enum class PixDifLoadStatus { kOk, kOpenFailed, kWrongVersion, kBroken, kOutOfMemory };

// Parses a PD30 dictionary from memory; the result is owned by the caller
// and released with PixDifTreeData_Delete. Null on failure (*status says why).
PixDifTreeData* PixDifTreeData_LoadFromMemory(const uint8_t* bytes, uint32_t size, PixDifLoadStatus* status);
// Reads a PD30 file; prints "PixDifTreeData::LoadFromFile(%s) failed.\n" or
// "... wrong dictionary version.\n" on standard error when it cannot.
PixDifTreeData* PixDifTreeData_LoadFromFile(const char* path);
// Bytes of the PD30 form of data (0 when it cannot be written).
uint32_t PixDifTreeData_SerializedSize(const PixDifTreeData* data);
// Writes the PD30 form; false when the buffer is too small or data invalid.
bool PixDifTreeData_Save(const PixDifTreeData* data, uint8_t* out, uint32_t size);
void PixDifTreeData_Delete(PixDifTreeData* data);

// The built-in dictionary (static; never deleted).
const PixDifTreeData* PixDifTreeData_MV09_M2R_X5();

}  // namespace orielcore_VA

#endif
