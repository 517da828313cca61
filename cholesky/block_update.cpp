// A finished block updates rows of a later block: the dense product of a few strips of coefficients with the rows of
// the source, added at places that are found once for the pair. The source may be a group of blocks (group_panel.hpp).
#include <algorithm>

#include "cholesky/block_work.hpp"
#include "cholesky/group_panel.hpp"

namespace sm {

namespace {

constexpr i64 kLongRun = 6;        // runs that are shorter on average are not worth their bounds
constexpr i64 kInPlaceWidth = 16;  // narrower sources are read where they stand

class BlockUpdate {
 public:
  BlockUpdate(const Target& target, const SourceGroup& sources, Panels& panels)
      : target_(target),
        sources_(sources),
        s_(sources.leader()),
        rows_(s_.done),
        depth_(sources.rows),
        panels_(panels),
        tiles_(tile_kernels()),
        group_(sources, panels.source) {
    packed_ = sources.count > 1 || (depth_ > kInPlaceWidth && rows_ > 2 * tiles_.strip_rows);
  }
  void run();

 private:
  double* coefficients(i64 first_row) { return panels_.coefficient + first_row * depth_; }
  void find_coefficients();
  void keep_multipliers();
  void find_places(i64 begin, i64 end);
  void fetch_targets(int rows, i64 from, i64 columns, double* const* row) const;
  void strip(i64 first_row, i64 begin, i64 end);
  void scatter(int rows, const std::int32_t* to, i64 columns, double* const* row) const;
  i64 head_of_strip(i64 first_row, int rows, i64 end);
  void pack(i64 begin, i64 end);
  TileSource in_place(i64 column) const { return {s_.value + column, s_.step, 1, tiles_.tile_columns}; }
  TileSource in_panel(i64 column) const {
    return {group_.at(column), tiles_.tile_columns, 0, tiles_.tile_columns * depth_};
  }

  const Target& target_;
  const SourceGroup& sources_;
  const Source& s_;  // the leader
  i64 rows_;
  i64 depth_;
  Panels& panels_;
  const TileKernels& tiles_;
  GroupPanel group_;
  bool packed_;
  i64 runs_ = 0;
  bool in_runs_ = false;
};

// -V D of the source's first columns, strip by strip, row s of a strip's coefficients being that of source row s.
void BlockUpdate::find_coefficients() {
  const i64 height = tiles_.strip_rows;
  for (i64 r = 0; r < rows_; r += height) {
    const i64 rows = std::min(height, rows_ - r);
    double* out = coefficients(r);
    const double* v = s_.value + r;
    for (i64 s = 0; s < s_.width; ++s) {
      const double d = -s_.pivot[s];
      for (i64 i = 0; i < rows; ++i) out[i] = v[i] * d;
      out += height;
      v += s_.step - s;
    }
  }
}

void BlockUpdate::keep_multipliers() {
  const i64 height = tiles_.strip_rows;
  for (i64 r = 0; r < rows_; r += height) {
    const i64 rows = std::min(height, rows_ - r);
    const double* from = coefficients(r);
    double* v = s_.value + r;
    for (i64 s = 0; s < s_.width; ++s) {
      for (i64 i = 0; i < rows; ++i) v[i] = from[i];
      from += height;
      v += s_.step - s;
    }
  }
}

// Places of the columns [begin, end) in the rows of the target, and their runs where these are long.
void BlockUpdate::find_places(i64 begin, i64 end) {
  const i64 count = end - begin;
  std::int32_t* to = panels_.to;
  target_.find_places(s_.column + begin, begin == 0 ? rows_ : 0, count, to);
  i64 runs = 1;
  for (i64 j = 1; j < count; ++j) runs += to[j] != to[j - 1] + 1;
  runs_ = runs;
  in_runs_ = count >= kLongRun * runs;
  if (!in_runs_) return;
  Run* run = panels_.run - 1;
  std::int32_t next = -1;
  for (std::int32_t j = 0; j < count; ++j) {
    if (to[j] != next) *++run = {j, to[j], 0};
    ++run->length;
    next = to[j] + 1;
  }
}

// Asks for what the columns from place `from` of the panel on add to, while the sums are made.
void BlockUpdate::fetch_targets(int rows, i64 from, i64 columns, double* const* row) const {
  if (!in_runs_) {
    for (i64 j = from; j < columns; ++j) {
      for (int i = 0; i < rows; ++i) __builtin_prefetch(row[i] + panels_.to[j], 1);
    }
    return;
  }
  for (const Run* run = panels_.run; run != panels_.run + runs_; ++run) {
    if (run->from + run->length <= from) continue;
    for (i64 j = 0; j < run->length; j += 8) {
      for (int i = 0; i < rows; ++i) __builtin_prefetch(row[i] + run->to + j, 1);
    }
  }
}

// Adds the sums one by one, a few rows with each place that is read.
void BlockUpdate::scatter(int rows, const std::int32_t* to, i64 columns, double* const* row) const {
  const double* sum = panels_.sums;
  int i = 0;
  for (; i + 4 <= rows; i += 4, sum += 4 * kPanelColumns) {
    double *a = row[i], *b = row[i + 1], *c = row[i + 2], *d = row[i + 3];
    for (i64 j = 0; j < columns; ++j) {
      const i64 place = to[j];
      a[place] += sum[j];
      b[place] += sum[j + kPanelColumns];
      c[place] += sum[j + 2 * kPanelColumns];
      d[place] += sum[j + 3 * kPanelColumns];
    }
  }
  for (; i < rows; ++i, sum += kPanelColumns) {
    for (i64 j = 0; j < columns; ++j) row[i][to[j]] += sum[j];
  }
}

// The columns of the strip's own rows, where every row begins one later, and what must be added through `to` with them.
// Answers where the rest begins.
i64 BlockUpdate::head_of_strip(i64 first_row, int rows, i64 end) {
  const i64 columns = tiles_.tile_columns;
  i64 stop = first_row + rows;
  if (packed_) stop = (stop + columns - 1) / columns * columns;
  stop = std::min(stop, end);
  double* out[kMostStripRows];
  for (int i = 0; i < rows; ++i) out[i] = panels_.sums + i * kPanelColumns;
  tiles_.strip(rows, depth_, coefficients(first_row), sources_.count > 1 ? in_panel(first_row) : in_place(first_row),
               stop - first_row, out, Finish::store);
  for (int i = 0; i < rows; ++i) {
    const i64 column = s_.column[first_row + i];
    double* row = target_.block.row(column - target_.block.first);
    target_.diag[column] += out[i][i];
    for (i64 j = i + 1; j < stop - first_row; ++j) row[panels_.to[first_row + j]] += out[i][j];
  }
  return stop;
}

// Columns [begin, end), of which places and packed rows are at hand, for the strip of rows that begins at first_row.
void BlockUpdate::strip(i64 first_row, i64 begin, i64 end) {
  const int rows = static_cast<int>(std::min<i64>(tiles_.strip_rows, rows_ - first_row));
  const i64 from = begin == 0 ? head_of_strip(first_row, rows, end) : begin;
  if (from >= end) return;
  const TileSource source = packed_ ? in_panel(from - begin) : in_place(from);
  double* row[kMostStripRows];
  for (int i = 0; i < rows; ++i) row[i] = target_.block.row(s_.column[first_row + i] - target_.block.first);
  if (runs_ == 1) {
    for (int i = 0; i < rows; ++i) row[i] += panels_.to[from - begin];
    tiles_.strip(rows, depth_, coefficients(first_row), source, end - from, row, Finish::add);
    return;
  }
  fetch_targets(rows, from - begin, end - begin, row);
  double* sums[kMostStripRows];
  for (int i = 0; i < rows; ++i) sums[i] = panels_.sums + i * kPanelColumns;
  tiles_.strip(rows, depth_, coefficients(first_row), source, end - from, sums, Finish::store);
  if (!in_runs_) {
    scatter(rows, panels_.to + (from - begin), end - from, row);
    return;
  }
  tiles_.spread(rows, panels_.sums, kPanelColumns, from - begin, panels_.run, panels_.run + runs_, row);
}

void BlockUpdate::pack(i64 begin, i64 end) {
  if (sources_.count == 1) {
    tiles_.pack(s_.width, s_.value + begin, s_.step, end - begin, panels_.source);
    return;
  }
  group_.pack(begin, end);
  if (begin == 0) group_.find_coefficients(rows_, tiles_.strip_rows, panels_.coefficient);
}

void BlockUpdate::run() {
  if (sources_.count == 1) find_coefficients();
  for (i64 begin = 0; begin < s_.count; begin += kPanelColumns) {
    const i64 end = std::min(begin + kPanelColumns, s_.count);
    find_places(begin, end);
    if (packed_) pack(begin, end);
    for (i64 r = 0; r < rows_; r += tiles_.strip_rows) strip(r, begin, end);
  }
  if (sources_.count == 1) {
    keep_multipliers();
  } else {
    group_.keep_multipliers(rows_, tiles_.strip_rows, panels_.coefficient);
  }
}

}  // namespace

void update_block(const Target& target, const SourceGroup& group, Panels& panels) {
  BlockUpdate(target, group, panels).run();
}

}  // namespace sm
