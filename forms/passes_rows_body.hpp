// The passes of passes.hpp for one vector. Included behind passes_strips_body.hpp and passes_pieces_body.hpp, in the
// same namespace.
//
// Deliberately without an include guard.

// What the next rows are: so many of a strip, or, negative, so many others, or, 0, a batch. Either by looking, less and
// less often where nothing is found, or from a list of that.
template <bool kCuts>
struct Look {
  static constexpr bool kReadsColumns = true;
  static constexpr bool kHasBatches = kCuts;
  i64 least;
  Pieces& pieces;
  i64 patience = 1;

  SM_PASS_INLINE i64 next(const UpperRows& a, i64 i, i64 p) {
    const i64 rows = strip_rows(a, i, p, least);
    if (rows > 0) {
      patience = 1;
      return rows;
    }
    if (kCuts && patience == kPatience) {
      pieces.rows = batch_rows(a, i, a.rows);
      if (pieces.rows > 0) return 0;
    }
    const i64 others = std::min(a.rows - i, patience);
    patience = std::min<i64>(2 * patience, kPatience);
    return -others;
  }
  SM_PASS_INLINE i64 batched() const { return pieces.rows; }
  template <bool kForm>
  SM_PASS_INLINE Batch begin(const UpperRows& a, i64 i, const double* x, double* y, Sums&) {
    static_assert(!kForm);
    cut_rows(a, i, pieces.rows, AddDiagonal{a.values, x, y}, pieces);
    return batch_of(i, pieces);
  }
};
template <bool kBatches>
struct Listed {
  static constexpr bool kReadsColumns = false;
  static constexpr bool kHasBatches = kBatches;
  const i64* list;

  SM_PASS_INLINE i64 next(const UpperRows&, i64, i64) { return *list++; }
  SM_PASS_INLINE i64 batched() const { return *list; }
  template <bool kForm>
  SM_PASS_INLINE Batch begin(const UpperRows& a, i64 i, const double* x, double* y, Sums& form) {
    Batch batch;
    list = read_batch(list, i, batch);
    exchange_diagonals<kForm>(a, batch, x, y, form);
    return batch;
  }
};

// Lists the rows from i up to `until`, none of which begins a strip, and says whether there are batches among them.
// Answers where the list ends.
SM_PASS_TARGET i64* list_others(const UpperRows& a, i64 i, i64 until, Pieces& pieces, i64* list, i64& has_batches) {
  while (i < until) {
    const i64 batched = a.is_ascending ? batch_rows(a, i, until) : 0;
    const i64 rows = batched > 0 ? batched : std::min(until - i, kBatchRows);
    if (batched > 0) {
      cut_rows(a, i, rows, LeaveDiagonal{}, pieces);
      has_batches = 1;
      *list++ = 0;
      list = write_batch(batch_of(i, pieces), list);
    } else {
      *list++ = -rows;
    }
    i += rows;
  }
  return list;
}

SM_PASS_TARGET void list_rows(const UpperRows& a, i64* list) {
  Pieces pieces;
  Look<false> look{kLeastListed, pieces};
  i64& has_batches = *list++;
  has_batches = 0;
  i64 listed = 0;
  for (i64 i = 0; i < a.rows;) {
    const i64 rows = look.next(a, i, a.row_start[i]);
    if (rows > 0) {
      list = list_others(a, listed, i, pieces, list, has_batches);
      *list++ = rows;
      listed = i + rows;
    }
    i += std::abs(rows);
  }
  list_others(a, listed, a.rows, pieces, list, has_batches);
}

template <class Ready>
SM_PASS_INLINE void reach(i64 last, i64 n, i64& ready, const Ready& make_ready) {
  if (__builtin_expect(last >= ready, 0)) {
    const i64 from = ready;
    ready = std::min(n, last + kAhead);
    make_ready(from, ready);
  }
}

// y += A x, with what it needs of the vectors made ready just before. Answers x'A x when asked: its terms come along.
// The loop over the entries of a row stands here as well as in exchange_row: it keeps the registers.
template <bool kForm, class Turns, class Ready>
SM_PASS_INLINE double exchange_rows(const UpperRows& a, Turns turns, const double* x, double* y,
                                    const Ready& make_ready) {
  const i64* __restrict start = a.row_start;
  const i64* __restrict column = a.col_index;
  const double* __restrict value = a.values;
  const i64 n = a.rows;
  double form = 0.0;
  Sums forms{};
  i64 ready = 0;
  if (!a.is_ascending) make_ready(0, ready = n);
  for (i64 i = 0, p = start[0]; i < n;) {
    const i64 rows = turns.next(a, i, p);
    if (rows > 0) {
      const i64 length = start[i + 1] - p;
      reach(column[p + length - 1] + rows - 1, n, ready, make_ready);
      exchange_strip<kForm, Turns>(a, {i, rows, p, length}, x, y, forms);
      p += rows * length;
      i += rows;
      continue;
    }
    if (Turns::kHasBatches && rows == 0) {
      reach(i + turns.batched() - 1, n, ready, make_ready);
      const Batch batch = turns.template begin<kForm>(a, i, x, y, forms);
      reach(batch.reach, n, ready, make_ready);
      exchange_batch<kForm>(a, batch, x, y, forms);
      i += batch.rows;
      p = start[i];
      continue;
    }
    for (const i64 until = i - rows; i < until; ++i) {
      const i64 end = start[i + 1];
      if (p == end) continue;
      reach(column[end - 1], n, ready, make_ready);
      fetch_entries(a, p);
      const double t = x[i];
      double diagonal = 0.0;
      if (column[p] == i) diagonal = value[p++] * t;
      double sum = 0.0;
      if (end - p >= kLongRow) {
        if (end - p >= kRun && a.is_ascending) {
          sum = exchange_border(a, p, end, t, x, y);
          p = end;
        } else {
          sum = exchange_long(a, p, end, t, x, y);
        }
      }
      for (; p < end; ++p) {
        const i64 k = column[p];
        const double v = value[p];
        sum += v * x[k];
        y[k] += v * t;
      }
      y[i] += diagonal + sum;
      if constexpr (kForm) form += t * (diagonal + 2.0 * sum);
    }
  }
  make_ready(ready, n);
  return form + total_of(forms);
}

template <bool kCuts, class Ready>
SM_PASS_TARGET __attribute__((noinline)) void multiply_looking(const UpperRows& a, const double* x, double* y,
                                                               const Ready& make_ready) {
  Pieces pieces;
  exchange_rows<false>(a, Look<kCuts>{kLeastStrip, pieces}, x, y, make_ready);
}

SM_PASS_TARGET void multiply_one(const UpperRows& a, const double* x, double* y, bool accumulate) {
  const bool cuts = is_uneven(a);
  if (accumulate) {
    (cuts ? multiply_looking<true, Nothing> : multiply_looking<false, Nothing>)(a, x, y, Nothing{});
  } else {
    (cuts ? multiply_looking<true, Cleared> : multiply_looking<false, Cleared>)(a, x, y, Cleared{x, y});
  }
}

// Rows without batches have a loop of their own, whose turns are of two kinds only.
template <bool kBatches>
SM_PASS_TARGET __attribute__((noinline)) double direct_listed(const UpperRows& a, const i64* list, const Direction& d) {
  return exchange_rows<true>(a, Listed<kBatches>{list}, d.p, d.q, Directed{d});
}

SM_PASS_TARGET double direct(const UpperRows& a, const i64* list, const Direction& d) {
  return (*list != 0 ? direct_listed<true> : direct_listed<false>)(a, list + 1, d);
}

SM_PASS_TARGET double advance(const Step& s) {
  const double* __restrict p = s.p;
  const double* __restrict q = s.q;
  const double* __restrict inverse = s.inverse;
  double* __restrict x = s.x;
  double* __restrict r = s.r;
  const double alpha = s.alpha;
  Sums rho{};
  i64 i = 0;
  for (; i + kSums <= s.n; i += kSums) {
    sums_at(x + i) += sums_at(p + i) * alpha;
    const Sums rest = sums_at(r + i) - sums_at(q + i) * alpha;
    sums_at(r + i) = rest;
    rho += rest * (sums_at(inverse + i) * rest);
  }
  for (int lane = 0; i < s.n; ++i, ++lane) {
    x[i] += alpha * p[i];
    r[i] -= alpha * q[i];
    rho[lane] += r[i] * (inverse[i] * r[i]);
  }
  return total_of(rho);
}

SM_PASS_TARGET double measure(i64 n, const double* b, const double* q, const double* inverse, double* r) {
  Sums rho{};
  i64 i = 0;
  for (; i + kSums <= n; i += kSums) {
    const Sums rest = sums_at(b + i) - sums_at(q + i);
    sums_at(r + i) = rest;
    rho += rest * (sums_at(inverse + i) * rest);
  }
  for (int lane = 0; i < n; ++i, ++lane) {
    r[i] = b[i] - q[i];
    rho[lane] += r[i] * (inverse[i] * r[i]);
  }
  return total_of(rho);
}
