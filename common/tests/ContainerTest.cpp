#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include "testkit/fault.h"

namespace {

using lumicor::test::FaultScope;

TEST(ContainerTest, VectorGrowsByEightAndEmptiesOnFailure) {
    zbmvector<int32_t> v;
    for (int32_t i = 0; i < 9; ++i) {
        ASSERT_EQ(v.PushBack(i), 1);
        EXPECT_EQ(v.capacity, i < 8 ? 8 : 16);
    }
    EXPECT_EQ(v.count, 9);
    EXPECT_EQ(v[8], 8);
    for (int32_t i = 9; i < 16; ++i) v.PushBack(i);  // fills the capacity without reallocating
    {
        FaultScope fault(1);
        EXPECT_EQ(v.PushBack(16), 0);  // the 17th element needs a reallocation
        EXPECT_TRUE(fault.Triggered());
    }
    EXPECT_EQ(v.data, nullptr);
    EXPECT_EQ(v.count, 0);
    EXPECT_EQ(v.capacity, 0);
    EXPECT_EQ(v.PushBack(5), 1);  // usable again
    v.Clear();
    EXPECT_EQ(v.capacity, 0);
}

TEST(ContainerTest, VectorResizeAndSelfReference) {
    zbmvector<zbm_Pos> v;
    ASSERT_EQ(v.Resize(3), 1);
    EXPECT_EQ(v.capacity, 3);
    EXPECT_EQ(v[2].x, 0);
    v[0] = zbm_Pos{7, 8};
    v[2] = zbm_Pos{1, 1};
    ASSERT_EQ(v.PushBack(v[0]), 1);  // the argument lives in the storage that moves
    EXPECT_EQ(v[3].x, 7);
    ASSERT_EQ(v.Resize(1), 1);
    ASSERT_EQ(v.Resize(3), 1);
    EXPECT_EQ(v[2].x, 0);  // dropped elements come back zeroed
    EXPECT_EQ(v.Resize(-1), 0);
    {
        FaultScope fault(1);
        EXPECT_EQ(v.Resize(100), 0);
    }
    EXPECT_EQ(v.count, 3);  // unchanged after a failed resize
    EXPECT_EQ(v[0].y, 8);
    v.Clear();
}

// Nested vectors own their buffers: clearing or dropping the outer one frees
// them (the asan preset reports any leak).
TEST(ContainerTest, NestedVectorsAreFreedWithTheirOwner) {
    zbmvector<zbmvector<zbm_Pos>> contours;
    for (int32_t i = 0; i < 10; ++i) {
        zbmvector<zbm_Pos> c;
        for (int32_t k = 0; k <= i; ++k) c.PushBack(zbm_Pos{k, i});
        ASSERT_EQ(contours.PushBack(c), 1);  // ownership moves into the outer vector
    }
    EXPECT_EQ(contours[9].count, 10);
    ASSERT_EQ(contours.Resize(4), 1);
    {
        FaultScope fault(1);
        EXPECT_EQ(contours.PushBack(zbmvector<zbm_Pos>()), 1);  // capacity 16 left: no allocation
        contours.Resize(16);
        EXPECT_EQ(contours.PushBack(zbmvector<zbm_Pos>()), 0);  // reallocation fails: everything freed
    }
    EXPECT_EQ(contours.count, 0);
}

TEST(ContainerTest, ListInsertsBeforePositionAndSurvivesFailure) {
    zbmlist<int32_t> list;
    ASSERT_EQ(list.PushBack(2), 1);
    ASSERT_EQ(list.PushFront(1), 1);
    zbmlist<int32_t>::Node* three = list.Insert(list.End(), 3);
    ASSERT_NE(three, list.End());
    zbmlist<int32_t>::Node* mid = list.Insert(three, 25);
    EXPECT_EQ(mid->next, three);
    {
        FaultScope fault(1);
        EXPECT_EQ(list.Insert(three, 99), three);
    }
    std::vector<int32_t> values;
    for (auto* n = list.Begin(); n != list.End(); n = n->next) values.push_back(n->value);
    EXPECT_EQ(values, (std::vector<int32_t>{1, 2, 25, 3}));
    EXPECT_EQ(list.Size(), 4);
    EXPECT_EQ(list.Erase(mid), three);
    list.PopFront();
    EXPECT_EQ(list.Front(), 2);
    EXPECT_EQ(list.Back(), 3);
    list.Clear();
    EXPECT_TRUE(list.Empty());
    list.PopBack();  // harmless on an empty list
    list.PushBack(4);  // freed by the destructor
}

}  // namespace
