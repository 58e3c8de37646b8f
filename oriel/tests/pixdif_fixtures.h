// Small pixel-difference dictionaries written by the tests, with scores that
// can be worked out by hand.
#ifndef LUMICOR_ORIEL_TESTS_PIXDIF_FIXTURES_H
#define LUMICOR_ORIEL_TESTS_PIXDIF_FIXTURES_H

#include <deque>
#include <memory>
#include <vector>

#include "oriel/src/pixdif/pixdif_data.h"

namespace pixdif_test {

using namespace orielcore_VA;

// Owns everything a PixDifTreeData points to. Add nodes in index order.
class Dictionary {
public:
    Dictionary(int window, bool multiScale, int32_t scale = 100, int32_t bias = 0) : window_(window) {
        data_.scoreScale = scale;
        data_.defaultBias = bias;
        data_.multiScale = multiScale ? 1 : 0;
    }

    // A node with a type 8 learner.
    void Add(int32_t label, int32_t parent, std::vector<int32_t> children, std::vector<int32_t> margins,
             bool restart, std::vector<PixDifElement> elements, int32_t offset) {
        plain_.push_back(elements);
        auto learner = std::make_unique<PixDifWL_2Th_Reject>(plain_.back().data());
        AddNode(label, parent, children, margins, restart,
                PixDifLearnerDesc{PIXDIF_WL_2TH_REJECT, window_, window_, static_cast<int32_t>(elements.size()),
                                  learner.get(), offset, 0});
        learners_.push_back(std::move(learner));
    }
    // A node with a type 11 learner (mirrored indices computed as the reader does).
    void AddMirrorOff(int32_t label, int32_t parent, std::vector<int32_t> children, std::vector<int32_t> margins,
                      bool restart, std::vector<PixDifElement> elements, int32_t offset) {
        std::vector<PixDifMirrorElement> m;
        for (const PixDifElement& e : elements) {
            const bool ms = data_.multiScale != 0;
            m.push_back(PixDifMirrorElement{e.p1, e.p2, ms ? MirrorIndexMS(e.p1, window_) : MirrorIndex(e.p1, window_),
                                            ms ? MirrorIndexMS(e.p2, window_) : MirrorIndex(e.p2, window_), e.a, e.b,
                                            e.t1, e.t2, e.rt});
        }
        mirror_.push_back(m);
        auto learner = std::make_unique<PixDifWL_2Th_Reject_MirrorOff>(mirror_.back().data());
        AddNode(label, parent, children, margins, restart,
                PixDifLearnerDesc{PIXDIF_WL_2TH_REJECT_MIRROR_OFF, window_, window_,
                                  static_cast<int32_t>(elements.size()), learner.get(), offset, 0});
        learners_.push_back(std::move(learner));
    }
    // A node with a type 12 learner mirroring node `source` (0-based).
    void AddMirrorOn(int32_t label, int32_t parent, std::vector<int32_t> children, std::vector<int32_t> margins,
                     bool restart, int32_t source, int32_t offset) {
        const auto* src = static_cast<const PixDifWL_2Th_Reject_MirrorOff*>(descs_[source].learner);
        auto learner = std::make_unique<PixDifWL_2Th_Reject_MirrorOn>(src);
        AddNode(label, parent, children, margins, restart,
                PixDifLearnerDesc{PIXDIF_WL_2TH_REJECT_MIRROR_ON, window_, window_, descs_[source].numElements,
                                  learner.get(), offset, source + 1});
        learners_.push_back(std::move(learner));
    }

    const PixDifTreeData* Data() {
        data_.numNodes = static_cast<int32_t>(nodes_.size());
        data_.nodes = nodes_.data();
        data_.learners = descs_.data();
        return &data_;
    }

private:
    void AddNode(int32_t label, int32_t parent, const std::vector<int32_t>& children,
                 const std::vector<int32_t>& margins, bool restart, const PixDifLearnerDesc& desc) {
        children_.push_back(children);
        margins_.push_back(margins);
        nodes_.push_back(PixDifTreeNode{static_cast<int32_t>(nodes_.size()), label, parent,
                                        static_cast<int32_t>(children.size()), children_.back().data(),
                                        margins_.back().data(), static_cast<uint8_t>(restart ? 1 : 0)});
        descs_.push_back(desc);
    }

    int window_;
    PixDifTreeData data_{};
    std::vector<PixDifTreeNode> nodes_;
    std::vector<PixDifLearnerDesc> descs_;
    std::deque<std::vector<int32_t>> children_, margins_;
    std::deque<std::vector<PixDifElement>> plain_;
    std::deque<std::vector<PixDifMirrorElement>> mirror_;
    std::vector<std::unique_ptr<PixDifWeakLearner>> learners_;
};

inline PixDifElement El(uint16_t p1, uint16_t p2, int16_t a, int16_t b, int16_t t1, int16_t t2, int32_t rt) {
    return PixDifElement{p1, p2, a, b, t1, t2, rt};
}

// One leaf (label 1) over a 20 x 20 single-scale window: accepts a window
// whose centre pixel is more than 50 brighter than its top-left corner, with
// score 100 (end threshold 50).
inline void BrightCentre(Dictionary& d) { d.Add(1, -1, {}, {}, false, {El(210, 0, 100, 0, 50, 0, 50)}, 0); }

}  // namespace pixdif_test

#endif
