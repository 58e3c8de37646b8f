#include "oriel/src/pixdif/pixdif_data.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>

#include "common/src/internal/byte_cursor.h"
#include "common/src/internal/memory.h"

namespace orielcore_VA {

namespace {

// Scores wrap as 32-bit two's complement numbers on every target.
inline int32_t Add(int32_t a, int32_t b) {
    return static_cast<int32_t>(static_cast<uint32_t>(a) + static_cast<uint32_t>(b));
}

template <typename E>
int32_t EvalElements(const E* el, int32_t m, int32_t offset, const uint8_t* window, int32_t start, bool mirrored) {
    int32_t s = start;
    for (int32_t i = 0; i < m; ++i) {
        const E& e = el[i];
        uint16_t i1, i2;
        if constexpr (sizeof(E) == sizeof(PixDifMirrorElement)) {
            i1 = mirrored ? e.mp1 : e.p1;
            i2 = mirrored ? e.mp2 : e.p2;
        } else {
            (void)mirrored;
            i1 = e.p1;
            i2 = e.p2;
        }
        const int32_t d = static_cast<int32_t>(window[i1]) - static_cast<int32_t>(window[i2]);
        s = Add(s, Add(d > e.t1 ? e.a : 0, d > e.t2 ? e.b : 0));
        if (s < e.rt) return kPixDifRejected;
    }
    return Add(s, offset);
}

}  // namespace

PixDifWeakLearner::~PixDifWeakLearner() = default;

PixDifWL_2Th_Reject::PixDifWL_2Th_Reject(const PixDifElement* e, bool o) : elements(e), owned(o) {}
PixDifWL_2Th_Reject::~PixDifWL_2Th_Reject() {
    if (owned) delete[] elements;
}
int32_t PixDifWL_2Th_Reject::EvalPixDif(int32_t m, int32_t offset, const uint8_t* window, int32_t start) const {
    return EvalElements(elements, m, offset, window, start, false);
}

PixDifWL_2Th_Reject_MirrorOff::PixDifWL_2Th_Reject_MirrorOff(const PixDifMirrorElement* e, bool o)
    : elements(e), owned(o) {}
PixDifWL_2Th_Reject_MirrorOff::~PixDifWL_2Th_Reject_MirrorOff() {
    if (owned) delete[] elements;
}
int32_t PixDifWL_2Th_Reject_MirrorOff::EvalPixDif(int32_t m, int32_t offset, const uint8_t* window,
                                                  int32_t start) const {
    return EvalElements(elements, m, offset, window, start, false);
}

PixDifWL_2Th_Reject_MirrorOn::PixDifWL_2Th_Reject_MirrorOn(const PixDifWL_2Th_Reject_MirrorOff* s) : source(s) {}
int32_t PixDifWL_2Th_Reject_MirrorOn::EvalPixDif(int32_t m, int32_t offset, const uint8_t* window,
                                                 int32_t start) const {
    return EvalElements(source->elements, m, offset, window, start, true);
}

uint16_t MirrorIndex(int32_t i, int32_t w) {
    return static_cast<uint16_t>((i / w) * w + (w - 1 - i % w));
}

uint16_t MirrorIndexMS(int32_t i, int32_t w) {
    static const int32_t kBlock[4] = {1, 2, 4, 8};
    const int32_t s = i % 4, p = i / 4;
    return static_cast<uint16_t>(s + 4 * ((p / w) * w - kBlock[s] + w - p % w));
}

// ------------------------------------------------------------------ checks

namespace {

bool PixelOk(uint32_t p, int32_t w, int32_t h, bool multiScale) {
    if (!multiScale) return p < static_cast<uint32_t>(w * h);
    if (p >= static_cast<uint32_t>(4 * w * h)) return false;
    const int32_t block = 1 << (p % 4);
    const int32_t q = static_cast<int32_t>(p / 4);
    return q % w + block <= w && q / w + block <= h;
}

}  // namespace

bool PixDifTreeData_Validate(const PixDifTreeData* d) {
    if (d == nullptr || d->numNodes < 1 || d->numNodes > kPixDifMaxNodes || d->nodes == nullptr ||
        d->learners == nullptr || d->scoreScale < 1) {
        return false;
    }
    const int32_t n = d->numNodes;
    bool seen[kPixDifMaxNodes] = {};
    if (d->nodes[0].parent != -1) return false;
    for (int32_t i = 0; i < n; ++i) {
        const PixDifTreeNode& node = d->nodes[i];
        if (node.id != i || node.numChildren < 0 || node.numChildren >= n) return false;
        if (i > 0 && (node.parent < 0 || node.parent >= n)) return false;
        if (node.numChildren > 0 && (node.children == nullptr || node.margins == nullptr)) return false;
        for (int32_t k = 0; k < node.numChildren; ++k) {
            const int32_t c = node.children[k];
            if (c <= 0 || c >= n || seen[c] || d->nodes[c].parent != i) return false;
            seen[c] = true;
        }
    }
    const int32_t wh = d->learners[0].windowHeight, ww = d->learners[0].windowWidth;
    if (wh < 1 || ww < 1 || wh > kPixDifMaxWindow || ww > kPixDifMaxWindow) return false;
    const bool ms = d->multiScale != 0;
    for (int32_t i = 0; i < n; ++i) {
        const PixDifLearnerDesc& l = d->learners[i];
        if (l.windowHeight != wh || l.windowWidth != ww || l.numElements < 1 ||
            l.numElements > kPixDifMaxElements || l.learner == nullptr) {
            return false;
        }
        if (l.type == PIXDIF_WL_2TH_REJECT) {
            const auto* e = static_cast<const PixDifWL_2Th_Reject*>(l.learner)->elements;
            if (e == nullptr) return false;
            for (int32_t k = 0; k < l.numElements; ++k) {
                if (!PixelOk(e[k].p1, ww, wh, ms) || !PixelOk(e[k].p2, ww, wh, ms)) return false;
            }
        } else if (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_OFF) {
            const auto* e = static_cast<const PixDifWL_2Th_Reject_MirrorOff*>(l.learner)->elements;
            if (e == nullptr) return false;
            for (int32_t k = 0; k < l.numElements; ++k) {
                if (!PixelOk(e[k].p1, ww, wh, ms) || !PixelOk(e[k].p2, ww, wh, ms) || !PixelOk(e[k].mp1, ww, wh, ms) ||
                    !PixelOk(e[k].mp2, ww, wh, ms)) {
                    return false;
                }
            }
        } else if (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_ON) {
            if (l.mirrorOf < 1 || l.mirrorOf > i) return false;
            const PixDifLearnerDesc& src = d->learners[l.mirrorOf - 1];
            if (src.type != PIXDIF_WL_2TH_REJECT_MIRROR_OFF || l.numElements > src.numElements ||
                static_cast<const PixDifWL_2Th_Reject_MirrorOn*>(l.learner)->source != src.learner) {
                return false;
            }
        } else {
            return false;
        }
    }
    return true;
}

// ------------------------------------------------------------------ delete

void PixDifTreeData_Delete(PixDifTreeData* d) {
    if (d == nullptr) return;
    if (d->nodes != nullptr) {
        for (int32_t i = 0; i < d->numNodes; ++i) {
            delete[] d->nodes[i].children;
            delete[] d->nodes[i].margins;
        }
        delete[] d->nodes;
    }
    if (d->learners != nullptr) {
        for (int32_t i = 0; i < d->numNodes; ++i) delete d->learners[i].learner;
        delete[] d->learners;
    }
    delete d;
}

// ------------------------------------------------------------------ PD30

namespace {

const char kMagic[4] = {'P', 'D', '3', '0'};

// Reads the four element groups of a type 8 or 11 learner into el.
template <typename E>
void ReadGroups(lmk::ByteReader& r, E* el, int32_t m) {
    for (int32_t k = 0; k < m; ++k) {
        el[k].p1 = r.U16();
        el[k].p2 = r.U16();
    }
    for (int32_t k = 0; k < m; ++k) {
        el[k].a = static_cast<int16_t>(r.U16());
        el[k].b = static_cast<int16_t>(r.U16());
    }
    for (int32_t k = 0; k < m; ++k) {
        el[k].t1 = static_cast<int16_t>(r.U16());
        el[k].t2 = static_cast<int16_t>(r.U16());
    }
    for (int32_t k = 0; k < m; ++k) el[k].rt = r.I32();
}

template <typename E>
void WriteGroups(lmk::ByteWriter& w, const E* el, int32_t m) {
    for (int32_t k = 0; k < m; ++k) w.U16(el[k].p1), w.U16(el[k].p2);
    for (int32_t k = 0; k < m; ++k) w.U16(static_cast<uint16_t>(el[k].a)), w.U16(static_cast<uint16_t>(el[k].b));
    for (int32_t k = 0; k < m; ++k) w.U16(static_cast<uint16_t>(el[k].t1)), w.U16(static_cast<uint16_t>(el[k].t2));
    for (int32_t k = 0; k < m; ++k) w.I32(el[k].rt);
}

PixDifTreeData* Fail(PixDifTreeData* d, PixDifLoadStatus* status, PixDifLoadStatus why) {
    PixDifTreeData_Delete(d);
    if (status) *status = why;
    return nullptr;
}

}  // namespace

PixDifTreeData* PixDifTreeData_LoadFromMemory(const uint8_t* bytes, uint32_t size, PixDifLoadStatus* status) {
    lmk::ByteReader r(bytes, size, ZBM_WRITE_ENDIAN_LITTLE);
    char magic[4];
    if (!r.Bytes(magic, 4) || std::memcmp(magic, kMagic, 4) != 0) {
        if (status) *status = PixDifLoadStatus::kWrongVersion;
        return nullptr;
    }
    const int32_t n = r.I32();
    const int32_t scale = r.I32();
    const int32_t bias = r.I32();
    const int32_t multi = r.I32();
    if (!r.ok() || n < 1 || n > kPixDifMaxNodes) {
        if (status) *status = PixDifLoadStatus::kBroken;
        return nullptr;
    }
    PixDifTreeData* d = new (std::nothrow) PixDifTreeData();
    if (d == nullptr) return Fail(nullptr, status, PixDifLoadStatus::kOutOfMemory);
    d->numNodes = n;
    d->scoreScale = scale;
    d->defaultBias = bias;
    d->multiScale = multi != 0 ? 1 : 0;
    PixDifTreeNode* nodes = new (std::nothrow) PixDifTreeNode[n]();
    d->nodes = nodes;
    PixDifLearnerDesc* learners = new (std::nothrow) PixDifLearnerDesc[n]();
    d->learners = learners;
    if (nodes == nullptr || learners == nullptr) return Fail(d, status, PixDifLoadStatus::kOutOfMemory);

    for (int32_t i = 0; i < n; ++i) {
        PixDifTreeNode& node = nodes[i];
        node.id = r.I32();
        node.label = r.I32();
        node.parent = r.I32();
        const int32_t k = r.I32();
        if (!r.ok() || k < 0 || k >= n) return Fail(d, status, PixDifLoadStatus::kBroken);
        node.numChildren = k;
        if (k > 0) {
            int32_t* children = new (std::nothrow) int32_t[k];
            node.children = children;
            int32_t* margins = new (std::nothrow) int32_t[k];
            node.margins = margins;
            if (children == nullptr || margins == nullptr) return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
            for (int32_t c = 0; c < k; ++c) children[c] = r.I32();
            for (int32_t c = 0; c < k; ++c) margins[c] = r.I32();
        }
        node.restart = r.I32() != 0 ? 1 : 0;
    }
    for (int32_t i = 0; i < n; ++i) {
        PixDifLearnerDesc& l = learners[i];
        l.type = r.I32();
        l.windowHeight = r.I32();
        l.windowWidth = r.I32();
        l.numElements = r.I32();
        l.scoreOffset = r.I32();
        const int32_t m = l.numElements;
        if (!r.ok() || m < 1 || m > kPixDifMaxElements || l.windowWidth < 1 || l.windowWidth > kPixDifMaxWindow) {
            return Fail(d, status, PixDifLoadStatus::kBroken);
        }
        // Every element takes 16 bytes in the file: refuse a count the rest
        // of the file cannot hold before allocating for it.
        if ((l.type == PIXDIF_WL_2TH_REJECT || l.type == PIXDIF_WL_2TH_REJECT_MIRROR_OFF) &&
            !r.Has(static_cast<uint32_t>(m) * 16u)) {
            return Fail(d, status, PixDifLoadStatus::kBroken);
        }
        if (l.type == PIXDIF_WL_2TH_REJECT) {
            PixDifElement* el = new (std::nothrow) PixDifElement[m]();
            if (el == nullptr) return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
            ReadGroups(r, el, m);
            l.learner = new (std::nothrow) PixDifWL_2Th_Reject(el, true);
            if (l.learner == nullptr) {
                delete[] el;
                return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
            }
        } else if (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_OFF) {
            PixDifMirrorElement* el = new (std::nothrow) PixDifMirrorElement[m]();
            if (el == nullptr) return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
            ReadGroups(r, el, m);
            for (int32_t k = 0; k < m; ++k) {
                el[k].mp1 = d->multiScale ? MirrorIndexMS(el[k].p1, l.windowWidth) : MirrorIndex(el[k].p1, l.windowWidth);
                el[k].mp2 = d->multiScale ? MirrorIndexMS(el[k].p2, l.windowWidth) : MirrorIndex(el[k].p2, l.windowWidth);
            }
            l.learner = new (std::nothrow) PixDifWL_2Th_Reject_MirrorOff(el, true);
            if (l.learner == nullptr) {
                delete[] el;
                return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
            }
        } else if (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_ON) {
            l.mirrorOf = r.I32();
            if (!r.ok() || l.mirrorOf < 1 || l.mirrorOf > i ||
                learners[l.mirrorOf - 1].type != PIXDIF_WL_2TH_REJECT_MIRROR_OFF) {
                return Fail(d, status, PixDifLoadStatus::kBroken);
            }
            l.learner = new (std::nothrow) PixDifWL_2Th_Reject_MirrorOn(
                static_cast<const PixDifWL_2Th_Reject_MirrorOff*>(learners[l.mirrorOf - 1].learner));
            if (l.learner == nullptr) return Fail(d, status, PixDifLoadStatus::kOutOfMemory);
        } else {
            // A learner of another type cannot be evaluated: the file is refused.
            return Fail(d, status, PixDifLoadStatus::kBroken);
        }
        if (!r.ok()) return Fail(d, status, PixDifLoadStatus::kBroken);
    }
    if (!PixDifTreeData_Validate(d)) return Fail(d, status, PixDifLoadStatus::kBroken);
    if (status) *status = PixDifLoadStatus::kOk;
    return d;
}

PixDifTreeData* PixDifTreeData_LoadFromFile(const char* path) {
    std::FILE* fp = path ? std::fopen(path, "rb") : nullptr;
    lmk::UniqueArray<uint8_t> bytes;
    long size = -1;
    if (fp != nullptr && std::fseek(fp, 0, SEEK_END) == 0) {
        size = std::ftell(fp);
        // Dictionaries are a few hundred kilobytes; anything past 64 MB is not one.
        if (size < 0 || size > (64L << 20) || std::fseek(fp, 0, SEEK_SET) != 0) size = -1;
    }
    if (size >= 0) {
        bytes = lmk::NewArray<uint8_t>(static_cast<size_t>(size) + 1);
        if (!bytes || std::fread(bytes.get(), 1, static_cast<size_t>(size), fp) != static_cast<size_t>(size)) {
            size = -1;
        }
    }
    if (fp != nullptr) std::fclose(fp);
    if (size < 0) {
        std::fprintf(stderr, "PixDifTreeData::LoadFromFile(%s) failed.\n", path ? path : "(null)");
        return nullptr;
    }
    PixDifLoadStatus status;
    PixDifTreeData* d = PixDifTreeData_LoadFromMemory(bytes.get(), static_cast<uint32_t>(size), &status);
    if (status == PixDifLoadStatus::kWrongVersion) {
        std::fprintf(stderr, "PixDifTreeData::LoadFromFile(%s) wrong dictionary version.\n", path);
    } else if (d == nullptr) {
        std::fprintf(stderr, "PixDifTreeData::LoadFromFile(%s) failed.\n", path);
    }
    return d;
}

uint32_t PixDifTreeData_SerializedSize(const PixDifTreeData* d) {
    if (!PixDifTreeData_Validate(d)) return 0;
    uint32_t size = 20;
    for (int32_t i = 0; i < d->numNodes; ++i) {
        size += 20 + 8u * static_cast<uint32_t>(d->nodes[i].numChildren);
        const PixDifLearnerDesc& l = d->learners[i];
        size += 20 + (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_ON ? 4u : 16u * static_cast<uint32_t>(l.numElements));
    }
    return size;
}

bool PixDifTreeData_Save(const PixDifTreeData* d, uint8_t* out, uint32_t size) {
    const uint32_t need = PixDifTreeData_SerializedSize(d);
    if (need == 0 || out == nullptr || size < need) return false;
    lmk::ByteWriter w(out, need, ZBM_WRITE_ENDIAN_LITTLE);
    w.Bytes(kMagic, 4);
    w.I32(d->numNodes);
    w.I32(d->scoreScale);
    w.I32(d->defaultBias);
    w.I32(d->multiScale ? 1 : 0);
    for (int32_t i = 0; i < d->numNodes; ++i) {
        const PixDifTreeNode& node = d->nodes[i];
        w.I32(node.id);
        w.I32(node.label);
        w.I32(node.parent);
        w.I32(node.numChildren);
        for (int32_t k = 0; k < node.numChildren; ++k) w.I32(node.children[k]);
        for (int32_t k = 0; k < node.numChildren; ++k) w.I32(node.margins[k]);
        w.I32(node.restart ? 1 : 0);
    }
    for (int32_t i = 0; i < d->numNodes; ++i) {
        const PixDifLearnerDesc& l = d->learners[i];
        w.I32(l.type);
        w.I32(l.windowHeight);
        w.I32(l.windowWidth);
        w.I32(l.numElements);
        w.I32(l.scoreOffset);
        if (l.type == PIXDIF_WL_2TH_REJECT) {
            WriteGroups(w, static_cast<const PixDifWL_2Th_Reject*>(l.learner)->elements, l.numElements);
        } else if (l.type == PIXDIF_WL_2TH_REJECT_MIRROR_OFF) {
            WriteGroups(w, static_cast<const PixDifWL_2Th_Reject_MirrorOff*>(l.learner)->elements, l.numElements);
        } else {
            w.I32(l.mirrorOf);
        }
    }
    return w.ok() && w.position() == need;
}

}  // namespace orielcore_VA
