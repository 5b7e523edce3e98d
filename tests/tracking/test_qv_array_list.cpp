#include <gtest/gtest.h>

#include "tracking/QVArrayList.h"

TEST(QVArrayListSlots, AppendsWhileNoSlotIsFree)
{
    QVArrayList<int> list;
    EXPECT_EQ(list.insert(7), 0u);
    EXPECT_EQ(list.insert(8), 1u);
    ASSERT_EQ(list.items.size(), 2u);
    EXPECT_TRUE(list.alive[0] && list.alive[1]);
}

TEST(QVArrayListSlots, ReusesLastFreedFirstAndNeverShrinks)
{
    QVArrayList<int> list;
    for (int v = 0; v < 4; ++v) list.insert(v);
    list.remove(1);
    list.remove(3);
    EXPECT_FALSE(list.alive[1]);
    EXPECT_EQ(list.items[1], 1) << "a dead slot keeps its old contents";
    EXPECT_EQ(list.insert(30), 3u);
    EXPECT_EQ(list.insert(10), 1u);
    EXPECT_EQ(list.insert(40), 4u);
    EXPECT_EQ(list.items.size(), 5u);
    EXPECT_EQ(list.items[3], 30);
}

TEST(QVArrayListSlots, RemovingADeadSlotStacksItAgain)
{
    QVArrayList<int> list;
    list.insert(1);
    list.remove(0);
    list.remove(0);
    EXPECT_EQ(list.freeSlots.size(), 2u);
    EXPECT_EQ(list.insert(5), 0u);
    EXPECT_EQ(list.insert(6), 0u) << "the second copy of the index lands on the same slot";
    EXPECT_EQ(list.items[0], 6);
}

TEST(QVArrayListSlots, IgnoresRemovalOfAnIndexItNeverGave)
{
    QVArrayList<int> list;
    list.insert(1);
    list.remove(9);
    EXPECT_TRUE(list.freeSlots.empty());
    EXPECT_EQ(list.insert(2), 1u);
}
