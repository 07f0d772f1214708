// The owning list: stepping, removal at head, tail and cursor, ownership.
#include "install/ilist.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

class Item {
public:
  Item(int value, int *destroyed) : value(value), destroyed(destroyed) {}
  virtual ~Item() { ++*destroyed; }
  int value;
  int *destroyed;
};

class ItemList : public ::testing::Test {
protected:
  Item *add(int value) {
    Item *item = new Item(value, &destroyed);
    EXPECT_EQ(0u, list.Append(item));
    return item;
  }
  // Steps to the end from wherever the cursor is.
  std::vector<int> rest() {
    std::vector<int> values;
    for (Item *item = list.Next(); item != nullptr; item = list.Next())
      values.push_back(item->value);
    return values;
  }
  std::vector<int> all() {
    list.Rewind();
    return rest();
  }
  int destroyed = 0;
  ILIST<Item> list;
};

using Values = std::vector<int>;

TEST_F(ItemList, AFreshListIsWalkedFromItsHeadInAppendOrder) {
  EXPECT_EQ(nullptr, list.Next());
  add(1);
  add(2);
  add(3);
  EXPECT_EQ(3, list.GetCount());
  EXPECT_EQ(nullptr, list.Current());
  EXPECT_EQ(Values({1, 2, 3}), rest());
  EXPECT_EQ(nullptr, list.Current());
  // Past the end the cursor is null again, so the next walk restarts at the head.
  EXPECT_EQ(Values({1, 2, 3}), rest());
}

TEST_F(ItemList, RemovingTheHeadUnderTheCursorGoesOnWithTheNewHead) {
  Item *first = add(1);
  add(2);
  add(3);
  ASSERT_EQ(1, list.Next()->value);
  EXPECT_EQ(0u, list.Remove(first));
  EXPECT_EQ(1, destroyed);
  EXPECT_EQ(2, list.GetCount());
  EXPECT_EQ(Values({2, 3}), rest());
}

TEST_F(ItemList, RemovingTheCurrentMiddleElementKeepsTheWalkGoing) {
  add(1);
  Item *second = add(2);
  add(3);
  list.Next();
  ASSERT_EQ(second, list.Next());
  EXPECT_EQ(0u, list.Remove(second));
  EXPECT_EQ(1, list.Current()->value);
  EXPECT_EQ(Values({3}), rest());
  EXPECT_EQ(Values({1, 3}), all());
}

TEST_F(ItemList, RemovingTheTailMovesItAndLaterAppendsFollowTheNewTail) {
  add(1);
  Item *last = add(2);
  EXPECT_EQ(0u, list.Remove(last));
  add(4);
  EXPECT_EQ(Values({1, 4}), all());
  // Removing the tail while the cursor is on it ends the walk after its predecessor.
  list.Rewind();
  list.Next();
  Item *tail = list.Next();
  ASSERT_EQ(4, tail->value);
  EXPECT_EQ(0u, list.Remove(tail));
  EXPECT_EQ(Values({}), rest());
}

TEST_F(ItemList, RemovingTheOnlyElementLeavesAnEmptyListThatTakesNewElements) {
  Item *only = add(7);
  list.Next();
  EXPECT_EQ(0u, list.Remove(only));
  EXPECT_EQ(0, list.GetCount());
  EXPECT_EQ(nullptr, list.Current());
  EXPECT_EQ(nullptr, list.Next());
  add(8);
  EXPECT_EQ(Values({8}), all());
}

TEST_F(ItemList, RemovingSomethingNotInTheListChangesNothing) {
  add(1);
  int elsewhere = 0;
  Item stranger(9, &elsewhere);
  EXPECT_EQ(KXLI_RC_NAME_NOT_FOUND, list.Remove(&stranger));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, list.Remove(nullptr));
  EXPECT_EQ(KXLI_RC_NULL_ARGUMENT, list.Append(nullptr));
  EXPECT_EQ(1, list.GetCount());
  EXPECT_EQ(0, destroyed);
}

TEST(ItemListOwnership, DestroyingTheListDestroysEveryElementOnce) {
  int destroyed = 0;
  {
    ILIST<Item> list;
    for (int i = 0; i < 5; ++i)
      list.Append(new Item(i, &destroyed));
    list.Remove(list.Next());
    EXPECT_EQ(1, destroyed);
  }
  EXPECT_EQ(5, destroyed);
}

} // namespace
