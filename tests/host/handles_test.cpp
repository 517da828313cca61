// The C++ handles: they own, move, and report failure by being false.
#include <gtest/gtest.h>

#include <qxhost/qxhost.hpp>
#include <string>
#include <type_traits>
#include <utility>

namespace {

static_assert(!std::is_copy_constructible_v<qxhost::Host> && !std::is_copy_assignable_v<qxhost::Host>);
static_assert(!std::is_copy_constructible_v<qxhost::Extension> && !std::is_copy_constructible_v<qxhost::Instance>);
static_assert(!std::is_copy_constructible_v<qxhost::Matrix> && !std::is_copy_assignable_v<qxhost::Matrix>);
static_assert(std::is_nothrow_move_constructible_v<qxhost::Host> && std::is_nothrow_move_assignable_v<qxhost::Matrix>);

const QxHostOptions kChecking = {0, 1};

std::int64_t violations(const qxhost::Host& host) {
  const QxHostViolations v = qxhost_violations(host.get());
  return v.foreign_frees + v.double_frees + v.overruns + v.dead_pools;
}

TEST(Handles, assemble_factor_and_solve_and_give_everything_back) {
  qxhost::Host host(kChecking);
  ASSERT_TRUE(host);
  {
    qxhost::Extension extension(host);
    ASSERT_TRUE(extension) << host.last_error();
    qxhost::Instance instance(extension);
    ASSERT_TRUE(instance);
    const SmFunctionTable& sm = instance.fn();
    auto a = qxhost::Matrix::symmetric_sparse(instance, 2);
    ASSERT_TRUE(a) << a.status();
    ASSERT_EQ(sm.qxsmassign(a, 0, 0, 0, 4.0), SM_OK);
    ASSERT_EQ(sm.qxsmassign(a, 1, 1, 0, 2.0), SM_OK);
    ASSERT_EQ(sm.qxsmclose(a, 0.0), SM_OK);
    ASSERT_EQ(sm.qxsmfact(a, 0), SM_OK);
    const double b[2] = {4.0, 4.0};
    double x[2] = {};
    ASSERT_EQ(sm.qxsmsubst(a, b, x, 1), SM_OK);
    EXPECT_EQ(x[0], 1.0);
    EXPECT_EQ(x[1], 2.0);
    EXPECT_GT(host.usage().pools_live, 0);
  }
  EXPECT_EQ(host.usage().pools_live, 0);
  EXPECT_EQ(host.usage().blocks_live, 0);
  EXPECT_EQ(violations(host), 0);
}

TEST(Handles, make_matrices_of_every_kind) {
  qxhost::Host host(kChecking);
  qxhost::Extension extension(host);
  qxhost::Instance instance(extension);
  ASSERT_TRUE(instance) << host.last_error();
  const auto ss = qxhost::Matrix::symmetric_sparse(instance, 3);
  const auto sd = qxhost::Matrix::symmetric_dense(instance, 4);
  const auto gs = qxhost::Matrix::general_sparse(instance, 5, 6);
  const auto dg = qxhost::Matrix::diagonal(instance, 7);
  const qxhost::Matrix typed(instance, SM_KIND_GENERAL, SM_FORMAT_ROWS);
  ASSERT_TRUE(ss && sd && gs && dg && typed);
  EXPECT_EQ(ss->kind, SM_KIND_SYMMETRIC);
  EXPECT_EQ(ss->format, SM_FORMAT_SPARSE);
  EXPECT_EQ(sd->format, SM_FORMAT_COLUMNS);
  EXPECT_EQ(sd->rows, 4);
  EXPECT_EQ(gs->rows, 5);
  EXPECT_EQ(gs->cols, 6);
  EXPECT_EQ(dg->kind, SM_KIND_DIAGONAL);
  EXPECT_EQ(dg->rows, 7);
  EXPECT_EQ(typed->format, SM_FORMAT_ROWS);
  EXPECT_EQ(typed->rows, 0);
  EXPECT_EQ(instance.get()->matrix_count, 5);
}

TEST(Handles, a_matrix_that_cannot_be_made_is_false_and_has_the_status) {
  qxhost::Host host(kChecking);
  qxhost::Extension extension(host);
  qxhost::Instance instance(extension);
  ASSERT_TRUE(instance) << host.last_error();
  const qxhost::Matrix no_kind(instance, 99, SM_FORMAT_ROWS);
  EXPECT_FALSE(no_kind);
  EXPECT_EQ(no_kind.status(), SM_UNAVAILABLE);
  EXPECT_EQ(no_kind.get(), nullptr);
  const auto negative = qxhost::Matrix::symmetric_sparse(instance, -1);
  EXPECT_FALSE(negative);
  EXPECT_EQ(negative.status(), SM_BAD_SIZE);
  qxhost_fail_request(host.get(), QXHOST_FAIL_POOLS, 0, 0);
  const auto refused = qxhost::Matrix::diagonal(instance, 3);
  EXPECT_FALSE(refused);
  EXPECT_EQ(refused.status(), SM_NO_MEMORY);
}

TEST(Handles, move_their_object_and_leave_a_false_handle) {
  qxhost::Host first(kChecking);
  qxhost::Host host(std::move(first));
  EXPECT_FALSE(first);
  ASSERT_TRUE(host);
  EXPECT_EQ(first.services(), nullptr);
  EXPECT_EQ(first.usage().pools_live, 0);
  qxhost::Extension loaded(host);
  qxhost::Extension extension(std::move(loaded));
  EXPECT_FALSE(loaded);
  qxhost::Instance created(extension);
  qxhost::Instance instance(std::move(created));
  EXPECT_FALSE(created);
  ASSERT_TRUE(instance) << host.last_error();
  auto a = qxhost::Matrix::diagonal(instance, 3);
  const std::int64_t one_matrix = host.usage().blocks_live;
  qxhost::Matrix b(std::move(a));
  EXPECT_FALSE(a);
  EXPECT_EQ(a.get(), nullptr);
  EXPECT_TRUE(b);
  b = qxhost::Matrix::diagonal(instance, 3);
  EXPECT_EQ(b->registry_index, 2);
  EXPECT_EQ(host.usage().blocks_live, one_matrix) << "the first matrix went back";
  EXPECT_EQ(violations(host), 0);
}

TEST(Handles, stay_false_when_what_they_build_on_is) {
  const QxHostOptions tiny = {16, 0};
  qxhost::Host host(tiny);
  ASSERT_TRUE(host);
  qxhost::Extension extension(host);
  EXPECT_FALSE(extension);
  EXPECT_TRUE(host.ceiling_was_met());
  EXPECT_NE(std::string(host.last_error()).find("libqxesm.so"), std::string::npos) << host.last_error();
  qxhost::Instance instance(extension);
  EXPECT_FALSE(instance);
  const auto a = qxhost::Matrix::symmetric_sparse(instance, 3);
  EXPECT_FALSE(a);
  EXPECT_EQ(a.status(), SM_NO_MEMORY);
}

TEST(Handles, reach_the_rest_of_the_host) {
  qxhost::Host host;
  ASSERT_TRUE(host);
  EXPECT_FALSE(host.add_search_path(""));
  EXPECT_TRUE(host.add_search_path("/tmp"));
  EXPECT_EQ(host.load(L"no such name"), nullptr);
  EXPECT_NE(std::string(host.last_error()), "");
  host.set_memory_ceiling(8);
  HostServices* services = host.services();
  const PoolParms parms = {};
  MemoryPool* pool = services->create_pool(services, &parms, nullptr, nullptr);
  EXPECT_EQ(pool->allocate(pool, 9, 0), nullptr);
  EXPECT_TRUE(host.ceiling_was_met());
  EXPECT_NE(pool->allocate(pool, 8, 0), nullptr);
  EXPECT_EQ(host.usage().bytes_in_use, 8U);
}

}  // namespace

extern "C" std::int32_t run_c_program();

TEST(CProgram, uses_the_host_and_the_module_from_c) { EXPECT_EQ(run_c_program(), 0); }
