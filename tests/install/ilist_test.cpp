// The owning list: stepping, removal at head, tail and cursor, ownership.
// Each row is a script of list operations and what they answer.
#include "install/ilist.h"

#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <sstream>
#include <string>

namespace {

class Item {
public:
  Item(int value, int *destroyed) : value(value), destroyed(destroyed) {}
  virtual ~Item() { ++*destroyed; }
  int value;
  int *destroyed;
};

std::string code(uint32_t rc) {
  return rc == 0                        ? "ok"
         : rc == KXLI_RC_NAME_NOT_FOUND ? "notfound"
         : rc == KXLI_RC_NULL_ARGUMENT  ? "null"
                                        : "?";
}

std::string valueOf(const Item *item) {
  return item != nullptr ? std::to_string(item->value) : "-";
}

// "+N" appends N, "-N" removes the element holding N (or a stranger), "+0x" and
// "-0x" hand in null, "n" steps, "c" is the cursor, "w" rewinds, "r" walks the
// rest, "k" counts, "d" counts the destroyed elements, "~" destroys the list.
std::string run(const std::string &script) {
  int destroyed = 0, strangers = 0;
  auto list = std::make_unique<ILIST<Item>>();
  std::map<int, Item *> items;
  std::istringstream ops(script);
  std::string out;
  for (std::string op; ops >> op;) {
    const bool null = op.size() > 1 && op[1] == '0' && op.back() == 'x';
    const int value = op.size() > 1 && !null ? std::stoi(op.substr(1)) : 0;
    Item stranger(value, &strangers);
    std::string said;
    if (op[0] == '+') {
      Item *item = null ? nullptr : items[value] = new Item(value, &destroyed);
      said = code(list->Append(item));
    } else if (op[0] == '-') {
      said = code(list->Remove(null ? nullptr : items.contains(value) ? items[value] : &stranger));
    } else if (op == "r") {
      for (Item *item = list->Next(); item != nullptr; item = list->Next())
        said += valueOf(item);
      said = "<" + said + ">";
    } else if (op == "w" || op == "~") {
      op == "w" ? list->Rewind() : list.reset();
      continue;
    } else {
      said = op == "n"   ? valueOf(list->Next())
             : op == "c" ? valueOf(list->Current())
             : op == "k" ? "#" + std::to_string(list->GetCount())
                         : "d" + std::to_string(destroyed);
    }
    out += (out.empty() ? "" : " ") + said;
  }
  return out;
}

TEST(ItemList, ScriptsOfOperations) {
  const struct {
    const char *script, *answers;
  } rows[] = {
      // A fresh list is walked from its head in append order; past the end
      // the cursor is null again, so the next walk restarts at the head.
      {"n +1 +2 +3 k c r c r", "- ok ok ok #3 - <123> - <123>"},
      // Removing the head under the cursor goes on with the new head.
      {"+1 +2 +3 n -1 d k r", "ok ok ok 1 ok d1 #2 <23>"},
      // Removing the current middle element keeps the walk going.
      {"+1 +2 +3 n n -2 c r w r", "ok ok ok 1 2 ok 1 <3> <13>"},
      // Appends after a removed tail follow the new tail; removing the tail
      // under the cursor ends the walk after its predecessor.
      {"+1 +2 -2 +4 w r w n n -4 r", "ok ok ok ok <14> 1 4 ok <>"},
      // The only element removed leaves an empty list that takes new ones.
      {"+7 n -7 k c n +8 w r", "ok 7 ok #0 - - ok <8>"},
      // Something not in the list changes nothing.
      {"+1 -9 -0x +0x k d", "ok notfound null null #1 d0"},
      // Destroying the list destroys every element once.
      {"+0 +1 +2 +3 +4 n -0 d ~ d", "ok ok ok ok ok 0 ok d1 d5"},
  };
  for (const auto &row : rows)
    EXPECT_EQ(row.answers, run(row.script)) << row.script;
}

} // namespace
