#include "oriel/src/pixdif/pixdif_detector.h"

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <new>

#include "common/src/internal/memory.h"
#include "common/src/internal/plane_scale.h"

namespace orielcore_VA {

namespace {

// Resampling of a level image to the size of a scale.
bool AffineBilinear(uint8_t* dst, int32_t dw, int32_t dh, const uint8_t* src, int32_t sw, int32_t sh, int32_t ss) {
    return IIScaleImage(dst, dw, dh, dw, src, sw, sh, ss) == 0;
}

}  // namespace

// ------------------------------------------------------------------ list

SPooledList::SPooledList() : pool_(nullptr), poolSize_(0) {
    head_.prev = head_.next = &head_;
    std::memset(&head_.result, 0, sizeof head_.result);
}

SPooledList::~SPooledList() { Clear(); }

void SPooledList::Bind(SPooledListNode* pool, int32_t poolSize) {
    Clear();
    pool_ = pool;
    poolSize_ = pool ? poolSize : 0;
}

int32_t SPooledList::Size() const {
    int32_t n = 0;
    for (const SPooledListNode* p = head_.next; p != &head_; p = p->next) ++n;
    return n;
}

SPooledListNode* SPooledList::PushBack(const FaceDetectionResult& r) {
    for (int32_t i = 0; i < poolSize_; ++i) {
        SPooledListNode* node = &pool_[i];
        if (node->prev != nullptr || node->next != nullptr) continue;
        node->result = r;
        node->prev = head_.prev;
        node->next = &head_;
        head_.prev->next = node;
        head_.prev = node;
        return node;
    }
    return nullptr;
}

SPooledListNode* SPooledList::Erase(SPooledListNode* node) {
    if (node == nullptr || node == &head_) return &head_;
    SPooledListNode* next = node->next;
    node->prev->next = next;
    next->prev = node->prev;
    node->prev = node->next = nullptr;
    return next;
}

void SPooledList::Clear() {
    while (head_.next != &head_) Erase(head_.next);
}

// ------------------------------------------------------------------ angles

void Label2FaceAngle4HeadDirectionCalc(int32_t label, float* roll, float* pitch, float* yaw) {
    static const float kAngles[15][2] = {{0, 0},          {47.5f, 0},     {-47.5f, 0},   {0, -55},
                                         {0, 55},         {47.5f, -55},   {-47.5f, -55}, {47.5f, 55},
                                         {-47.5f, 55},    {77.5f, 0},     {-77.5f, 0},   {77.5f, -55},
                                         {-77.5f, -55},   {77.5f, 55},    {-77.5f, 55}};
    static const float kRoll[5] = {0, 20, -20, 40, -40};
    static const float kAmp[15][2] = {{1, 1},         {0.763f, 1},     {0.763f, 1},     {1, 1.11f},
                                      {1, 1.75f},     {0.763f, 1.11f}, {0.763f, 1.11f}, {0.763f, 1.75f},
                                      {0.763f, 1.75f}, {1, 1},         {1, 1},          {1, 1.11f},
                                      {1, 1.11f},     {1, 1.75f},      {1, 1.75f}};
    static const float kRollAmp = 1.0f;
    const float toRad = 3.1415927f / 180.0f;
    float r = 0, p = 0, y = 0;
    // Labels come from dictionary files: anything outside 1..75 has no angles
    // (and label - 1 must not overflow for the smallest label).
    const int32_t i = label >= 1 ? label - 1 : -1;
    const int32_t rollIndex = static_cast<int32_t>(static_cast<float>(i) / 15.0f);
    if (i >= 0 && rollIndex < 5) {
        y = kAngles[i % 15][0] * kAmp[i % 15][0] * toRad;
        p = kAngles[i % 15][1] * kAmp[i % 15][1] * toRad;
        r = kRoll[rollIndex] * kRollAmp * toRad;
    }
    if (roll) *roll = r;
    if (pitch) *pitch = p;
    if (yaw) *yaw = y;
}

// ------------------------------------------------------------------ detector

PixDifTreeDetector::PixDifTreeDetector()
    : stepX(2), stepY(2), stabilize(STABILIZE_LOCAL_SEARCH_MERGE), data_(nullptr), ownsData_(false), bias_(0),
      bufWidth_(0), bufHeight_(0), bufWindowWidth_(0), fullBuf_(nullptr), quarterBuf_(nullptr), stripBuf_(nullptr),
      pool_(nullptr), poolSize_(0) {}

PixDifTreeDetector::~PixDifTreeDetector() {
    FreeMemory();
    FreeData();
}

void PixDifTreeDetector::FreeData() {
    if (ownsData_) PixDifTreeData_Delete(const_cast<PixDifTreeData*>(data_));
    data_ = nullptr;
    ownsData_ = false;
}

void PixDifTreeDetector::FreeMemory() {
    std::free(fullBuf_);
    std::free(quarterBuf_);
    std::free(stripBuf_);
    std::free(pool_);
    fullBuf_ = quarterBuf_ = stripBuf_ = nullptr;
    pool_ = nullptr;
    poolSize_ = 0;
    bufWidth_ = bufHeight_ = bufWindowWidth_ = 0;
}

bool PixDifTreeDetector::AttachData(const PixDifTreeData* data) {
    if (!PixDifTreeData_Validate(data)) return false;
    FreeData();
    data_ = data;
    bias_ = data->defaultBias;
    return true;
}

bool PixDifTreeDetector::LoadData(const char* path) {
    PixDifTreeData* loaded = PixDifTreeData_LoadFromFile(path);
    if (loaded == nullptr) return false;
    FreeData();
    data_ = loaded;
    ownsData_ = true;
    bias_ = loaded->defaultBias;
    return true;
}

void PixDifTreeDetector::SetEndThresholdBias(float f) {
    if (data_ == nullptr) return;
    const float v = 0.5f + f * static_cast<float>(data_->scoreScale);
    // Out-of-range values saturate instead of overflowing the conversion.
    if (!(v > -2147483648.0f)) {
        bias_ = v != v ? 0 : INT32_MIN;
    } else if (v >= 2147483648.0f) {
        bias_ = INT32_MAX;
    } else {
        bias_ = static_cast<int32_t>(v);
    }
}

bool PixDifTreeDetector::AllocateMemory(int32_t width, int32_t height, int32_t windowWidth, int32_t poolSize) {
    FreeMemory();
    if (width < 1 || height < 1 || windowWidth < 1 || poolSize < 1) return false;
    uint32_t full, strip, rows, poolBytes;
    if (!lmk::CheckedMul(static_cast<uint32_t>(width), static_cast<uint32_t>(height), &full) ||
        !lmk::CheckedMul(static_cast<uint32_t>(windowWidth), static_cast<uint32_t>(height - 1), &rows) ||
        !lmk::CheckedAdd(rows, static_cast<uint32_t>(width), &strip) || !lmk::CheckedMul(strip, 4, &strip) ||
        !lmk::CheckedMul(static_cast<uint32_t>(poolSize), sizeof(SPooledListNode), &poolBytes) ||
        full > INT32_MAX || strip > INT32_MAX || poolBytes > INT32_MAX) {
        return false;
    }
    fullBuf_ = static_cast<uint8_t*>(std::malloc(full));
    quarterBuf_ = static_cast<uint8_t*>(std::malloc(full / 4 > 0 ? full / 4 : 1));
    stripBuf_ = static_cast<uint8_t*>(std::calloc(strip, 1));
    pool_ = static_cast<SPooledListNode*>(std::calloc(static_cast<size_t>(poolSize), sizeof(SPooledListNode)));
    if (!fullBuf_ || !quarterBuf_ || !stripBuf_ || !pool_) {
        FreeMemory();
        return false;
    }
    poolSize_ = poolSize;
    bufWidth_ = width;
    bufHeight_ = height;
    bufWindowWidth_ = windowWidth;
    return true;
}

void PixDifTreeDetector::CreateEmptyResultHolder(SPooledList* list) {
    if (list != nullptr) list->Bind(pool_, poolSize_);
}

// ------------------------------------------------------------------ windows

bool PixDifTreeDetector::EvalPixDifTree(const uint8_t* window, int32_t* score, int32_t* label) const {
    *score = kPixDifRejected;
    *label = -1;
    if (data_ == nullptr) return false;
    struct Candidate {
        int32_t node;
        int32_t score;
    };
    Candidate list[kPixDifMaxNodes];
    int32_t childScore[kPixDifMaxNodes];
    int32_t n = 0;
    const PixDifTreeNode* nodes = data_->nodes;
    const PixDifLearnerDesc* learners = data_->learners;
    auto eval = [&](int32_t node, int32_t start) {
        const PixDifLearnerDesc& l = learners[node];
        return l.learner->EvalPixDif(l.numElements, l.scoreOffset, window, start);
    };
    const int32_t rootScore = eval(0, 0);
    if (rootScore == kPixDifRejected) return false;
    list[n++] = Candidate{0, rootScore};
    while (n > 0) {
        const Candidate current = list[n - 1];
        const PixDifTreeNode& node = nodes[current.node];
        if (node.numChildren == 0) {
            *score = current.score;
            *label = node.label;
            return true;
        }
        const int32_t k = node.numChildren;
        for (int32_t c = 0; c < k; ++c) {
            const int32_t child = node.children[c];
            childScore[c] = eval(child, nodes[child].restart ? 0 : current.score);
        }
        --n;
        for (int32_t c = 0; c < k; ++c) {
            if (childScore[c] == kPixDifRejected) continue;
            bool keep = true;
            for (int32_t s = 0; s < k && keep; ++s) {
                if (s == c || childScore[s] == kPixDifRejected) continue;
                if (static_cast<int64_t>(childScore[c]) - childScore[s] < node.margins[c]) keep = false;
            }
            if (!keep) continue;
            int32_t pos = 0;
            while (pos < n && list[pos].score > childScore[c]) ++pos;
            for (int32_t i = n; i > pos; --i) list[i] = list[i - 1];
            list[pos] = Candidate{node.children[c], childScore[c]};
            ++n;
        }
    }
    return false;
}

int64_t PixDifTreeDetector::GetEndThreshold(int32_t node) const {
    if (data_ == nullptr || node < 0 || node >= data_->numNodes) return INT64_MAX;
    const PixDifLearnerDesc& l = data_->learners[node];
    return static_cast<int64_t>(l.learner->LastRejectThreshold(l.numElements)) + l.scoreOffset;
}

int32_t PixDifTreeDetector::Label2NodeID(int32_t label) const {
    if (data_ == nullptr) return -1;
    for (int32_t i = 0; i < data_->numNodes; ++i) {
        if (data_->nodes[i].numChildren == 0 && data_->nodes[i].label == label) return i;
    }
    return -1;
}

// ------------------------------------------------------------------ scanning

void PixDifTreeDetector::MakeMultiScaleWindow(int32_t x, int32_t height, int32_t fresh) {
    const int32_t w = data_->learners[0].windowWidth;
    uint8_t* base = stripBuf_ + 4 * static_cast<ptrdiff_t>(x);
    const int32_t pitch = 4 * w;
    auto at = [&](int32_t col, int32_t row, int32_t ch) -> uint8_t& {
        return base[static_cast<ptrdiff_t>(row) * pitch + 4 * col + ch];
    };
    static const int32_t kLast[4] = {0, 1, 3, 7};
    for (int32_t ch = 1; ch < 4; ++ch) {
        const int32_t k = kLast[ch];
        const int32_t d = 1 << (ch - 1);  // offset between the four blocks of the level below
        int32_t from = w - k - fresh;
        if (from < 0) from = 0;
        for (int32_t row = 0; row <= height - 1 - k; ++row) {
            for (int32_t col = from; col <= w - 1 - k; ++col) {
                const int32_t sum = at(col, row, ch - 1) + at(col + d, row, ch - 1) + at(col, row + d, ch - 1) +
                                    at(col + d, row + d, ch - 1);
                at(col, row, ch) = static_cast<uint8_t>(sum >> 2);
            }
        }
    }
}

void PixDifTreeDetector::EvalPixDifTreeStripOfImage(const uint8_t* pixels, int32_t height, int32_t stride,
                                                    int32_t x, int32_t fresh) {
    const int32_t w = data_->learners[0].windowWidth;
    const bool ms = data_->multiScale != 0;
    for (int32_t row = 0; row < height; ++row) {
        const uint8_t* src = pixels + static_cast<ptrdiff_t>(row) * stride + x;
        if (ms) {
            uint8_t* dst = stripBuf_ + 4 * (static_cast<ptrdiff_t>(x) + static_cast<ptrdiff_t>(row) * w);
            for (int32_t col = w - fresh; col < w; ++col) dst[4 * col] = src[col];
        } else {
            uint8_t* dst = stripBuf_ + x + static_cast<ptrdiff_t>(row) * w;
            for (int32_t col = w - fresh; col < w; ++col) dst[col] = src[col];
        }
    }
    if (ms) MakeMultiScaleWindow(x, height, fresh);
}

void PixDifTreeDetector::EvalPixDifTreeImage(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                                             SPooledList* list) {
    const int32_t ww = data_->learners[0].windowWidth, wh = data_->learners[0].windowHeight;
    if (width < ww || height < wh || width > bufWidth_ || height > bufHeight_ || ww > bufWindowWidth_) return;
    const int32_t bpp = data_->multiScale ? 4 : 1;
    const int32_t sx = stepX > 0 ? stepX : 1, sy = stepY > 0 ? stepY : 1;
    for (int32_t x = 0; x <= width - ww; x += sx) {
        const int32_t fresh = x == 0 || sx >= ww ? ww : sx;
        EvalPixDifTreeStripOfImage(pixels, height, stride, x, fresh);
        for (int32_t y = 0; y <= height - wh; y += sy) {
            const uint8_t* window = stripBuf_ + bpp * (static_cast<ptrdiff_t>(x) + static_cast<ptrdiff_t>(y) * ww);
            int32_t score, label;
            if (!EvalPixDifTree(window, &score, &label)) continue;
            FaceDetectionResult r;
            r.x = static_cast<float>(x) / static_cast<float>(width);
            r.y = static_cast<float>(y) / static_cast<float>(height);
            r.width = static_cast<float>(ww) / static_cast<float>(width);
            r.height = static_cast<float>(wh) / static_cast<float>(height);
            Label2FaceAngle4HeadDirectionCalc(label, &r.roll, &r.pitch, &r.yaw);
            r.maxScore = score;
            r.label = label;
            r.meanScore = score;
            r.count = 1;
            list->PushBack(r);  // a full pool drops the hit
        }
    }
}

void PixDifTreeDetector::EvalPixDifTreeMultiLayerCore(const uint8_t* pixels, int32_t width, int32_t height,
                                                      int32_t stride, float startScale, float scaleStep,
                                                      float minScale, SPooledList* list) {
    const float ww = static_cast<float>(data_->learners[0].windowWidth);
    const float wh = static_cast<float>(data_->learners[0].windowHeight);
    float s = startScale < 1.0f ? startScale : 1.0f;
    float level = 1.0f;
    const uint8_t* levelImage = pixels;
    int32_t lw = width, lh = height, ls = stride;
    const float w = static_cast<float>(width), h = static_cast<float>(height);
    while (s > 0.0f) {
        if (w * s < ww || h * s < wh || s < minScale) break;
        if (level / 2 + 0.0005f < s && s <= level + 0.0005f) {
            if (s == 1.0f) {
                EvalPixDifTreeImage(pixels, width, height, stride, list);
            } else if (std::fabs(s - level) <= 0.0005f) {
                EvalPixDifTreeImage(levelImage, lw, lh, ls, list);
            } else {
                const int32_t sw = static_cast<int32_t>(w * s), sh = static_cast<int32_t>(h * s);
                if (sw > bufWidth_ || sh > bufHeight_ || !AffineBilinear(fullBuf_, sw, sh, levelImage, lw, lh, ls)) {
                    break;
                }
                EvalPixDifTreeImage(fullBuf_, sw, sh, sw, list);
            }
            s *= scaleStep;
        } else if (s <= level / 2 + 0.0005f) {
            const int32_t nw = lw / 2, nh = lh / 2;
            if (nw < 1 || nh < 1) break;
            if (levelImage == pixels) {
                if (!AffineBilinear(quarterBuf_, nw, nh, pixels, lw, lh, ls)) break;
            } else {
                if (!AffineBilinear(fullBuf_, nw, nh, quarterBuf_, lw, lh, ls)) break;
                std::memcpy(quarterBuf_, fullBuf_, static_cast<size_t>(nw) * static_cast<size_t>(nh));
            }
            levelImage = quarterBuf_;
            lw = nw;
            lh = nh;
            ls = nw;
            level /= 2;
        } else {
            break;
        }
    }
}

// ------------------------------------------------------------------ overlaps

bool PixDifTreeDetector::CheckOverlap(const FaceDetectionResult& a, const FaceDetectionResult& b, float t) {
    const float ix = std::fmin(a.x + a.width, b.x + b.width) - std::fmax(a.x, b.x);
    const float iy = std::fmin(a.y + a.height, b.y + b.height) - std::fmax(a.y, b.y);
    if (!(ix > 0.0f) || !(iy > 0.0f)) return false;
    const float inter = ix * iy;
    return inter / (a.width * a.height) > t || inter / (b.width * b.height) > t;
}

bool PixDifTreeDetector::CheckSimilarSize(const FaceDetectionResult& a, const FaceDetectionResult& b) {
    return std::fabs(a.width / b.width - 1.0f) <= 0.5f;
}

void PixDifTreeDetector::RemoveOverlap(SPooledList* list) const {
    for (SPooledListNode* a = list->Begin(); a != list->End(); a = a->next) {
        for (SPooledListNode* b = a->next; b != list->End(); b = b->next) {
            if (b->result.maxScore > a->result.maxScore) {
                const FaceDetectionResult t = a->result;
                a->result = b->result;
                b->result = t;
            }
        }
    }
    for (SPooledListNode* e = list->Begin(); e != list->End();) {
        bool covered = false;
        for (SPooledListNode* p = list->Begin(); p != e && !covered; p = p->next) {
            covered = CheckOverlap(p->result, e->result, 0.37f);
        }
        e = covered ? list->Erase(e) : e->next;
    }
}

void PixDifTreeDetector::MergeOverlap(FaceDetectionResult* r, SPooledList* list) const {
    int64_t c = r->count, m = r->meanScore;
    int32_t mx = r->maxScore;
    float f[7] = {r->x, r->y, r->width, r->height, r->roll, r->pitch, r->yaw};
    for (SPooledListNode* q = list->Begin(); q != list->End(); q = q->next) {
        const FaceDetectionResult& o = q->result;
        if (!CheckOverlap(*r, o, 0.4f) || !CheckSimilarSize(*r, o)) continue;
        const int64_t wr = c * m;
        const int64_t wq = static_cast<int64_t>(o.meanScore) * o.count;
        c += o.count;
        if (c != 0) m = (wr + wq) / c;
        if (o.maxScore > mx) mx = o.maxScore;
        const float of[7] = {o.x, o.y, o.width, o.height, o.roll, o.pitch, o.yaw};
        // Equal and opposite weights leave the box where it is.
        if (wr + wq != 0) {
            for (int i = 0; i < 7; ++i) {
                f[i] = (static_cast<float>(wq) * of[i] + static_cast<float>(wr) * f[i]) / static_cast<float>(wr + wq);
            }
        }
    }
    if (c >= 1) {
        r->count = c > INT32_MAX ? INT32_MAX : static_cast<int32_t>(c);
        r->meanScore = m > INT32_MAX ? INT32_MAX : (m < INT32_MIN ? INT32_MIN : static_cast<int32_t>(m));
        r->maxScore = mx;
        r->x = f[0], r->y = f[1], r->width = f[2], r->height = f[3];
        r->roll = f[4], r->pitch = f[5], r->yaw = f[6];
    } else {
        r->count = c < INT32_MIN ? INT32_MIN : static_cast<int32_t>(c);
    }
}

void PixDifTreeDetector::RemoveByScore(SPooledList* list) const {
    for (SPooledListNode* e = list->Begin(); e != list->End();) {
        const int64_t threshold = GetEndThreshold(Label2NodeID(e->result.label)) + bias_;
        e = e->result.maxScore < threshold ? list->Erase(e) : e->next;
    }
}

void PixDifTreeDetector::EvalPixDifTreeLocal(const uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                                             const FaceDetectionResult& r, SPooledList* hits) {
    const float grow = 0.689f;
    float left = r.x - grow * r.width, top = r.y - grow * r.height;
    float right = r.x + r.width + grow * r.width, bottom = r.y + r.height + grow * r.height;
    left = std::fmax(left, 0.0f);
    top = std::fmax(top, 0.0f);
    right = std::fmin(right, 1.0f);
    bottom = std::fmin(bottom, 1.0f);
    const int32_t x0 = static_cast<int32_t>(left * static_cast<float>(width) + 0.5f);
    const int32_t y0 = static_cast<int32_t>(top * static_cast<float>(height) + 0.5f);
    const int32_t x1 = static_cast<int32_t>(right * static_cast<float>(width) + 0.5f);
    const int32_t y1 = static_cast<int32_t>(bottom * static_cast<float>(height) + 0.5f);
    const int32_t rw = x1 - x0, rh = y1 - y0;
    if (rw < 1 || rh < 1 || !(r.width > 0.0f)) return;
    const float ww = static_cast<float>(data_->learners[0].windowWidth);
    const float startScale = ww / (static_cast<float>(width) * r.width) / 0.841f;
    const float minScale = startScale * 0.841f * 0.841f * 0.999f;
    const int32_t savedX = stepX, savedY = stepY;
    stepX = stepY = 1;
    SPooledList local;
    local.Bind(pool_, poolSize_);
    EvalPixDifTreeMultiLayerCore(pixels + static_cast<ptrdiff_t>(y0) * stride + x0, rw, rh, stride, startScale,
                                 0.841f, minScale, &local);
    stepX = savedX;
    stepY = savedY;
    const float fx = static_cast<float>(x0) / static_cast<float>(width);
    const float fy = static_cast<float>(y0) / static_cast<float>(height);
    const float fw = static_cast<float>(rw) / static_cast<float>(width);
    const float fh = static_cast<float>(rh) / static_cast<float>(height);
    for (SPooledListNode* p = local.Begin(); p != local.End(); p = p->next) {
        p->result.x = fx + fw * p->result.x;
        p->result.y = fy + fh * p->result.y;
        p->result.width *= fw;
        p->result.height *= fh;
    }
    // Hand the nodes over to the caller's list.
    while (!local.Empty()) {
        SPooledListNode* p = local.Begin();
        const FaceDetectionResult moved = p->result;
        local.Erase(p);
        hits->PushBack(moved);
    }
}

int32_t PixDifTreeDetector::EvalPixDifTreeMultiLayer(const uint8_t* pixels, int32_t width, int32_t height,
                                                     int32_t stride, float startScale, float scaleStep,
                                                     float minScale, SPooledList* list) {
    if (list == nullptr) return 0;
    // A step outside (0, 1) would never leave the first scale.
    if (data_ == nullptr || pool_ == nullptr || pixels == nullptr || width < 1 || height < 1 || stride < width ||
        !(scaleStep > 0.0f && scaleStep < 1.0f)) {
        return list->Size();
    }
    EvalPixDifTreeMultiLayerCore(pixels, width, height, stride, startScale, scaleStep, minScale, list);
    if (stabilize == STABILIZE_MERGE_RESULT) {
        SPooledList copies;
        copies.Bind(pool_, poolSize_);
        for (SPooledListNode* p = list->Begin(); p != list->End(); p = p->next) copies.PushBack(p->result);
        RemoveOverlap(list);
        for (SPooledListNode* p = list->Begin(); p != list->End();) {
            MergeOverlap(&p->result, &copies);
            p = p->result.count < 1 ? list->Erase(p) : p->next;
        }
    } else if (stabilize == STABILIZE_LOCAL_SEARCH_MERGE) {
        RemoveOverlap(list);
        for (SPooledListNode* p = list->Begin(); p != list->End();) {
            SPooledList hits;
            hits.Bind(pool_, poolSize_);
            EvalPixDifTreeLocal(pixels, width, height, stride, p->result, &hits);
            MergeOverlap(&p->result, &hits);
            p = p->result.count <= 0 ? list->Erase(p) : p->next;
        }
        RemoveOverlap(list);
    } else {
        RemoveOverlap(list);
    }
    RemoveByScore(list);
    return list->Size();
}

}  // namespace orielcore_VA
