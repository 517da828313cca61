// Searches of ascending lists of columns.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Where the list has c, or its length. Without branches on what is read: searches of one list go everywhere in it.
inline i64 find_column(const i64* list, i64 length, i64 c) {
  const i64* at = list;
  for (i64 left = length; left > 1; left -= left / 2) at += at[left / 2 - 1] < c ? left / 2 : 0;
  return length > 0 && *at == c ? at - list : length;
}

// The same where columns are often neighbours at either end of the list: those of its own block in a row of a factor,
// and those of a border.
inline i64 find_column_at_ends(const i64* list, i64 length, i64 c) {
  if (length == 0) return 0;
  const i64 from_front = c - list[0];
  if (from_front >= 0 && from_front < length && list[from_front] == c) return from_front;
  const i64 from_back = length - 1 - (list[length - 1] - c);
  if (from_back >= 0 && from_back < length && list[from_back] == c) return from_back;
  return find_column(list, length, c);
}

}  // namespace sm
