#include "support/module_test.hpp"

#include <cstring>

namespace sm::test {

std::string name_of(HostKind kind) { return kind == HostKind::embedded ? "embedded" : "minimal"; }

Session::Session(HostKind kind) : host_(make_host(kind)) {
  std::int32_t major = 0;
  std::int32_t minor = 0;
  qxextver(host_->services(), &major, &minor);
  extension_ = qxesm(nullptr, nullptr);
  if (extension_) instance_ = CreateInstance(extension_);
}

Session::~Session() { close(); }

void Session::close() {
  if (instance_) qxsmDestroyInstance(&instance_);
  if (extension_) qxsmDestroyExtension(extension_);
  extension_ = nullptr;
}

void ModuleTest::SetUp() {
  session_ = std::make_unique<Session>(GetParam());
  ASSERT_NE(session_->instance(), nullptr);
}

void ModuleTest::TearDown() {
  session_->close();
  EXPECT_EQ(host().live_pools(), 0);
  EXPECT_EQ(host().live_blocks(), 0);
  EXPECT_EQ(host().violations(), 0);
}

SmMatrix* ModuleTest::make(int32_t kind, int32_t format, int64_t rows, int64_t cols) {
  SmMatrix* matrix = nullptr;
  EXPECT_EQ(fn().qxsmnew(instance(), &matrix, kind, format), SM_OK);
  EXPECT_EQ(fn().qxsmresize(matrix, rows, cols), SM_OK);
  return matrix;
}

bool is_missing(double value) {
  std::uint64_t bits = 0;
  std::memcpy(&bits, &value, sizeof bits);
  return bits == SM_MISSING_BITS;
}

}  // namespace sm::test
