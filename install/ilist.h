// Owning doubly linked lists of the installation registry: every node owns the
// object it holds, and a list owns its nodes. One cursor per list, so a list
// must not be walked from two places at once; lookups park the caller's cursor
// and put it back.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <new>
#include <type_traits>

// Result codes of the installation registry (unsigned).
inline constexpr uint32_t KXLI_RC_NULL_ARGUMENT = 0x9000000Cu;    // null buffer or pointer
inline constexpr uint32_t KXLI_RC_BUFFER_TOO_SMALL = 0x90000008u; // string and terminator do not fit
inline constexpr uint32_t KXLI_RC_NOT_USABLE = 0x90000002u;       // object unusable or not found
inline constexpr uint32_t KXLI_RC_NAME_NOT_FOUND = 0x9000006Du;   // no entry of that name
inline constexpr uint32_t KXLI_RC_NO_MEMORY = 0x9000000Du;        // allocation failed

// Names of copies and instances are single-byte text compared ignoring case.
inline constexpr uint32_t KXLI_COPY_NAME_SZ = 65;
// Name of the version-8 installation in the list of copies.
inline constexpr const char KXLI_V8_COPY_NAME[] = "KXLV8";

template <typename C> C kxliUpper(C c) {
  return c >= 'a' && c <= 'z' ? static_cast<C>(c - 'a' + 'A') : c;
}

// The command's one comparison ignoring case: equal over at most `limit`
// characters (or up to the end of both), of single-byte text or of the wide
// names the cluster hands out. Made here, not with the library's compare: a
// compare that failed would read as "different", and this machine would be
// taken for another one.
template <typename C> bool kxliSameText(const C *a, const C *b, size_t limit) {
  for (size_t i = 0; i < limit; ++i) {
    if (kxliUpper(a[i]) != kxliUpper(b[i]))
      return false;
    if (a[i] == '\0')
      return true;
  }
  return true;
}

inline bool kxliSameName(const char *a, const char *b) {
  if (a == nullptr || b == nullptr)
    return a == b;
  return kxliSameText(a, b, SIZE_MAX);
}

// Destroys an object a list owned: strings were allocated with malloc
// (strdup), everything else with new and has a virtual destructor.
template <class T> void kxliDestroy(T *object) {
  if constexpr (std::is_same_v<T, char>)
    std::free(object);
  else
    delete object;
}

template <class T> class ILIST;

template <class T> class INODE {
  friend class ILIST<T>;

public:
  T *data;
  INODE<T> *next;
  INODE<T> *prev;

  INODE<T> &operator=(const INODE<T> &) = default;

private:
  explicit INODE(T *object) : data(object), next(nullptr), prev(nullptr) {}
  // A node takes its object with it.
  ~INODE() { kxliDestroy(data); }
};

template <class T> class ILIST {
public:
  ILIST() = default;
  ~ILIST() { Clear(); }
  ILIST(const ILIST &) = delete;
  ILIST &operator=(const ILIST &) = delete;

  // Takes ownership of `object` and puts it after the tail. The cursor stays
  // where it is, so a walk of a freshly built list starts at its head. When no node can
  // be allocated the object is destroyed, so nothing leaks, and
  // KXLI_RC_NO_MEMORY is returned. A null object is refused.
  uint32_t Append(T *object) {
    if (object == nullptr)
      return KXLI_RC_NULL_ARGUMENT;
    INODE<T> *node = new (std::nothrow) INODE<T>(object);
    if (node == nullptr) {
      kxliDestroy(object);
      return KXLI_RC_NO_MEMORY;
    }
    if (tail == nullptr) {
      head = tail = node;
    } else {
      node->prev = tail;
      tail->next = node;
      tail = node;
    }
    ++count;
    return 0;
  }

  // One iteration step: the element after the cursor (the head when the walk
  // has not started), null at the end.
  T *Next() {
    cursor = cursor == nullptr ? head : cursor->next;
    return cursor != nullptr ? cursor->data : nullptr;
  }

  // The element under the cursor, null before the first step or at the end.
  T *Current() const { return cursor != nullptr ? cursor->data : nullptr; }

  // Starts the next walk at the head.
  void Rewind() { cursor = nullptr; }

  int32_t GetCount() const { return count; }

  // Unlinks the node that holds `object` and destroys both. A cursor (or a
  // parked cursor) on that node moves to its predecessor, so a walk that
  // removes its current element goes on with the element after it.
  // KXLI_RC_NAME_NOT_FOUND when the object is not in the list.
  uint32_t Remove(T *object) {
    INODE<T> *node = head;
    while (node != nullptr && node->data != object)
      node = node->next;
    if (node == nullptr || object == nullptr)
      return object == nullptr ? KXLI_RC_NULL_ARGUMENT : KXLI_RC_NAME_NOT_FOUND;
    unlink(node);
    delete node;
    --count;
    return 0;
  }

protected:
  // The first element whose GetName (65-byte buffer) equals `name` ignoring
  // case. The caller's cursor is kept.
  uint32_t FindByName(const char *name, T **out) {
    if (out == nullptr || name == nullptr)
      return KXLI_RC_NULL_ARGUMENT;
    savedCursor = cursor;
    cursor = nullptr;
    uint32_t rc = KXLI_RC_NAME_NOT_FOUND;
    for (T *element = Next(); element != nullptr; element = Next()) {
      char elementName[65] = {};
      if (element->GetName(elementName, sizeof elementName) == 0 && kxliSameName(elementName, name)) {
        *out = element;
        rc = 0;
        break;
      }
    }
    cursor = savedCursor;
    savedCursor = nullptr;
    return rc;
  }

  INODE<T> *head = nullptr;
  INODE<T> *cursor = nullptr;
  INODE<T> *tail = nullptr;
  INODE<T> *savedCursor = nullptr;
  int32_t count = 0;

private:
  void Clear() {
    while (head != nullptr) {
      INODE<T> *node = head;
      head = node->next;
      delete node;
    }
    cursor = tail = savedCursor = nullptr;
    count = 0;
  }

  void unlink(INODE<T> *node) {
    if (cursor == node)
      cursor = node->prev;
    if (savedCursor == node)
      savedCursor = node->prev;
    if (tail == node)
      tail = node->prev;
    if (head == node)
      head = node->next;
    if (node->prev != nullptr)
      node->prev->next = node->next;
    if (node->next != nullptr)
      node->next->prev = node->prev;
  }
};
