// Every request of every operation of the store refused in turn, once and from then on.
#include <gtest/gtest.h>

#include <vector>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Allocation : public ::testing::TestWithParam<HostKind> {
 protected:
  template <class Prepare, class Run, class Check>
  std::int64_t each_request_refused(Prepare prepare, Run run, Check check) {
    return refuse_each_request(GetParam(), prepare, run, check);
  }

  static SmMatrix* square(Session& session, Shape shape, std::int64_t n) { return new_sized(session, shape, n, n); }
  static SmStatus set(Session& session, SmMatrix* m, std::int64_t row, std::int64_t col, double value) {
    return session.fn().qxsmassign(m, row, col, 0, value);
  }
  static double at(Session& session, SmMatrix* m, std::int64_t row, std::int64_t col) {
    double value = 0.0;
    EXPECT_EQ(session.fn().qxsmget(m, row, col, &value), SM_OK) << row << ' ' << col;
    return value;
  }
  static Nonzeros tree_entries(SmMatrix* m) {
    return walk(m, m->kind == SM_KIND_GENERAL ? m->row_roots : m->sym_roots);
  }
  // A sparse matrix whose slab has one node left, the spare one.
  static SmMatrix* nearly_full(Session& session, Shape shape) {
    SmMatrix* m = square(session, shape, 50);
    for (std::int64_t r = 0; r < 50; ++r) {
      for (std::int64_t c = r + 1; c < 49 && m->nnz < m->slab_nodes - 1; ++c) {
        EXPECT_EQ(set(session, m, r, c, 1.0), SM_OK);
      }
    }
    EXPECT_EQ(m->slab_used, m->slab_bytes);
    return m;
  }
  // What a sparse matrix is whose last entry could not be followed by a new slab.
  static void expect_without_spare(Session& session, SmMatrix* m, std::int64_t nnz) {
    EXPECT_EQ(m->nnz, nnz) << "the entry is in";
    EXPECT_EQ(m->spare_node, nullptr);
    EXPECT_EQ(m->next_node, nullptr);
    EXPECT_EQ(set(session, m, 40, 45, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(session.fn().qxsmassign(m, 0, 1, 1, 1.0), SM_NO_MEMORY) << "an old key";
    EXPECT_EQ(set(session, m, 60, 60, 1.0), SM_NO_MEMORY) << "growing";
    EXPECT_EQ(m->nnz, nnz);
    EXPECT_EQ(static_cast<std::int64_t>(tree_entries(m).size()), nnz);
  }
};

TEST_P(Allocation, typing_a_new_record_needs_a_record_a_registry_a_pool_and_perhaps_a_tree) {
  struct Problem {
    SmMatrix* m;
    std::int64_t pools;
  };
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    const auto create = [shape](Session& session, Problem& p) {
      return session.fn().qxsmnew(session.instance(), &p.m, shape.kind, shape.format);
    };
    const std::int64_t requests = each_request_refused(
        [](Session& session) {
          return Problem{nullptr, session.host().live_pools()};
        },
        create,
        [&](Session& session, Problem& p, SmStatus status, std::int64_t request) {
          SmInstance* instance = session.instance();
          if (request >= 3) {  // a missing tree manager is found by the first entry
            EXPECT_EQ(status, SM_OK);
            ASSERT_NE(p.m, nullptr);
            EXPECT_EQ(p.m->tree, nullptr);
            return;
          }
          EXPECT_EQ(status, SM_NO_MEMORY);
          EXPECT_EQ(p.m, nullptr);
          EXPECT_EQ(session.host().live_pools(), p.pools);
          EXPECT_EQ(instance->matrix_count, request < 2 ? 0 : 1);
          if (request == 2) {
            ASSERT_NE(instance->registry[0], nullptr);
            EXPECT_EQ(instance->registry[0]->kind, SM_KIND_NONE);
            EXPECT_EQ(instance->registry[0]->pool, nullptr);
          }
          EXPECT_EQ(create(session, p), SM_OK);
          EXPECT_EQ(p.m->registry_index, request < 2 ? 1 : 2);
        });
    // A host's tree manager may itself ask for more than one thing.
    EXPECT_TRUE(is_sparse(shape) ? requests > 3 : requests == 3) << requests;
  }
}

TEST_P(Allocation, typing_a_reset_record_without_a_pool_keeps_it_for_the_next_try) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    const auto create = [shape](Session& session, SmMatrix*& m) {
      return session.fn().qxsmnew(session.instance(), &m, shape.kind, shape.format);
    };
    each_request_refused(
        [](Session& session) {
          SmMatrix* m = new_typed(session, kGeneralRows);
          EXPECT_EQ(session.fn().qxsmdelete(m), SM_OK);
          return m;
        },
        create,
        [&](Session& session, SmMatrix*& m, SmStatus status, std::int64_t request) {
          EXPECT_EQ(status, request == 0 ? SM_NO_MEMORY : SM_OK);
          ASSERT_NE(m, nullptr);
          EXPECT_EQ(m->kind, request == 0 ? SM_KIND_NONE : shape.kind);
          EXPECT_EQ(session.instance()->matrix_count, 1);
          EXPECT_EQ(session.fn().qxsmdelete(m), SM_OK);
          EXPECT_EQ(create(session, m), SM_OK);
          EXPECT_EQ(session.instance()->registry[0], m);
        });
  }
}

TEST_P(Allocation, sizing_without_memory_answers_101_and_works_the_next_time) {
  struct Case {
    Shape shape;
    std::int64_t from;  // 0: typed only
    std::int64_t to;
  };
  std::vector<Case> cases;
  for (const Shape shape : kShapes) {
    for (const auto& [from, to] : {std::pair<std::int64_t, std::int64_t>{0, 5}, {4, 25}, {25, 4}}) {
      cases.push_back({shape, from, to});
    }
    if (is_sparse(shape)) cases.push_back({shape, 6, 6});
  }
  for (const Case& c : cases) {
    SCOPED_TRACE(name_of(c.shape) + " from " + std::to_string(c.from) + " to " + std::to_string(c.to));
    const auto size = [&c](Session& session, SmMatrix* m) { return session.fn().qxsmresize(m, c.to, c.to); };
    const std::int64_t requests = each_request_refused(
        [&c](Session& session) { return c.from > 0 ? square(session, c.shape, c.from) : new_typed(session, c.shape); },
        size,
        [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t) {
          EXPECT_EQ(status, SM_NO_MEMORY);
          EXPECT_EQ(m->nnz, 0);
          EXPECT_EQ(m->rows, c.to);
          EXPECT_EQ(m->cols, c.to);
          EXPECT_EQ(set(session, m, 1, 1, 1.0), is_sparse(c.shape) ? SM_NO_MEMORY : SM_BAD_ARGUMENT);
          EXPECT_EQ(set(session, m, 0, 0, 1.0), is_sparse(c.shape) ? SM_NO_MEMORY : SM_BAD_ARGUMENT);
          EXPECT_EQ(m->nnz, 0);
          EXPECT_EQ(size(session, m), SM_OK);
          EXPECT_EQ(set(session, m, 1, 1, 1.0), SM_OK);
          EXPECT_EQ(session.fn().qxsmclose(m, 0.0), SM_OK);
          EXPECT_EQ(at(session, m, 1, 1), 1.0);
        });
    EXPECT_EQ(requests, is_sparse(c.shape) ? 3 : 1);
  }
}

TEST_P(Allocation, the_short_forms_answer_101_and_leave_what_can_be_destroyed) {
  using Short = SmStatus (*)(Session&, SmMatrix**);
  const Short forms[] = {
      [](Session& s, SmMatrix** m) { return s.fn().qxsmnewss(s.instance(), m, 4); },
      [](Session& s, SmMatrix** m) { return s.fn().qxsmnewds(s.instance(), m, 4); },
      [](Session& s, SmMatrix** m) { return s.fn().qxsmnewsd(s.instance(), m, 4); },
      [](Session& s, SmMatrix** m) { return s.fn().qxsmnewsg(s.instance(), m, 4, 5); },
  };
  for (const Short form : forms) {
    const bool general = form == forms[3];
    each_request_refused([](Session&) { return static_cast<SmMatrix*>(nullptr); },
                         [form](Session& session, SmMatrix*& m) { return form(session, &m); },
                         [&](Session& session, SmMatrix*& m, SmStatus status, std::int64_t request) {
                           // A general sparse matrix without a tree manager fails with its first entry only.
                           if (general && request >= 3 && status == SM_OK) {
                             EXPECT_EQ(set(session, m, 0, 0, 1.0), SM_NO_MEMORY);
                           } else {
                             EXPECT_EQ(status, SM_NO_MEMORY);
                           }
                           EXPECT_EQ(session.fn().qxsmDestroyMatrix(session.instance(), &m), SM_OK);
                           EXPECT_EQ(form(session, &m), SM_OK);
                           EXPECT_EQ(set(session, m, 3, 3, 1.0), SM_OK);
                         });
  }
}

TEST_P(Allocation, roots_that_cannot_grow_leave_the_matrix_as_it_was) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    const auto grow = [](Session& session, SmMatrix* m) {
      return set(session, m, 2, 2, 3.0) + set(session, m, 30, 31, 9.0);
    };
    const std::int64_t requests = each_request_refused(
        [shape](Session& session) {
          SmMatrix* m = square(session, shape, 5);
          EXPECT_EQ(set(session, m, 1, 3, 7.0), SM_OK);
          return m;
        },
        grow,
        [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t) {
          EXPECT_EQ(status, SM_NO_MEMORY);
          EXPECT_EQ(m->rows, 5);
          EXPECT_EQ(m->cols, 5);
          EXPECT_EQ(m->row_capacity, 20);
          EXPECT_EQ(m->value_count, shape.kind == SM_KIND_GENERAL ? 25.0 : 15.0);
          const Nonzeros before = tree_entries(m);
          EXPECT_EQ(before.at({1, 3}), 7.0);
          EXPECT_EQ(before.at({2, 2}), 3.0);
          EXPECT_EQ(grow(session, m), SM_OK);
          EXPECT_EQ(tree_entries(m).at({30, 31}), 9.0);
          EXPECT_EQ(tree_entries(m).size(), before.size() + 1);
        });
    EXPECT_EQ(requests, 1);
  }
}

TEST_P(Allocation, an_entry_that_no_slab_follows_is_in_and_the_next_ones_are_refused) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t requests = each_request_refused(
        [shape](Session& session) { return nearly_full(session, shape); },
        [](Session& session, SmMatrix* m) { return set(session, m, 2, 49, 9.0); },
        [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t) {
          EXPECT_EQ(status, SM_NO_MEMORY);
          expect_without_spare(session, m, 1000);
          EXPECT_EQ(tree_entries(m).at({2, 49}), 9.0);
          EXPECT_EQ(m->rows, 50);
          if (shape.kind == SM_KIND_GENERAL) {
            EXPECT_EQ(qxsmremove(m, 2, 49), SM_OK);
            EXPECT_EQ(m->nnz, 999);
            EXPECT_EQ(set(session, m, 2, 49, 9.0), SM_NO_MEMORY) << "a removed node is not used again";
          } else {
            EXPECT_EQ(session.fn().qxsmclose(m, 0.0), SM_OK);
            EXPECT_EQ(at(session, m, 2, 49), 9.0);
            EXPECT_EQ(compressed(m).size(), 1000U);
          }
          EXPECT_EQ(session.fn().qxsmresize(m, 50, 50), SM_OK);
          EXPECT_EQ(set(session, m, 2, 49, 1.0), SM_OK);
        });
    EXPECT_EQ(requests, 1);
  }
}

TEST_P(Allocation, an_entry_may_need_roots_and_a_slab) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    const auto enter = [](Session& session, SmMatrix* m) { return set(session, m, 70, 70, 9.0); };
    const std::int64_t requests =
        each_request_refused([shape](Session& session) { return nearly_full(session, shape); }, enter,
                             [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t request) {
                               EXPECT_EQ(status, SM_NO_MEMORY);
                               EXPECT_EQ(m->rows, request == 0 ? 50 : 71);
                               if (request == 0) {
                                 EXPECT_EQ(m->nnz, 999);
                                 EXPECT_EQ(enter(session, m), SM_OK);
                               } else {
                                 expect_without_spare(session, m, 1000);
                               }
                               EXPECT_EQ(tree_entries(m).at({70, 70}), 9.0);
                             });
    EXPECT_EQ(requests, 2);
  }
}

TEST_P(Allocation, closing_without_memory_leaves_the_matrix_open) {
  for (const bool grown : {false, true}) {
    const auto close = [](Session& session, SmMatrix* m) { return session.fn().qxsmclose(m, 0.5); };
    each_request_refused(
        [grown](Session& session) {
          SmMatrix* m = square(session, kSymmetricSparse, 6);
          EXPECT_EQ(set(session, m, 0, 1, 0.25), SM_OK);
          EXPECT_EQ(set(session, m, 1, grown ? 40 : 4, 2.0), SM_OK);
          EXPECT_EQ(set(session, m, 5, 5, 3.0), SM_OK);
          return m;
        },
        close,
        [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t) {
          EXPECT_EQ(status, SM_NO_MEMORY);
          EXPECT_EQ(m->state, SM_STATE_OPEN);
          EXPECT_NE(m->assembly_pool, nullptr);
          EXPECT_EQ(m->row_start, nullptr);
          EXPECT_EQ(m->col_index, nullptr);
          EXPECT_EQ(m->nz_values, nullptr);
          EXPECT_EQ(static_cast<std::int64_t>(tree_entries(m).size()), m->nnz);
          EXPECT_EQ(set(session, m, 2, 3, 8.0), SM_OK) << "still taking entries";
          EXPECT_EQ(close(session, m), SM_OK);
          const std::int64_t n = grown ? 41 : 6;
          Nonzeros expected{{{1, grown ? 40 : 4}, 2.0}, {{2, 3}, 8.0}};
          for (std::int64_t i = 0; i < n; ++i) expected[{i, i}] = i == 5 ? 3.0 : 0.0;
          EXPECT_EQ(compressed(m), expected);
        });
  }
}

TEST_P(Allocation, closing_gives_back_what_it_took_when_it_fails) {
  survives_every_allocation_failure(
      GetParam(),
      [](Session& session) {
        SmMatrix* m = square(session, kSymmetricSparse, 6);
        EXPECT_EQ(set(session, m, 0, 40, 2.0), SM_OK);
        return m;
      },
      [](Session& session, SmMatrix* m) { return session.fn().qxsmclose(m, 0.0); });
}

TEST_P(Allocation, an_outer_product_stops_at_the_entry_that_no_slab_follows) {
  const double z[] = {2.0, 3.0, 5.0};
  const std::int64_t index[] = {46, 49, 48};
  const std::int64_t requests =
      each_request_refused([](Session& session) { return nearly_full(session, kSymmetricSparse); },
                           [&](Session& session, SmMatrix* m) { return session.fn().qxsmzscp(m, z, index, 3, 1.0); },
                           [&](Session& session, SmMatrix* m, SmStatus status, std::int64_t) {
                             EXPECT_EQ(status, SM_NO_MEMORY);
                             expect_without_spare(session, m, 1000);
                             const Nonzeros out = tree_entries(m);
                             EXPECT_EQ(out.at({46, 46}), 4.0);
                             EXPECT_EQ(out.at({46, 49}), 6.0);
                             EXPECT_EQ(out.count({46, 48}), 0U);
                             EXPECT_EQ(out.at({49, 49}), 0.0);
                             EXPECT_EQ(session.fn().qxsmzscp(m, z, index, 3, 1.0), SM_NO_MEMORY);
                           });
  EXPECT_EQ(requests, 1);
}

TEST_P(Allocation, what_needs_no_memory_asks_for_none) {
  double mine[9] = {};
  const double z[] = {1.0, 2.0, 3.0};
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    Session session(GetParam());
    const SmFunctionTable& fn = session.fn();
    SmMatrix* m = square(session, shape, 3);
    SmMatrix* other = square(session, shape, 3);
    EXPECT_EQ(set(session, m, 1, 1, 2.0), SM_OK);
    session.host().fail_request(0, true);
    EXPECT_EQ(fn.qxsmassign(m, 1, 1, 1, 2.0), SM_OK);
    EXPECT_EQ(set(session, m, 2, 2, 5.0), SM_OK);
    EXPECT_EQ(fn.qxsmzscp(m, z, nullptr, 3, 1.0), shape.kind == SM_KIND_SYMMETRIC ? SM_OK : SM_UNAVAILABLE);
    double value = 0.0;
    if (m->state == SM_STATE_CLOSED) {
      EXPECT_EQ(fn.qxsmget(m, 1, 1, &value), SM_OK);
      EXPECT_EQ(fn.qxsmclose(m, 0.0), SM_OK);
      EXPECT_EQ(fn.qxsmsetee(m, 1.0), SM_OK);
    }
    qxsmremove(m, 1, 1);
    EXPECT_EQ(fn.qxsmresize(m, 0, 0), SM_OK);
    EXPECT_EQ(qxsmtie(m, mine, 3, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
    EXPECT_EQ(fn.qxsmdelete(m), SM_OK);
    EXPECT_EQ(fn.qxsmDestroyMatrix(session.instance(), &other), SM_OK);
    EXPECT_EQ(session.host().stop_failing(), 0);
  }
}

INSTANTIATE_BOTH_HOSTS(Allocation);

}  // namespace
}  // namespace sm::test
